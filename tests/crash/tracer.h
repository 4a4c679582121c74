/**
 * @file
 * Stops a child at the beginning and at the end of each of its system calls, and kills it there when asked.
 */
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <string>
#include <sys/types.h>

namespace kova_test {

/** A system call of the traced process, where it stands now. */
struct system_call {
    pid_t pid;
    long number;
    std::array<uint64_t, 6> arguments;
    bool has_returned; ///< false: about to be made
    long result;       ///< below 0: -errno

    /** The text a pointer argument leads to. */
    [[nodiscard]] std::string text(size_t argument) const;
    /** What a descriptor argument stands for, as a path. */
    [[nodiscard]] std::string file(size_t argument) const;
};

/** Called at every stop; false kills the process there. */
using at_stop = std::function<bool(const system_call &)>;

enum class traced_end { kSucceeded, kFailed, kKilled, kNotTraced };

/**
 * Runs a function in a child of its own that is stopped at each system call the function makes. What the child has
 * started itself is not stopped, and is waited for before this returns.
 */
traced_end trace(const std::function<bool()> &function, const at_stop &visit);

} // namespace kova_test
