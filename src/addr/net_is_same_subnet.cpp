#include <kovanetsdk/addr.h>

#include "addr/any_address.h"
#include "core/report.h"

using namespace kova;

extern "C" int KOVANetIsSameSubnet(const char *szIP1, const char *szIP2, const char *szMask) {
    if (refuses_null_text(HERE, "szIP1", szIP1) || refuses_null_text(HERE, "szIP2", szIP2) ||
        refuses_null_text(HERE, "szMask", szMask)) {
        return 0;
    }
    const any_address first = read_address(szIP1);
    const any_address second = read_address(szIP2);
    const any_address mask = read_address(szMask);
    if (first.family == 0 || first.family != second.family || first.family != mask.family) {
        return 0;
    }
    for (size_t i = 0; i < mask.size(); ++i) {
        if (((first.bytes[i] ^ second.bytes[i]) & mask.bytes[i]) != 0) {
            return 0;
        }
    }
    return 1;
}
