#include <kovanetsdk/link.h>

#include "core/kernel.h"
#include "core/report.h"
#include "core/text.h"
#include "link/vlan_name.h"

using namespace kova;

extern "C" int KLIBNetVlanGet(const char *szIfname, VLANINFO *pVlan) {
    if (refuses_text(HERE, "szIfname", szIfname) || refuses_null(HERE, "pVlan", pVlan)) {
        return -1;
    }
    *pVlan = {};
    copy_text(pVlan->szIfname, szIfname);
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    const bool is_vlan =
        socket.vlan_row_device(szIfname, pVlan->szRowDevice) == 0 && socket.vlan_id(szIfname, pVlan->vlanId) == 0;
    return is_vlan ? 1 : 0;
}

extern "C" int KLIBNetVlanGetByRowDev(const char *szRowDevice, int nId, VLANINFO *pVlan) {
    if (refuses_text(HERE, "szRowDevice", szRowDevice) || refuses_null(HERE, "pVlan", pVlan) ||
        refuses(HERE, KLIBNetVlanValidId(nId) == 0, "0 == KLIBNetVlanValidId(nId)")) {
        return -1;
    }
    return KLIBNetVlanGet(vlan_name{szRowDevice, nId}.c_str(), pVlan);
}
