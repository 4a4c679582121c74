/**
 * @file
 * The interface files and the keys in them.
 */
#pragma once

#include "core/guards.h"
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
inline constexpr char kIpv6Addr[] = "IPV6ADDR";
inline constexpr char kIpv6PrefixLength[] = "IPV6PREFIXLENG";
inline constexpr char kIpv6DefaultGateway[] = "IPV6_DEFAULTGW";
inline constexpr char kIpv6AcceptRa[] = "IPV6_ACCEPT_RA";
inline constexpr char kUserCtl[] = "USERCTL";
inline constexpr char kBondingOpts[] = "BONDING_OPTS";
inline constexpr char kType[] = "TYPE";
inline constexpr char kPrimary[] = "PRIMARY";
inline constexpr char kBridge[] = "BRIDGE";
} // namespace key

/** Keys of a file to be set and removed together, in one rewrite, as plain lines. A key in both is set. */
class key_changes {
public:
    void set(const char *key, const char *value);
    void remove(const char *key);
    /** Whether there was memory for all of it. */
    [[nodiscard]] bool is_complete() const { return is_complete_; }
    /** Keys to set and their values, for calls that add some. */
    [[nodiscard]] KLIBSZHASH *to_set() const { return to_set_.get(); }
    /** @return 0; -1 with the code of the rewrite. Nothing is logged. */
    [[nodiscard]] int apply(const char *path) const;

private:
    string_hash to_set_ = make_hash();
    string_hash to_remove_ = make_hash();
    bool is_complete_ = to_set_.is_held() && to_remove_.is_held();
};

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
