/** @file The argument vector of a call that takes a NULL-terminated list. */
#ifndef KOVA_PLATFORM_ARGUMENTS_H
#define KOVA_PLATFORM_ARGUMENTS_H

#include <cstdarg>

#include "common/guard.h"

namespace kova {

/** @return argv with the program in front, or NULL when memory runs out */
inline heap_ptr<const char *> make_argv(const char *program, va_list list) {
    va_list again;
    va_copy(again, list);
    size_t count = 1;
    while (va_arg(list, const char *) != nullptr)
        count++;
    heap_ptr<const char *> argv{static_cast<const char **>(malloc((count + 1) * sizeof(const char *)))};
    if (argv) {
        argv.get()[0] = program;
        for (size_t i = 1; i <= count; i++)
            argv.get()[i] = va_arg(again, const char *);
    }
    va_end(again);
    return argv;
}

} // namespace kova

#endif
