#include <kovanetsdk/routing.h>

#include "core/commands.h"
#include "core/kernel.h"
#include "core/report.h"
#include "core/text.h"

#include <arpa/inet.h>
#include <bit>

using namespace kova;

namespace {

/** One subnet route in the words of both tools. */
struct subnet_route {
    const char *ifname;
    const char *source;
    const char *netmask;
    address_text network;
};

/** "<network>/<bits>" */
class target_text : public built_text<128> {
public:
    target_text(const char *network, int bits) : built_text("%s/%d", network, bits) {}
};

void delete_route(const subnet_route &route, const char *target) {
    if (run("/sbin/ip", "route", "del", target, "dev", route.ifname, "src", route.source) == 0) {
        return;
    }
    log_info(HERE, "%s ip route del failed, instead of route", route.ifname);
    if (run("/sbin/route", "del", "-net", route.network, "netmask", route.netmask, "dev", route.ifname) != 0) {
        log_info(HERE, "cmd route del -net %s netmask %s dev %s failded", route.network, route.netmask, route.ifname);
    }
}

void add_route(const subnet_route &route, const char *target) {
    if (run("/sbin/ip", "route", "add", target, "dev", route.ifname, "src", route.source) == 0) {
        return;
    }
    log_info(HERE, "%s ip route add failed, might be the same subnet, instead of route", route.ifname);
    if (run("/sbin/route", "add", "-net", route.network, "netmask", route.netmask, "dev", route.ifname) != 0) {
        log_info(HERE, "cmd route add -net %s netmask %s dev %s failded", route.network, route.netmask, route.ifname);
    }
}

/** Reads a dotted address, or says what is none. */
bool reads_address(const char *text, in_addr &address) {
    const bool is_address = inet_pton(AF_INET, text, &address) == 1;
    if (!is_address) {
        log_err(HERE, "inet_pton error (%s)", text);
    }
    return is_address;
}

bool is_missing(const char *text) {
    return text == nullptr || *text == '\0';
}

} // namespace

extern "C" int NetRoutetableEdit(int type, const char *szIP, const char *szNetmask, const char *szIfname) {
    if (is_missing(szIP) || is_missing(szNetmask) || is_missing(szIfname) || !is_interface_name(szIfname)) {
        return fail_keeping_code(HERE, -1, "bad parameter");
    }
    if (type != NET_ROUTE_ADD && type != NET_ROUTE_DELETE) {
        return fail_keeping_code(HERE, -1, "error type");
    }
    in_addr mask;
    in_addr ip;
    if (!reads_address(szNetmask, mask) || !reads_address(szIP, ip)) {
        return -1;
    }
    subnet_route route{szIfname, szIP, szNetmask, ""};
    write_address(ip.s_addr & mask.s_addr, route.network);
    const target_text target{route.network, std::popcount(mask.s_addr)};

    delete_route(route, target.c_str());
    if (type == NET_ROUTE_ADD) {
        add_route(route, target.c_str());
    }
    return 0;
}
