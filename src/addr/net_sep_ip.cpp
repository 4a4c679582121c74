#include <kovanetsdk/addr.h>

#include "core/report.h"
#include "core/text.h"

#include <cstdlib>

using namespace kova;

namespace {

/** Reads one part. What does not fit becomes the largest value, so that no later check takes it for a small one. */
uint32_t read_part(char **text) {
    const long value = strtol(*text, text, 0);
    return value < 0 || value > UINT32_MAX ? UINT32_MAX : static_cast<uint32_t>(value);
}

} // namespace

extern "C" int cKLIBISepIP(const char *szIP, uint32_t rgPart[4]) {
    if (refuses_null_text(HERE, "szIP", szIP) || refuses_null(HERE, "rgPart", rgPart)) {
        return 0;
    }
    constexpr int kLastPart = 3;
    char text[32];
    copy_text(text, szIP);

    char *rest = text;
    for (int dots = 0; dots < kLastPart; ++dots) {
        rgPart[dots] = read_part(&rest);
        if (rest[0] != '.' || rest[1] == '.') {
            return fail_quietly(HERE, NET_ERR_BAD_ADDRESS, dots);
        }
        ++rest;
    }
    if (*rest == '\0') {
        return kLastPart;
    }
    rgPart[kLastPart] = read_part(&rest);
    return *rest == '\0' ? kLastPart + 1 : fail_quietly(HERE, NET_ERR_BAD_ADDRESS, kLastPart);
}
