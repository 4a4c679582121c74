/**
 * @file
 * The interface files and the keys in them.
 */
#pragma once

#include "core/report.h"
#include "core/text.h"

#include <initializer_list>

namespace kova {

/** Line formats of the key/value files. */
inline constexpr char kQuotedLine[] = "%s=\"%s\"\n";
inline constexpr char kPlainLine[] = "%s=%s\n";

inline constexpr char kKovaInfo[] = "/etc/kovainfo.conf";
inline constexpr char kKovaInfoDefaults[] = "/etc.defaults/kovainfo.conf";

/** Path of an interface's file; the name has passed refuses_ifname. */
class ifcfg_path : public path_text {
public:
    explicit ifcfg_path(const char *szIfname) : path_text("/etc/sysconfig/network-scripts/ifcfg-%s", szIfname) {}
};

/** Path of the lease that the DHCP client got for an interface, with the keys IPADDR and NETMASK. */
class lease_path : public path_text {
public:
    explicit lease_path(const char *szIfname) : path_text("/etc/dhclient/ipv4/dhcpcd-%s.info", szIfname) {}
};

/** Keys of an interface's file. */
namespace key {
inline constexpr char kDevice[] = "DEVICE";
inline constexpr char kBootProto[] = "BOOTPROTO";
inline constexpr char kOnBoot[] = "ONBOOT";
inline constexpr char kIpAddr[] = "IPADDR";
inline constexpr char kNetmask[] = "NETMASK";
inline constexpr char kMaster[] = "MASTER";
inline constexpr char kSlave[] = "SLAVE";
inline constexpr char kLocalLan[] = "LOCAL_LAN";
inline constexpr char kSlaveList[] = "SLAVE_LIST";
inline constexpr char kBondMode[] = "BOND_MODE";
inline constexpr char kIpv6Init[] = "IPV6INIT";
} // namespace key

struct key_value {
    const char *key;
    const char *value;
};

/**
 * Sets keys of a file and removes others in one rewrite, as plain lines. Nothing is logged.
 * @return 0; -1 with NET_ERR_OUT_OF_MEMORY under the caller's place, or with the code of the rewrite
 */
[[nodiscard]] int rewrite_keys(const place &at, const char *path, std::initializer_list<key_value> set,
                               std::initializer_list<const char *> removed);

} // namespace kova
