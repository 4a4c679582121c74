#include "kova/core.h"

#include <cstdarg>

#include "common/arguments.h"
#include "common/report.h"
#include "kovacore/launch.h"

using namespace kova;

namespace {

constexpr int kQuietWaiting = 0xBB;

bool is_bad_program(const char *program) {
    return program == nullptr || *program != '/';
}

int start_and_wait(const launch &what) {
    const started child = start_program(what);
    if (child.failure != 0)
        return fail(HERE, kErrExec), child.failure;
    const int status = wait_for_program(child.pid);
    return status == kNoProcess ? fail(HERE, kErrExec) : status;
}

int start_only(const launch &what) {
    const int failure = start_detached(what);
    if (failure != 0)
        fail(HERE, kErrExec);
    return failure;
}

/** Runs, and notes the run when commands are traced. */
int run(const char *program, const char *const *argv, bool wait = true) {
    const launch what = {.program = program, .argv = argv};
    const heap_ptr<char> trace = trace_command(argv);
    const int status = wait ? start_and_wait(what) : start_only(what);
    trace_result(trace.get(), status);
    return status;
}

} // namespace

int KLIBCExec(const char *szProgram, const char *szArg1, const char *szArg2, const char *szArg3, const char *szArg4) {
    if (is_bad_program(szProgram))
        return fail(HERE, kErrArgument);
    const char *const argv[] = {szProgram, szArg1, szArg2, szArg3, szArg4, nullptr};
    return run(szProgram, argv);
}

int KLIBCExecl(const char *szProgram, int flags, ...) {
    if (is_bad_program(szProgram) || flags != kQuietWaiting)
        return fail(HERE, kErrArgument);

    va_list list;
    va_start(list, flags);
    const heap_ptr<const char *> argv = make_argv(szProgram, list);
    va_end(list);
    if (!argv)
        return fail(HERE, kErrMemory);
    return run(szProgram, argv.get());
}

int KLIBCExecv(const char *szProgram, const char *const *ppszArg, int wait) {
    if (is_bad_program(szProgram) || ppszArg == nullptr || ppszArg[0] == nullptr || (wait != 0 && wait != 1))
        return fail(HERE, kErrArgument);
    return run(szProgram, ppszArg, wait == 1);
}
