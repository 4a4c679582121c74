#include <kovanetsdk/iface.h>

#include "core/kernel.h"
#include "core/report.h"

#include <kovanetsdk/link.h>

namespace {

using namespace kova;

/** Asks the kernel alone. @return 1 link, 0 none; -1 with log and code */
int has_carrier(const char *szIfname) {
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    unsigned flags = 0;
    if (socket.flags(szIfname, flags) < 0) {
        log_info(HERE, "Cannot get link status of the %s: %m", szIfname);
        return fail_quietly(HERE, request_code(errno), -1);
    }
    return (flags & IFF_RUNNING) != 0 ? 1 : 0;
}

int test_interface(const char *szIfname) {
    const int result = has_carrier(szIfname);
    if (result < 0) {
        log_info(HERE, "get link status failed on %s", szIfname);
    }
    return result;
}

/** The first member with link, or whose test fails, decides. */
int test_ovs_bond(const char *szBond) {
    KOVALINKAGGROPT bond;
    if (KOVANetLinkAggrGet(szBond, &bond) != 0) {
        return fail_keeping_code(HERE, -1, "Failed to get OVS bond slave of %s", szBond);
    }
    int result = -1;
    for (int i = 0; i < bond.cSlaves; ++i) {
        result = has_carrier(bond.aszSlaves[i]);
        if (result != 0) {
            break;
        }
    }
    return result;
}

int test_ovs_port(const char *szPort) {
    char szOriginal[IFNAMSIZ];
    if (KLIBNetOVSGetOriginalIf(szPort, szOriginal, sizeof szOriginal) < 0) {
        return fail_keeping_code(HERE, -1, "get ovs origin interface error");
    }
    return test_interface(szOriginal);
}

} // namespace

extern "C" int KOVANetIfIsLink(const char *szIfname) {
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    switch (KLIBNetOVSIfIsMaster(szIfname)) {
    case kOvsBond:
        return test_ovs_bond(szIfname);
    case kOvsPort:
        return test_ovs_port(szIfname);
    default:
        return test_interface(szIfname);
    }
}
