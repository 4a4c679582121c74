/**
 * @file
 * The calls of the C library that a sweep makes fail, in front of the real ones. What a unit test makes fail, too, is
 * in support/interpose.cpp; reads and writes of streams are in support/fault_points.cpp.
 */
#include "support/fault_points.h"

#include <cstdarg>
#include <cstring>
#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <spawn.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <sys/utsname.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace kova_test;

namespace {

std::string named(const char *path) {
    return path != nullptr ? path : "nothing";
}

/** The path that is opened wherever this one is meant. */
std::string meant(const char *path) {
    const rig_at_work guard;
    return current_rig != nullptr && current_rig->is_observing ? current_rig->redirected(path) : named(path);
}

std::string between(const char *from, const char *to) {
    return named(from) + " " + named(to);
}

} // namespace

#pragma GCC diagnostic ignored "-Wmissing-declarations"

// ---- files by path

FAULT_IN_FRONT(int, stat, (const char *path, struct stat *out), (meant(path).c_str(), out), named(path), -1, EACCES)
FAULT_IN_FRONT(int, fstatat, (int fd, const char *path, struct stat *out, int flags), (fd, path, out, flags),
               named(path), -1, EACCES)
FAULT_IN_FRONT(int, chmod, (const char *path, mode_t mode), (path, mode), named(path), -1, EPERM)
FAULT_IN_FRONT(int, chown, (const char *path, uid_t user, gid_t group), (path, user, group), named(path), -1, EPERM)
FAULT_IN_FRONT(int, mkdir, (const char *path, mode_t mode), (path, mode), named(path), -1, ENOSPC)
FAULT_IN_FRONT(int, link, (const char *from, const char *to), (from, to), between(from, to), -1, ENOSPC)
FAULT_IN_FRONT(int, rename, (const char *from, const char *to), (from, to), between(from, to), -1, EIO)
FAULT_IN_FRONT(int, renameat2, (int from_fd, const char *from, int to_fd, const char *to, unsigned flags),
               (from_fd, from, to_fd, to, flags), between(from, to), -1, EIO)
FAULT_IN_FRONT(int, unlink, (const char *path), (path), named(path), -1, EIO)
FAULT_IN_FRONT(ssize_t, readlink, (const char *path, char *to, size_t size), (path, to, size), named(path), -1, EIO)
FAULT_IN_FRONT(char *, realpath, (const char *path, char *resolved), (path, resolved), named(path), nullptr, EACCES)

/** The same name in each run: the first that is free. */
extern "C" int failing_mkostemp(char *path, int flags) __asm__("mkostemp");
extern "C" int failing_mkostemp(char *path, int flags) {
    const fault_point point{"mkostemp", is_in_code_under_test(__builtin_return_address(0)),
                            [&] { return named(path); }};
    if (point.fails()) {
        errno = ENOSPC;
        return -1;
    }
    const rig_at_work guard;
    char *const end = path + strlen(path) - 6;
    int fd = -1;
    for (int number = 0; fd < 0 && number < 100; ++number) {
        snprintf(end, 7, "%06d", number);
        fd = open(path, O_RDWR | O_CREAT | O_EXCL | flags, 0600);
    }
    return fd;
}
static const bool mkostemp_can_fail = can_fail("mkostemp");

extern "C" int failing_openat(int fd, const char *path, int flags, ...) __asm__("openat");
extern "C" int failing_openat(int fd, const char *path, int flags, ...) {
    static const auto next = reinterpret_cast<int (*)(int, const char *, int, ...)>(dlsym(RTLD_NEXT, "openat"));
    va_list list;
    va_start(list, flags);
    const mode_t mode = va_arg(list, mode_t); // whatever is there when none was given
    va_end(list);
    const fault_point point{"openat", is_in_code_under_test(__builtin_return_address(0)), [&] { return named(path); }};
    if (point.fails()) {
        errno = EMFILE;
        return -1;
    }
    return next(fd, path, flags, mode);
}
static const bool openat_can_fail = can_fail("openat");

// ---- files by descriptor

