#include <kovanetsdk/iface.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/report.h"

#include <cstring>

extern "C" int KOVANetIfIsStaticIP(const char *szIfname) {
    using namespace kova;
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return 0;
    }
    const named_lock lock{kConfigShared};
    if (!lock.is_held()) {
        return fail_lock(HERE, 0);
    }
    char protocol[16];
    const ifcfg_path path{szIfname};
    return KLIBCFileGetKeyValue(path.c_str(), key::kBootProto, protocol, sizeof protocol, 0) > 0 &&
                   strcmp(protocol, "static") == 0
               ? 1
               : 0;
}
