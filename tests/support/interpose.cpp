/**
 * @file
 * The replaced calls of the rig: same names, found before the real ones.
 */
#include "support/rig.h"

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <glob.h>
#include <kova/core.h>
#include <kova/plugin.h>
#include <map>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <syslog.h>
#include <time.h>
#include <unistd.h>

using kova_test::current_rig;
using kova_test::texts;

namespace {

/** The definition that this one stands before. */
template<typename Function> Function real(const char *name) {
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

bool is_failing(const char *operation, uint32_t code) {
    if (current_rig == nullptr || !current_rig->is_failing(operation)) {
        return false;
    }
    if (code != 0) {
        KLIBCErrSetEx(code, "platform", 1);
    }
    return true;
}

bool is_observing() {
    return current_rig != nullptr && current_rig->is_observing;
}

void count(const char *kind, int by) {
    if (is_observing()) {
        current_rig->held[kind] += by;
    }
}

std::string hexadecimal(uint32_t word) {
    char text[16];
    snprintf(text, sizeof text, "0x%X", word);
    return text;
}

} // namespace

#pragma GCC diagnostic ignored "-Wmissing-declarations"

/** A platform operation that only has to be able to fail. */
#define FAILING(type, name, parameters, arguments, failure, code)                                                      \
    extern "C" type name parameters {                                                                                  \
        static const auto next = real<type(*) parameters>(#name);                                                      \
        return is_failing(#name, code) ? (failure) : next arguments;                                                   \
    }

FAILING(int, KLIBCFileGetKeyValue, (const char *path, const char *key, char *value, int cb, int flags),
        (path, key, value, cb, flags), -1, 0x900)
FAILING(int, KLIBCFileSetKeyValue, (const char *path, const char *key, const char *value, const char *format),
        (path, key, value, format), -1, 0xB00)
FAILING(int, KLIBCFileSetKeys, (const char *path, const KLIBSZHASH *set, const KLIBSZHASH *removed, const char *format),
        (path, set, removed, format), -1, 0xB00)
FAILING(int, KLIBCFileRemoveKey, (const char *path, const char *key), (path, key), -1, 0xB00)
FAILING(int, KLIBCFileCheckKeyValue, (const char *path, const char *key, const char *value, int flags),
        (path, key, value, flags), -1, 0x900)
FAILING(int, KLIBCSzListPush, (KLIBSZLIST * *list, const char *item), (list, item), -1, 0x200)
FAILING(int, KLIBCSzHashSetValue, (KLIBSZHASH * hash, const char *key, const char *value), (hash, key, value), -1,
        0x200)
FAILING(int, KLIBCModuleIsLoad, (const char *module), (module), -1, 0x900)
FAILING(int, KLIBCFileEnumDir, (const char *dir, KLIBSZLIST *list, const char *prefix, int flags),
        (dir, list, prefix, flags), -1, 0x900)
FAILING(int, KLIBCFileGetLine, (const char *path, const char *prefix, char *line, int cb, int flags),
        (path, prefix, line, cb, flags), -1, 0x900)
FAILING(int, KLIBCFileAddLine, (const char *path, const char *marker, const char *line, int flags),
        (path, marker, line, flags), -1, 0xB00)
FAILING(int, KLIBCSzHashEnumKey, (const KLIBSZHASH *hash, KLIBSZLIST *list), (hash, list), -1, 0x200)
FAILING(const char *, KLIBCSzListGet, (const KLIBSZLIST *list, int index), (list, index), nullptr, 0)
FAILING(int, KLIBCFileReadLines, (const char *path, KLIBSZLIST *list), (path, list), -1, 0x900)

// ---- containers

extern "C" KLIBSZLIST *KLIBCSzListAlloc(int capacity) {
    static const auto next = real<KLIBSZLIST *(*)(int)>("KLIBCSzListAlloc");
    KLIBSZLIST *const list = is_failing("KLIBCSzListAlloc", 0x200) ? nullptr : next(capacity);
    count("lists", list != nullptr ? 1 : 0);
    return list;
}

extern "C" void KLIBCSzListFree(KLIBSZLIST *list) {
    static const auto next = real<void (*)(KLIBSZLIST *)>("KLIBCSzListFree");
    count("lists", list != nullptr ? -1 : 0);
    next(list);
}

extern "C" KLIBSZHASH *KLIBCSzHashAlloc(int capacity) {
    static const auto next = real<KLIBSZHASH *(*)(int)>("KLIBCSzHashAlloc");
    KLIBSZHASH *const hash = is_failing("KLIBCSzHashAlloc", 0x200) ? nullptr : next(capacity);
    count("hashes", hash != nullptr ? 1 : 0);
    return hash;
}

extern "C" void KLIBCSzHashFree(KLIBSZHASH *hash) {
    static const auto next = real<void (*)(KLIBSZHASH *)>("KLIBCSzHashFree");
    count("hashes", hash != nullptr ? -1 : 0);
    next(hash);
}

// ---- locks

extern "C" int KLIBCFileLock(uint32_t word, int wait) {
    static const auto next = real<int (*)(uint32_t, int)>("KLIBCFileLock");
    const int result = is_failing("KLIBCFileLock", 0x400) ? -1 : next(word, wait);
    if (is_observing() && result == 0) {
        current_rig->now.locks.push_back("+" + hexadecimal(word));
        count("named locks", 1);
    }
    return result;
}

extern "C" int KLIBCFileUnlock(uint32_t name) {
    static const auto next = real<int (*)(uint32_t)>("KLIBCFileUnlock");
    if (is_observing()) {
        current_rig->now.locks.push_back("-" + hexadecimal(name));
        count("named locks", -1);
    }
    return next(name);
}

extern "C" int KLIBCFileLockTimeByFile(const char *path, int mode, int seconds, int *fd) {
    static const auto next = real<int (*)(const char *, int, int, int *)>("KLIBCFileLockTimeByFile");
    if (is_failing("KLIBCFileLockTimeByFile", 0x400)) {
        *fd = -1;
        return -1;
    }
    const int result = next(path, mode, seconds, fd);
    if (is_observing() && result == 0) {
        current_rig->now.locks.push_back(std::string("file+") + path);
    }
    return result;
}

extern "C" int KLIBCFileUnlockByFile(int fd) {
    static const auto next = real<int (*)(int)>("KLIBCFileUnlockByFile");
    if (is_observing()) {
        current_rig->now.locks.emplace_back("file-");
    }
    const int result = next(fd);
    return is_failing("KLIBCFileUnlockByFile", 0xD00) ? 0 : result;
}

// ---- programs

namespace {

/** Notes a command and answers it; -2 asks for the real thing. */
int note_command(const texts &words, std::string *output) {
    return current_rig != nullptr ? current_rig->note_command(words, output) : -2;
}

int exec(const texts &words, int wait) {
    static const auto next = real<int (*)(const char *, const char *const *, int)>("KLIBCExecv");
    const int status = note_command(words, nullptr);
    if (status != -2) {
        return status;
    }
    std::vector<const char *> vector;
    for (const std::string &word : words) {
        vector.push_back(word.c_str());
    }
    vector.push_back(nullptr);
    return next(vector[0], vector.data(), wait);
}

texts collect(const char *program, va_list list) {
    texts words{program};
    for (const char *word = va_arg(list, const char *); word != nullptr; word = va_arg(list, const char *)) {
        words.emplace_back(word);
    }
    return words;
}

struct answered_stream {
    int status;
    bool is_real;
};
std::map<FILE *, answered_stream> streams;

} // namespace

extern "C" int KLIBCExec(const char *program, const char *a1, const char *a2, const char *a3, const char *a4) {
    texts words{program};
    for (const char *word : {a1, a2, a3, a4}) {
        if (word == nullptr) {
            break;
        }
        words.emplace_back(word);
    }
    return exec(words, 1);
}

extern "C" int KLIBCExecl(const char *program, int flags, ...) {
    va_list list;
    va_start(list, flags);
    const texts words = collect(program, list);
    va_end(list);
    EXPECT_EQ(0xBB, flags) << program;
    return exec(words, 1);
}

extern "C" int KLIBCExecv(const char *program, const char *const *vector, int wait) {
    texts words;
    for (const char *const *word = vector; *word != nullptr; ++word) {
        words.emplace_back(*word);
    }
    EXPECT_EQ(program, words.at(0));
    return exec(words, wait);
}

extern "C" FILE *KLIBCPopen(const char *program, const char *mode, ...) {
    static const auto next = real<FILE *(*)(const char *, const char *, ...)>("KLIBCPopen");
    va_list list;
    va_start(list, mode);
    const texts words = collect(program, list);
    va_end(list);
    std::string output;
    const int status = note_command(words, &output);
    if (is_failing("KLIBCPopen", 0x2A00)) {
        return nullptr;
    }
    FILE *stream = nullptr;
    if (status != -2) {
        stream = tmpfile();
        fputs(output.c_str(), stream);
        rewind(stream);
    } else {
        const char *argument[8] = {};
        for (size_t i = 1; i < words.size() && i < 8; ++i) {
            argument[i - 1] = words[i].c_str();
        }
        stream = next(program, mode, argument[0], argument[1], argument[2], argument[3], argument[4], argument[5],
                      argument[6], nullptr);
    }
    if (stream != nullptr) {
        streams[stream] = {status, status == -2};
        count("program streams", 1);
    }
    return stream;
}

extern "C" int KLIBCPclose(FILE *stream) {
    static const auto next = real<int (*)(FILE *)>("KLIBCPclose");
    const auto found = streams.find(stream);
    if (found == streams.end()) {
        return next(stream);
    }
    const answered_stream answered = found->second;
    streams.erase(found);
    count("program streams", -1);
    if (answered.is_real) {
        return next(stream);
    }
    fclose(stream);
    return answered.status;
}

// ---- events

namespace {

struct open_event {
    std::string name;
    std::string arguments;
};
std::map<uint64_t, open_event> events;

/** True while the platform sets a text on behalf of another setter: that is no argument of its own. */
bool is_setting = false;

int set_argument(const char *operation, uint64_t handle, const std::string &text) {
    if (is_failing(operation, 0x200)) {
        return -1;
    }
    EXPECT_TRUE(events.count(handle)) << operation << " on a handle that is not open";
    events[handle].arguments += " " + text;
    return 0;
}

} // namespace

extern "C" int KLIBPluginSDKInit(const char *component, const char *event, uint64_t *handle) {
    static const auto next = real<int (*)(const char *, const char *, uint64_t *)>("KLIBPluginSDKInit");
    if (is_failing("KLIBPluginSDKInit", 0x200)) {
        return -1;
    }
    const int result = next(component, event, handle);
    if (result >= 0) {
        EXPECT_EQ("net", std::string(component));
        events[*handle] = {event, ""};
        count("event handles", 1);
    }
    return result;
}

extern "C" int KLIBPluginSetArg(uint64_t handle, const char *key, const char *value) {
    static const auto next = real<int (*)(uint64_t, const char *, const char *)>("KLIBPluginSetArg");
    const int result = next(handle, key, value);
    return result < 0 || is_setting ? result : set_argument("KLIBPluginSetArg", handle, std::string(key) + "=" + value);
}

extern "C" int KLIBPluginSetArgByInt(uint64_t handle, const char *key, int value) {
    static const auto next = real<int (*)(uint64_t, const char *, int)>("KLIBPluginSetArgByInt");
    is_setting = true;
    const int result = next(handle, key, value);
    is_setting = false;
    return result < 0 ? result
                      : set_argument("KLIBPluginSetArgByInt", handle, std::string(key) + "=" + std::to_string(value));
}

extern "C" int KLIBPluginSetArgByArray(uint64_t handle, const char *key, const char *const *values, int number) {
    static const auto next = real<int (*)(uint64_t, const char *, const char *const *, int)>("KLIBPluginSetArgByArray");
    const int result = next(handle, key, values, number);
    std::string text = std::string(key) + "=[";
    for (int i = 0; result >= 0 && i < number; ++i) {
        text += (i == 0 ? "" : " ") + std::string(values[i]);
    }
    return result < 0 ? result : set_argument("KLIBPluginSetArgByArray", handle, text + "]");
}

extern "C" int KLIBPluginAction(int phase, uint64_t handle) {
    const bool failing = is_failing("KLIBPluginAction", 0x2A00);
    EXPECT_TRUE(events.count(handle)) << "KLIBPluginAction on a handle that is not open";
    if (current_rig != nullptr) {
        current_rig->now.events.push_back(events[handle].name + " " + std::to_string(phase) + events[handle].arguments);
    }
    return failing ? -1 : 0;
}

extern "C" int KLIBPluginExit(uint64_t handle) {
    static const auto next = real<int (*)(uint64_t)>("KLIBPluginExit");
    count("event handles", events.erase(handle) != 0 ? -1 : 0);
    return next(handle);
}

// ---- log

namespace {

void note_log(int priority, const char *format, va_list list) {
    const int saved = errno;
    char line[32768];
    errno = saved;
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    vsnprintf(line, sizeof line, format, list);
#pragma GCC diagnostic pop
    if (is_observing()) {
        current_rig->note_log(priority, line);
    }
}

} // namespace

extern "C" void vsyslog(int priority, const char *format, va_list list) {
    note_log(priority, format, list);
}

extern "C" void __vsyslog_chk(int priority, int, const char *format, va_list list) {
    note_log(priority, format, list);
}

extern "C" void syslog(int priority, const char *format, ...) {
    va_list list;
    va_start(list, format);
    note_log(priority, format, list);
    va_end(list);
}

extern "C" void __syslog_chk(int priority, int, const char *format, ...) {
    va_list list;
    va_start(list, format);
    note_log(priority, format, list);
    va_end(list);
}

// ---- kernel

extern "C" int ioctl(int fd, unsigned long request, ...) noexcept {
    static const auto next = real<int (*)(int, unsigned long, void *)>("ioctl");
    va_list list;
    va_start(list, request);
    void *const argument = va_arg(list, void *);
    va_end(list);
    if (is_observing() && current_rig->on_ioctl) {
        if (const std::optional<int> answer = current_rig->on_ioctl(request, argument)) {
            return *answer;
        }
    }
    return next(fd, request, argument);
}

extern "C" int socket(int domain, int type, int protocol) noexcept {
    static const auto next = real<int (*)(int, int, int)>("socket");
    if (is_failing("socket", 0)) {
        errno = EMFILE;
        return -1;
    }
    return next(domain, type, protocol);
}

// ---- paths

namespace {

std::string meant(const char *path) {
    return is_observing() && path != nullptr ? current_rig->redirected(path) : std::string(path != nullptr ? path : "");
}

int open_meant(const char *name, const char *path, int flags, mode_t mode) {
    if (is_failing("open", 0)) {
        errno = EMFILE;
        return -1;
    }
    return real<int (*)(const char *, int, ...)>(name)(meant(path).c_str(), flags, mode);
}

FILE *fopen_meant(const char *name, const char *path, const char *mode) {
    if (is_failing("fopen", 0)) {
        errno = EMFILE;
        return nullptr;
    }
    return real<FILE *(*)(const char *, const char *)>(name)(meant(path).c_str(), mode);
}

mode_t mode_of(int flags, va_list list) {
    return (flags & (O_CREAT | O_TMPFILE)) != 0 ? va_arg(list, mode_t) : 0;
}

} // namespace

extern "C" int open(const char *path, int flags, ...) {
    va_list list;
    va_start(list, flags);
    const mode_t mode = mode_of(flags, list);
    va_end(list);
    return open_meant("open", path, flags, mode);
}

extern "C" int open64(const char *path, int flags, ...) {
    va_list list;
    va_start(list, flags);
    const mode_t mode = mode_of(flags, list);
    va_end(list);
    return open_meant("open64", path, flags, mode);
}

extern "C" int __open_2(const char *path, int flags) {
    return open_meant("open", path, flags, 0);
}

extern "C" FILE *fopen(const char *path, const char *mode) {
    return fopen_meant("fopen", path, mode);
}

extern "C" FILE *fopen64(const char *path, const char *mode) {
    return fopen_meant("fopen64", path, mode);
}

extern "C" int access(const char *path, int mode) noexcept {
    return real<int (*)(const char *, int)>("access")(meant(path).c_str(), mode);
}

extern "C" int glob(const char *pattern, int flags, int (*on_error)(const char *, int), glob_t *found) noexcept {
    static const auto next = real<int (*)(const char *, int, int (*)(const char *, int), glob_t *)>("glob");
    return is_failing("glob", 0) ? GLOB_NOSPACE : next(pattern, flags, on_error, found);
}

extern "C" DIR *opendir(const char *path) {
    return real<DIR *(*)(const char *)>("opendir")(meant(path).c_str());
}

// ---- time

namespace {

int note_sleep(const timespec *wanted) {
    const long ms = wanted->tv_sec * 1000 + wanted->tv_nsec / 1000000;
    current_rig->slept_ms += ms;
    current_rig->now.sleeps.push_back(ms);
    if (current_rig->during_sleep) {
        current_rig->during_sleep(ms);
    }
    return 0;
}

} // namespace

extern "C" int nanosleep(const timespec *wanted, timespec *left) {
    static const auto next = real<int (*)(const timespec *, timespec *)>("nanosleep");
    return is_observing() ? note_sleep(wanted) : next(wanted, left);
}

extern "C" int clock_nanosleep(clockid_t clock, int flags, const timespec *wanted, timespec *left) {
    static const auto next = real<int (*)(clockid_t, int, const timespec *, timespec *)>("clock_nanosleep");
    return is_observing() ? note_sleep(wanted) : next(clock, flags, wanted, left);
}

extern "C" unsigned sleep(unsigned seconds) {
    const timespec wanted{static_cast<time_t>(seconds), 0};
    return is_observing() ? static_cast<unsigned>(note_sleep(&wanted)) : real<unsigned (*)(unsigned)>("sleep")(seconds);
}

extern "C" int usleep(useconds_t microseconds) {
    const timespec wanted{static_cast<time_t>(microseconds / 1000000),
                          static_cast<long>(microseconds % 1000000) * 1000};
    return is_observing() ? note_sleep(&wanted) : real<int (*)(useconds_t)>("usleep")(microseconds);
}

extern "C" int clock_gettime(clockid_t clock, timespec *now) noexcept {
    static const auto next = real<int (*)(clockid_t, timespec *)>("clock_gettime");
    const int result = next(clock, now);
    if (current_rig != nullptr) {
        now->tv_sec += current_rig->slept_ms / 1000;
    }
    return result;
}

/** The clock of the tests stands still. */
extern "C" time_t time(time_t *out) noexcept {
    static const auto next = real<time_t (*)(time_t *)>("time");
    if (!is_observing()) {
        return next(out);
    }
    constexpr time_t kNow = 1700000000;
    if (out != nullptr) {
        *out = kNow;
    }
    return kNow;
}

// ---- memory: a sanitizer owns these calls in its builds, and memory failures are then made by the containers alone

#ifndef __SANITIZE_ADDRESS__

extern "C" void *__libc_malloc(size_t);
extern "C" void *__libc_calloc(size_t, size_t);
extern "C" void *__libc_realloc(void *, size_t);

namespace {

/** Whether the library or the platform asks: the rig's own bookkeeping allocates, too. */
bool is_of_the_library(const void *caller) {
    Dl_info object;
    return dladdr(caller, &object) != 0 && strstr(object.dli_fname, "libkova") != nullptr;
}

bool is_memory_failing(const char *operation, const void *caller) {
    if (!is_observing() || !is_of_the_library(caller) || !current_rig->is_failing(operation)) {
        return false;
    }
    errno = ENOMEM;
    return true;
}

/** The C library's call under its public name, which is the one that a memory checker watches. */
template<typename Function> Function *allocator(Function *&found, Function *while_looking, const char *name) {
    static bool is_looking = false;
    if (found == nullptr && !is_looking) {
        is_looking = true;
        found = real<Function *>(name);
        is_looking = false;
    }
    return found != nullptr ? found : while_looking;
}

void *(*next_malloc)(size_t);
void *(*next_calloc)(size_t, size_t);
void *(*next_realloc)(void *, size_t);

} // namespace

extern "C" void *malloc(size_t size) noexcept {
    return is_memory_failing("malloc", __builtin_return_address(0))
               ? nullptr
               : allocator(next_malloc, __libc_malloc, "malloc")(size);
}

extern "C" void *calloc(size_t number, size_t size) noexcept {
    return is_memory_failing("calloc", __builtin_return_address(0))
               ? nullptr
               : allocator(next_calloc, __libc_calloc, "calloc")(number, size);
}

extern "C" void *realloc(void *block, size_t size) noexcept {
    return is_memory_failing("realloc", __builtin_return_address(0))
               ? nullptr
               : allocator(next_realloc, __libc_realloc, "realloc")(block, size);
}

#endif