FAULT_IN_FRONT(ssize_t, read, (int fd, void *to, size_t size), (fd, to, size), path_of(fd), -1, EIO)
FAULT_IN_FRONT(ssize_t, write, (int fd, const void *from, size_t size), (fd, from, size), path_of(fd), -1, ENOSPC)
FAULT_IN_FRONT(off_t, lseek, (int fd, off_t to, int whence), (fd, to, whence), path_of(fd), -1, EINVAL)
FAULT_IN_FRONT(int, fstat, (int fd, struct stat *out), (fd, out), path_of(fd), -1, EIO)
FAULT_IN_FRONT(int, fchmod, (int fd, mode_t mode), (fd, mode), path_of(fd), -1, EPERM)
FAULT_IN_FRONT(int, fchown, (int fd, uid_t user, gid_t group), (fd, user, group), path_of(fd), -1, EPERM)
FAULT_BEHIND(int, close, (int fd), (fd), path_of(fd), -1, EIO)
FAULT_IN_FRONT(int, memfd_create, (const char *name, unsigned flags), (name, flags), named(name), -1, ENFILE)
FAULT_IN_FRONT(int, pipe2, (int *ends, int flags), (ends, flags), std::string{}, -1, EMFILE)

/** The same bytes in each run. */
extern "C" ssize_t failing_getrandom(void *to, size_t size, unsigned flags) __asm__("getrandom");
extern "C" ssize_t failing_getrandom(void *to, size_t size, unsigned) {
    const fault_point point{"getrandom", is_in_code_under_test(__builtin_return_address(0)),
                            [] { return std::string(); }};
    if (point.fails()) {
        errno = ENOSYS;
        return -1;
    }
    memset(to, 0x42, size);
    return static_cast<ssize_t>(size);
}
static const bool getrandom_can_fail = can_fail("getrandom");

/** Nothing goes to the disk: the files of a run are gone after it. */
extern "C" int failing_fsync(int fd) __asm__("fsync");
extern "C" int failing_fsync(int fd) {
    const fault_point point{"fsync", is_in_code_under_test(__builtin_return_address(0)), [&] { return path_of(fd); }};
    if (point.fails()) {
        errno = EIO;
        return -1;
    }
    return 0;
}
static const bool fsync_can_fail = can_fail("fsync");

extern "C" int failing_fcntl(int fd, int command, ...) __asm__("fcntl");
extern "C" int failing_fcntl(int fd, int command, ...) {
    static const auto next = reinterpret_cast<int (*)(int, int, ...)>(dlsym(RTLD_NEXT, "fcntl"));
    va_list list;
    va_start(list, command);
    void *const argument = va_arg(list, void *);
    va_end(list);
    // F_GETFD has no way to fail on a descriptor that is open
    const fault_point point{"fcntl", command != F_GETFD && is_in_code_under_test(__builtin_return_address(0)),
                            [&] { return std::to_string(command) + " " + path_of(fd); }};
    if (point.fails()) {
        errno = ENOLCK;
        return -1;
    }
    return next(fd, command, argument);
}
static const bool fcntl_can_fail = can_fail("fcntl");

extern "C" int failing_dprintf(int fd, const char *format, ...) __asm__("dprintf");
extern "C" int failing_dprintf(int fd, const char *format, ...) {
    const fault_point point{"dprintf", is_in_code_under_test(__builtin_return_address(0)), [&] { return path_of(fd); }};
    if (point.fails()) {
        errno = ENOSPC;
        return -1;
    }
    va_list list;
    va_start(list, format);
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    const int length = vdprintf(fd, format, list);
#pragma GCC diagnostic pop
    va_end(list);
    return length;
}
static const bool dprintf_can_fail = can_fail("dprintf");

// ---- streams and directories

extern "C" int failing_fclose(FILE *stream) __asm__("fclose");
extern "C" int failing_fclose(FILE *stream) {
    static const auto next = reinterpret_cast<int (*)(FILE *)>(dlsym(RTLD_NEXT, "fclose"));
    const fault_point point{"fclose", is_in_code_under_test(__builtin_return_address(0)),
                            [&] { return stream_text(stream); }};
    forget(stream);
    const int result = next(stream);
    if (point.fails()) {
        errno = EIO;
        return EOF;
    }
    return result;
}
static const bool fclose_can_fail = can_fail("fclose");

