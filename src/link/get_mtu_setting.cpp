#include <kovanetsdk/link.h>

#include "core/kernel.h"
#include "core/report.h"

#include <algorithm>
#include <kovanetsdk/iface.h>

namespace {

using namespace kova;

/** The largest MTU of the members, as far as they answer. */
int ovs_bond_mtu(const char *szBond) {
    KOVALINKAGGROPT bond;
    if (KOVANetLinkAggrGet(szBond, &bond) != 0) {
        return fail_keeping_code(HERE, -1, "Failed to get OVS bond slave of %s", szBond);
    }
    int largest = -1;
    for (int i = 0; i < bond.cSlaves; ++i) {
        const int mtu = KOVAGetMTU(bond.aszSlaves[i]);
        if (mtu < 1) {
            return fail_keeping_code(HERE, largest, "Failed to Get the MTU of %s", bond.aszSlaves[i]);
        }
        largest = std::max(largest, mtu);
    }
    return largest;
}

int interface_mtu(const char *szIfname) {
    const int mtu = KOVAGetMTU(szIfname);
    return mtu < 0 ? fail_keeping_code(HERE, mtu, "Failed to get MTU of %s", szIfname) : mtu;
}

int ovs_port_mtu(const char *szPort) {
    char szOriginal[1024];
    if (KLIBNetOVSGetOriginalIf(szPort, szOriginal, sizeof szOriginal) < 0) {
        return fail_keeping_code(HERE, -1, "get ovs origin interface error");
    }
    return interface_mtu(szOriginal);
}

} // namespace

extern "C" int KOVAGetMTUSetting(const char *szIfname) {
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    switch (KLIBNetOVSIfIsMaster(szIfname)) {
    case kOvsBond:
        return ovs_bond_mtu(szIfname);
    case kOvsPort:
        return ovs_port_mtu(szIfname);
    default:
        return interface_mtu(szIfname);
    }
}
