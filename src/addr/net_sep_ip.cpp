#include <kovanetsdk/addr.h>

#include "core/report.h"
#include "core/text.h"

#include <cstdlib>

using namespace kova;

namespace {

bool is_digit(char c) {
    return '0' <= c && c <= '9';
}

/** Reads a decimal part of few digits, as nearly all are. @return false, and nothing read, for any other text */
bool read_plain_part(char **text, uint32_t &part) {
    constexpr int kAlwaysFit = 9;
    char *c = *text;
    for (part = 0; is_digit(*c); ++c) {
        part = part * 10 + static_cast<uint32_t>(*c - '0');
    }
    const auto digits = c - *text;
    const bool may_be_octal_or_hexadecimal = **text == '0' && (digits > 1 || *c == 'x' || *c == 'X');
    if (digits == 0 || digits > kAlwaysFit || may_be_octal_or_hexadecimal) {
        return false;
    }
    *text = c;
    return true;
}

/** Reads one part. What does not fit becomes the largest value, so that no later check takes it for a small one. */
uint32_t read_part(char **text) {
    uint32_t part = 0;
    if (read_plain_part(text, part)) {
        return part;
    }
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
