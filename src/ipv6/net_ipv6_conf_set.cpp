#include <kovanetsdk/ipv6.h>

#include "core/ifcfg.h"
#include "core/pause.h"
#include "core/report.h"
#include "ipv6/accept_ra.h"
#include "ipv6/dhcp6_client.h"
#include "ipv6/mode.h"

#include <algorithm>
#include <arpa/inet.h>
#include <climits>
#include <cstdlib>
#include <kovanetsdk/addr.h>
#include <kovanetsdk/iface.h>

using namespace kova;

namespace {

constexpr int kLogicalInterfaces = 2;
constexpr unsigned kLongestPrefix = 128;
enum ipv6_switch { kEnable = 0, kDisable = 1 };
enum command { kAdd = 0, kDelete = 1 };
enum refusal { kLinkLocalRefused = 2, kGatewayRefused = 3 };

/** What every step works on. */
struct target {
    const char *name;
    ifcfg_path file;
};

struct fixed_address {
    const char *address;
    unsigned prefix;
    const char *gateway; ///< "" for none
};

// ---- the interface's file

/** Longer than every value that is used. */
using value_text = char[64];

/** @return as the platform's call: above 0 found, 0 absent, below 0 not to be read */
int read_value(const target &it, const char *key, value_text &value) {
    return KLIBCFileGetKeyValue(it.file.c_str(), key, value, sizeof value, 0);
}

bool is_off(const target &it) {
    value_text mode;
    const int found = read_value(it, key::kIpv6Init, mode);
    if (found < 0) {
        log_info(HERE, "Fail to set key %s, %s", key::kIpv6Init, it.file.c_str()); // the text that its readers know
    }
    return found > 0 && is_ipv6_mode(mode, NET_IPV6_OFF);
}

int store_mode(const target &it, int mode) {
    if (KLIBCFileSetKeyValue(it.file.c_str(), key::kIpv6Init, kIpv6Modes[mode], kQuotedLine) < 0) {
        return fail_keeping_code(HERE, -1, "Fail to set key %s, %s", key::kIpv6Init, it.file.c_str());
    }
    return 0;
}

int store_value(const target &it, const char *key, const char *value) {
    if (KLIBCFileSetKeyValue(it.file.c_str(), key, value, kQuotedLine) < 0) {
        return fail_keeping_code(HERE, -1, "Fail to set key %s, %s : %s", key, it.file.c_str(), value);
    }
    return 0;
}

// ---- router advertisements

int set_accept_ra(const target &it, bool accepts) {
    const accept_ra_path path{it.name};
    const uint32_t code = write_accept_ra(path, accepts);
    if (code == NET_ERR_FILE_OPEN) {
        return fail(HERE, code, -1, "Failed to open file [%s]", path.c_str());
    }
    if (code != 0) {
        return fail(HERE, code, -1, "Failed to write file [%s]", path.c_str());
    }
    if (KLIBCFileSetKeyValue(it.file.c_str(), key::kIpv6AcceptRa, accepts ? "1" : "0", kQuotedLine) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to set key %s in %s", key::kIpv6AcceptRa, it.file.c_str());
    }
    return 0;
}

// ---- the DHCPv6 client

int start_dhcp6(const target &it, const char *kind) {
    if (running_dhcp6_client(it.name) != nullptr) {
        log_info(HERE, "DHCPv6 already running!");
        return 0;
    }
    const int status = start_dhcp6_client(it.name, kind);
    return status == 0 ? 0 : fail_keeping_code(HERE, status, "Failed to start dhclient on interface [%s]", it.name);
}

/** The change goes on with a client that does not end. */
void stop_dhcp6(const target &it) {
    const char *const kind = running_dhcp6_client(it.name);
    if (kind != nullptr && stop_dhcp6_client(it.name, kind) != 0) {
        log_warning(HERE, "Failed to stop dhclient on interface [%s]", it.name);
    }
}

int change_client(const target &it, const char *kind) {
    stop_dhcp6(it);
    if (start_dhcp6(it, kind) != 0) {
        log_err(HERE, "Fail to start DHCP:%s, %s", it.name, strerror(errno));
        stop_dhcp6(it);
        return -1;
    }
    return 0;
}

// ---- addresses

/** A value that is needed for the address that goes. @return whether it is there */
bool find_value(const target &it, const char *key, value_text &value) {
    const int found = read_value(it, key, value);
    if (found < 0) {
        log_info(HERE, "Fail to get key %s, %s", key, it.file.c_str());
    }
    return found > 0;
}

/** Takes the address of the mode that ends off the interface; the file keeps it. */
void drop_stored_address(const target &it) {
    value_text mode;
    value_text address;
    value_text length;
    if (!find_value(it, key::kIpv6Init, mode) || !is_ipv6_mode(mode, NET_IPV6_STATIC) ||
        !find_value(it, key::kIpv6Addr, address)) {
        return;
    }
    const bool has_length = find_value(it, key::kIpv6PrefixLength, length);
    const unsigned long prefix = has_length ? strtoul(length, nullptr, 0) : kLongestPrefix;
    constexpr unsigned long kMost = UINT_MAX;
    if (KOVANetIPv6IPAction(kDelete, it.name, address, static_cast<unsigned>(std::min(prefix, kMost)), nullptr) != 0) {
        log_info(HERE, "Fail to delete ipv6 address %s, %s", address, it.name);
    }
}

/** Gives the kernel its time and removes what another machine has, too. @return their number, 0, or -1 */
int remove_duplicates(const target &it) {
    constexpr int kDetectionSeconds = 5;
    pause_for_seconds(kDetectionSeconds);
    KOVAV6IP duplicate;
    const int found = KOVANetIPv6RemoveDADFailedIP(it.name, &duplicate, 1);
    if (found < 0) {
        return fail_keeping_code(HERE, found, "failed to run ipv6 dad failed ip");
    }
    if (found > 0) {
        log_err(HERE, "ipv6 dad fail, ip:%s, pxleng:%d", duplicate.szIP, static_cast<int>(duplicate.nPrefixLength));
    }
    return found;
}

/** Whether an interface can have an address; what the tools would refuse is refused while nothing is lost yet. */
bool is_usable(const char *szV6IPAddr) {
    in6_addr address;
    return BlKLIBIsv6IpAddrValid(szV6IPAddr) != 0 && inet_pton(AF_INET6, szV6IPAddr, &address) == 1 &&
           !IN6_IS_ADDR_UNSPECIFIED(&address) && !IN6_IS_ADDR_LOOPBACK(&address) && !IN6_IS_ADDR_MULTICAST(&address);
}

bool is_link_local(const char *szV6IPAddr) {
    constexpr unsigned kBits = 10;
    return KOVANetIPv6IsSameSubnet(szV6IPAddr, "fe80::1", kBits) == 1;
}

int refuse_address(const char *szV6IPAddr, int nPrefixLength) {
    if (!is_usable(szV6IPAddr)) {
        return fail(HERE, NET_ERR_BAD_ADDRESS, -1, "IPv6 address illegal %s", szV6IPAddr);
    }
    if (is_link_local(szV6IPAddr)) {
        return fail_keeping_code(HERE, kLinkLocalRefused, "Cannot set link local address manually");
    }
    const bool is_length = nPrefixLength >= 0 && static_cast<unsigned>(nPrefixLength) <= kLongestPrefix;
    return refuses(HERE, is_length, "nPrefixLength <= 128") ? -1 : 0;
}

// ---- the modes

/** What ends every mode that takes its address from the network. */
int accept_network(const target &it, int mode) {
    drop_stored_address(it);
    if (store_mode(it, mode) < 0) {
        if (mode != NET_IPV6_AUTO) {
            stop_dhcp6(it);
        }
        return -1;
    }
    return set_accept_ra(it, true) < 0 ? fail_keeping_code(HERE, -1, "Failed to enable ipv6 accept_ra") : 0;
}

int set_auto(const target &it) {
    if (KOVALnxIPv6ProcAction(it.name, kEnable) < 0) {
        return -1;
    }
    stop_dhcp6(it);
    return accept_network(it, NET_IPV6_AUTO);
}

int set_off(const target &it) {
    if (store_mode(it, NET_IPV6_OFF) < 0) {
        return -1;
    }
    stop_dhcp6(it);
    return KOVALnxIPv6ProcAction(it.name, kDisable);
}

int set_dhcp(const target &it) {
    if (KOVALnxIPv6ProcAction(it.name, kEnable) < 0 || change_client(it, kDhcp6Client) < 0) {
        return -1;
    }
    const int duplicates = remove_duplicates(it);
    if (duplicates != 0) {
        stop_dhcp6(it);
        return duplicates;
    }
    return accept_network(it, NET_IPV6_DHCP);
}

int set_auto_dhcp(const target &it) {
    if (KOVALnxIPv6ProcAction(it.name, kEnable) < 0 || change_client(it, kDhcp6Info) < 0) {
        return -1;
    }
    return accept_network(it, NET_IPV6_AUTO_DHCP);
}

int store_fixed_address(const target &it, const fixed_address &fixed) {
    const built_text<16> prefix{"%u", fixed.prefix};
    if (store_mode(it, NET_IPV6_STATIC) < 0 || store_value(it, key::kIpv6Addr, fixed.address) < 0 ||
        store_value(it, key::kIpv6PrefixLength, prefix.c_str()) < 0) {
        return fail_keeping_code(HERE, -1, "Fail to set ipv6 static key values");
    }
    return 0;
}

int remove_gateway(const target &it) {
    if (KLIBCFileRemoveKey(it.file.c_str(), key::kIpv6DefaultGateway) < 0) {
        return fail_keeping_code(HERE, -1, "Error while removing key %s from %s", key::kIpv6DefaultGateway,
                                 it.file.c_str());
    }
    return 0;
}

int set_gateway(const target &it, const fixed_address &fixed) {
    if (!is_usable(fixed.gateway)) {
        return fail(HERE, NET_ERR_BAD_ADDRESS, -1, "IPv6 router address illegal %s", fixed.gateway);
    }
    if (!is_link_local(fixed.gateway) && KOVANetIPv6IsSameSubnet(fixed.gateway, fixed.address, fixed.prefix) != 1) {
        return fail_keeping_code(HERE, kGatewayRefused, "Gateway IP and IPv6 Addr is not the same subnet");
    }
    if (KOVANetIPv6IPAction(kAdd, it.name, fixed.address, fixed.prefix, fixed.gateway) != 0) {
        return fail_keeping_code(HERE, -1, "Fail to add ipv6 router %s, v6ip %s, dev %s", fixed.gateway, fixed.address,
                                 it.name);
    }
    return store_value(it, key::kIpv6DefaultGateway, fixed.gateway);
}

/** Has the kernel start anew, without any address, and take none from the network. */
int clear_addresses(const target &it) {
    stop_dhcp6(it);
    if (KOVALnxIPv6ProcAction(it.name, kDisable) < 0) {
        return -1;
    }
    if (set_accept_ra(it, false) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to disable ipv6 accept_ra");
    }
    return KOVALnxIPv6ProcAction(it.name, kEnable);
}

int set_static(const target &it, const fixed_address &fixed) {
    if (clear_addresses(it) < 0) {
        return -1;
    }
    if (KOVANetIPv6IPAction(kAdd, it.name, fixed.address, fixed.prefix, nullptr) != 0) {
        return fail_keeping_code(HERE, -1, "Fail to add ipv6 address %s, %s", fixed.address, it.name);
    }
    const int duplicates = remove_duplicates(it);
    if (duplicates != 0) {
        return duplicates;
    }
    if (store_fixed_address(it, fixed) < 0) {
        return -1;
    }
    if (*fixed.gateway == '\0') {
        return remove_gateway(it);
    }
    const int result = set_gateway(it, fixed);
    return result < 0 ? fail_keeping_code(HERE, -1, "Fail to set IPv6 router") : result;
}

int set_mode(int mode, const target &it, const fixed_address &fixed) {
    switch (mode) {
    case NET_IPV6_AUTO:
        return set_auto(it);
    case NET_IPV6_OFF:
        return set_off(it);
    case NET_IPV6_DHCP:
        return set_dhcp(it);
    case NET_IPV6_STATIC:
        return set_static(it, fixed);
    default:
        return set_auto_dhcp(it);
    }
}

const char *or_empty(const char *text) {
    return text == nullptr ? "" : text;
}

} // namespace

extern "C" int KOVANetIPv6ConfSet(int nMode, const char *szIfname, const char *szV6IPAddr, int nPrefixLength,
                                  const char *szGateway) {
    if (refuses_ifname(HERE, "szIfname", szIfname) || KOVANetIsDevTypeMatch(szIfname, kLogicalInterfaces) == 0) {
        return -1;
    }
    const target it{szIfname, ifcfg_path{szIfname}};
    const bool was_off = is_off(it);
    if (nMode < 0 || nMode >= kIpv6ModeCount) {
        return -1;
    }
    const char *const szAddress = or_empty(szV6IPAddr);
    const int refused = nMode == NET_IPV6_STATIC ? refuse_address(szAddress, nPrefixLength) : 0;
    if (refused != 0) {
        return refused;
    }
    const int result = set_mode(nMode, it, {szAddress, static_cast<unsigned>(nPrefixLength), or_empty(szGateway)});
    if (result != 0 && was_off) {
        (void)KOVALnxIPv6ProcAction(szIfname, kDisable);
    }
    return result;
}
