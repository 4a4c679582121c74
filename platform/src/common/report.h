/** @file How a platform unit reports a failure: its code, unit and line go to the error register. */
#ifndef KOVA_PLATFORM_REPORT_H
#define KOVA_PLATFORM_REPORT_H

#include "kova/core.h"

namespace kova {

enum error_code : uint32_t {
    kErrMemory = 0x200,
    kErrLock = 0x400,
    kErrFileOpen = 0x900,
    kErrFileWrite = 0xB00,
    kErrArgument = 0xD00,
    kErrRename = 0x2800,
    kErrExec = 0x2A00,
    kErrSyscall = 0x8100,
    kErrNotFound = 0xBC00,
};

struct place {
    const char *unit;
    int line;
};
#define HERE (::kova::place{KOVA_UNIT, __LINE__})

/** Sets the register; gives the failure value of most calls. */
inline int fail(place where, error_code code) {
    KLIBCErrSetEx(code, where.unit, where.line);
    return -1;
}

inline bool is_empty(const char *text) {
    return text == nullptr || *text == '\0';
}

/** Puts the register back as it was: for questions whose "no" is no failure. */
class register_keeper {
public:
    register_keeper() : code_(KLIBCErrGet()), file_(KLIBCErrorGetFile()), line_(KLIBCErrorGetLine()) {}
    ~register_keeper() { KLIBCErrSetEx(code_, file_, line_); }
    register_keeper(const register_keeper &) = delete;
    register_keeper &operator=(const register_keeper &) = delete;

private:
    uint32_t code_;
    const char *file_;
    int line_;
};

} // namespace kova

#endif
