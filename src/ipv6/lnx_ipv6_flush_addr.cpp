#include <kovanetsdk/ipv6.h>

#include "core/ifcfg.h"
#include "core/report.h"

#include <strings.h>

using namespace kova;

extern "C" int KOVALnxIPv6FlushAddr(const char *szIfname) {
    constexpr int kEnable = 0;
    constexpr int kDisable = 1;
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    const ifcfg_path path{szIfname};
    char mode[16];
    if (KLIBCFileGetKeyValue(path.c_str(), key::kIpv6Init, mode, sizeof mode, 0) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get key [%s] in [%s]", key::kIpv6Init, path.c_str());
    }
    if (KOVALnxIPv6ProcAction(szIfname, kDisable) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to disable IPv6 on [%s]", szIfname);
    }
    if (strcasecmp(mode, "off") != 0 && KOVALnxIPv6ProcAction(szIfname, kEnable) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to enable IPv6 on [%s]", szIfname);
    }
    return 0;
}
