#include <kovanetsdk/addr.h>

#include "core/report.h"

#include <cstring>

using namespace kova;

namespace {

bool begins_name(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_';
}

bool continues_name(char c) {
    return begins_name(c) || (c >= '0' && c <= '9') || c == '-';
}

} // namespace

extern "C" int BlKLIBIsHostname(const char *szHostname) {
    if (refuses_null_text(HERE, "szHostname", szHostname)) {
        return 0;
    }
    constexpr size_t kLongest = 15;
    const size_t length = strnlen(szHostname, kLongest + 1);
    if (!begins_name(szHostname[0]) || length > kLongest) {
        return 0;
    }
    for (size_t i = 1; i < length; ++i) {
        if (!continues_name(szHostname[i])) {
            return 0;
        }
    }
    return 1;
}
