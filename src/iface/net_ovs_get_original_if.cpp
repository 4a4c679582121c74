#include <kovanetsdk/iface.h>

#include "core/report.h"
#include "core/text.h"

#include <cstring>

extern "C" int KLIBNetOVSGetOriginalIf(const char *szIfname, char *szOut, int size) {
    using namespace kova;
    constexpr char kPrefix[] = "ovs_";
    constexpr size_t kPrefixLength = sizeof kPrefix - 1;
    if (refuses_null_text(HERE, "szIfname", szIfname) || refuses_null_text(HERE, "szOut", szOut) ||
        refuses(HERE, strncmp(szIfname, kPrefix, kPrefixLength) == 0, "0 == strncmp(szIfname, \"ovs_\", 4)") ||
        refuses(HERE, 0 < size && copy_whole(szOut, size, szIfname + kPrefixLength), "strlen(szIfname) - 4 < size")) {
        return -1;
    }
    return 0;
}
