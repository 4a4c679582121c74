#include <kovanetsdk/addr.h>

#include "core/report.h"

using namespace kova;

extern "C" int KOVANetIsPrivateIP(const char *szIP) {
    uint32_t part[4];
    if (refuses_null_text(HERE, "szIP", szIP) || cKLIBISepIP(szIP, part) != 4) {
        return 0;
    }
    switch (part[0]) {
    case 10:
    case 127:
        return 1;
    case 169:
        return part[1] == 254 ? 1 : 0;
    case 172:
        return part[1] >= 16 && part[1] <= 31 ? 1 : 0;
    case 192:
        return part[1] == 168 ? 1 : 0;
    default:
        return 0;
    }
}
