/** @file Reads a regular file line by line in bounded memory, whatever is in it. */
#ifndef KOVA_PLATFORM_LINE_SOURCE_H
#define KOVA_PLATFORM_LINE_SOURCE_H

#include <cstddef>
#include <string_view>

#include "common/guard.h"

namespace kova {

/** Opens a regular file for reading; a directory, a FIFO or a device is refused, and none of them is waited for. */
unique_fd open_regular(const char *path);

/** read(2) that is not interrupted. @return as read(2) */
ssize_t read_some(int fd, void *to, size_t size);

class line_source {
public:
    /** Longest line looked at; the rest of a longer one is passed over. */
    static constexpr size_t kLineMax = 65536;

    // cppcheck-suppress uninitMemberVar ; the buffer is filled before it is read
    explicit line_source(const char *path) : fd_(open_regular(path)), failed_(!fd_) {}

    /** Gives the next line without its newline; it stays valid until the next call. @return false at the end */
    bool next(std::string_view &line);
    /** @return whether the file could not be opened or read to its end */
    [[nodiscard]] bool failed() const { return failed_; }

private:
    bool refill();

    unique_fd fd_;
    bool failed_;
    bool at_end_ = false;
    bool skip_rest_ = false; // of a line that was given cut
    size_t begin_ = 0;
    size_t end_ = 0;
    char buffer_[kLineMax];
};

} // namespace kova

#endif
