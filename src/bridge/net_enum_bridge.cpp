#include <kovanetsdk/bridge.h>

#include "core/guards.h"

#include <cstring>
#include <kovanetsdk/iface.h>
#include <kovanetsdk/stats.h>

using namespace kova;

namespace {

/** Bridges with this in their name are the system's own. */
constexpr char kHidden[] = "gbr";

bool is_wanted(const char *szIfname, int kind) {
    if (strstr(szIfname, kHidden) != nullptr || KLIBNetBridgeIfIsMaster(szIfname) == 0) {
        return false;
    }
    const bool is_local_lan = KLIBNetIFIsLocalLan(szIfname) != 0;
    return (kind == KLIB_BRIDGE_MASTER && !is_local_lan) || (kind == KLIB_BRIDGE_LOCAL_LAN && is_local_lan);
}

} // namespace

extern "C" int KLIBNetEnumBridge(KLIBSZLIST *pList, int nKind) {
    constexpr int kMost = 32;
    const heap<NETSTAT> records{KLIBNetStatInit(kMost)};
    if (records == nullptr) {
        return -1;
    }
    const int found = KLIBNetStatGetAll(records.get(), kMost);
    if (found < 0) {
        return -1;
    }
    int bridges = 0;
    for (int i = 0; i < found; ++i) {
        const char *const szIfname = records.get()[i].szIfname;
        if (!is_wanted(szIfname, nKind)) {
            continue;
        }
        if (pList != nullptr && KLIBCSzListPush(&pList, szIfname) < 0) {
            return -1;
        }
        ++bridges;
    }
    return bridges;
}
