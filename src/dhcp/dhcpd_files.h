/**
 * @file
 * The DHCP server's files below /etc/dhcpd: their paths, the directory, the switch in the info files. Names in paths
 * have passed is_interface_name, so that none leaves the directory and every path fits.
 */
#pragma once

#include "core/report.h"
#include "core/text.h"

namespace kova {

inline constexpr char kDhcpdDir[] = "/etc/dhcpd";
/** What the paths of a family begin with. */
inline constexpr char kDhcpdV4[] = "/etc/dhcpd/dhcpd";
inline constexpr char kDhcpdV6[] = "/etc/dhcpd/dhcpd6";

/** Families, as callers say them. */
inline constexpr int kTypeV4 = 0;
inline constexpr int kTypeV6 = 1;
inline bool is_dhcp_type(int type) {
    return type == kTypeV4 || type == kTypeV6;
}

/** The switch of an interface. */
inline path_text dhcpd_info_path(int type, const char *ifname) {
    return type == kTypeV4 ? path_text{"/etc/dhcpd/dhcpd-%s.info", ifname}
                           : path_text{"/etc/dhcpd/dhcpd6-%s.info", ifname};
}

/** The fragment of a numbered subnet. */
inline path_text subnet_conf_path(int type, const char *ifname, unsigned subnet) {
    return type == kTypeV4 ? path_text{"/etc/dhcpd/dhcpd-%s-subnet%u.conf", ifname, subnet}
                           : path_text{"/etc/dhcpd/dhcpd6-%s-subnet%u.conf", ifname, subnet};
}

/** The switch of a numbered subnet. */
inline path_text subnet_info_path(int type, const char *ifname, unsigned subnet) {
    return type == kTypeV4 ? path_text{"/etc/dhcpd/dhcpd-%s-subnet%u.info", ifname, subnet}
                           : path_text{"/etc/dhcpd/dhcpd6-%s-subnet%u.info", ifname, subnet};
}

/** The key of the info files. */
inline constexpr char kEnable[] = "enable";
inline const char *yes_or_no(bool is_on) {
    return is_on ? "yes" : "no";
}
/** Whether an info file is there and its switch is on. */
[[nodiscard]] bool says_enabled(const path_text &info);

/** Makes the directory, which every writer does first; logs at the caller's place when it cannot. */
[[nodiscard]] bool make_dhcpd_dir(const place &at);

} // namespace kova
