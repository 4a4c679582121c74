#include <kovanetsdk/bridge.h>

#include "core/ifcfg.h"

#include <cstring>
#include <kovanetsdk/iface.h>

using namespace kova;

const BRIDGEINFO grgTopologyIFInfo[KLIB_TOPOLOGY_ROWS][KLIB_TOPOLOGY_IFS] = {
    {},
    {{KLIB_BRIDGE_NONE, "eth0", ""}, {KLIB_BRIDGE_NONE, "wlan0", ""}},
    {{KLIB_BRIDGE_SLAVE, "eth0", "br0"}, {KLIB_BRIDGE_SLAVE, "wlan0", "br0"}, {KLIB_BRIDGE_MASTER, "br0", "eth0"}},
    {{KLIB_BRIDGE_NONE, "eth0", ""}, {KLIB_BRIDGE_SLAVE, "wlan0", "lbr0"}, {KLIB_BRIDGE_LOCAL_LAN, "lbr0", "wlan0"}},
};

namespace {

/** The role that the kernel shows. */
int kernel_role(const char *szIfname) {
    if (KLIBNetBridgeIfIsMaster(szIfname) != 0) {
        return KLIBNetIFIsLocalLan(szIfname) != 0 ? KLIB_BRIDGE_LOCAL_LAN : KLIB_BRIDGE_MASTER;
    }
    return KLIBNetBridgeIfIsSlave(szIfname) != 0 ? KLIB_BRIDGE_SLAVE : KLIB_BRIDGE_NONE;
}

/** What the interface's file says about the other side; a file without it is logged. */
void read_peer(const char *szIfname, int role, char (&szPeer)[16]) {
    const char *const key = role == KLIB_BRIDGE_SLAVE ? key::kBridge : key::kPrimary;
    const ifcfg_path path{szIfname};
    if (KLIBCFileGetKeyValue(path.c_str(), key, szPeer, sizeof szPeer, 0) <= 0) {
        log_info(HERE, "Failed to get key[%s] in file[%s].", key, path.c_str());
    }
}

} // namespace

extern "C" int KLIBNETGetBridgeInfo(const char *szIfname, BRIDGEINFO *pInfo) {
    if (KOVANetIsIFUp(szIfname) == 0) {
        return 0;
    }
    const int role = kernel_role(szIfname);
    if (pInfo != nullptr) {
        *pInfo = {role, "", ""};
        copy_text(pInfo->szIfname, szIfname);
        if (role != KLIB_BRIDGE_NONE) {
            read_peer(szIfname, role, pInfo->szPeer);
        }
    }
    return role;
}

extern "C" int KLIBNETGetBridgeInfoByTopology(const char *szIfname, BRIDGEINFO *pInfo, int nRow) {
    if (refuses_null_text(HERE, "szIfname", szIfname) || nRow < 1 || nRow >= KLIB_TOPOLOGY_ROWS) {
        return 0;
    }
    for (const BRIDGEINFO &entry : grgTopologyIFInfo[nRow]) {
        if (*entry.szIfname == '\0') {
            break;
        }
        if (strcmp(entry.szIfname, szIfname) == 0) {
            if (pInfo != nullptr) {
                *pInfo = entry;
            }
            return entry.nType;
        }
    }
    return 0;
}
