#include "dhcp/subnet_write.h"

#include "core/text.h"
#include "dhcp/dhcp_option.h"
#include "dhcp/dhcpd_files.h"
#include "dhcp/fragment.h"

#include <cstring>

namespace kova {

namespace {

constexpr char kOff[] = "off";
constexpr char kRaOnly[] = "ra-only";
constexpr char kRaStateless[] = "ra-stateless";
constexpr char kStateful[] = "stateful";
constexpr char kPrefixLength[] = "64";

bool has_mode(const DHCP_TAG_CONF &conf, const char *mode) {
    return strcmp(conf.v6_mode, mode) == 0;
}

using tag_text = built_text<256>;

tag_text tag_of(const subnet_id &subnet) {
    return subnet.type == kTypeV4 ? tag_text{"%s%u", subnet.ifname, subnet.number}
                                  : tag_text{"%sv6%u", subnet.ifname, subnet.number};
}

/** Values joined by ",", in one line. */
class joined_values {
public:
    /** NULL fits nowhere. */
    void append(const char *open, const char *value, const char *close) {
        if (value == nullptr) {
            fits_ = false;
            return;
        }
        const size_t used = strlen(text_);
        const int length = snprintf(text_ + used, sizeof text_ - used, "%s%s%s", open, value, close);
        fits_ = fits_ && length >= 0 && static_cast<size_t>(length) < sizeof text_ - used;
    }
    void drop_last_comma() {
        const size_t length = strlen(text_);
        if (length > 0 && text_[length - 1] == ',') {
            text_[length - 1] = '\0';
        }
    }
    [[nodiscard]] const char *c_str() const { return text_; }
    [[nodiscard]] bool fits() const { return fits_; }

private:
    char text_[kLineRoom] = "";
    bool fits_ = true;
};

/** The name servers of a subnet; those of IPv6 stand in brackets, further ones have theirs already. */
joined_values dns_of(const subnet_id &subnet, const DHCP_TAG_CONF &conf) {
    joined_values servers;
    for (const char *server : {conf.dns1, conf.dns2}) {
        if (*server != '\0') {
            servers.append(subnet.type == kTypeV4 ? "" : "[", server, subnet.type == kTypeV4 ? "," : "],");
        }
    }
    servers.append("", conf.dns_more, "");
    servers.drop_last_comma();
    return servers;
}

bool is_dns_writable(const subnet_id &subnet, const DHCP_TAG_CONF &conf, const char *name) {
    if (!is_line_field(conf.dns1) || !is_line_field(conf.dns2) || !is_line_field(conf.dns_more)) {
        return false;
    }
    const joined_values servers = dns_of(subnet, conf);
    return servers.fits() && is_one_line(tag_of(subnet).c_str(), name, servers.c_str());
}

bool is_v4_writable(const subnet_id &subnet, const DHCP_TAG_CONF &conf) {
    return is_range_field(conf.start_ip) && is_range_field(conf.end_ip) && is_range_field(conf.netmask) &&
           is_line_field(conf.router) && is_line_field(conf.domain) &&
           is_one_line(tag_of(subnet).c_str(), daemon_key::kDomainSearch, conf.domain) &&
           is_dns_writable(subnet, conf, daemon_key::kDnsServer);
}

bool is_v6_writable(const subnet_id &subnet, const DHCP_TAG_CONF &conf) {
    if (!is_line_field(conf.v6_mode)) {
        return false;
    }
    if (has_mode(conf, kOff)) {
        return true; // nothing is written
    }
    if (has_mode(conf, kStateful) && (!is_range_field(conf.start_ip) || !is_range_field(conf.end_ip))) {
        return false;
    }
    return is_dns_writable(subnet, conf, daemon_key::kDnsServerV6);
}

bool open_fragment(const place &at, const subnet_id &subnet, fragment &lines) {
    if (!make_dhcpd_dir(at)) {
        return false;
    }
    const path_text path = subnet_conf_path(subnet.type, subnet.ifname, subnet.number);
    lines = fragment{path};
    if (!lines.is_open()) {
        log_err(at, "Failed to open file [%s].", path.c_str());
    }
    return lines.is_open();
}

int close_fragment(const place &at, const subnet_id &subnet, fragment &lines) {
    if (lines.close()) {
        return 0;
    }
    return fail_keeping_code(at, -1, "Failed to write file [%s].",
                             subnet_conf_path(subnet.type, subnet.ifname, subnet.number).c_str());
}

/** The value of an option, or its items joined by ",". */
joined_values value_of(const DHCP_OPTION &option) {
    joined_values value;
    if (DHCPOptionIsListValue(static_cast<unsigned>(option.number)) == 0) {
        value.append("", option.value, "");
        return value;
    }
    for (int i = 0; i < static_cast<int>(option.items->nItem); ++i) {
        value.append(i > 0 ? "," : "", KLIBCSzListGet(option.items, i), "");
    }
    return value;
}

bool write_user_option(const tag_text &tag, const DHCP_OPTION &option, fragment &lines) {
    if (!is_valid_option(option)) {
        return false;
    }
    const built_text<64> name{"option:%s", option.name};
    const joined_values value = value_of(option);
    if (!value.fits() || !is_one_line(tag.c_str(), name.c_str(), value.c_str())) {
        return false;
    }
    lines.write_option(tag.c_str(), name.c_str(), value.c_str());
    return true;
}

} // namespace

bool is_writable(const subnet_id &subnet, const DHCP_TAG_CONF &conf) {
    // a name with "," would be two fields in the tag
    return is_list_field(subnet.ifname) &&
           (subnet.type == kTypeV4 ? is_v4_writable(subnet, conf) : is_v6_writable(subnet, conf));
}

int write_v4_subnet(const place &at, const subnet_id &subnet, const DHCP_TAG_CONF &conf) {
    fragment lines;
    if (!open_fragment(at, subnet, lines)) {
        return -1;
    }
    const tag_text tag = tag_of(subnet);
    lines.write_interface(subnet.ifname);
    lines.write_range(tag.c_str(), conf.start_ip, conf.end_ip, conf.netmask, conf.lease_time);
    lines.write_option(tag.c_str(), daemon_key::kRouter, conf.router);
    if (conf.domain[0] != '\0') {
        lines.write_option(tag.c_str(), daemon_key::kDomainSearch, conf.domain);
        lines.write_option(tag.c_str(), daemon_key::kDomainName, conf.domain);
    }
    lines.write_option(tag.c_str(), daemon_key::kDnsServer, dns_of(subnet, conf).c_str());
    for (const DHCP_OPTION *option = conf.options; option != nullptr; option = option->next) {
        if (!write_user_option(tag, *option, lines)) {
            return fail_keeping_code(at, -1, "interface [%s] subnet [%d] option [%d] has wrong format", subnet.ifname,
                                     static_cast<int>(subnet.number), option->number);
        }
    }
    return close_fragment(at, subnet, lines);
}

int write_v6_subnet(const place &at, const subnet_id &subnet, const DHCP_TAG_CONF &conf) {
    if (has_mode(conf, kOff)) {
        return 0;
    }
    const bool is_stateful = has_mode(conf, kStateful);
    if (!is_stateful && !has_mode(conf, kRaOnly) && !has_mode(conf, kRaStateless)) {
        return fail_keeping_code(at, -1, "Wrong dhcpv6 type [%s]", conf.v6_mode);
    }
    fragment lines;
    if (!open_fragment(at, subnet, lines)) {
        return -1;
    }
    const tag_text tag = tag_of(subnet);
    lines.write_interface(subnet.ifname);
    if (is_stateful) {
        lines.write_range(tag.c_str(), conf.start_ip, conf.end_ip, kPrefixLength, conf.lease_time);
    } else {
        lines.write_advertised_range(tag.c_str(), subnet.ifname, conf.v6_mode, conf.lease_time);
    }
    const joined_values servers = dns_of(subnet, conf);
    if (*servers.c_str() != '\0') {
        lines.write_option(tag.c_str(), daemon_key::kDnsServerV6, servers.c_str());
    }
    if (is_stateful) {
        lines.write_enable_ra();
    }
    return close_fragment(at, subnet, lines);
}

} // namespace kova
