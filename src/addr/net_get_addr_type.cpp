#include <kovanetsdk/addr.h>

#include "addr/any_address.h"
#include "core/report.h"

using namespace kova;

extern "C" int KOVANetGetAddrType(const char *szIP) {
    if (refuses_null_text(HERE, "szIP", szIP)) {
        return 0;
    }
    return read_address(szIP).family;
}
