#include <kovanetsdk/iface.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/report.h"

extern "C" int KLIBNetGetIfCfg(const char *szIfname, const char *szConf, char *szValue, int cbValue) {
    using namespace kova;
    if (refuses_ifname(HERE, "szIfname", szIfname) || refuses_text(HERE, "szConf", szConf) ||
        refuses_null_text(HERE, "szValue", szValue) || refuses(HERE, 0 < cbValue, "0 < cbValue")) {
        return -1;
    }
    const named_lock lock{kConfigShared};
    if (!lock.is_held()) {
        return fail_lock(HERE, -1);
    }
    const ifcfg_path path{szIfname};
    const int result = KLIBCFileGetKeyValue(path.c_str(), szConf, szValue, cbValue, 0);
    if (result < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get [%s] from [%s], kovaerr=[0x%04X]", szConf, path.c_str(),
                                 KLIBCErrGet());
    }
    return result > 0 ? 1 : 0;
}

extern "C" int KLIBNetSetIfCfg(const char *szIfname, const char *szConf, const char *szValue) {
    using namespace kova;
    if (refuses_ifname(HERE, "szIfname", szIfname) || refuses_text(HERE, "szConf", szConf) ||
        refuses_null_text(HERE, "szValue", szValue)) {
        return -1;
    }
    const named_lock lock{kConfigExclusive};
    if (!lock.is_held()) {
        return fail_lock(HERE, -1);
    }
    const ifcfg_path path{szIfname};
    if (KLIBCFileSetKeyValue(path.c_str(), szConf, szValue, kQuotedLine) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to set key [%s] with value [%s]", szConf, szValue);
    }
    return 0;
}
