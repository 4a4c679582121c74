#include <kovanetsdk/addr.h>

#include "core/report.h"

#include <cstring>

using namespace kova;

namespace {

bool is_forbidden(char c) {
    const auto byte = static_cast<unsigned char>(c);
    return byte <= ' ' || strchr("\"(),.:;<>[\\]@", byte) != nullptr;
}

bool is_atom(const char *begin, const char *end) {
    for (const char *c = begin; c != end; ++c) {
        if (is_forbidden(*c)) {
            return false;
        }
    }
    return begin != end;
}

} // namespace

extern "C" int BlKLIBIsAtom(const char *szAtom) {
    if (refuses_null_text(HERE, "szAtom", szAtom)) {
        return 0;
    }
    return is_atom(szAtom, szAtom + strlen(szAtom)) ? 1 : 0;
}

extern "C" int BlKLIBIsDomain(const char *szDomain) {
    if (refuses_null_text(HERE, "szDomain", szDomain)) {
        return 0;
    }
    constexpr size_t kLongest = 511; // nothing behind it is looked at
    const char *const end = szDomain + strnlen(szDomain, kLongest);
    const char *label = szDomain;
    for (const char *c = szDomain; c != end; ++c) {
        if (*c != '.') {
            continue;
        }
        if (!is_atom(label, c)) {
            return 0;
        }
        label = c + 1;
    }
    return is_atom(label, end) ? 1 : 0;
}
