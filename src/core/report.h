/**
 * @file
 * How a failure is reported: one log line, the error register, the failure value, in one expression. errno outlives all
 * of it. A place is made by HERE or one of its siblings, which also choose how the log line begins.
 *
 *     return fail(HERE, NET_ERR_FILE_OPEN, -1, "Fail to open [%s], errno=[%d/%m]", path, errno);
 */
#pragma once

#include <cstdint>
#include <kovanetsdk/core.h>
#include <syslog.h>

namespace kova {

/** How a log line begins. */
enum class lead : unsigned char {
    none,           ///< nothing
    unit,           ///< "%s:%d ", unit and line
    unit_spaced,    ///< "%s (%d) ", unit and line
    function,       ///< "%s(%d) ", function and line
    function_colon, ///< "%s(%d): ", function and line
    unit_function,  ///< "%s %s(%d): ", unit, function and line
};

/** The point in the source that reports. */
struct place {
    const char *unit;
    const char *function;
    int line;
    lead begin;
};

// Only the preprocessor knows where it is.
#define HERE                                                                                                           \
    ::kova::place {                                                                                                    \
        KOVA_UNIT, __func__, __LINE__, ::kova::lead::unit                                                              \
    }
#define HERE_SPACED                                                                                                    \
    ::kova::place {                                                                                                    \
        KOVA_UNIT, __func__, __LINE__, ::kova::lead::unit_spaced                                                       \
    }
#define HERE_FUNCTION                                                                                                  \
    ::kova::place {                                                                                                    \
        KOVA_UNIT, __func__, __LINE__, ::kova::lead::function                                                          \
    }
#define HERE_FUNCTION_COLON                                                                                            \
    ::kova::place {                                                                                                    \
        KOVA_UNIT, __func__, __LINE__, ::kova::lead::function_colon                                                    \
    }
#define HERE_BARE                                                                                                      \
    ::kova::place {                                                                                                    \
        KOVA_UNIT, __func__, __LINE__, ::kova::lead::none                                                              \
    }
/** A place that reports under the name of another function. */
#define HERE_AS(name)                                                                                                  \
    ::kova::place {                                                                                                    \
        KOVA_UNIT, name, __LINE__, ::kova::lead::function                                                              \
    }
/** The same behind the unit's name. */
#define HERE_IN_UNIT_AS(name)                                                                                          \
    ::kova::place {                                                                                                    \
        KOVA_UNIT, name, __LINE__, ::kova::lead::unit_function                                                         \
    }

// What the register says, for log texts that end in "[0x%04X %s:%d]".
#define REGISTER KLIBCErrGet(), KLIBCErrorGetFile(), KLIBCErrorGetLine()

/** Writes one log line. */
[[gnu::format(printf, 2, 3)]] void log_err(const place &at, const char *format, ...);
[[gnu::format(printf, 2, 3)]] void log_warning(const place &at, const char *format, ...);
[[gnu::format(printf, 2, 3)]] void log_info(const place &at, const char *format, ...);
[[gnu::format(printf, 2, 3)]] void log_debug(const place &at, const char *format, ...);

/** Logs at LOG_ERR, sets the register and gives the result back. */
[[gnu::format(printf, 4, 5)]] int fail(const place &at, uint32_t code, int result, const char *format, ...);

/** Logs at LOG_ERR and gives the result back; the code of the step that failed stays in the register. */
[[gnu::format(printf, 3, 4)]] int fail_keeping_code(const place &at, int result, const char *format, ...);

/** Sets the register and gives the result back, without a log line. */
int fail_quietly(const place &at, uint32_t code, int result);

/** The configuration lock could not be had: logs the code of the lock and sets NET_ERR_LOCK. */
int fail_lock(const place &at, int result);

/** A socket for interface requests could not be had. */
int fail_socket(const place &at, int result);

/** Logs "Invaild Argument" with the condition that had to hold and sets NET_ERR_BAD_PARAMETER. */
void report_refused(const place &at, const char *condition);
/** The same with a condition about an argument's name. */
[[gnu::format(printf, 2, 0)]] void report_refused(const place &at, const char *condition, const char *name);

/** Argument checks: report and answer true when the argument is to be refused. */
[[nodiscard]] inline bool refuses(const place &at, bool holds, const char *condition) {
    if (!holds) {
        report_refused(at, condition);
    }
    return !holds;
}

/** A text that must be there. */
[[nodiscard]] inline bool refuses_null_text(const place &at, const char *name, const char *text) {
    if (text == nullptr) {
        report_refused(at, "((void *)0) != %s", name);
    }
    return text == nullptr;
}

/** A record or output that must be there. */
[[nodiscard]] inline bool refuses_null(const place &at, const char *name, const void *pointer) {
    if (pointer == nullptr) {
        report_refused(at, "NULL != %s", name);
    }
    return pointer == nullptr;
}

/** A text that must be there and must not be empty. */
[[nodiscard]] inline bool refuses_text(const place &at, const char *name, const char *text) {
    if (refuses_null_text(at, name, text)) {
        return true;
    }
    if (*text == '\0') {
        report_refused(at, "'\\0' != *%s", name);
    }
    return *text == '\0';
}

/** Whether a text can be one component of a path: no "/", blank or control character, neither "." nor "..". */
bool is_interface_name(const char *text);

/** The name of an interface that goes into a path: a text that names one component and nothing else. */
[[nodiscard]] inline bool refuses_ifname(const place &at, const char *name, const char *text) {
    if (refuses_text(at, name, text)) {
        return true;
    }
    const bool usable = is_interface_name(text);
    if (!usable) {
        report_refused(at, "is_interface_name(%s)", name);
    }
    return !usable;
}

} // namespace kova
