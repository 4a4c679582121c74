#include "dhcp/subnet_read.h"

#include "core/kernel_files.h"
#include "dhcp/dhcp_option.h"
#include "dhcp/fragment.h"

#include <algorithm>
#include <cstring>

namespace kova {

namespace {

constexpr char kMissing[] = "Failed to get key %s";
constexpr size_t kDomainRoom = 255;
constexpr size_t kModeRoom = 16;
constexpr int kLeaseTime = 3600; // seconds, when the daemon's own word for it is no number

/** Fields of a range after its tag: "::", constructor, mode, prefix length, lease time. */
void take_advertised_range(const comma_fields &fields, DHCP_TAG_CONF &conf) {
    copy_cut(conf.v6_mode, kModeRoom, fields[3]);
    conf.lease_time = kLeaseTime;
    leading_number(fields[5], conf.lease_time);
}

/** Fields of a range after its tag: start, end, prefix length, lease time. */
void take_stateful_range(const comma_fields &fields, DHCP_TAG_CONF &conf) {
    copy_text(conf.v6_mode, "stateful");
    copy_text(conf.start_ip, fields[1]);
    copy_text(conf.end_ip, fields[2]);
    leading_number(fields[4], conf.lease_time);
}

/** Copies a text without its first and last character, which are brackets. */
template<size_t Size> void copy_bracketed(char (&out)[Size], const char *text) {
    const size_t length = strlen(text);
    const size_t inner = length < 2 ? 0 : std::min(length - 2, Size - 1);
    memcpy(out, text + (inner > 0 ? 1 : 0), inner);
    out[inner] = '\0';
}

} // namespace

int read_v4_subnet(const place &at, const path_text &path, DHCP_TAG_CONF &conf) {
    if (KLIBCFileGetKeyValue(path.c_str(), daemon_key::kInterface, conf.ifname, sizeof conf.ifname, 0) <= 0) {
        return fail_keeping_code(at, -1, "Failed to get key %s in %s", daemon_key::kInterface, path.c_str());
    }
    if (!read_v4_range(path, conf)) {
        return fail_keeping_code(at, -1, kMissing, daemon_key::kRange);
    }
    const comma_fields servers = fields_of_line(path, daemon_key::kDnsServer);
    if (!servers.is_held()) {
        return fail_keeping_code(at, -1, kMissing, daemon_key::kOption);
    }
    copy_text(conf.dns1, servers[2]);
    copy_text(conf.dns2, servers[3]);
    if (read_option(path, daemon_key::kRouter, conf.router, kAddressRoom) <= 0) {
        return fail_keeping_code(at, -1, kMissing, daemon_key::kRouter);
    }
    if (read_option(path, daemon_key::kDomainSearch, conf.domain, kDomainRoom) < 0) { // a subnet may do without
        return fail_keeping_code(at, -1, kMissing, daemon_key::kDomainSearch);
    }
    option_list options;
    if (read_options(at, path.c_str(), options) < 0) {
        return -1;
    }
    conf.options = options.give_up();
    return 0;
}

int read_v6_subnet(const place &at, const path_text &path, DHCP_TAG_CONF &conf) {
    const comma_fields range = fields_of_range(path);
    if (!range.is_held()) {
        return fail_keeping_code(at, -1, kMissing, daemon_key::kRange);
    }
    switch (range.count()) {
    case 6:
        take_advertised_range(range, conf);
        break;
    case 5:
        take_stateful_range(range, conf);
        break;
    default:
        return fail_keeping_code(at, -1, "Failed to parse DHCP range of [%s]", path.c_str());
    }
    const comma_fields servers = fields_of_line(path, daemon_key::kDnsServerV6);
    if (!servers.is_held()) {
        return fail_keeping_code(at, -1, kMissing, daemon_key::kOption);
    }
    copy_bracketed(conf.dns1, servers[2]);
    copy_bracketed(conf.dns2, servers[3]);
    return 0;
}

} // namespace kova
