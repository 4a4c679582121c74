#include <kovanetsdk/addr.h>

#include "core/report.h"

#include <bit>

using namespace kova;

extern "C" int cKLIBICalMask(const uint32_t rgPart[4]) {
    if (refuses_null(HERE, "rgPart", rgPart)) {
        return 0;
    }
    uint32_t mask = 0;
    for (int i = 0; i < 4; ++i) {
        if (rgPart[i] > 255) {
            return fail_quietly(HERE, NET_ERR_BAD_ADDRESS, 0);
        }
        mask = mask << 8 | rgPart[i];
    }
    const int ones = std::countl_one(mask);
    return ones == std::popcount(mask) ? ones : fail_quietly(HERE, NET_ERR_BAD_ADDRESS, 0);
}
