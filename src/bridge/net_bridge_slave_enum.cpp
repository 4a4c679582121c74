#include <kovanetsdk/bridge.h>

#include "core/report.h"
#include "core/text.h"

extern "C" int KLIBNetBridgeSlaveEnum(const char *szBridge, KLIBSZLIST *pMembers) {
    using namespace kova;
    constexpr int kAnyType = 64; // ports are links
    if (szBridge == nullptr || pMembers == nullptr) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, -1, "Bad Parameter.");
    }
    if (refuses_ifname(HERE, "szBridge", szBridge)) {
        return -1;
    }
    if (KLIBNetBridgeIfIsMaster(szBridge) == 0) {
        return fail_keeping_code(HERE, -1, "[%s] is not bridge master.", szBridge);
    }
    return KLIBCFileEnumDir(path_text{"/sys/class/net/%s/brif/", szBridge}.c_str(), pMembers, nullptr, kAnyType);
}
