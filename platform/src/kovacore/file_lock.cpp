#include "kovacore/file_lock.h"

#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <utility>

#include "common/backoff.h"
#include "common/fnv.h"
#include "common/report.h"

using namespace kova;

namespace {

constexpr const char *kLockDirectory = "/run/lock/kova";

/**
 * Opens the directory. /run/lock may be open to everybody: one that a stranger made in advance is not used, and only
 * the system's own user makes it, or a reader's would be in its way. The mode is looked at every time: the mask of who
 * made it, killed before it could be put right, must not keep readers out.
 */
unique_fd open_lock_directory() {
    constexpr int kFlags = O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
    unique_fd directory{open(kLockDirectory, kFlags)};
    if (!directory && errno == ENOENT && geteuid() == 0) {
        mkdir("/run/lock", 0755);
        mkdir(kLockDirectory, 0755);
        directory.reset(open(kLockDirectory, kFlags));
    }
    struct stat status;
    if (directory && (fstat(directory.get(), &status) < 0 || (status.st_uid != 0 && status.st_uid != geteuid()))) {
        errno = EPERM;
        directory.reset();
    }
    if (directory && (status.st_mode & 0555) != 0555 && status.st_uid == geteuid())
        chmod(kLockDirectory, 0755);
    return directory;
}

/** As with the directory, whoever may write puts a mode right that a killed one could not. */
unique_fd open_to_write(int directory, const char *name) {
    unique_fd fd{openat(directory, name, O_RDWR | O_NOFOLLOW | O_CLOEXEC)};
    if (!fd && errno == ENOENT)
        fd.reset(openat(directory, name, O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0644));
    struct stat status;
    if (fd && fstat(fd.get(), &status) == 0 && (status.st_mode & 0444) != 0444)
        fchmod(fd.get(), 0644);
    return fd;
}

struct flock describe(short type) {
    struct flock lock = {};
    lock.l_type = type;
    lock.l_whence = SEEK_SET;
    return lock;
}

/** The directory part made real, the file's own name behind it. */
bool resolve_parent(const char *path, char (&resolved)[PATH_MAX]) {
    const char *slash = strrchr(path, '/');
    const char *name = slash != nullptr ? slash + 1 : path;
    char parent[PATH_MAX];
    snprintf(parent, sizeof parent, "%.*s", slash != nullptr ? static_cast<int>(slash + 1 - path) : 1,
             slash != nullptr ? path : ".");
    if (*name == '\0' || realpath(parent, resolved) == nullptr)
        return false;
    const size_t used = strcmp(resolved, "/") == 0 ? 0 : strlen(resolved);
    const size_t left = sizeof resolved - used;
    return static_cast<size_t>(snprintf(resolved + used, left, "/%s", name)) < left;
}

} // namespace

unique_fd kova::open_lock_file(const char *name, lock_mode mode) {
    const unique_fd directory = open_lock_directory();
    if (!directory)
        return {};
    unique_fd fd = open_to_write(directory.get(), name);
    if (!fd && errno == EACCES && mode == lock_mode::kShared)
        fd.reset(openat(directory.get(), name, O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
    return fd;
}

lock_result kova::try_lock(int fd, lock_mode mode) {
    struct flock lock = describe(mode == lock_mode::kExclusive ? F_WRLCK : F_RDLCK);
    if (fcntl(fd, F_OFD_SETLK, &lock) == 0)
        return lock_result::kTaken;
    return errno == EAGAIN || errno == EACCES || errno == EINTR ? lock_result::kBusy : lock_result::kFailed;
}

bool kova::lock_within(int fd, lock_mode mode, int seconds) {
    backoff wait{int64_t{seconds} * 1000};
    lock_result result;
    do {
        result = try_lock(fd, mode);
    } while (result == lock_result::kBusy && wait.pause());
    return result == lock_result::kTaken;
}

void kova::unlock(int fd) {
    const errno_keeper keep;
    struct flock lock = describe(F_UNLCK);
    fcntl(fd, F_OFD_SETLK, &lock);
}

bool kova::resolve_path(const char *path, char (&resolved)[PATH_MAX]) {
    if (strlen(path) >= PATH_MAX) {
        errno = ENAMETOOLONG;
        return false;
    }
    if (realpath(path, resolved) != nullptr)
        return true;
    if (errno != ENOENT || !resolve_parent(path, resolved))
        return false;

    // nothing is there, or a link to nothing: that one is followed to the file it would name
    char target[PATH_MAX];
    const ssize_t length = readlink(resolved, target, sizeof target - 1);
    if (length < 0)
        return errno == ENOENT || errno == EINVAL; // no link: somebody may have made the file meanwhile
    target[length] = '\0';
    char joined[PATH_MAX];
    const char *slash = strrchr(resolved, '/');
    const int directory = target[0] == '/' ? 0 : static_cast<int>(slash + 1 - resolved);
    if (snprintf(joined, sizeof joined, "%.*s%s", directory, resolved, target) >= PATH_MAX)
        return false;
    return resolve_parent(joined, resolved);
}

unique_fd kova::open_lock_for(const char *kind, const char *resolved, lock_mode mode) {
    char name[64];
    snprintf(name, sizeof name, "%s-%016llx", kind, static_cast<unsigned long long>(fnv1a(resolved)));
    return open_lock_file(name, mode);
}

int KLIBCFileLockTimeByFile(const char *szPath, int mode, int seconds, int *pFd) {
    if (is_empty(szPath) || (mode != 0 && mode != 1) || seconds < 0 || pFd == nullptr)
        return fail(HERE, kErrArgument);

    *pFd = -1;
    const lock_mode wanted = mode == 1 ? lock_mode::kExclusive : lock_mode::kShared;
    char resolved[PATH_MAX];
    if (!resolve_path(szPath, resolved))
        return fail(HERE, kErrLock);
    unique_fd fd = open_lock_for("file", resolved, wanted);
    if (!fd || !lock_within(fd.get(), wanted, seconds))
        return fail(HERE, kErrLock);
    *pFd = fd.release();
    return 0;
}

int KLIBCFileUnlockByFile(int fd) {
    if (fd < 0 || fcntl(fd, F_GETFD) < 0)
        return fail(HERE, kErrArgument), 0;
    unlock(fd);
    close(fd);
    return 1;
}
