#include "kova/core.h"

#include <cstdio>
#include <pthread.h>

#include "common/backoff.h"
#include "common/report.h"
#include "kovacore/file_lock.h"

using namespace kova;

namespace {

/** A lock this process holds. */
struct held_lock {
    uint32_t name;
    int count; // 0: the entry is free
    int fd;    // below 0: see take_first
    lock_mode mode;
};

constexpr uint32_t kModeMask = 0xFF;
constexpr uint32_t kModeShared = 5;
constexpr uint32_t kModeExclusive = 6;
constexpr int kHeldMax = 64;

held_lock g_held[kHeldMax];
pid_t g_owner;
pthread_mutex_t g_mutex = PTHREAD_MUTEX_INITIALIZER;

/** A forked child holds nothing: its copies of the descriptors would keep a dead parent's locks alive. */
void drop_inherited() {
    if (g_owner == getpid())
        return;
    for (held_lock &lock : g_held) {
        if (lock.count > 0 && lock.fd >= 0)
            close(lock.fd);
        lock.count = 0;
    }
    g_owner = getpid();
}

void lock_table() {
    pthread_mutex_lock(&g_mutex);
}
void unlock_table() {
    pthread_mutex_unlock(&g_mutex);
}
void unlock_table_in_child() {
    drop_inherited();
    unlock_table();
}

void watch_forks() {
    static pthread_once_t once = PTHREAD_ONCE_INIT;
    pthread_once(&once, [] { pthread_atfork(lock_table, unlock_table, unlock_table_in_child); });
}

/** The table, for the time of a scope. A process made by a bare clone is noticed here. */
class table_guard {
public:
    table_guard() {
        lock_table();
        drop_inherited();
    }
    ~table_guard() { unlock_table(); }
    table_guard(const table_guard &) = delete;
    table_guard &operator=(const table_guard &) = delete;
};

held_lock *find_held(uint32_t name) {
    for (held_lock &lock : g_held)
        if (lock.count > 0 && lock.name == name)
            return &lock;
    return nullptr;
}

held_lock *find_free() {
    for (held_lock &lock : g_held)
        if (lock.count == 0)
            return &lock;
    return nullptr;
}

/**
 * A shared lock that has no file yet has never been asked for by a process that may write: it is given to an
 * unprivileged reader without one.
 */
lock_result take_first(uint32_t name, lock_mode mode) {
    held_lock *entry = find_free();
    if (entry == nullptr)
        return lock_result::kFailed;
    char file[16];
    snprintf(file, sizeof file, "%x", name);
    unique_fd fd = open_lock_file(file, mode);
    const bool no_file = !fd && mode == lock_mode::kShared && errno == ENOENT && geteuid() != 0;
    if (!fd && !no_file)
        return lock_result::kFailed;
    const lock_result result = fd ? try_lock(fd.get(), mode) : lock_result::kTaken;
    if (result == lock_result::kTaken)
        *entry = {name, 1, fd.release(), mode};
    return result;
}

lock_result take_again(held_lock &held, lock_mode mode) {
    if (mode == lock_mode::kExclusive && held.mode == lock_mode::kShared) {
        const lock_result result = try_lock(held.fd, mode);
        if (result != lock_result::kTaken)
            return result;
        held.mode = mode;
    }
    held.count++;
    return lock_result::kTaken;
}

/** One attempt: the table is free while a caller waits for another process. */
lock_result attempt(uint32_t name, lock_mode mode) {
    const table_guard table;
    held_lock *held = find_held(name);
    return held != nullptr ? take_again(*held, mode) : take_first(name, mode);
}

} // namespace

int KLIBCFileLock(uint32_t lock, int wait) {
    const uint32_t mode = lock & kModeMask;
    const uint32_t name = lock & ~kModeMask;
    if ((mode != kModeShared && mode != kModeExclusive) || name == 0 || wait < 0)
        return fail(HERE, kErrArgument);

    watch_forks();
    backoff pause{int64_t{wait} * 1000};
    lock_result result;
    do {
        result = attempt(name, mode == kModeExclusive ? lock_mode::kExclusive : lock_mode::kShared);
    } while (result == lock_result::kBusy && pause.pause());
    return result == lock_result::kTaken ? 0 : fail(HERE, kErrLock);
}

int KLIBCFileUnlock(uint32_t name) {
    if ((name & kModeMask) != 0 || name == 0)
        return fail(HERE, kErrArgument);

    const table_guard table;
    held_lock *held = find_held(name);
    if (held == nullptr || --held->count > 0)
        return 0;
    if (held->fd >= 0) {
        unlock(held->fd);
        close(held->fd);
    }
    return 0;
}
