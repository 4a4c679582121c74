/**
 * @file
 * How kovanet ends: the exit codes, and the one line on standard error that goes with a failure.
 */
#pragma once

#include <string>

namespace kova {

/** Exit codes; scripts rely on them. */
enum exit_code {
    kDone = 0,         /**< done, or yes */
    kNo = 1,           /**< no, or an invalid value */
    kUsage = 2,        /**< the command line cannot be understood */
    kNotFound = 3,     /**< no such interface or address */
    kCallFailed = 4,   /**< the library could not do it */
    kNoPermission = 5, /**< only root may do it */
};

/** Thrown to end the program: its exit code and its line on standard error. */
struct failure {
    exit_code code;
    std::string text;
};

/** A text made as printf makes it. */
[[gnu::format(printf, 1, 2)]] std::string textf(const char *format, ...);

/** Forgets an earlier error, so that a call that reports none is not blamed for it. Goes before every library call
 * whose failure is shown. */
void clear_error();

/** Ends the program over a library call that failed: what was being done, the code by name and number, the unit that
 * reported it and what to do. */
[[noreturn]] void call_failed(const std::string &what);

/** Ends the program unless it runs as root. @param what  what needs it */
void require_root(const char *what = "changing the network");

} // namespace kova
