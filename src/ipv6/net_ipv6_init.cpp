#include <kovanetsdk/ipv6.h>

#include "core/ifcfg.h"
#include "core/kernel.h"
#include "ipv6/accept_ra.h"
#include "ipv6/mode.h"

#include <cstring>
#include <kovanetsdk/bridge.h>
#include <kovanetsdk/iface.h>
#include <kovanetsdk/stats.h>

using namespace kova;

namespace {

/** Whether it has IPv6 of its own: no loopback, and no part of something else. */
bool stands_alone(const interface_socket &socket, const char *szIfname) {
    unsigned flags = 0;
    return socket.flags(szIfname, flags) == 0 && (flags & (IFF_LOOPBACK | IFF_SLAVE)) == 0 &&
           KLIBNetBridgeIfIsSlave(szIfname) == 0 && KLIBNetOVSIfIsSlave(szIfname) == 0;
}

/** Reads a key. @return as the platform's call, whose failure is logged here */
template<size_t Size> int read_key(const ifcfg_path &path, const char *key, char (&value)[Size]) {
    const int found = KLIBCFileGetKeyValue(path.c_str(), key, value, static_cast<int>(Size), 0);
    if (found < 0) {
        log_warning(HERE, "Failed to get key %s in %s", key, path.c_str());
    }
    return found;
}

/** Whether the file wants router advertisements. @return 1, 0; below 0 when it cannot be read */
int wants_advertisements(const ifcfg_path &path) {
    char value[16];
    int found = read_key(path, key::kIpv6AcceptRa, value);
    if (found != 0) {
        return found < 0 ? found : static_cast<int>(strcmp(value, "0") != 0);
    }
    found = read_key(path, key::kIpv6Init, value);
    if (found < 0) {
        return found;
    }
    return found == 0 || !is_ipv6_mode(value, NET_IPV6_STATIC) ? 1 : 0;
}

/** Sets the switch of an interface that has a file. @return 0, or the code of what failed */
uint32_t set_switch(const char *szIfname) {
    const ifcfg_path path{szIfname};
    const int accepts = KLIBCFileExist(path.c_str()) == 1 ? wants_advertisements(path) : -1;
    return accepts < 0 ? 0 : write_accept_ra(accept_ra_path{szIfname}, accepts != 0);
}

} // namespace

extern "C" int KOVANetIpv6Init(void) {
    constexpr int kMostInterfaces = 32;
    const heap<NETSTAT> interfaces{KLIBNetStatInit(kMostInterfaces)};
    if (!interfaces) {
        return fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
    }
    const int count = KLIBNetStatGetAll(interfaces.get(), kMostInterfaces);
    if (count < 0) {
        return -1;
    }
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    for (int i = 0; i < count; ++i) {
        const char *const szIfname = interfaces.get()[i].szIfname;
        const bool counts = is_interface_name(szIfname) && stands_alone(socket, szIfname);
        const uint32_t code = counts ? set_switch(szIfname) : 0;
        if (code != 0) {
            return fail(HERE, code, -1, "Failed to set ipv6 accept_ra.");
        }
    }
    return 0;
}
