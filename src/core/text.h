/**
 * @file
 * Bounded texts: paths and file names built from a format, copies into record fields.
 */
#pragma once

#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <cstring>
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

/** A record's field as a text, whole even when nothing ends it. */
template<size_t Size> class field_text : public built_text<Size + 1> {
public:
    explicit field_text(const char (&field)[Size]) : built_text<Size + 1>("%.*s", static_cast<int>(Size), field) {}
};

/** Whether a record's field is terminated. */
template<size_t Size> [[nodiscard]] bool ends_within(const char (&field)[Size]) {
    return memchr(field, '\0', Size) != nullptr;
}

/** Whether a record's field is one line as well: a second one would be a line of its own in a file. */
template<size_t Size> [[nodiscard]] bool is_one_line(const char (&field)[Size]) {
    return ends_within(field) && strpbrk(field, "\r\n") == nullptr;
}

/** Copies a text, cut to the room there is; the size is above 0. */
inline void copy_cut(char *out, size_t size, const char *text) {
    const size_t length = strnlen(text, size - 1);
    memcpy(out, text, length);
    out[length] = '\0';
}

/** Copies a text into a field, cut to it. */
template<size_t Size> void copy_text(char (&field)[Size], const char *text) {
    copy_cut(field, Size, text);
}

/** Copies a text whole, or leaves "" and answers false when it does not fit; the size is above 0. */
[[nodiscard]] bool copy_whole(char *out, int size, const char *text);

/** Cuts a text up at any of the delimiters and appends the words to a list. @return their number, -1 for no memory */
[[nodiscard]] int split(char *text, const char *delimiters, KLIBSZLIST *words);

/** Appends what stands between the separators to a list, empty fields too. @return their number, -1 for no memory */
[[nodiscard]] int split_fields(const char *text, const char *separators, KLIBSZLIST *fields);

} // namespace kova
