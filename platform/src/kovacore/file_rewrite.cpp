#include "kovacore/file_rewrite.h"

#include <cstdio>
#include <cstring>
#include <fcntl.h>

#include "common/fnv.h"
#include "common/report.h"
#include "kovacore/line_source.h"

using namespace kova;

namespace {

constexpr int kWritersWaitSeconds = 30;

bool write_all(int fd, std::string_view text) {
    while (!text.empty()) {
        const ssize_t written = write(fd, text.data(), text.size());
        if (written < 0 && errno != EINTR)
            return false;
        if (written > 0)
            text.remove_prefix(static_cast<size_t>(written));
    }
    return true;
}

/**
 * The temporary of a target has one name, made under the lock of its writers: what a killed writer left is in the way
 * and goes. The name begins with a dot, so that no pattern such as "ifcfg-*" takes it for the file.
 */
class temporary_file {
public:
    explicit temporary_file(const char *target) {
        const auto directory = static_cast<int>(strrchr(target, '/') + 1 - target);
        snprintf(path_, sizeof path_, "%.*s.%.100s.%016llx", directory, target, target + directory,
                 static_cast<unsigned long long>(fnv1a(target)));
    }
    ~temporary_file() {
        const errno_keeper keep;
        if (fd_)
            unlink(path_);
    }
    temporary_file(const temporary_file &) = delete;
    temporary_file &operator=(const temporary_file &) = delete;

    bool create() {
        constexpr int kFlags = O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC;
        fd_.reset(open(path_, kFlags, 0600));
        if (!fd_ && errno == EEXIST && unlink(path_) == 0)
            fd_.reset(open(path_, kFlags, 0600));
        return static_cast<bool>(fd_);
    }
    [[nodiscard]] int fd() const { return fd_.get(); }
    /** @param flags RENAME_NOREPLACE: fails when something has the name */
    bool rename_to(const char *target, unsigned flags) {
        if (renameat2(AT_FDCWD, path_, AT_FDCWD, target, flags) < 0)
            return false;
        fd_.reset();
        return true;
    }

private:
    char path_[PATH_MAX + 128];
    unique_fd fd_;
};

/** A rename is on the disk when its directory is. */
bool sync_directory_of(const char *path) {
    char directory[PATH_MAX];
    const char *slash = strrchr(path, '/');
    snprintf(directory, sizeof directory, "%.*s", static_cast<int>(slash + 1 - path), path);
    const unique_fd fd{open(directory, O_RDONLY | O_DIRECTORY | O_CLOEXEC)};
    // some file systems cannot sync a directory and say so
    return fd && (fsync(fd.get()) == 0 || errno == EINVAL);
}

} // namespace

bool text_buffer::reserve(size_t size) {
    if (size <= capacity_)
        return true;
    const size_t capacity = size < 2048 ? 4096 : size * 2;
    void *block = realloc(data_.get(), capacity);
    if (block == nullptr) {
        out_of_memory_ = true;
        return false;
    }
    (void)data_.release();
    data_.reset(static_cast<char *>(block));
    capacity_ = capacity;
    return true;
}

void text_buffer::add(std::string_view text) {
    if (text.empty() || out_of_memory_ || !reserve(size_ + text.size()))
        return;
    memcpy(data_.get() + size_, text.data(), text.size());
    size_ += text.size();
}

void text_buffer::add_line(std::string_view line) {
    add(line);
    add("\n");
}

/** @return false for a read that failed or ran out of memory */
bool text_buffer::read_all(int fd, size_t size_hint) {
    if (!reserve(size_hint + 1))
        return false;
    while (true) {
        const ssize_t got = read_some(fd, data_.get() + size_, capacity_ - size_);
        if (got <= 0)
            return got == 0;
        size_ += static_cast<size_t>(got);
        if (size_ > file_rewrite::kSizeMax || (size_ == capacity_ && !reserve(size_ + 1)))
            return false;
    }
}

int file_rewrite::open(const char *path) {
    if (!resolve_path(path, path_))
        return fail(HERE, kErrFileOpen);
    if (!lock_.take(open_lock_for("write", path_, lock_mode::kExclusive), kWritersWaitSeconds))
        return fail(HERE, kErrLock);
    return read_old();
}

int file_rewrite::read_old() {
    const unique_fd fd{::open(path_, O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK | O_NOCTTY)};
    if (!fd && errno == ENOENT)
        return 0;
    if (!fd || fstat(fd.get(), &status_) < 0 || !S_ISREG(status_.st_mode))
        return fail(HERE, kErrFileOpen);
    if (static_cast<size_t>(status_.st_size) > kSizeMax ||
        !old_.read_all(fd.get(), static_cast<size_t>(status_.st_size)))
        return fail(HERE, old_.out_of_memory() ? kErrMemory : kErrFileOpen);
    existed_ = true;
    return 0;
}

/** The owner before the mode: changing the owner takes mode bits away. */
int file_rewrite::fill_temporary(int fd, mode_t mode_of_new) {
    if (!write_all(fd, fresh_.view()))
        return fail(HERE, kErrFileWrite);
    if (existed_ && fchown(fd, status_.st_uid, status_.st_gid) < 0)
        return fail(HERE, kErrFileWrite);
    if (fchmod(fd, existed_ ? status_.st_mode & 07777 : mode_of_new) < 0 || fsync(fd) < 0)
        return fail(HERE, kErrFileWrite);
    return 0;
}

int file_rewrite::put_in_place(mode_t mode_of_new, unsigned rename_flags) {
    if (fresh_.out_of_memory())
        return fail(HERE, kErrMemory);

    temporary_file temporary{path_};
    if (!temporary.create())
        return fail(HERE, kErrFileOpen);
    if (fill_temporary(temporary.fd(), mode_of_new) < 0)
        return -1;
    if (!temporary.rename_to(path_, rename_flags))
        return rename_flags != 0 && errno == EEXIST ? 0 : fail(HERE, kErrRename);
    return sync_directory_of(path_) ? 0 : fail(HERE, kErrFileWrite);
}

int file_rewrite::commit() {
    const bool is_same = !fresh_.out_of_memory() && fresh_.view() == old_.view();
    return is_same ? 0 : put_in_place(0644, 0);
}

int file_rewrite::create(mode_t mode) {
    return existed_ ? 0 : put_in_place(mode, RENAME_NOREPLACE);
}
