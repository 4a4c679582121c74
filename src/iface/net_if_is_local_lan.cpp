#include <kovanetsdk/iface.h>

#include "core/ifcfg.h"
#include "core/report.h"

#include <cstring>

extern "C" int KLIBNetIFIsLocalLan(const char *szIfname) {
    using namespace kova;
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return 0;
    }
    char value[16];
    return KLIBCFileGetKeyValue(ifcfg_path{szIfname}.c_str(), key::kLocalLan, value, sizeof value, 0) > 0 &&
                   strcmp(value, "yes") == 0
               ? 1
               : 0;
}
