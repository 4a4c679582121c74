/**
 * @file
 * Bounded texts: paths and file names built from a format, copies into record fields.
 */
#pragma once

#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <kova/core.h>

namespace kova {

/** A text built once from a format and never cut silently. */
template<size_t Size> class built_text {
public:
    [[gnu::format(printf, 2, 3)]] explicit built_text(const char *format, ...) {
        va_list arguments;
        va_start(arguments, format);
        const int length = vsnprintf(text_, Size, format, arguments);
        va_end(arguments);
        fits_ = length >= 0 && static_cast<size_t>(length) < Size;
    }
    [[nodiscard]] const char *c_str() const { return text_; }
    [[nodiscard]] bool fits() const { return fits_; }

private:
    char text_[Size];
    bool fits_ = false;
};

/** Long enough for every path with an interface name that passed is_interface_name. */
using path_text = built_text<512>;

/** Copies a text into a field, cut to it. */
template<size_t Size> void copy_text(char (&field)[Size], const char *text) {
    snprintf(field, Size, "%s", text);
}

} // namespace kova
