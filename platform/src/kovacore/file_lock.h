/** @file Locks on files of their own below /run/lock/kova. */
#ifndef KOVA_PLATFORM_FILE_LOCK_H
#define KOVA_PLATFORM_FILE_LOCK_H

#include <climits>

#include "common/guard.h"

namespace kova {

enum class lock_mode { kShared, kExclusive };
enum class lock_result { kTaken, kBusy, kFailed };

/**
 * Opens a lock file, made when it is not there. Readable for a shared lock is enough, so that an unprivileged process
 * can take one.
 */
unique_fd open_lock_file(const char *name, lock_mode mode);

/** Takes or converts a lock; a conversion that is refused leaves the lock as it was. */
lock_result try_lock(int fd, lock_mode mode);
/** Tries until it works or the time is up. @return whether the lock was taken */
bool lock_within(int fd, lock_mode mode, int seconds);
/** Releases the lock also for the copies of the descriptor that a fork has made. */
void unlock(int fd);

/** Where a file really is: links followed, also for a file that is not there yet. @return false with errno */
bool resolve_path(const char *path, char (&resolved)[PATH_MAX]);
/** Opens the lock file that stands for a file, "<kind>-<hash of the resolved path>". */
unique_fd open_lock_for(const char *kind, const char *resolved, lock_mode mode);

/** An exclusive lock that ends with its scope. */
class scoped_lock {
public:
    scoped_lock() = default;
    ~scoped_lock() {
        if (fd_)
            unlock(fd_.get());
    }
    scoped_lock(const scoped_lock &) = delete;
    scoped_lock &operator=(const scoped_lock &) = delete;

    bool take(unique_fd fd, int seconds) {
        if (!fd || !lock_within(fd.get(), lock_mode::kExclusive, seconds))
            return false;
        fd_ = static_cast<unique_fd &&>(fd);
        return true;
    }

private:
    unique_fd fd_;
};

} // namespace kova

#endif
