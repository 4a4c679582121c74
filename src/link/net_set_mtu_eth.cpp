#include <kovanetsdk/link.h>

#include "core/kernel.h"
#include "core/report.h"
#include "link/mtu_key.h"

#include <cstring>
#include <kovanetsdk/iface.h>

using namespace kova;

namespace {

/** A VLAN's row device has to carry at least its MTU: it is set first. */
int set_row_device(const char *szValue, const char *szIfname);

int change_mtu(const char *szValue, const char *szIfname) {
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    log_warning(HERE, "we temporarily do the eth up/down in sdk when setting MTU");
    KLIBNetIfDown(szIfname);
    if (socket.set_mtu(szIfname, mtu_number(szValue)) < 0) {
        return fail(HERE, NET_ERR_SYSCALL, -1, "Kernel refuses MTU %s of %s: %m", szValue, szIfname);
    }
    return 0;
}

/** Sets the MTU of one interface in the kernel, which wants it down meanwhile. It is up afterwards in any case. */
int set_kernel_mtu(const char *szValue, const char *szIfname) {
    if (refuses(HERE, strlen(szIfname) <= IFNAMSIZ, "strlen(szIfname) <= IFNAMSIZ")) {
        return -1;
    }
    const int result = set_row_device(szValue, szIfname) < 0 ? -1 : change_mtu(szValue, szIfname);
    KLIBNetIfUp(szIfname);
    return result;
}

int set_row_device(const char *szValue, const char *szIfname) {
    VLANINFO vlan;
    const int is_vlan = KLIBNetVlanGet(szIfname, &vlan);
    if (is_vlan < 1) {
        return is_vlan;
    }
    if (strcmp(vlan.szRowDevice, vlan.szIfname) == 0) {
        return fail(HERE, NET_ERR_SYSCALL, -1, "VLAN %s is its own row device", szIfname);
    }
    return set_kernel_mtu(szValue, vlan.szRowDevice);
}

int set_ovs_bond(const char *szValue, const char *szBond) {
    KOVALINKAGGROPT bond;
    if (KOVANetLinkAggrGet(szBond, &bond) != 0) {
        return fail_keeping_code(HERE, -1, "Failed to get OVS bond slave of %s", szBond);
    }
    for (int i = 0; i < bond.cSlaves; ++i) {
        if (set_kernel_mtu(szValue, bond.aszSlaves[i]) < 0) {
            return fail_keeping_code(HERE, -1, "Failed to set the MTU %s to OVS bonding slave %s", szValue,
                                     bond.aszSlaves[i]);
        }
    }
    return bond.cSlaves > 0 ? 0 : -1;
}

int set_interface(const char *szValue, const char *szIfname) {
    if (set_kernel_mtu(szValue, szIfname) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to set MTU %s of %s", szValue, szIfname);
    }
    return 0;
}

} // namespace

extern "C" int KOVANetSetMTUEth(const char *szValue, const char *szIfname) {
    if (refuses_null_text(HERE, "szValue", szValue) || refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    char szOriginal[1024];
    switch (KLIBNetOVSIfIsMaster(szIfname)) {
    case kOvsBond:
        return set_ovs_bond(szValue, szIfname);
    case kOvsPort:
        if (KLIBNetOVSGetOriginalIf(szIfname, szOriginal, sizeof szOriginal) < 0) {
            return fail_keeping_code(HERE, -1, "get ovs origin interface error");
        }
        return set_interface(szValue, szOriginal);
    default:
        return set_interface(szValue, szIfname);
    }
}
