#include "init.h"

#include "kernel_files.h"
#include "network.h"
#include "private_root.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <filesystem>
#include <optional>
#include <poll.h>
#include <sched.h>
#include <sys/prctl.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace kova {

namespace fs = std::filesystem;

namespace {

void set_environment() {
    setenv("PATH", "/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin", 1);
    setenv("KOVA_BOX", "1", 1);
    const char *temporary = getenv("TMPDIR");
    if (temporary != nullptr && !fs::is_directory(temporary)) {
        unsetenv("TMPDIR"); // below the host's /tmp, which is not here
    }
}

void make_box(const box_options &options, bool mapped) {
    std::error_code gone;
    const fs::path working_directory = fs::current_path(gone);
    require(unshare(CLONE_NEWNS | CLONE_NEWUTS | CLONE_NEWIPC) == 0, "cannot make mount, UTS and IPC namespaces");
    require(sethostname(options.hostname.c_str(), options.hostname.size()) == 0, "cannot set the host name");
    const unique_fd other_side = enter_network_namespace(options);
    enter_private_root(options, mapped);
    write_file("/etc/hostname", options.hostname + "\n");
    set_environment();
    wire_network(options, other_side);
    add_kernel_files(options);
    if (gone || chdir(working_directory.c_str()) != 0) {
        require(chdir("/") == 0, "cannot enter /");
    }
}

// Becomes the command, with everything as a new program expects it.
[[noreturn]] void become_command(const std::vector<std::string> &command, terminal_use use) {
    if (use == terminal_use::none) {
        setsid(); // a signal to its process group must not reach processes outside
    } else {
        setpgid(0, 0);
    }
    if (use == terminal_use::foreground) {
        tcsetpgrp(STDIN_FILENO, getpid());
    }
    signal(SIGTTOU, SIG_DFL);
    signal(SIGPIPE, SIG_DFL);
    sigset_t none;
    sigemptyset(&none);
    sigprocmask(SIG_SETMASK, &none, nullptr);

    execvp(command[0].c_str(), argument_vector(command).data());
    const int error = errno;
    fprintf(stderr, "kova-box: cannot run %s: %s\n", command[0].c_str(), strerror(error));
    _exit(error == ENOENT ? kNotFound : kCannotExecute);
}

// Takes up the ends of all children. Returns the exit status of the command when it was among them.
std::optional<int> reap(pid_t command, const unique_fd &channel) {
    int status = 0;
    for (pid_t child = 0; (child = waitpid(-1, &status, WNOHANG | WUNTRACED)) > 0;) {
        if (child != command) {
            continue;
        }
        if (!WIFSTOPPED(status)) {
            return exit_status(status);
        }
        if (write(channel.get(), &kStopped, 1) != 1) {
            return kNoBox; // nobody is left to let it go on
        }
    }
    return std::nullopt;
}

// Follows a message of the supervisor. Returns false when the supervisor is gone.
bool obey(pid_t command, const unique_fd &channel) {
    char message = 0;
    if (read(channel.get(), &message, 1) != 1) {
        return false;
    }
    if (message == kContinueForeground) {
        tcsetpgrp(STDIN_FILENO, command);
    }
    kill(-command, SIGCONT);
    return true;
}

int watch(pid_t command, const unique_fd &channel) {
    sigset_t child_signal;
    sigemptyset(&child_signal);
    sigaddset(&child_signal, SIGCHLD);
    const unique_fd children{signalfd(-1, &child_signal, SFD_CLOEXEC | SFD_NONBLOCK)};
    require(children.get() >= 0, "cannot wait for signals");
    for (;;) {
        if (const std::optional<int> status = reap(command, channel)) {
            return *status;
        }
        std::array<pollfd, 2> sources{{{children.get(), POLLIN, 0}, {channel.get(), POLLIN, 0}}};
        if (poll(sources.data(), sources.size(), -1) < 0 && errno != EINTR) {
            return kNoBox;
        }
        signalfd_siginfo info;
        if (sources[0].revents != 0 && read(children.get(), &info, sizeof info) < 0 && errno != EAGAIN) {
            return kNoBox;
        }
        if (sources[1].revents != 0 && !obey(command, channel)) {
            return kNoBox;
        }
    }
}

} // namespace

int box_init(const box_options &options, bool mapped, terminal_use use, const unique_fd &channel) {
    try {
        // whatever ends kova-box, the box goes with it; should it be gone already, the channel is at its end
        require(prctl(PR_SET_PDEATHSIG, SIGKILL) == 0, "cannot follow kova-box");
        const mode_t mask = umask(022); // the command's own; others than root go into the box's directories
        make_box(options, mapped);
        umask(mask);
        const pid_t command = fork();
        require(command >= 0, "cannot make a process");
        if (command == 0) {
            become_command(options.command, use);
        }
        return watch(command, channel);
    } catch (const std::exception &error) {
        fprintf(stderr, "kova-box: %s\n", error.what());
        return kNoBox;
    }
}

} // namespace kova
