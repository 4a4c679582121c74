/** @file How every program is started: no shell, nothing inherited but the environment and the working directory. */
#ifndef KOVA_PLATFORM_LAUNCH_H
#define KOVA_PLATFORM_LAUNCH_H

#include <unistd.h>

#include "common/guard.h"

namespace kova {

/** What the shells say of a program that cannot be executed. */
constexpr int kNotExecutable = 127;
constexpr int kNoProcess = -1;

struct launch {
    const char *program;
    const char *const *argv; // NULL-terminated
    char *const *environment = environ;
    int standard_input = -1;  // below 0: /dev/null; only one of the two may be given
    int standard_output = -1; // below 0: /dev/null
    bool own_group = false;   // leads a process group of its own
};

struct started {
    pid_t pid;   // above 0 when it runs; it must be waited for
    int failure; // 0, kNotExecutable or kNoProcess
};

/** Starts a program. The caller's memory is shared until it runs, not copied: the cost does not grow with it. */
started start_program(const launch &what);

/** Starts a program that nobody waits for: it is handed to init. @return 0, kNotExecutable or kNoProcess */
int start_detached(const launch &what);

/** Waits for a program. @return exit status, 128 + signal, or kNoProcess when somebody else has reaped it */
int wait_for_program(pid_t pid);

/** Waits at most so long, then ends the program's process group: by SIGTERM, and a little later by SIGKILL. */
int wait_for_program(pid_t pid, int limit_ms);

/** The command as one line, for the log; NULL unless trace_commands="yes" in /etc/kova/platform.conf. */
heap_ptr<char> trace_command(const char *const *argv);
/** Logs that a traced command gave a status; nothing for NULL. */
void trace_result(const char *command, int status);

} // namespace kova

#endif
