#include "tracer.h"

#include <cerrno>
#include <csignal>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <sys/prctl.h>
#include <sys/ptrace.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

namespace kova_test {

namespace {

constexpr long kMark = 0x6b6f7661; // a process group that nobody asks about

/** Shows the tracer where the function begins and where it has ended. */
void mark() {
    syscall(SYS_getpgid, kMark);
}

[[noreturn]] void run_traced(const std::function<bool()> &function) {
    if (ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) < 0) {
        _exit(2);
    }
    raise(SIGSTOP);
    mark();
    const bool works = function();
    mark();
    _exit(works ? 0 : 1);
}

/** Follows one child from stop to stop. */
class tracer {
public:
    tracer(pid_t pid, const at_stop &visit) : visit_(visit) { now_.pid = pid; }

    traced_end run() {
        int status = 0;
        if (waitpid(now_.pid, &status, 0) != now_.pid || !WIFSTOPPED(status) || !begin()) {
            kill();
            return traced_end::kNotTraced;
        }
        while (next_stop(status)) {
            if (read_call() && is_inside() && !visit_(now_)) {
                kill();
                return traced_end::kKilled;
            }
        }
        return WIFEXITED(status) && WEXITSTATUS(status) == 0 ? traced_end::kSucceeded : traced_end::kFailed;
    }

private:
    bool begin() const {
        constexpr long kOptions = PTRACE_O_EXITKILL | PTRACE_O_TRACESYSGOOD;
        return ptrace(PTRACE_SETOPTIONS, now_.pid, nullptr, kOptions) == 0;
    }

    /** @return whether the child stands at a system call; false: it has ended */
    bool next_stop(int &status) const {
        constexpr int kSystemCall = SIGTRAP | 0x80;
        int signal = 0;
        do {
            ptrace(PTRACE_SYSCALL, now_.pid, nullptr, static_cast<long>(signal));
            if (waitpid(now_.pid, &status, 0) != now_.pid || !WIFSTOPPED(status)) {
                return false;
            }
            signal = WSTOPSIG(status); // SIGCHLD and the like are handed on
        } while (signal != kSystemCall);
        return true;
    }

    bool read_call() {
        __ptrace_syscall_info info = {};
        if (ptrace(PTRACE_GET_SYSCALL_INFO, now_.pid, sizeof info, &info) <= 0) {
            return false;
        }
        now_.has_returned = info.op == PTRACE_SYSCALL_INFO_EXIT;
        if (now_.has_returned) {
            now_.result = static_cast<long>(info.exit.rval);
            return true;
        }
        now_.number = static_cast<long>(info.entry.nr);
        std::copy(std::begin(info.entry.args), std::end(info.entry.args), now_.arguments.begin());
        return true;
    }

    /** Whether the stop lies between the marks. */
    bool is_inside() {
        if (now_.number != SYS_getpgid || now_.arguments[0] != static_cast<uint64_t>(kMark)) {
            return marks_ == 1;
        }
        marks_ += now_.has_returned ? 1 : 0;
        return false;
    }

    void kill() const {
        ::kill(now_.pid, SIGKILL);
        waitpid(now_.pid, nullptr, 0);
    }

    const at_stop &visit_;
    system_call now_ = {};
    int marks_ = 0;
};

} // namespace

std::string system_call::text(size_t argument) const {
    std::ifstream memory{"/proc/" + std::to_string(pid) + "/mem", std::ios::binary};
    memory.seekg(static_cast<std::streamoff>(arguments.at(argument)));
    std::string text;
    std::getline(memory, text, '\0');
    return text;
}

std::string system_call::file(size_t argument) const {
    std::error_code none;
    const auto fd = static_cast<int>(arguments.at(argument));
    return std::filesystem::read_symlink("/proc/" + std::to_string(pid) + "/fd/" + std::to_string(fd), none).string();
}

traced_end trace(const std::function<bool()> &function, const at_stop &visit) {
    prctl(PR_SET_CHILD_SUBREAPER, 1);
    fflush(nullptr);
    const pid_t pid = fork();
    if (pid == 0) {
        run_traced(function);
    }
    const traced_end end = pid > 0 ? tracer{pid, visit}.run() : traced_end::kNotTraced;
    while (wait(nullptr) > 0 || errno == EINTR) {
    }
    return end;
}

} // namespace kova_test
