#include "kovacore/launch.h"

#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <pthread.h>
#include <sched.h>
#include <spawn.h>
#include <sys/wait.h>
#include <syslog.h>

#include "common/backoff.h"
#include "common/platform_conf.h"

using namespace kova;

namespace {

constexpr int kTermGraceMs = 200;

/** What posix_spawn is told to do in the child: streams, signals, process group. */
class spawn_setup {
public:
    spawn_setup() {
        posix_spawn_file_actions_init(&actions_);
        posix_spawnattr_init(&attributes_);
    }
    ~spawn_setup() {
        posix_spawn_file_actions_destroy(&actions_);
        posix_spawnattr_destroy(&attributes_);
    }
    spawn_setup(const spawn_setup &) = delete;
    spawn_setup &operator=(const spawn_setup &) = delete;

    /** @return false when memory runs out */
    bool prepare(const launch &what) {
        sigset_t none;
        sigset_t all;
        sigemptyset(&none);
        sigfillset(&all);
        posix_spawnattr_setsigmask(&attributes_, &none);
        posix_spawnattr_setsigdefault(&attributes_, &all);
        const int group = what.own_group ? POSIX_SPAWN_SETPGROUP : 0;
        posix_spawnattr_setflags(&attributes_,
                                 static_cast<short>(POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF | group));
        // the given stream first: its descriptor may be the number of another stream
        return give(STDIN_FILENO, what.standard_input) && give(STDOUT_FILENO, what.standard_output) &&
               (what.standard_input >= 0 || give_null(STDIN_FILENO, O_RDONLY)) &&
               (what.standard_output >= 0 || give_null(STDOUT_FILENO, O_WRONLY)) &&
               give_null(STDERR_FILENO, O_WRONLY) &&
               posix_spawn_file_actions_addclosefrom_np(&actions_, STDERR_FILENO + 1) == 0;
    }

    /** @return errno of posix_spawn */
    int spawn(const launch &what, pid_t &pid) const {
        return posix_spawn(&pid, what.program, &actions_, &attributes_, const_cast<char *const *>(what.argv),
                           what.environment);
    }

private:
    bool give(int stream, int fd) { return fd < 0 || posix_spawn_file_actions_adddup2(&actions_, fd, stream) == 0; }
    bool give_null(int stream, int flags) {
        return posix_spawn_file_actions_addopen(&actions_, stream, "/dev/null", flags, 0) == 0;
    }

    posix_spawn_file_actions_t actions_;
    posix_spawnattr_t attributes_;
};

/** Leaves the reason in errno, as the other calls do. */
int failure_of(int error) {
    if (error == 0)
        return 0;
    errno = error;
    return error == EAGAIN || error == ENOMEM ? kNoProcess : kNotExecutable;
}

// A caller that ignores SIGCHLD gets no status of its children from the kernel: it does not while a program runs here.

pthread_mutex_t g_mutex = PTHREAD_MUTEX_INITIALIZER;
int g_running;
bool g_changed;
struct sigaction g_callers_action;

bool loses_status(const struct sigaction &action) {
    return action.sa_handler == SIG_IGN || (action.sa_flags & SA_NOCLDWAIT) != 0;
}

void keep_child_status() {
    pthread_mutex_lock(&g_mutex);
    if (g_running++ == 0) {
        sigaction(SIGCHLD, nullptr, &g_callers_action);
        g_changed = loses_status(g_callers_action);
        struct sigaction keeping = g_callers_action;
        keeping.sa_flags &= ~SA_NOCLDWAIT;
        if (keeping.sa_handler == SIG_IGN)
            keeping.sa_handler = SIG_DFL;
        if (g_changed)
            sigaction(SIGCHLD, &keeping, nullptr);
    }
    pthread_mutex_unlock(&g_mutex);
}

void give_back_child_signal() {
    pthread_mutex_lock(&g_mutex);
    if (--g_running == 0 && g_changed)
        sigaction(SIGCHLD, &g_callers_action, nullptr);
    pthread_mutex_unlock(&g_mutex);
}

int status_of(int wait_status) {
    return WIFSIGNALED(wait_status) ? 128 + WTERMSIG(wait_status) : WEXITSTATUS(wait_status);
}

/** @return whether the program has ended; its status, or kNoProcess, is stored then */
bool reap(pid_t pid, int options, int &status) {
    int wait_status = 0;
    pid_t ended;
    do {
        ended = waitpid(pid, &wait_status, options);
    } while (ended < 0 && errno == EINTR);
    status = ended > 0 ? status_of(wait_status) : kNoProcess;
    return ended != 0;
}

bool reap_within(pid_t pid, int limit_ms, int &status) {
    backoff pause{limit_ms};
    bool ended;
    do {
        ended = reap(pid, WNOHANG, status);
    } while (!ended && pause.pause());
    return ended;
}

struct orphan {
    const spawn_setup &setup;
    const launch &what;
    volatile int error; // what it stays when the process that starts it is killed first
};

/** Runs as a process of its own, on the memory of the caller, which stands still meanwhile. */
int start_orphan(void *argument) {
    auto &started = *static_cast<orphan *>(argument);
    pid_t program;
    started.error = started.setup.spawn(started.what, program);
    return 0;
}

} // namespace