extern "C" FILE *failing_fdopen(int fd, const char *mode) __asm__("fdopen");
extern "C" FILE *failing_fdopen(int fd, const char *mode) {
    static const auto next = reinterpret_cast<FILE *(*)(int, const char *)>(dlsym(RTLD_NEXT, "fdopen"));
    const bool is_counted = is_in_code_under_test(__builtin_return_address(0));
    const fault_point point{"fdopen", is_counted, [&] { return path_of(fd); }};
    if (point.fails()) {
        errno = ENOMEM;
        return nullptr;
    }
    FILE *const stream = next(fd, mode);
    const rig_at_work guard;
    return is_counted ? watched(stream, mode, path_of(fd)) : stream;
}
static const bool fdopen_can_fail = can_fail("fdopen");

extern "C" int failing_fileno(FILE *stream) __asm__("fileno");
extern "C" int failing_fileno(FILE *stream) {
    static const auto next = reinterpret_cast<int (*)(FILE *)>(dlsym(RTLD_NEXT, "fileno"));
    return next(behind(stream));
}

FAULT_IN_FRONT(int, setvbuf, (FILE * stream, char *buffer, int mode, size_t size), (stream, buffer, mode, size),
               stream_text(stream), -1, EBADF)
FAULT_IN_FRONT(dirent *, readdir, (DIR * directory), (directory), path_of(dirfd(directory)), nullptr, EIO)
FAULT_BEHIND(int, closedir, (DIR * directory), (directory), path_of(dirfd(directory)), -1, EIO)

// ---- processes

FAULT_IN_FRONT(int, posix_spawn,
               (pid_t * pid, const char *program, const posix_spawn_file_actions_t *actions,
                const posix_spawnattr_t *attributes, char *const *argv, char *const *environment),
               (pid, program, actions, attributes, argv, environment), named(program), EAGAIN, errno)
FAULT_IN_FRONT(int, posix_spawn_file_actions_adddup2, (posix_spawn_file_actions_t * actions, int from, int to),
               (actions, from, to), std::string{}, ENOMEM, errno)
FAULT_IN_FRONT(int, posix_spawn_file_actions_addopen,
               (posix_spawn_file_actions_t * actions, int fd, const char *path, int flags, mode_t mode),
               (actions, fd, path, flags, mode), named(path), ENOMEM, errno)
FAULT_IN_FRONT(int, posix_spawn_file_actions_addclosefrom_np, (posix_spawn_file_actions_t * actions, int from),
               (actions, from), std::string{}, ENOMEM, errno)
FAULT_IN_FRONT(int, clone, (int (*function)(void *), void *stack, int flags, void *argument),
               (function, stack, flags, argument), std::string{}, -1, EAGAIN)
FAULT_BEHIND(pid_t, waitpid, (pid_t pid, int *status, int options), (pid, status, options), std::string{}, -1, ECHILD)
FAULT_IN_FRONT(int, kill, (pid_t pid, int signal), (pid, signal), std::to_string(signal), -1, EPERM)
FAULT_IN_FRONT(int, uname, (struct utsname * out), (out), std::string{}, -1, EFAULT)
FAULT_IN_FRONT(int, sethostname, (const char *name, size_t size), (name, size), named(name), -1, EPERM)
FAULT_IN_FRONT(int, gethostname, (char *name, size_t size), (name, size), std::string{}, -1, EFAULT)
FAULT_IN_FRONT(int, __register_atfork, (void (*prepare)(), void (*parent)(), void (*child)(), void *object),
               (prepare, parent, child, object), std::string{}, ENOMEM, errno)

// ---- memory given back

#ifndef __SANITIZE_ADDRESS__

extern "C" void __libc_free(void *);

extern "C" void failing_free(void *block) __asm__("free");
extern "C" void failing_free(void *block) {
    if (current_points != nullptr && block != nullptr) {
        const rig_at_work guard;
        current_points->blocks.erase(block);
    }
    __libc_free(block);
}

#endif
