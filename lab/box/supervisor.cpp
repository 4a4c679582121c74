#include "supervisor.h"

#include "channel.h"
#include "init.h"
#include "system.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <poll.h>
#include <sched.h>
#include <stdexcept>
#include <sys/signalfd.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>

namespace kova {

namespace {

constexpr std::array kEndingSignals{SIGHUP, SIGINT, SIGQUIT, SIGTERM};

// Everything in a box is a child of its first process, which lives in a PID namespace of its own: when it ends, the
// kernel ends all others, and with them go the mounts and networks that only they used. An ordinary user gets the right
// to make such namespaces from a user namespace, in which that user is root. Returns whether it is such a box.
bool enter_pid_namespace() {
    if (unshare(CLONE_NEWPID) == 0) {
        return false;
    }
    const std::string uid = std::to_string(geteuid());
    const std::string gid = std::to_string(getegid());
    require(unshare(CLONE_NEWUSER | CLONE_NEWPID) == 0, "cannot make a PID namespace, nor one in a user namespace");
    write_file("/proc/self/setgroups", "deny");
    write_file("/proc/self/uid_map", "0 " + uid + " 1");
    write_file("/proc/self/gid_map", "0 " + gid + " 1");
    return true;
}

terminal_use terminal_of_caller() {
    if (!isatty(STDIN_FILENO) || !isatty(STDOUT_FILENO)) {
        return terminal_use::none;
    }
    return tcgetpgrp(STDIN_FILENO) == getpgrp() ? terminal_use::foreground : terminal_use::background;
}

// Ends kova-box as it was told to, so that a shell script around stops too.
void end_by(int ending_signal) {
    sigset_t all;
    sigfillset(&all);
    signal(ending_signal, SIG_DFL);
    sigprocmask(SIG_UNBLOCK, &all, nullptr);
    raise(ending_signal);
}

class supervisor {
public:
    supervisor(pid_t box, int ending, unique_fd channel, unique_fd signals, terminal_use use)
        : box_(box), ending_(ending), channel_(std::move(channel)), signals_(std::move(signals)), use_(use) {}

    // Waits for the end of the box. Returns its exit status.
    int wait();

private:
    void on_signal();
    void on_message();
    void take_terminal_back();
    void end_box() { kill(box_, ending_); }

    pid_t box_;
    int ending_;
    unique_fd channel_;
    unique_fd signals_;
    terminal_use use_;
    int ended_by_ = 0; // signal that kova-box was told to end by, SIGALRM at the end of the command's time
};

void supervisor::take_terminal_back() {
    if (use_ == terminal_use::foreground) {
        tcsetpgrp(STDIN_FILENO, getpgrp());
    }
}

void supervisor::on_signal() {
    signalfd_siginfo info;
    if (read(signals_.get(), &info, sizeof info) == sizeof info && info.ssi_signo != SIGCHLD) {
        ended_by_ = static_cast<int>(info.ssi_signo);
        end_box();
    }
}

// The command stopped: so does kova-box, as if the terminal had stopped it, until a shell lets it go on. A command that
// only wanted the terminal gets it when kova-box was brought to the foreground meanwhile.
void supervisor::on_message() {
    char message = 0;
    if (read(channel_.get(), &message, 1) != 1 || message != kStopped) {
        return;
    }
    if (use_ == terminal_use::foreground || terminal_of_caller() != terminal_use::foreground) {
        take_terminal_back();
        kill(0, SIGTSTP);
    }
    use_ = terminal_of_caller();
    const char answer = use_ == terminal_use::foreground ? kContinueForeground : kContinue;
    if (write(channel_.get(), &answer, 1) != 1) {
        end_box();
    }
}

int supervisor::wait() {
    int status = 0;
    pid_t ended = 0;
    while ((ended = waitpid(box_, &status, WNOHANG)) == 0) {
        std::array<pollfd, 2> sources{{{signals_.get(), POLLIN, 0}, {channel_.get(), POLLIN, 0}}};
        if (poll(sources.data(), sources.size(), -1) < 0 && errno != EINTR) {
            end_box();
        }
        if (sources[0].revents != 0) {
            on_signal();
        } else if ((sources[1].revents & POLLIN) != 0) {
            on_message();
        }
    }
    take_terminal_back();
    require(ended == box_, "cannot wait for the box");
    if (ended_by_ == SIGALRM) {
        fputs("kova-box: the command took too long\n", stderr);
        return kTookTooLong;
    }
    if (ended_by_ != 0) {
        end_by(ended_by_);
    }
    return exit_status(status);
}

// The signals that are waited for, blocked from now on.
unique_fd open_signals() {
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGCHLD);
    sigaddset(&signals, SIGALRM);
    for (const int ending : kEndingSignals) {
        sigaddset(&signals, ending);
    }
    require(sigprocmask(SIG_BLOCK, &signals, nullptr) == 0, "cannot block signals");
    unique_fd fd{signalfd(-1, &signals, SFD_CLOEXEC | SFD_NONBLOCK)};
    require(fd.get() >= 0, "cannot wait for signals");
    return fd;
}

} // namespace

int supervise(const std::function<int(terminal_use use, const unique_fd &channel)> &work, int ending) {
    const terminal_use use = terminal_of_caller();
    unique_fd signals = open_signals();
    signal(SIGTTOU, SIG_IGN); // the terminal is given and taken by a process that does not own it
    signal(SIGPIPE, SIG_IGN);
    int ends[2];
    require(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) == 0, "cannot make a socket pair");
    unique_fd outside{ends[0]};
    unique_fd inside{ends[1]};

    const pid_t box = fork();
    require(box >= 0, "cannot make a process");
    if (box == 0) {
        outside = unique_fd{};
        _exit(work(use, inside));
    }
    inside = unique_fd{};
    return supervisor(box, ending, std::move(outside), std::move(signals), use).wait();
}

int run_box(const box_options &options) {
    const bool mapped = enter_pid_namespace();
    alarm(options.limit);
    return supervise(
        [&](terminal_use use, const unique_fd &channel) { return box_init(options, mapped, use, channel); }, SIGKILL);
}

} // namespace kova
