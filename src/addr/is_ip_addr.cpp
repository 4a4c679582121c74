#include <kovanetsdk/addr.h>

#include "core/report.h"

using namespace kova;

extern "C" int BlKLIBIsIpAddr(const char *szIP) {
    if (refuses_null_text(HERE, "szIP", szIP)) {
        return 0;
    }
    constexpr uint32_t kLoopback = 127;
    constexpr uint32_t kLastUnicast = 223;
    uint32_t part[4];
    if (cKLIBISepIP(szIP, part) != 4) {
        return 0;
    }
    const bool is_host = part[0] >= 1 && part[0] <= kLastUnicast && part[0] != kLoopback;
    if (!is_host || part[1] > 255 || part[2] > 255 || part[3] > 255) {
        return fail_quietly(HERE, NET_ERR_BAD_ADDRESS, 0);
    }
    return 1;
}
