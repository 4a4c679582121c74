#include <kovanetsdk/dhcp.h>

#include "core/report.h"
#include "core/text.h"
#include "dhcp/dhcpd_files.h"
#include "dhcp/fragment.h"

#include <cstring>

using namespace kova;

namespace {

path_text conf_path(const char *ifname, const char *tag) {
    return path_text{"%s-%s-%s.conf", kDhcpdV4, ifname, tag};
}

path_text info_path(const char *ifname, const char *tag) {
    return path_text{"%s-%s-%s.info", kDhcpdV4, ifname, tag};
}

bool has_usable_names(const DHCP_TAG_CONF &conf) {
    return is_range_field(conf.ifname) && is_interface_name(conf.ifname) && is_range_field(conf.tag) &&
           is_interface_name(conf.tag);
}

bool has_usable_values(const DHCP_TAG_CONF &conf) {
    return is_range_field(conf.start_ip) && is_range_field(conf.end_ip) && is_range_field(conf.netmask) &&
           is_line_field(conf.router) && is_line_field(conf.domain) && is_line_field(conf.dns1) &&
           is_line_field(conf.dns2) && is_one_line(conf.tag, daemon_key::kDomainSearch, conf.domain);
}

/** Opens one of the files empty. @return whether it is open; logged when not */
bool open_empty(const path_text &path, fragment &file) {
    file = fragment{path};
    if (!file.is_open()) {
        log_err(HERE, "Failed to open file [%s].", path.c_str());
    }
    return file.is_open();
}

void write_subnet(const DHCP_TAG_CONF &conf, fragment &lines) {
    lines.write_interface(conf.ifname);
    lines.write_range(conf.tag, conf.start_ip, conf.end_ip, conf.netmask, conf.lease_time);
    lines.write_option(conf.tag, daemon_key::kRouter, conf.router);
    if (conf.domain[0] != '\0') {
        lines.write_option(conf.tag, daemon_key::kDomainSearch, conf.domain);
    }
    if (conf.dns2[0] != '\0') {
        lines.write_option(conf.tag, daemon_key::kDnsServer, conf.dns1, conf.dns2);
    } else {
        lines.write_option(conf.tag, daemon_key::kDnsServer, conf.dns1);
    }
}

int fail_to_set(const char *ifname) {
    return fail_keeping_code(HERE, 0, "Failed to set config file of dhcp server [%s].", ifname);
}

// ---- reading; every value is cut to kAddressRoom, however long its field is

bool read_dns(const path_text &path, DHCP_TAG_CONF &conf) {
    const comma_fields fields = fields_of_line(path, daemon_key::kDnsServer);
    if (fields.count() == 3 || fields.count() == 4) {
        copy_cut(conf.dns1, kAddressRoom, fields[2]);
        copy_cut(conf.dns2, kAddressRoom, fields[3]);
    }
    return fields.is_held();
}

/** @return 1; 0, logged, when a line is missing that has to be there */
int read_subnet(const path_text &path, DHCP_TAG_CONF &conf) {
    constexpr char kMissing[] = "Failed to get key %s";
    if (!read_v4_range(path, conf)) {
        return fail_keeping_code(HERE, 0, kMissing, daemon_key::kRange);
    }
    if (!read_dns(path, conf)) {
        return fail_keeping_code(HERE, 0, kMissing, daemon_key::kOption);
    }
    if (read_option(path, daemon_key::kRouter, conf.router, kAddressRoom) <= 0) {
        return fail_keeping_code(HERE, 0, kMissing, daemon_key::kRouter);
    }
    if (KLIBCFileGetKeyValue(path.c_str(), daemon_key::kInterface, conf.ifname, sizeof conf.ifname, 0) <= 0) {
        return fail_keeping_code(HERE, 0, "Failed to get key %s in %s", daemon_key::kInterface, path.c_str());
    }
    if (read_option(path, daemon_key::kDomainSearch, conf.domain, kAddressRoom) < 0) { // a subnet may do without
        return fail_keeping_code(HERE, 0, kMissing, daemon_key::kDomainSearch);
    }
    return 1;
}

} // namespace

extern "C" int KOVANetSetDhcpServerConfigFiles(const DHCP_TAG_CONF *conf, int enable) {
    const bool is_on = enable != 0;
    if (conf == nullptr || !has_usable_names(*conf) || (is_on && !has_usable_values(*conf))) {
        return fail_keeping_code(HERE, 0, "Bad parameters.");
    }
    fragment info;
    if (!make_dhcpd_dir(HERE) || !open_empty(info_path(conf->ifname, conf->tag), info)) {
        return 0;
    }
    info.write_enable(is_on);
    if (!info.close()) {
        return fail_to_set(conf->ifname);
    }
    if (!is_on) {
        return 1;
    }
    fragment lines;
    if (!open_empty(conf_path(conf->ifname, conf->tag), lines)) {
        return fail_to_set(conf->ifname);
    }
    write_subnet(*conf, lines);
    return lines.close() ? 1 : fail_to_set(conf->ifname);
}

extern "C" int KOVANetGetDhcpServerConf(const char *tag, const char *ifname, DHCP_TAG_CONF *conf_out) {
    if (tag == nullptr || ifname == nullptr || conf_out == nullptr) {
        return 0;
    }
    if (refuses_ifname(HERE, "tag", tag) || refuses_ifname(HERE, "ifname", ifname)) {
        return 0;
    }
    const path_text path = conf_path(ifname, tag);
    const path_text info = info_path(ifname, tag);
    if (KLIBCFileExist(path.c_str()) != 1) {
        return fail_keeping_code(HERE, 0, "File [%s] does not exist.", path.c_str());
    }
    char own_tag[sizeof conf_out->tag]; // the names may be the record's own
    copy_text(own_tag, tag);
    *conf_out = {};
    if (read_subnet(path, *conf_out) == 0) {
        return 0;
    }
    conf_out->enabled = says_enabled(info) ? 1 : 0;
    copy_text(conf_out->tag, own_tag);
    return 1;
}
