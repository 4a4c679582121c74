#include <kovanetsdk/iface.h>

#include "core/commands.h"
#include "core/report.h"
#include "core/text.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cstring>
#include <kovanetsdk/addr.h>
#include <kovanetsdk/events.h>
#include <kovanetsdk/ipv6.h>
#include <span>

using namespace kova;

namespace {

constexpr int kLongestPrefixV4 = 32;
constexpr size_t kLongestTextV4 = 31; // what BlKLIBIsIpAddr looks at
constexpr int kLongestPrefixV6 = 128;
constexpr size_t kMostV6Addresses = 16;

/** Addresses of one interface, joined by ",". */
using address_list = char[kMostV6Addresses * sizeof(KOVAV6IP::szIP)];

/** "<ip>/<prefix>"; every address that is valid fits. */
class subnet_text : public built_text<64> {
public:
    subnet_text(const char *szIP, int prefix) : built_text("%s/%d", szIP, prefix) {}
};

int delete_address(const char *szFamily, const char *szIfname, const char *subnet) {
    if (run("/sbin/ip", szFamily, "address", "del", subnet, "dev", szIfname) != 0) {
        return fail_keeping_code(HERE, -1, "excute cmd /sbin/ip address del %s dev %s failed", subnet, szIfname);
    }
    return 0;
}

/** Takes the old IPv4 address down and sets the new one. */
int replace_ipv4_address(const char *szIfname, const char *szIP, const char *subnet) {
    if (run("/sbin/ifconfig", szIfname, "0.0.0.0") != 0) {
        return fail_keeping_code(HERE, -1, "excute command ifconfig %s 0.0.0.0 failed", szIfname);
    }
    char ip_mask[sizeof(subnet_text)];
    copy_text(ip_mask, subnet);
    if (ErrKLIBSubnetToIpMask(ip_mask, nullptr) < 0) {
        // what is left behind the slash is prefix 0, which the tool reads as the empty mask
        log_err(HERE, "translate subnet to ip/netmask failed");
    }
    const char *const mask = strchr(ip_mask, '/') + 1;
    if (run("/sbin/ifconfig", szIfname, szIP, "netmask", mask) != 0) {
        return fail_keeping_code(HERE, -1, "excute command ifconfig %s %s netmask %s failed", szIfname, szIP, mask);
    }
    return 0;
}

/** Without link the kernel would keep a route that leads nowhere. */
int delete_subnet_route(const char *szIfname, const char *subnet, int prefix) {
    char network[64] = "";
    if (KOVANetCalNetwork(subnet, network, sizeof network) < 0) {
        return fail_keeping_code(HERE, -1, "calculate Network IP failed");
    }
    const built_text<sizeof network + 16> route{"%s/%d", network, prefix};
    if (run("/sbin/ip", "-4", "route", "del", route.c_str(), "dev", szIfname) != 0) {
        log_info(HERE, "excute cmd /sbin/ip route del %s dev %s failed", route.c_str(), szIfname);
    }
    return 0;
}

int add_ipv4(const char *szIfname, const char *szIP, int prefix, const char *szOld, const char *subnet) {
    const bool is_new = strcmp(szOld, szIP) != 0;
    if (is_new) {
        KOVANetIPChangePreHook(0, szIfname, szOld, szIP, prefix);
    }
    if (replace_ipv4_address(szIfname, szIP, subnet) < 0) {
        return -1;
    }
    if (!is_new && run("/usr/kova/sbin/kovanetdtool", "--refresh-static-route-rules", "-4") != 0) {
        log_err(HERE, "Failed to refresh static route rules.");
    }
    return KOVANetIfIsLink(szIfname) == 0 ? delete_subnet_route(szIfname, subnet, prefix) : 0;
}

int change_ipv4(const char *szIfname, const char *szIP, int prefix, bool adds) {
    if (prefix < 0 || prefix > kLongestPrefixV4) {
        return fail_keeping_code(HERE, -1, "prefix length is wrong");
    }
    if (!BlKLIBIsIpAddr(szIP) || strlen(szIP) > kLongestTextV4) {
        return fail_keeping_code(HERE, -1, "your ip %s is not valid", szIP);
    }
    const subnet_text subnet{szIP, prefix};
    char old[1024] = "";
    if (KOVAILnxGetIP(szIfname, old, sizeof old) < 0) {
        return fail_keeping_code(HERE, -1, "get old v4 IP failed");
    }
    return adds ? add_ipv4(szIfname, szIP, prefix, old, subnet.c_str())
                : delete_address("-4", szIfname, subnet.c_str());
}

/** Whether two texts mean one IPv6 address. */
bool is_same_ipv6(const char *one, const char *other) {
    in6_addr first;
    in6_addr second;
    return inet_pton(AF_INET6, one, &first) == 1 && inet_pton(AF_INET6, other, &second) == 1 &&
           memcmp(&first, &second, sizeof first) == 0;
}

void join(std::span<const KOVAV6IP> addresses, address_list &list) {
    size_t used = 0;
    list[0] = '\0';
    for (const KOVAV6IP &address : addresses) {
        const int length = snprintf(list + used, sizeof list - used, "%s%s", used == 0 ? "" : ",", address.szIP);
        used += static_cast<size_t>(length);
    }
}

int add_ipv6(const char *szIfname, const char *szIP, int prefix, std::span<const KOVAV6IP> current,
             const char *subnet) {
    const auto is_it = [szIP](const KOVAV6IP &address) { return is_same_ipv6(address.szIP, szIP); };
    if (std::none_of(current.begin(), current.end(), is_it)) {
        address_list list;
        join(current, list);
        KOVANetIPChangePreHook(1, szIfname, list, szIP, prefix);
    }
    if (run("/sbin/ip", "-6", "address", "add", subnet, "dev", szIfname) != 0) {
        return fail_keeping_code(HERE, -1, "excute cmd /sbin/ip address add %s dev %s failed", subnet, szIfname);
    }
    return 0;
}

int change_ipv6(const char *szIfname, const char *szIP, int prefix, bool adds) {
    if (prefix < 0 || prefix > kLongestPrefixV6) {
        return fail_keeping_code(HERE, -1, "prefix length is wrong");
    }
    if (!BlKLIBIsv6IpAddrValid(szIP)) {
        return fail_keeping_code(HERE, -1, "your v6ip %s is not valid", szIP);
    }
    const subnet_text subnet{szIP, prefix};
    KOVAV6IP current[kMostV6Addresses];
    const int count = KOVALnxV6IPGet(szIfname, current, kMostV6Addresses);
    if (count < 0) {
        return fail_keeping_code(HERE, -1, "get old v6 IP failed");
    }
    if (!adds) {
        return delete_address("-6", szIfname, subnet.c_str());
    }
    const size_t stored = std::min(static_cast<size_t>(count), kMostV6Addresses);
    return add_ipv6(szIfname, szIP, prefix, {current, stored}, subnet.c_str());
}

} // namespace

extern "C" int KOVANetSetIP(const char *szFamily, const char *szIfname, const char *szIP, int prefix,
                            const char *szAction) {
    if (refuses_null_text(HERE, "szFamily", szFamily) || refuses_ifname(HERE, "szIfname", szIfname) ||
        refuses_null_text(HERE, "szAction", szAction)) {
        return -1;
    }
    if (strcmp(szAction, "flush") == 0) {
        return KOVANetFlushIP(szFamily, szIfname) < 0 ? fail_keeping_code(HERE, -1, "flush ip failed") : 0;
    }
    const bool adds = strcmp(szAction, "add") == 0;
    if (!adds && strcmp(szAction, "del") != 0) {
        return fail_keeping_code(HERE, -1, "action command is wrong. your action is %s", szAction);
    }
    if (refuses_null_text(HERE, "szIP", szIP)) {
        return -1;
    }
    if (strcmp(szFamily, "-4") == 0) {
        return change_ipv4(szIfname, szIP, prefix, adds);
    }
    if (strcmp(szFamily, "-6") == 0) {
        return change_ipv6(szIfname, szIP, prefix, adds);
    }
    return fail_keeping_code(HERE, -1, "ip type is wrong, only -4 or -6");
}
