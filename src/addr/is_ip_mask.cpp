#include <kovanetsdk/addr.h>

#include "core/report.h"

#include <cstdio>
#include <cstring>

using namespace kova;

extern "C" int BlKLIBIsIpMask(char *szMask) {
    if (refuses_null_text(HERE, "szMask", szMask)) {
        return 0;
    }
    uint32_t part[4];
    if (cKLIBISepIP(szMask, part) != 4 || cKLIBICalMask(part) == 0) {
        return fail_quietly(HERE, NET_ERR_BAD_ADDRESS, 0);
    }
    // a mask in plain decimal is never longer than the text it was read from
    snprintf(szMask, strlen(szMask) + 1, "%u.%u.%u.%u", part[0], part[1], part[2], part[3]);
    return 1;
}
