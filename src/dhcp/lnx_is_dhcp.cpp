#include <kovanetsdk/dhcp.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/report.h"

#include <cstring>

extern "C" int BlKOVALnxIsDHCP(const char *szIfname) {
    using namespace kova;
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return 0;
    }
    const named_lock lock{kConfigShared};
    if (!lock.is_held()) {
        return fail_keeping_code(HERE_FUNCTION, 0, "KLIBCFileLock failed.");
    }
    const ifcfg_path path{szIfname};
    char protocol[16];
    if (KLIBCFileGetKeyValue(path.c_str(), key::kBootProto, protocol, sizeof protocol, 0) > 0) {
        return strcmp(protocol, "dhcp") == 0 ? 1 : 0;
    }
    log_err(HERE_FUNCTION, "Get BOOTPROTO failed.(%X)", KLIBCErrGet());
    if (KLIBCFileSetKeyValue(path.c_str(), key::kBootProto, "static", kPlainLine) < 0) {
        log_err(HERE_FUNCTION, "KLIBCFileSetKeyValue(%s, BOOTPROTO, static) failed.(%X)", path.c_str(), KLIBCErrGet());
    }
    return 0;
}
