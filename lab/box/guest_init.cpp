#include "guest_init.h"

#include "frames.h"
#include "init.h"
#include "system.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <mutex>
#include <sstream>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/utsname.h>
#include <sys/wait.h>
#include <termios.h>
#include <thread>
#include <unistd.h>

namespace kova {

namespace fs = std::filesystem;

namespace {

const fs::path kModules = "/usr/lib/uml/modules"; // of Debian's package
const fs::path kOwn = "/dev/kova";                // the host's files cannot be written here, /dev is in memory

// ---- the kernel

// The kernel asks this program for a module when something needs it: the first bond, the first VLAN.
void let_kernel_load_modules() {
    make_directories(kOwn / "lib");
    fs::create_symlink(kModules, kOwn / "lib/modules");
    const fs::path loader = kOwn / "modprobe";
    write_file(loader, "#!/bin/sh\nexec /sbin/modprobe -d " + kOwn.string() + " \"$@\"\n");
    fs::permissions(loader, fs::perms::owner_all);
    write_file("/proc/sys/kernel/modprobe", loader);
}

// Device files whose first use loads the module behind them: /dev/net/tun, /dev/ppp.
void make_device_files() {
    utsname kernel{};
    uname(&kernel);
    std::ifstream table(kModules / kernel.release / "modules.devname");
    for (std::string line; std::getline(table, line);) {
        std::istringstream fields(line);
        std::string module, name;
        char type = 0, colon = 0;
        unsigned major = 0, minor = 0;
        if (fields >> module >> name >> type >> major >> colon >> minor && type == 'c') {
            make_directories((fs::path("/dev") / name).parent_path());
            mknod(("/dev/" + name).c_str(), S_IFCHR | 0666, makedev(major, minor));
        }
    }
}

// What is laid over the root inside, so that programs there find the modules where every system has them.
fs::path tree_of_modules() {
    const fs::path tree = kOwn / "tree";
    make_directories(tree / "usr/lib");
    fs::create_symlink(kModules, tree / "usr/lib/modules");
    return tree;
}

void mount_kernel_directories() {
    mount_new("proc", "/proc", 0);
    mount_new("sysfs", "/sys", 0);
    if (!fs::exists("/dev/null")) {
        mount_new("devtmpfs", "/dev", 0);
    }
    make_directories("/dev/pts");
    mount_new("devpts", "/dev/pts", 0, "ptmxmode=0666,mode=620");
}

// The root shows the host's files and cannot be written to; a share is the host's again, to be written to.
void mount_share(const std::string &directory) {
    require(mount("none", directory.c_str(), "hostfs", 0, directory.c_str()) == 0, "cannot share " + directory);
}

// ---- the line to the outside

unique_fd open_line() {
    unique_fd line = open_file("/dev/tty1", O_RDWR | O_NOCTTY);
    termios settings{};
    require(tcgetattr(line.get(), &settings) == 0, "cannot read the settings of the line");
    cfmakeraw(&settings);
    require(tcsetattr(line.get(), TCSANOW, &settings) == 0, "cannot make the line carry plain bytes");
    return line;
}

class line_to_outside {
public:
    void send(char kind, std::string_view data) {
        const std::lock_guard<std::mutex> guard(writing_);
        send_frame(line_.get(), kind, data);
    }
    std::optional<frame> receive() { return receive_frame(line_.get()); }

private:
    unique_fd line_ = open_line();
    std::mutex writing_;
};

// Passes on what a command writes, until nobody can write any more. A terminal without users ends with an error.
void pass_output(line_to_outside &line, char kind, const unique_fd &source) {
    std::array<char, 16384> buffer;
    for (ssize_t got = 0; (got = read(source.get(), buffer.data(), buffer.size())) > 0;) {
        line.send(kind, {buffer.data(), static_cast<std::size_t>(got)});
    }
}

void pass_input(line_to_outside &line, unique_fd target) {
    while (const std::optional<frame> received = line.receive()) {
        if (received->kind == kSize) {
            ioctl(target.get(), TIOCSWINSZ, received->data.data());
        } else if (received->data.empty()) {
            target = unique_fd{};
        } else {
            std::string_view rest = received->data;
            while (!rest.empty()) { // what a command does not read is lost, as in any pipe
                const ssize_t put = write(target.get(), rest.data(), rest.size());
                rest.remove_prefix(put < 0 ? rest.size() : static_cast<std::size_t>(put));
            }
        }
    }
}

// ---- the command's streams

struct pipe_ends {
    unique_fd reader, writer;
};

pipe_ends make_pipe() {
    std::array<int, 2> ends;
    require(pipe2(ends.data(), O_CLOEXEC) == 0, "cannot make a pipe");
    return {unique_fd{ends[0]}, unique_fd{ends[1]}};
}

struct streams {
    std::array<unique_fd, 3> inside; // the command's
    unique_fd input, output, errors; // the other ends, errors only when it has one of its own
};

unique_fd copy_of(const unique_fd &fd) {
    return unique_fd{fcntl(fd.get(), F_DUPFD_CLOEXEC, 0)};
}

streams make_streams(const guest_job &job) {
    streams made;
    if (job.terminal) {
        made.input = open_file("/dev/ptmx", O_RDWR | O_NOCTTY);
        require(unlockpt(made.input.get()) == 0, "cannot make a terminal");
        made.output = copy_of(made.input);
        made.inside[0] = open_file(ptsname(made.input.get()), O_RDWR | O_NOCTTY);
        made.inside[1] = copy_of(made.inside[0]);
    } else {
        pipe_ends input = make_pipe(), output = make_pipe();
        made.inside[0] = std::move(input.reader);
        made.input = std::move(input.writer);
        made.inside[1] = std::move(output.writer);
        made.output = std::move(output.reader);
    }
    if (job.same_output) {
        made.inside[2] = copy_of(made.inside[1]);
    } else {
        pipe_ends errors = make_pipe();
        made.inside[2] = std::move(errors.writer);
        made.errors = std::move(errors.reader);
    }
    return made;
}

// ---- the command

[[noreturn]] void become_box(const guest_job &job, const streams &own) {
    setsid();
    for (int fd = 0; fd < 3; ++fd) {
        dup2(own.inside[static_cast<std::size_t>(fd)].get(), fd);
    }
    if (job.terminal) {
        ioctl(STDIN_FILENO, TIOCSCTTY, 0);
    }
    signal(SIGPIPE, SIG_DFL);
    umask(job.mask);
    const bool there = chdir(job.directory.c_str()) == 0 || chdir("/") == 0;
    if (there) {
        execve("/proc/self/exe", argument_vector(job.arguments).data(), argument_vector(job.environment).data());
    }
    fprintf(stderr, "kova-box: cannot run itself in the guest: %s\n", strerror(errno));
    _exit(kNoBox);
}

// Takes up the ends of all processes that lost their parent, until the one that matters ends.
int wait_for(pid_t process) {
    int status = 0;
    for (pid_t ended = 0; ended != process;) {
        ended = wait(&status);
    }
    return exit_status(status);
}

int run(const guest_job &job, line_to_outside &line) {
    streams own = make_streams(job);
    const pid_t box = fork();
    require(box >= 0, "cannot make a process");
    if (box == 0) {
        become_box(job, own);
    }
    for (unique_fd &end : own.inside) {
        end = unique_fd{}; // only the command's are left, and end with it
    }
    std::thread(pass_input, std::ref(line), std::move(own.input)).detach();
    std::thread output(pass_output, std::ref(line), kOutput, std::cref(own.output));
    std::thread errors(pass_output, std::ref(line), kErrors, std::cref(own.errors));
    const int status = wait_for(box);
    output.join();
    errors.join();
    return status;
}

guest_job take_job(line_to_outside &line) {
    line.send(kReady, {});
    const std::optional<frame> received = line.receive();
    if (!received || received->kind != kJob) {
        throw std::runtime_error("the guest got no job");
    }
    return unpack(received->data);
}

} // namespace

void guest_init() {
    try {
        signal(SIGPIPE, SIG_IGN);
        mount_kernel_directories();
        line_to_outside line;
        guest_job job = take_job(line);
        int status = kNoBox;
        try {
            let_kernel_load_modules();
            make_device_files();
            run_program({kOwn / "modprobe", "-a", "overlay", "ipv6", "veth"}, "");
            for (const std::string &share : job.shares) {
                mount_share(share);
            }
            job.arguments.insert(job.arguments.begin() + 1, {"--tree", tree_of_modules()});
            status = run(job, line);
            sync(); // what was written to shares through mapped memory
        } catch (const std::exception &error) {
            line.send(kErrors, std::string("kova-box: in the guest: ") + error.what() + "\n");
        }
        line.send(kStatus, std::to_string(status));
        for (;;) {
            pause();
        }
    } catch (const std::exception &error) {
        fprintf(stderr, "kova-box: %s\n", error.what()); // in the kernel's log
        _exit(kNoBox);                                   // and with its first process the kernel ends
    }
}

} // namespace kova
