#include "errors.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <iterator>
#include <kova/core.h>
#include <kovanetsdk/core.h>
#include <unistd.h>

namespace kova {
namespace {

struct known_code {
    uint32_t code;
    const char *name;
    const char *hint;
};

constexpr char kSeeLog[] = "run again with --verbose to see the library's log";

constexpr known_code kKnownCodes[] = {
    {NET_ERR_UNKNOWN, "NET_ERR_UNKNOWN", kSeeLog},
    {NET_ERR_OUT_OF_MEMORY, "NET_ERR_OUT_OF_MEMORY", "free some memory and try again"},
    {NET_ERR_LOCK, "NET_ERR_LOCK", "another program is changing the network; try again"},
    {NET_ERR_FILE_OPEN, "NET_ERR_FILE_OPEN", "check that the file is there and can be opened"},
    {NET_ERR_FILE_READ, "NET_ERR_FILE_READ", kSeeLog},
    {NET_ERR_FILE_WRITE, "NET_ERR_FILE_WRITE", "check the free space and that the file system can be written"},
    {NET_ERR_BAD_PARAMETER, "NET_ERR_BAD_PARAMETER", "the library refuses a value; check the command"},
    {NET_ERR_OUT_OF_RANGE, "NET_ERR_OUT_OF_RANGE", "the library refuses a value; check the command"},
    {NET_ERR_BAD_ADDRESS, "NET_ERR_BAD_ADDRESS", "try the address with kovanet check"},
    {NET_ERR_RENAME, "NET_ERR_RENAME", "check that the file system can be written"},
    {NET_ERR_EXEC, "NET_ERR_EXEC", "a system tool failed; run again with --verbose to see which"},
    {NET_ERR_SOCKET, "NET_ERR_SOCKET", "check that the interface still exists: kovanet link show"},
    {NET_ERR_IOCTL, "NET_ERR_IOCTL", "the kernel refused; check the interface: kovanet link show"},
    {NET_ERR_PARSE, "NET_ERR_PARSE", kSeeLog},
    {NET_ERR_SYSCALL, "NET_ERR_SYSCALL", "the kernel refused the value"},
    {NET_ERR_EXISTS, "NET_ERR_EXISTS", "it is there already"},
    {NET_ERR_NOT_FOUND, "NET_ERR_NOT_FOUND", "check the name: kovanet link show"},
    {NET_ERR_FULL, "NET_ERR_FULL", "remove an entry first"},
};

} // namespace

std::string textf(const char *format, ...) {
    char buffer[512];
    va_list arguments;
    va_start(arguments, format);
    vsnprintf(buffer, sizeof buffer, format, arguments);
    va_end(arguments);
    return buffer;
}

void clear_error() {
    KLIBCErrSetEx(0, "", 0);
}

void call_failed(const std::string &what) {
    const uint32_t code = KLIBCErrGet();
    if (code == 0) {
        throw failure{kCallFailed, what + ": failed without an error code; " + kSeeLog};
    }
    const auto *known = std::find_if(std::begin(kKnownCodes), std::end(kKnownCodes),
                                     [code](const known_code &entry) { return entry.code == code; });
    const bool found = known != std::end(kKnownCodes);
    throw failure{kCallFailed, what + textf(": %s (0x%X) in %s; %s", found ? known->name : "unknown code", code,
                                            KLIBCErrorGetFile(), found ? known->hint : kSeeLog)};
}

void require_root(const char *what) {
    if (geteuid() != 0) {
        throw failure{kNoPermission, std::string(what) + " needs root; run it as root or with sudo"};
    }
}

} // namespace kova
