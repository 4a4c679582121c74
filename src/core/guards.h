/**
 * @file
 * Owners of everything that has to be given back. Move-only, without implicit conversions; giving back keeps errno.
 */
#pragma once

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <kova/core.h>
#include <kova/plugin.h>
#include <memory>
#include <unistd.h>
#include <utility>

namespace kova {

/** Brings errno back when the scope ends. */
class errno_keeper {
public:
    errno_keeper() = default;
    errno_keeper(const errno_keeper &) = delete;
    errno_keeper &operator=(const errno_keeper &) = delete;
    ~errno_keeper() { restore(); }
    void restore() const { errno = saved_; }

private:
    int saved_ = errno;
};

/** Owns one handle; Kind says what no handle looks like and how one is given back. */
template<typename Kind> class owner {
public:
    using handle = decltype(Kind::none());

    owner() = default;
    explicit owner(handle held) : held_(held) {}
    owner(owner &&other) noexcept : held_(std::exchange(other.held_, Kind::none())) {}
    owner &operator=(owner &&other) noexcept {
        std::swap(held_, other.held_);
        return *this;
    }
    owner(const owner &) = delete;
    owner &operator=(const owner &) = delete;
    ~owner() {
        if (is_held()) {
            const errno_keeper keep;
            Kind::release(held_);
        }
    }

    [[nodiscard]] bool is_held() const { return held_ != Kind::none(); }
    [[nodiscard]] handle get() const { return held_; }
    /** The handle's place, for calls that fill one in. */
    [[nodiscard]] handle *out() { return &held_; }
    /** The handle, no longer owned. */
    [[nodiscard]] handle give_up() { return std::exchange(held_, Kind::none()); }

private:
    handle held_ = Kind::none();
};

struct descriptor_kind {
    static int none() { return -1; }
    static void release(int fd) { close(fd); }
};
using descriptor = owner<descriptor_kind>;

struct stream_kind {
    static FILE *none() { return nullptr; }
    static void release(FILE *file) { fclose(file); }
};
using stream = owner<stream_kind>;

/** Closes a stream that was written. @return whether all of it reached the file */
[[nodiscard]] inline bool close_written(stream &file) {
    const bool is_whole = ferror(file.get()) == 0;
    return fclose(file.give_up()) == 0 && is_whole;
}

/** A lock of KLIBCFileLockTimeByFile. */
struct file_lock_kind {
    static int none() { return -1; }
    static void release(int fd) { KLIBCFileUnlockByFile(fd); }
};
using file_lock = owner<file_lock_kind>;

/** A program whose output is read. */
struct process_stream_kind {
    static FILE *none() { return nullptr; }
    static void release(FILE *file) { KLIBCPclose(file); }
};
using process_stream = owner<process_stream_kind>;

struct string_list_kind {
    static KLIBSZLIST *none() { return nullptr; }
    static void release(KLIBSZLIST *list) { KLIBCSzListFree(list); }
};
using string_list = owner<string_list_kind>;

struct string_hash_kind {
    static KLIBSZHASH *none() { return nullptr; }
    static void release(KLIBSZHASH *hash) { KLIBCSzHashFree(hash); }
};
using string_hash = owner<string_hash_kind>;

struct plugin_kind {
    static uint64_t none() { return 0; }
    static void release(uint64_t handle) { KLIBPluginExit(handle); }
};
using plugin_handle = owner<plugin_kind>;

/** Memory from malloc, or from a call that says so. */
struct free_memory {
    void operator()(void *block) const { free(block); }
};
template<typename T> using heap = std::unique_ptr<T, free_memory>;

/** Capacity the library asks for unless a caller says otherwise. */
inline constexpr int kContainerCapacity = 1024;

inline string_list make_list(int capacity = kContainerCapacity) {
    return string_list{KLIBCSzListAlloc(capacity)};
}
inline string_hash make_hash(int capacity = kContainerCapacity) {
    return string_hash{KLIBCSzHashAlloc(capacity)};
}

/** Words of the named locks: the name in the upper bits, shared (5) or exclusive (6) in the lowest byte. */
inline constexpr uint32_t kConfigShared = 0x105;
inline constexpr uint32_t kConfigExclusive = 0x106;
/** The lock of /etc/kovainfo.conf, for calls that look at several of its keys. */
inline constexpr uint32_t kInfoShared = 0x805;
inline constexpr uint32_t kInfoExclusive = 0x806;
/** The name alone, as it is given back. */
inline constexpr uint32_t kConfigName = 0x100;
/** Longest wait for a named lock. */
inline constexpr int kLockWaitSeconds = 5;

/** Holds a named lock while it lives, if it could be had. */
class named_lock {
public:
    explicit named_lock(uint32_t word) : word_(word), result_(KLIBCFileLock(word, kLockWaitSeconds)) {}
    named_lock(const named_lock &) = delete;
    named_lock &operator=(const named_lock &) = delete;
    ~named_lock() {
        if (is_held()) {
            const errno_keeper keep;
            KLIBCFileUnlock(word_ & ~0xffU);
        }
    }
    [[nodiscard]] bool is_held() const { return result_ != -1; }
    /** Gives it back before its scope ends. @return what the unlock call answered */
    [[nodiscard]] int release() {
        result_ = -1;
        return KLIBCFileUnlock(word_ & ~0xffU);
    }
    /** What the lock call answered. */
    [[nodiscard]] int result() const { return result_; }

private:
    uint32_t word_;
    int result_;
};

} // namespace kova
