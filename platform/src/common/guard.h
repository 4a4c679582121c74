/** @file Owners of what must be given back. Their destructors leave errno alone. */
#ifndef KOVA_PLATFORM_GUARD_H
#define KOVA_PLATFORM_GUARD_H

#include <cerrno>
#include <cstdlib>
#include <memory>
#include <unistd.h>

namespace kova {

class errno_keeper {
public:
    errno_keeper() : saved_(errno) {}
    ~errno_keeper() { errno = saved_; }
    errno_keeper(const errno_keeper &) = delete;
    errno_keeper &operator=(const errno_keeper &) = delete;

private:
    int saved_;
};

class unique_fd {
public:
    unique_fd() = default;
    explicit unique_fd(int fd) : fd_(fd) {}
    unique_fd(unique_fd &&other) noexcept : fd_(other.release()) {}
    unique_fd &operator=(unique_fd &&other) noexcept {
        reset(other.release());
        return *this;
    }
    unique_fd(const unique_fd &) = delete;
    unique_fd &operator=(const unique_fd &) = delete;
    ~unique_fd() { reset(); }

    [[nodiscard]] int get() const { return fd_; }
    explicit operator bool() const { return fd_ >= 0; }
    int release() {
        const int fd = fd_;
        fd_ = -1;
        return fd;
    }
    void reset(int fd = -1) {
        const errno_keeper keep;
        if (fd_ >= 0)
            close(fd_);
        fd_ = fd;
    }

private:
    int fd_ = -1;
};

struct free_deleter {
    void operator()(const void *block) const { free(const_cast<void *>(block)); }
};
/** Memory from malloc. */
template<class T> using heap_ptr = std::unique_ptr<T, free_deleter>;

} // namespace kova

#endif