started kova::start_program(const launch &what) {
    spawn_setup setup;
    if (!setup.prepare(what))
        return {0, kNoProcess};
    keep_child_status();
    pid_t pid = 0;
    const int failure = failure_of(setup.spawn(what, pid));
    if (failure == 0)
        return {pid, 0};
    give_back_child_signal();
    return {0, failure};
}

int kova::start_detached(const launch &what) {
    spawn_setup setup;
    if (!setup.prepare(what))
        return kNoProcess;
    alignas(16) char stack[size_t{64} * 1024];
    orphan started = {setup, what, EAGAIN};
    // on the caller's memory, a handler of the caller would run there a second time
    sigset_t all;
    sigset_t callers;
    sigfillset(&all);
    pthread_sigmask(SIG_SETMASK, &all, &callers);
    const pid_t parent = clone(start_orphan, stack + sizeof stack, CLONE_VM | CLONE_VFORK | SIGCHLD, &started);
    pthread_sigmask(SIG_SETMASK, &callers, nullptr);
    if (parent < 0)
        return kNoProcess;
    int status;
    reap(parent, 0, status);
    return failure_of(started.error);
}

int kova::wait_for_program(pid_t pid) {
    int status;
    reap(pid, 0, status);
    give_back_child_signal();
    return status;
}

int kova::wait_for_program(pid_t pid, int limit_ms) {
    int status;
    bool ended = reap_within(pid, limit_ms, status);
    if (!ended) {
        kill(-pid, SIGTERM);
        ended = reap_within(pid, kTermGraceMs, status);
        // also for what the program leaves behind in its group
        kill(-pid, SIGKILL);
    }
    if (!ended)
        reap(pid, 0, status);
    give_back_child_signal();
    return status;
}

heap_ptr<char> kova::trace_command(const char *const *argv) {
    if (!platform_says("trace_commands"))
        return nullptr;
    size_t size = 1;
    for (const char *const *argument = argv; *argument != nullptr; argument++)
        size += strlen(*argument) + 1;
    heap_ptr<char> line{static_cast<char *>(malloc(size))};
    if (!line)
        return nullptr;
    char *end = line.get();
    for (const char *const *argument = argv; *argument != nullptr; argument++)
        end = stpcpy(stpcpy(end, argument == argv ? "" : " "), *argument);
    return line;
}

void kova::trace_result(const char *command, int status) {
    const errno_keeper keep;
    if (command != nullptr)
        syslog(LOG_DEBUG, "run: %s -> %d", command, status);
}
