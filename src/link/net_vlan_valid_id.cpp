#include <kovanetsdk/link.h>

#include "core/report.h"

extern "C" int KLIBNetVlanValidId(int nId) {
    constexpr int kLargest = 4094;
    return 1 <= nId && nId <= kLargest ? 0 : -1;
}

extern "C" int KLIBNetVlanExist([[maybe_unused]] const char *szIfname) {
    return KLIBCFileExist("/proc/net/vlan/config") == 1 ? 1 : 0;
}
