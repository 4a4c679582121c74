/**
 * @file
 * Readers of the small files below /proc and /sys that several units read.
 */
#pragma once

#include "core/guards.h"
#include "core/report.h"

namespace kova {

/** The first line of a file without its newline. What went wrong is kept apart, because callers report it differently.
 */
class first_line {
public:
    /** errno says why when the file is not open. */
    explicit first_line(const char *path);
    [[nodiscard]] bool is_open() const { return is_open_; }
    /** Whether there was a line; an empty file has none. */
    [[nodiscard]] bool is_read() const { return text_ != nullptr; }
    /** The line; callers may cut it up. */
    [[nodiscard]] char *text() { return text_.get(); }

private:
    bool is_open_ = false;
    heap<char> text_;
};

/** The next line of a stream without its newline, nothing at the end or when it cannot be read. */
heap<char> next_line(FILE *file);
inline heap<char> next_line(const stream &file) {
    return next_line(file.get());
}

/** Reads the decimal number a text begins with. @return whether there is one that fits */
bool leading_number(const char *text, int &number);

/** Whether an interface is a member of a bond of the virtual switch. Logs and sets the register at the place on
 * failure. */
bool is_ovs_bond_member(const place &at, const char *szIfname);

} // namespace kova
