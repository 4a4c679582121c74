#include "core/report.h"

#include "core/guards.h"

#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <kova/core.h>

namespace kova {

namespace {

/** Writes how a line begins. */
void begin_line(const place &at, char *out, size_t size) {
    switch (at.begin) {
    case lead::unit:
        snprintf(out, size, "%s:%d ", at.unit, at.line);
        break;
    case lead::unit_spaced:
        snprintf(out, size, "%s (%d) ", at.unit, at.line);
        break;
    case lead::function:
        snprintf(out, size, "%s(%d) ", at.function, at.line);
        break;
    case lead::function_colon:
        snprintf(out, size, "%s(%d): ", at.function, at.line);
        break;
    case lead::unit_function:
        snprintf(out, size, "%s %s(%d): ", at.unit, at.function, at.line);
        break;
    case lead::none:
        break;
    }
}

#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
/**
 * The place becomes part of the format, so that a message of any length is logged in one piece. Unit and function names
 * hold no percent sign.
 */
[[gnu::format(printf, 3, 0)]] void log_line(int level, const place &at, const char *format, va_list arguments) {
    const errno_keeper keep;
    char whole[1024] = "";
    begin_line(at, whole, sizeof whole);
    const size_t used = strlen(whole);
    snprintf(whole + used, sizeof whole - used, "%s", format);
    keep.restore(); // for %m
    vsyslog(level, whole, arguments);
}
#pragma GCC diagnostic pop

/** Sets the register without losing errno. */
void set_code(const place &at, uint32_t code) {
    const errno_keeper keep;
    KLIBCErrSetEx(code, at.unit, at.line);
}

} // namespace

#define KOVA_LOG_LINE(level)                                                                                           \
    va_list arguments;                                                                                                 \
    va_start(arguments, format);                                                                                       \
    log_line(level, at, format, arguments);                                                                            \
    va_end(arguments)

void log_err(const place &at, const char *format, ...) {
    KOVA_LOG_LINE(LOG_ERR);
}

void log_warning(const place &at, const char *format, ...) {
    KOVA_LOG_LINE(LOG_WARNING);
}

void log_info(const place &at, const char *format, ...) {
    KOVA_LOG_LINE(LOG_INFO);
}

void log_debug(const place &at, const char *format, ...) {
    KOVA_LOG_LINE(LOG_DEBUG);
}

int fail(const place &at, uint32_t code, int result, const char *format, ...) {
    KOVA_LOG_LINE(LOG_ERR);
    set_code(at, code);
    return result;
}

int fail_keeping_code(const place &at, int result, const char *format, ...) {
    KOVA_LOG_LINE(LOG_ERR);
    return result;
}

int fail_quietly(const place &at, uint32_t code, int result) {
    set_code(at, code);
    return result;
}

int fail_lock(const place &at, int result) {
    return fail(at, NET_ERR_LOCK, result, "KLIBCFileLock() failed.(%X)", KLIBCErrGet());
}

int fail_socket(const place &at, int result) {
    return fail(at, NET_ERR_SOCKET, result, "Cannot open control socket");
}

void report_refused(const place &at, const char *condition) {
    fail(at, NET_ERR_BAD_PARAMETER, 0, "Invaild Argument (%s)=[%d]\n", condition, 0);
}

void report_refused(const place &at, const char *condition, const char *name) {
    char text[128];
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    snprintf(text, sizeof text, condition, name);
#pragma GCC diagnostic pop
    report_refused(at, text);
}

bool is_interface_name(const char *text) {
    constexpr size_t kLongest = 235; // its "ifcfg-", backed up with ".tmp" and the time, is still one name
    for (const char *c = text; *c != '\0'; ++c) {
        const auto byte = static_cast<unsigned char>(*c);
        if (byte <= ' ' || byte == 0x7f || byte == '/') {
            return false;
        }
    }
    return *text != '\0' && strcmp(text, ".") != 0 && strcmp(text, "..") != 0 && strlen(text) <= kLongest;
}

} // namespace kova
