/**
 * @file
 * The replaced calls of the rig: same names, found before the real ones.
 */
#include "support/fault_points.h"

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <kova/core.h>
#include <kova/dhmx.h>
#include <kova/ha.h>
#include <kova/plugin.h>
#include <kova/service.h>
#include <linux/sockios.h>
#include <map>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <syslog.h>
#include <time.h>
#include <unistd.h>

using kova_test::can_fail;
using kova_test::current_points;
using kova_test::current_rig;
using kova_test::fault_point;
using kova_test::is_in_code_under_test;
using kova_test::rig_at_work;
using kova_test::texts;

namespace {

/** The definition that this one stands before. */
template<typename Function> Function real(const char *name) {
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

/** An operation of the platform, which only the library and the platform ask for. */
template<typename... Text> fault_point operation_point(const char *operation, const Text *...about) {
    return {operation, true, [&] {
                std::string detail;
                for (const char *text : {"", about...}) {
                    detail += (detail.empty() ? "" : " ") + std::string(text != nullptr ? text : "nothing");
                }
                return detail;
            }};
}

/** The same for one that the rig itself may ask for, too. */
fault_point path_point(const char *operation, const char *path, const void *caller) {
    return {operation, is_in_code_under_test(caller), [&] { return std::string(path); }};
}

/** Whether a test, or the sweep's plan, wants this call to fail; the register has the code then. */
bool is_failing(const fault_point &point, uint32_t code) {
    const rig_at_work guard;
    if (!point.fails() && (current_rig == nullptr || !current_rig->is_failing(point.operation()))) {
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
        const rig_at_work guard;
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

/**
 * A platform operation that only has to be able to fail; the texts tell one call of it from another. What only looks
 * into memory (KLIBCSzListGet, KLIBCSzHashGetValue, KLIBCStrTok and the like) has no way to fail.
 */
#define FAILING(type, name, parameters, arguments, about, failure, code)                                               \
    extern "C" type name parameters {                                                                                  \
        static const auto next = real<type(*) parameters>(#name);                                                      \
        const fault_point point = operation_point about;                                                               \
        return is_failing(point, code) ? (failure) : next arguments;                                                   \
    }                                                                                                                  \
    static const bool name##_can_fail = can_fail(#name);
FAILING(int, KLIBCFileGetKeyValue, (const char *path, const char *key, char *value, int cb, int flags),
        (path, key, value, cb, flags), ("KLIBCFileGetKeyValue", path, key), -1, 0x900)
FAILING(int, KLIBCFileSetKeyValue, (const char *path, const char *key, const char *value, const char *format),
        (path, key, value, format), ("KLIBCFileSetKeyValue", path, key), -1, 0xB00)
FAILING(int, KLIBCFileSetKeys, (const char *path, const KLIBSZHASH *set, const KLIBSZHASH *removed, const char *format),
        (path, set, removed, format), ("KLIBCFileSetKeys", path), -1, 0xB00)
FAILING(int, KLIBCFileRemoveKey, (const char *path, const char *key), (path, key), ("KLIBCFileRemoveKey", path, key),
        -1, 0xB00)
FAILING(int, KLIBCFileCheckKeyValue, (const char *path, const char *key, const char *value, int flags),
        (path, key, value, flags), ("KLIBCFileCheckKeyValue", path, key), -1, 0x900)
FAILING(int, KLIBCINFOSetKeyValue, (const char *key, const char *value), (key, value), ("KLIBCINFOSetKeyValue", key),
        -1, 0xB00)
FAILING(int, KLIBCINFORemoveKey, (const char *key), (key), ("KLIBCINFORemoveKey", key), -1, 0xB00)
FAILING(int, KLIBCFileExist, (const char *path), (path), ("KLIBCFileExist", path), 0, 0)
FAILING(int, KLIBCFileCheckDir, (const char *path), (path), ("KLIBCFileCheckDir", path), 0, 0)
FAILING(int, KLIBCFileTouch, (const char *path), (path), ("KLIBCFileTouch", path), -1, 0x900)
FAILING(int, KLIBCFileEnumDir, (const char *dir, KLIBSZLIST *list, const char *prefix, int flags),
        (dir, list, prefix, flags), ("KLIBCFileEnumDir", dir), -1, 0x900)
FAILING(int, KLIBCFileGetLine, (const char *path, const char *prefix, char *line, int cb, int flags),
        (path, prefix, line, cb, flags), ("KLIBCFileGetLine", path, prefix), -1, 0x900)
FAILING(int, KLIBCFileReadLines, (const char *path, KLIBSZLIST *list), (path, list), ("KLIBCFileReadLines", path), -1,
        0x900)
FAILING(int, KLIBCFileAddLine, (const char *path, const char *marker, const char *line, int flags),
        (path, marker, line, flags), ("KLIBCFileAddLine", path), -1, 0xB00)
FAILING(int, KLIBCFileReplaceSubStr, (const char *path, const char *from, const char *to), (path, from, to),
        ("KLIBCFileReplaceSubStr", path), -1, 0xB00)
FAILING(FILE *, KLIBCFileTempFileOpen, (char *path), (path), ("KLIBCFileTempFileOpen", path), nullptr, 0x900)
FAILING(int, KLIBCFileITmpName, (const char *target, char *name, int cb), (target, name, cb),
        ("KLIBCFileITmpName", target), -1, 0xD00)
FAILING(int, KLIBCSzListPush, (KLIBSZLIST * *list, const char *item), (list, item), ("KLIBCSzListPush", item), -1,
        0x200)
FAILING(int, KLIBCSzHashSetValue, (KLIBSZHASH * hash, const char *key, const char *value), (hash, key, value),
        ("KLIBCSzHashSetValue", key), -1, 0x200)
FAILING(int, KLIBCSzHashEnumKey, (const KLIBSZHASH *hash, KLIBSZLIST *list), (hash, list), ("KLIBCSzHashEnumKey"), -1,
        0x200)
FAILING(void *, reallocf, (void *block, size_t size), (block, size), ("reallocf"), (free(block), nullptr), 0)
FAILING(int, KLIBCModuleIsLoad, (const char *module), (module), ("KLIBCModuleIsLoad", module), -1, 0x900)
FAILING(int, KLIBCSupportDualhead, (), (), ("KLIBCSupportDualhead"), 0, 0)
FAILING(int, KLIBCCryptBufCrypt, (const void *in, int cbIn, void *out, int cbOut), (in, cbIn, out, cbOut),
        ("KLIBCCryptBufCrypt"), -1, 0x900)
FAILING(int, KLIBCPs, (const char *name, pid_t *pids, int number, int flags), (name, pids, number, flags),
        ("KLIBCPs", name), -1, 0x900)
FAILING(int, KLIBCReadPidFile, (const char *path), (path), ("KLIBCReadPidFile", path), -1, 0x900)
FAILING(int, KLIBCProcGetByPid, (pid_t pid, char *name, int cb), (pid, name, cb), ("KLIBCProcGetByPid"), -1, 0x900)
FAILING(int, KLIBCIsProcAlive, (const char *process), (process), ("KLIBCIsProcAlive", process), 0, 0)
FAILING(int, KLIBCKill, (const char *process, int number), (process, number), ("KLIBCKill", process), -1, 0x900)
FAILING(int, KOVAIsDockerHMX, (), (), ("KOVAIsDockerHMX"), 0, 0)
FAILING(int, KOVAHAIsRunning, (), (), ("KOVAHAIsRunning"), 0, 0)
FAILING(int, KOVAHAIsActive, (), (), ("KOVAHAIsActive"), 0, 0)
FAILING(int, KOVAHAGetHeartbeatIF, (char *name, int cb), (name, cb), ("KOVAHAGetHeartbeatIF"), -1, 0xBC00)
FAILING(int, KOVAHAGetRelatedIFInfo, (const char *name, char *ip, char *mask), (name, ip, mask),
        ("KOVAHAGetRelatedIFInfo", name), 0, 0)
FAILING(int, KOVAHAGetMac, (int index, char *mac, int cb), (index, mac, cb), ("KOVAHAGetMac"), -1, 0xBC00)
FAILING(int, KLIBPluginHasInit, (uint64_t handle), (handle), ("KLIBPluginHasInit"), 0, 0)
FAILING(int, KLIBServiceReload, (const char *service), (service), ("KLIBServiceReload", service), -1, 0x2A00)
FAILING(int, KLIBServiceIsRunning, (const char *service), (service), ("KLIBServiceIsRunning", service), 0, 0)
FAILING(int, KLIBServicectlJobStop, (const char *job), (job), ("KLIBServicectlJobStop", job), -1, 0x2A00)
FAILING(int, KLIBServicecfgRunKeyGet, (const char *service, int *run), (service, run),
        ("KLIBServicecfgRunKeyGet", service), -1, 0x900)

// ---- containers

extern "C" KLIBSZLIST *KLIBCSzListAlloc(int capacity) {
    static const auto next = real<KLIBSZLIST *(*)(int)>("KLIBCSzListAlloc");
    const fault_point point = operation_point("KLIBCSzListAlloc");
    KLIBSZLIST *const list = is_failing(point, 0x200) ? nullptr : next(capacity);
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
    const fault_point point = operation_point("KLIBCSzHashAlloc");
    KLIBSZHASH *const hash = is_failing(point, 0x200) ? nullptr : next(capacity);
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
    const fault_point point{"KLIBCFileLock", true, [&] { return hexadecimal(word); }};
    const int result = is_failing(point, 0x400) ? -1 : next(word, wait);
    if (is_observing() && result == 0) {
        const rig_at_work guard;
        current_rig->now.locks.push_back("+" + hexadecimal(word));
        count("named locks", 1);
    }
    return result;
}

extern "C" int KLIBCFileUnlock(uint32_t name) {
    static const auto next = real<int (*)(uint32_t)>("KLIBCFileUnlock");
    const fault_point point{"KLIBCFileUnlock", true, [&] { return hexadecimal(name); }};
    if (is_observing()) {
        const rig_at_work guard;
        current_rig->now.locks.push_back("-" + hexadecimal(name));
        count("named locks", -1);
    }
    const int result = next(name);
    return is_failing(point, 0xD00) ? -1 : result;
}

extern "C" int KLIBCFileLockTimeByFile(const char *path, int mode, int seconds, int *fd) {
    static const auto next = real<int (*)(const char *, int, int, int *)>("KLIBCFileLockTimeByFile");
    const fault_point point = operation_point("KLIBCFileLockTimeByFile", path);
    if (is_failing(point, 0x400)) {
        *fd = -1;
        return -1;
    }
    const int result = next(path, mode, seconds, fd);
    if (is_observing() && result == 0) {
        const rig_at_work guard;
        current_rig->now.locks.push_back(std::string("file+") + path);
    }
    return result;
}

extern "C" int KLIBCFileUnlockByFile(int fd) {
    static const auto next = real<int (*)(int)>("KLIBCFileUnlockByFile");
    const fault_point point = operation_point("KLIBCFileUnlockByFile");
    if (is_observing()) {
        const rig_at_work guard;
        current_rig->now.locks.emplace_back("file-");
    }
    const int result = next(fd);
    return is_failing(point, 0xD00) ? 0 : result;
}

// ---- programs

namespace {

/** Notes a command and answers it; -2 asks for the real thing. */
int note_command(const texts &words, std::string *output) {
    const rig_at_work guard;
    return current_rig != nullptr ? current_rig->note_command(words, output) : -2;
}

std::string joined(const texts &words) {
    std::string line;
    for (const std::string &word : words) {
        line += (line.empty() ? "" : " ") + word;
    }
    return line;
}

int exec(const char *operation, const texts &words, int wait) {
    static const auto next = real<int (*)(const char *, const char *const *, int)>("KLIBCExecv");
    const fault_point point{operation, true, [&] { return joined(words); }};
    const int status = note_command(words, nullptr);
    if (is_failing(point, 0x2A00)) {
        return current_points != nullptr && current_points->fails_otherwise() ? 1 : -1;
    }
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
    return exec("KLIBCExec", words, 1);
}

extern "C" int KLIBCExecl(const char *program, int flags, ...) {
    va_list list;
    va_start(list, flags);
    const texts words = collect(program, list);
    va_end(list);
    EXPECT_EQ(0xBB, flags) << program;
    return exec("KLIBCExecl", words, 1);
}

extern "C" int KLIBCExecv(const char *program, const char *const *vector, int wait) {
    texts words;
    for (const char *const *word = vector; *word != nullptr; ++word) {
        words.emplace_back(*word);
    }
    EXPECT_EQ(program, words.at(0));
    return exec("KLIBCExecv", words, wait);
}

extern "C" FILE *KLIBCPopen(const char *program, const char *mode, ...) {
    static const auto next = real<FILE *(*)(const char *, const char *, ...)>("KLIBCPopen");
    va_list list;
    va_start(list, mode);
    const texts words = collect(program, list);
    va_end(list);
    std::string output;
    const fault_point point{"KLIBCPopen", true, [&] { return joined(words); }};
    const int status = note_command(words, &output);
    if (is_failing(point, 0x2A00)) {
        return nullptr;
    }
    FILE *stream = nullptr;
    if (status != -2) {
        const rig_at_work guard;
        stream = tmpfile();
        fputs(output.c_str(), stream);
        rewind(stream);
        stream = kova_test::watched(stream, "r", "from " + words[0]);
    } else {
        const char *argument[8] = {};
        for (size_t i = 1; i < words.size() && i < 8; ++i) {
            argument[i - 1] = words[i].c_str();
        }
        stream = next(program, mode, argument[0], argument[1], argument[2], argument[3], argument[4], argument[5],
                      argument[6], nullptr);
    }
    if (stream != nullptr) {
        const rig_at_work guard;
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
    const fault_point point = operation_point("KLIBCPclose");
    const answered_stream answered = found->second;
    streams.erase(found);
    count("program streams", -1);
    if (!answered.is_real) {
        const rig_at_work guard;
        fclose(stream);
    }
    const int status = answered.is_real ? next(stream) : answered.status;
    return is_failing(point, 0) ? -1 : status;
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

void note_argument(uint64_t handle, const std::string &text) {
    const rig_at_work guard;
    EXPECT_TRUE(events.count(handle)) << text << " is set on a handle that is not open";
    events[handle].arguments += " " + text;
}

} // namespace

extern "C" int KLIBPluginSDKInit(const char *component, const char *event, uint64_t *handle) {
    static const auto next = real<int (*)(const char *, const char *, uint64_t *)>("KLIBPluginSDKInit");
    const fault_point point = operation_point("KLIBPluginSDKInit", event);
    if (is_failing(point, 0x200)) {
        return -1;
    }
    const int result = next(component, event, handle);
    if (result >= 0) {
        const rig_at_work guard;
        EXPECT_EQ(std::string(event) == "service" ? "service" : "net", std::string(component));
        events[*handle] = {event, ""};
        count("event handles", 1);
    }
    return result;
}

extern "C" int KLIBPluginSetArg(uint64_t handle, const char *key, const char *value) {
    static const auto next = real<int (*)(uint64_t, const char *, const char *)>("KLIBPluginSetArg");
    const fault_point point = operation_point("KLIBPluginSetArg", key);
    if (is_setting) {
        return point.fails() ? -1 : next(handle, key, value);
    }
    const int result = is_failing(point, 0x200) ? -1 : next(handle, key, value);
    if (result >= 0) {
        note_argument(handle, std::string(key) + "=" + value);
    }
    return result;
}

extern "C" int KLIBPluginSetArgByInt(uint64_t handle, const char *key, int value) {
    static const auto next = real<int (*)(uint64_t, const char *, int)>("KLIBPluginSetArgByInt");
    const fault_point point = operation_point("KLIBPluginSetArgByInt", key);
    is_setting = true;
    const int result = is_failing(point, 0x200) ? -1 : next(handle, key, value);
    is_setting = false;
    if (result >= 0) {
        note_argument(handle, std::string(key) + "=" + std::to_string(value));
    }
    return result;
}

extern "C" int KLIBPluginSetArgByArray(uint64_t handle, const char *key, const char *const *values, int number) {
    static const auto next = real<int (*)(uint64_t, const char *, const char *const *, int)>("KLIBPluginSetArgByArray");
    const fault_point point = operation_point("KLIBPluginSetArgByArray", key);
    const int result = is_failing(point, 0x200) ? -1 : next(handle, key, values, number);
    if (result >= 0) {
        note_argument(handle, std::string(key) + "=[" + joined(texts(values, values + number)) + "]");
    }
    return result;
}

extern "C" int KLIBPluginAction(int phase, uint64_t handle) {
    const fault_point point = operation_point("KLIBPluginAction", phase == KLIB_PLUGIN_PRE ? "before" : "after");
    const bool failing = is_failing(point, 0x2A00);
    const rig_at_work guard;
    EXPECT_TRUE(events.count(handle)) << "KLIBPluginAction on a handle that is not open";
    if (current_rig != nullptr) {
        current_rig->now.events.push_back(events[handle].name + " " + std::to_string(phase) + events[handle].arguments);
    }
    return failing ? -1 : 0;
}

extern "C" int KLIBPluginExit(uint64_t handle) {
    static const auto next = real<int (*)(uint64_t)>("KLIBPluginExit");
    const fault_point point = operation_point("KLIBPluginExit");
    count("event handles", events.erase(handle) != 0 ? -1 : 0);
    const int result = next(handle);
    return is_failing(point, 0xD00) ? -1 : result;
}

// ---- log

namespace {

void note_log(int priority, const char *format, va_list list) {
    const rig_at_work guard;
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

namespace {

/** The request and the interface it is about. */
std::string request_text(unsigned long request, const void *argument) {
    char text[64];
    const auto *const record = static_cast<const char *>(argument);
    const bool is_about_interface = request >= 0x8900 && request <= 0x89ff;
    const char *const name = request == SIOCGIFVLAN ? record + sizeof(int) : record;
    snprintf(text, sizeof text, "0x%lX %.16s", request, is_about_interface ? name : "");
    return text;
}

} // namespace

extern "C" int ioctl(int fd, unsigned long request, ...) noexcept {
    static const auto next = real<int (*)(int, unsigned long, void *)>("ioctl");
    va_list list;
    va_start(list, request);
    void *const argument = va_arg(list, void *);
    va_end(list);
    const fault_point point{"ioctl", is_in_code_under_test(__builtin_return_address(0)),
                            [&] { return request_text(request, argument); }};
    if (is_failing(point, 0)) {
        errno = EIO;
        return -1;
    }
    if (is_observing() && current_rig->on_ioctl) {
        const rig_at_work guard;
        if (const std::optional<int> answer = current_rig->on_ioctl(request, argument)) {
            return *answer;
        }
    }
    return next(fd, request, argument);
}

extern "C" int socket(int domain, int type, int protocol) noexcept {
    static const auto next = real<int (*)(int, int, int)>("socket");
    const fault_point point{"socket", is_in_code_under_test(__builtin_return_address(0)), [] { return std::string(); }};
    if (is_failing(point, 0)) {
        errno = EMFILE;
        return -1;
    }
    return next(domain, type, protocol);
}

extern "C" int setsockopt(int fd, int level, int option, const void *value, socklen_t size) noexcept {
    static const auto next = real<int (*)(int, int, int, const void *, socklen_t)>("setsockopt");
    const fault_point point{"setsockopt", is_in_code_under_test(__builtin_return_address(0)),
                            [&] { return std::to_string(option); }};
    if (is_failing(point, 0)) {
        errno = ENOPROTOOPT;
        return -1;
    }
    return next(fd, level, option, value, size);
}

extern "C" ssize_t sendto(int fd, const void *bytes, size_t size, int flags, const sockaddr *to, socklen_t length) {
    static const auto next = real<ssize_t (*)(int, const void *, size_t, int, const sockaddr *, socklen_t)>("sendto");
    const fault_point point{"sendto", is_in_code_under_test(__builtin_return_address(0)), [] { return std::string(); }};
    if (is_failing(point, 0)) {
        errno = ENOBUFS;
        return -1;
    }
    return next(fd, bytes, size, flags, to, length);
}

// ---- paths

namespace {

std::string meant(const char *path) {
    return is_observing() && path != nullptr ? current_rig->redirected(path) : std::string(path != nullptr ? path : "");
}

int open_meant(const char *name, const char *path, int flags, mode_t mode, const void *caller) {
    const fault_point point = path_point("open", path, caller);
    if (is_observing() && (flags & O_CREAT) != 0) {
        const rig_at_work guard;
        current_rig->made[path] = mode;
    }
    if (is_failing(point, 0)) {
        errno = EMFILE;
        return -1;
    }
    return real<int (*)(const char *, int, ...)>(name)(meant(path).c_str(), flags, mode);
}

FILE *fopen_meant(const char *name, const char *path, const char *mode, const void *caller) {
    const bool is_counted = is_in_code_under_test(caller);
    const fault_point point = path_point("fopen", path, caller);
    if (is_failing(point, 0)) {
        errno = EMFILE;
        return nullptr;
    }
    FILE *const stream = real<FILE *(*)(const char *, const char *)>(name)(meant(path).c_str(), mode);
    return is_counted ? kova_test::watched(stream, mode, path) : stream;
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
    return open_meant("open", path, flags, mode, __builtin_return_address(0));
}

extern "C" int open64(const char *path, int flags, ...) {
    va_list list;
    va_start(list, flags);
    const mode_t mode = mode_of(flags, list);
    va_end(list);
    return open_meant("open64", path, flags, mode, __builtin_return_address(0));
}

extern "C" int __open_2(const char *path, int flags) {
    return open_meant("open", path, flags, 0, __builtin_return_address(0));
}

extern "C" FILE *fopen(const char *path, const char *mode) {
    return fopen_meant("fopen", path, mode, __builtin_return_address(0));
}

extern "C" FILE *fopen64(const char *path, const char *mode) {
    return fopen_meant("fopen64", path, mode, __builtin_return_address(0));
}

extern "C" int access(const char *path, int mode) noexcept {
    const fault_point point = path_point("access", path, __builtin_return_address(0));
    if (is_failing(point, 0)) {
        errno = EACCES;
        return -1;
    }
    return real<int (*)(const char *, int)>("access")(meant(path).c_str(), mode);
}

extern "C" DIR *opendir(const char *path) {
    const fault_point point = path_point("opendir", path, __builtin_return_address(0));
    if (is_failing(point, 0)) {
        errno = EMFILE;
        return nullptr;
    }
    return real<DIR *(*)(const char *)>("opendir")(meant(path).c_str());
}

// ---- time

namespace {

int note_sleep(const timespec *wanted) {
    const rig_at_work guard;
    const long ms = wanted->tv_sec * 1000 + wanted->tv_nsec / 1000000;
    current_rig->slept_ms += ms;
    current_rig->now.sleeps.push_back(ms);
    if (current_rig->during_sleep) {
        current_rig->during_sleep(ms);
    }
    return 0;
}

/** A signal that is handled comes when half of the time is over. */
int interrupt_sleep(const timespec *wanted, timespec *left) {
    constexpr long kNanosecondsOfSecond = 1'000'000'000;
    const long half = (wanted->tv_sec * kNanosecondsOfSecond + wanted->tv_nsec) / 2;
    const timespec slept{half / kNanosecondsOfSecond, half % kNanosecondsOfSecond};
    note_sleep(&slept);
    if (left != nullptr) {
        *left = slept;
    }
    errno = EINTR;
    return -1;
}

} // namespace

extern "C" int nanosleep(const timespec *wanted, timespec *left) {
    static const auto next = real<int (*)(const timespec *, timespec *)>("nanosleep");
    if (is_observing() && current_points == nullptr && current_rig->is_failing("nanosleep")) {
        return interrupt_sleep(wanted, left);
    }
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

bool is_failing_in_a_test(const char *operation, const void *caller) {
    return is_observing() && current_points == nullptr && is_of_the_library(caller) &&
           current_rig->is_failing(operation);
}

/** Asks for memory, or answers that there is none; a sweep notes whether it is given back. */
template<typename Call>
void *allocate(const char *operation, const void *caller, const void *replaced, const Call &call) {
    const bool is_counted = kova_test::allocates_for_code_under_test(caller);
    const fault_point point{operation, is_counted, [] { return std::string(); }};
    if (point.fails() || is_failing_in_a_test(operation, caller)) {
        errno = ENOMEM;
        return nullptr;
    }
    void *const block = call();
    if (is_counted && block != nullptr) {
        const rig_at_work guard;
        current_points->blocks.erase(replaced);
        current_points->blocks.insert(block);
    }
    return block;
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
    return allocate("malloc", __builtin_return_address(0), nullptr,
                    [=] { return allocator(next_malloc, __libc_malloc, "malloc")(size); });
}

extern "C" void *calloc(size_t number, size_t size) noexcept {
    return allocate("calloc", __builtin_return_address(0), nullptr,
                    [=] { return allocator(next_calloc, __libc_calloc, "calloc")(number, size); });
}

extern "C" void *realloc(void *block, size_t size) noexcept {
    return allocate("realloc", __builtin_return_address(0), block,
                    [=] { return allocator(next_realloc, __libc_realloc, "realloc")(block, size); });
}

#endif

namespace {

const bool others_can_fail[] = {
    can_fail("KLIBCSzListAlloc"),
    can_fail("KLIBCSzHashAlloc"),
    can_fail("KLIBCFileLock"),
    can_fail("KLIBCFileUnlock"),
    can_fail("KLIBCFileLockTimeByFile"),
    can_fail("KLIBCFileUnlockByFile"),
    can_fail("KLIBCExec"),
    can_fail("KLIBCExecl"),
    can_fail("KLIBCExecv"),
    can_fail("KLIBCPopen"),
    can_fail("KLIBCPclose"),
    can_fail("KLIBPluginSDKInit"),
    can_fail("KLIBPluginSetArg"),
    can_fail("KLIBPluginSetArgByInt"),
    can_fail("KLIBPluginSetArgByArray"),
    can_fail("KLIBPluginAction"),
    can_fail("KLIBPluginExit"),
    can_fail("ioctl"),
    can_fail("socket"),
    can_fail("setsockopt"),
    can_fail("sendto"),
    can_fail("open"),
    can_fail("fopen"),
    can_fail("access"),
    can_fail("opendir"),
    can_fail("nanosleep"),
    can_fail("malloc"),
    can_fail("calloc"),
    can_fail("realloc"),
};

} // namespace
