#include "kovacore/line_source.h"

#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>

using namespace kova;

unique_fd kova::open_regular(const char *path) {
    unique_fd fd{open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOCTTY)};
    struct stat status;
    if (fd && (fstat(fd.get(), &status) < 0 || !S_ISREG(status.st_mode)))
        fd.reset();
    return fd;
}

ssize_t kova::read_some(int fd, void *to, size_t size) {
    ssize_t got;
    do {
        got = read(fd, to, size);
    } while (got < 0 && errno == EINTR);
    return got;
}

/** Moves what is left to the front and reads on behind it. */
bool line_source::refill() {
    memmove(buffer_, buffer_ + begin_, end_ - begin_);
    end_ -= begin_;
    begin_ = 0;
    const ssize_t got = read_some(fd_.get(), buffer_ + end_, sizeof buffer_ - end_);
    failed_ = got < 0;
    at_end_ = got <= 0;
    end_ += got > 0 ? static_cast<size_t>(got) : 0;
    return got > 0;
}

bool line_source::next(std::string_view &line) {
    if (!fd_)
        return false;
    size_t searched = 0;
    while (!failed_) {
        const char *text = buffer_ + begin_;
        const size_t size = end_ - begin_;
        const void *newline = memchr(text + searched, '\n', size - searched);
        if (newline == nullptr && size < sizeof buffer_ && !at_end_) {
            searched = size;
            refill();
            continue;
        }
        if (newline == nullptr && size == 0)
            return false;
        const size_t length =
            newline != nullptr ? static_cast<size_t>(static_cast<const char *>(newline) - text) : size;
        begin_ += length + (newline != nullptr ? 1 : 0);
        if (!skip_rest_) {
            skip_rest_ = newline == nullptr;
            line = {text, length};
            return true;
        }
        skip_rest_ = newline == nullptr;
        searched = 0;
    }
    return false;
}
