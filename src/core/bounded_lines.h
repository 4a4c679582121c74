/**
 * @file
 * The lines of a stream that somebody else writes, however long they are, in the room of one buffer.
 */
#pragma once

#include <climits>
#include <cstdio>

namespace kova {

/** Lines of a stream, newline included; of one that does not fit the buffer the beginning, the rest is passed over. */
class bounded_lines {
public:
    /** Without a line. */
    bounded_lines() = default;
    /** @param line, size  the buffer, at least 3 bytes. @param most  ends the lines after about that many bytes; a line
     * counts as a whole buffer */
    bounded_lines(FILE *stream, char *line, int size, long most = LONG_MAX)
        : stream_(stream), line_(line), size_(size), left_(most) {}

    /** @return whether the buffer holds another line; ferror tells a failure from the end */
    [[nodiscard]] bool next();

private:
    FILE *stream_ = nullptr;
    char *line_ = nullptr;
    int size_ = 0;
    long left_ = 0;
};

} // namespace kova
