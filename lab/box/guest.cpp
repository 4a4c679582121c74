#include "guest.h"

#include "frames.h"
#include "guest_init.h"
#include "init.h"
#include "supervisor.h"
#include "system.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <optional>
#include <poll.h>
#include <sched.h>
#include <stdexcept>
#include <sys/eventfd.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/signalfd.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/wait.h>
#include <termios.h>
#include <thread>
#include <unistd.h>

namespace kova {

namespace fs = std::filesystem;

namespace {

constexpr std::uint64_t kMiB = 1ULL << 20;
constexpr std::uint64_t kMemoryOfPrograms = 512 * kMiB; // beside what may be written
constexpr std::uint64_t kLargestSize = 4096 * kMiB;
constexpr int kBrokenOutput = 128 + SIGPIPE;

// What a guest is given.
struct guest_means {
    std::string kernel;      // program
    std::uint64_t megabytes; // of memory
    unsigned boot_limit;     // seconds until it is ready
    unsigned limit;          // seconds for the command, 0 for any time
};

// ---- the job

std::vector<std::string> environment() {
    std::vector<std::string> list;
    for (char **entry = environ; *entry != nullptr; ++entry) {
        list.emplace_back(*entry);
    }
    return list;
}

bool is_same_file(int one, int other) {
    struct stat first, second;
    return fstat(one, &first) == 0 && fstat(other, &second) == 0 && first.st_dev == second.st_dev &&
           first.st_ino == second.st_ino;
}

unsigned current_umask() {
    const mode_t mask = umask(0);
    umask(mask);
    return mask;
}

guest_job job_of(const box_options &options, const std::vector<std::string> &arguments) {
    guest_job job;
    job.arguments = arguments;
    // the first one is the option: what follows -- is the command's own
    job.arguments.erase(std::find(job.arguments.begin(), job.arguments.end(), "--guest"));
    job.environment = environment();
    job.environment.emplace_back("KOVA_GUEST=1");
    for (const std::string &share : options.shares) {
        job.shares.push_back(fs::canonical(share));
    }
    std::error_code gone;
    job.directory = fs::current_path(gone);
    job.mask = current_umask();
    job.terminal = isatty(STDIN_FILENO) && isatty(STDOUT_FILENO);
    job.same_output = is_same_file(STDOUT_FILENO, STDERR_FILENO);
    return job;
}

// ---- the kernel

// Size of the guest's memory in MiB. A share of it in percent is one of the default.
std::uint64_t memory_for(const std::string &size) {
    std::size_t digits = 0;
    std::uint64_t bytes = std::stoull(size, &digits);
    switch (digits < size.size() ? size[digits] : ' ') {
    case '%':
        bytes = 1024 * kMiB;
        break;
    case 'g':
        bytes *= 1024;
        [[fallthrough]];
    case 'm':
        bytes *= 1024;
        [[fallthrough]];
    case 'k':
        bytes *= 1024;
        break;
    default:
        break;
    }
    if (bytes > kLargestSize) {
        throw std::runtime_error("a guest has room for at most 4g, not " + size);
    }
    return (bytes + kMemoryOfPrograms) / kMiB;
}

// Where the file lies that is the guest's memory: it has no name, and takes only the room that is used. A small
// /dev/shm or one without executable pages is of no use.
const char *folder_for_memory(std::uint64_t megabytes) {
    struct statvfs shm;
    const bool fits = statvfs("/dev/shm", &shm) == 0 && (shm.f_flag & ST_NOEXEC) == 0 &&
                      shm.f_bavail * shm.f_frsize >= megabytes * kMiB && access("/dev/shm", W_OK) == 0;
    return fits ? "/dev/shm" : "/tmp";
}

std::vector<std::string> kernel_command(const guest_means &means, const unique_fd &line) {
    const std::string end = "fd:" + std::to_string(line.get());
    return {
        means.kernel,
        "mem=" + std::to_string(means.megabytes) + "M",
        "rootfstype=hostfs",
        "rootflags=/",
        "ro",
        "init=" + fs::read_symlink("/proc/self/exe").string(),
        "con=null",
        "con0=null,fd:1", // its log
        "con1=" + end + "," + end,
        "quiet",
        "uml_dir=/proc/", // it would make a directory there and leave it behind when killed; here it cannot
        "umid=kova",
        "pty.legacy_count=0",                   // saves a sixth of a second,
        "initcall_blacklist=raid6_select_algo", // and this, a measurement, nearly a second
        "bonding.max_bonds=0",
        "dummy.numdummies=0", // no interface that nobody asked for
        "ifb.numifbs=0",
        "--",
        kGuestInit,
    };
}

// All of a guest runs on one processor: its kernel and its programs take turns, and handing over to another processor
// costs several times what the work does. It is the one where this process was put, so guests spread by themselves.
void stay_on_this_processor() {
    cpu_set_t one;
    CPU_ZERO(&one);
    CPU_SET(static_cast<unsigned>(std::max(0, sched_getcpu())), &one);
    sched_setaffinity(0, sizeof one, &one); // where that is refused it is only slower
}

[[noreturn]] void become_kernel(const guest_means &means, const unique_fd &line, const unique_fd &log) {
    setsid(); // the kernel's processes are known by their group
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    stay_on_this_processor();
    umask(0);
    sigset_t none;
    sigemptyset(&none);
    sigprocmask(SIG_SETMASK, &none, nullptr);
    signal(SIGPIPE, SIG_DFL);
    signal(SIGTTOU, SIG_DFL);
    setenv("TMPDIR", folder_for_memory(means.megabytes), 1);
    fcntl(line.get(), F_SETFD, 0);
    dup2(open_file("/dev/null", O_RDONLY).get(), STDIN_FILENO);
    dup2(log.get(), STDOUT_FILENO);
    dup2(log.get(), STDERR_FILENO);
    execv(means.kernel.c_str(), argument_vector(kernel_command(means, line)).data());
    _exit(errno == ENOENT ? kNotFound : kCannotExecute);
}

// ---- the keeper: the parent of the kernel's processes

// The terminal as it was, when this ends.
class raw_terminal {
public:
    explicit raw_terminal(bool wanted) : used_(wanted && tcgetattr(STDIN_FILENO, &before_) == 0) {
        if (used_) {
            termios raw = before_;
            cfmakeraw(&raw);
            tcsetattr(STDIN_FILENO, TCSADRAIN, &raw);
        }
    }
    raw_terminal(const raw_terminal &) = delete;
    raw_terminal &operator=(const raw_terminal &) = delete;
    ~raw_terminal() {
        if (used_) {
            tcsetattr(STDIN_FILENO, TCSADRAIN, &before_);
        }
    }

private:
    termios before_{};
    bool used_;
};

class keeper {
public:
    keeper(guest_job job, guest_means means) : job_(std::move(job)), means_(std::move(means)) {}

    // Starts the kernel and waits until the command ends, the kernel dies, or kova-box is gone or tells it to stop.
    int run(const unique_fd &channel);

private:
    void start_kernel();
    void start_guard();
    void end_kernel();
    bool wait_for_end(const unique_fd &told, const unique_fd &channel);
    void talk();
    void pass_input();
    void send_size();
    std::string what_failed() const;
    int explain_failure() const;

    guest_job job_;
    guest_means means_;
    pid_t kernel_ = -1;
    pid_t guard_ = -1;
    int kernel_status_ = 0;
    unique_fd line_, log_, guard_line_;
    unique_fd done_{eventfd(0, EFD_CLOEXEC)};
    std::atomic<int> status_ = -1;
    std::atomic<bool> ready_ = false;
    bool late_ = false;
};

void keeper::start_kernel() {
    int ends[2];
    require(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) == 0, "cannot make a socket pair");
    line_ = unique_fd{ends[0]};
    const unique_fd inside{ends[1]};
    log_ = unique_fd{memfd_create("kernel log", MFD_CLOEXEC)};
    require(log_.get() >= 0, "cannot keep the kernel's log");
    require(prctl(PR_SET_CHILD_SUBREAPER, 1) == 0, "cannot take up the kernel's processes");
    kernel_ = fork();
    require(kernel_ >= 0, "cannot make a process");
    if (kernel_ == 0) {
        become_kernel(means_, inside, log_);
    }
    start_guard();
}

// Should this process be killed, the kernel goes with it, but not its helpers. The guard notes it by the end of a pipe,
// away from any signal to the process group.
void keeper::start_guard() {
    int ends[2];
    require(pipe2(ends, O_CLOEXEC) == 0, "cannot make a pipe");
    const unique_fd watched{ends[0]};
    guard_line_ = unique_fd{ends[1]};
    guard_ = fork();
    if (guard_ < 0) {
        end_kernel();
        throw std::runtime_error("cannot make a process");
    }
    if (guard_ == 0) {
        setsid();
        guard_line_ = unique_fd{};
        const int null = open("/dev/null", O_RDWR | O_CLOEXEC);
        for (int stream = STDIN_FILENO; stream <= STDERR_FILENO; ++stream) {
            dup2(null, stream); // a reader of the command's output is not to wait for the guard
        }
        char none = 0;
        while (read(watched.get(), &none, 1) < 0 && errno == EINTR) {
        }
        kill(-kernel_, SIGKILL);
        _exit(0);
    }
}

// Also other children are told of, and those that only stopped.
bool has_ended(pid_t child) {
    siginfo_t info{};
    return waitid(P_PID, static_cast<id_t>(child), &info, WEXITED | WNOHANG | WNOWAIT) == 0 && info.si_pid == child;
}

// The kernel keeps the memory of each of its programs in a process, all in its process group.
void keeper::end_kernel() {
    if (kernel_ < 0) {
        return;
    }
    if (guard_ > 0) {
        kill(guard_, SIGKILL);
    }
    kill(kernel_, SIGKILL);
    kill(-kernel_, SIGKILL);
    int status = 0;
    for (pid_t ended = 0; (ended = wait(&status)) > 0;) {
        kernel_status_ = ended == kernel_ ? status : kernel_status_;
    }
    kernel_ = guard_ = -1;
}

void keeper::pass_input() {
    try {
        std::array<char, 16384> buffer;
        for (ssize_t got = 0; (got = read(STDIN_FILENO, buffer.data(), buffer.size())) > 0;) {
            send_frame(line_.get(), kInput, {buffer.data(), static_cast<std::size_t>(got)});
        }
        send_frame(line_.get(), kInput, {});
    } catch (const std::exception &) {
        return; // the kernel is gone, which is noticed elsewhere
    }
}

void keeper::talk() {
    try {
        while (const std::optional<frame> received = receive_frame(line_.get())) {
            if (received->kind == kReady) {
                ready_ = true;
                alarm(means_.limit);
                send_frame(line_.get(), kJob, pack(job_));
                send_size();
                std::thread(&keeper::pass_input, this).detach();
            } else if (received->kind == kStatus) {
                status_ = std::stoi(received->data);
                break;
            } else {
                write_all(received->kind == kErrors ? STDERR_FILENO : STDOUT_FILENO, received->data);
            }
        }
    } catch (const std::exception &) {
        status_ = kBrokenOutput;
    }
    eventfd_write(done_.get(), 1);
}

void keeper::send_size() {
    winsize size{};
    if (job_.terminal && ioctl(STDIN_FILENO, TIOCGWINSZ, &size) == 0) {
        send_frame(line_.get(), kSize, {reinterpret_cast<const char *>(&size), sizeof size});
    }
}

std::string keeper::what_failed() const {
    if (late_) {
        return ready_ ? ": the command was still running after " + std::to_string(means_.limit) + " s"
                      : " was not ready after " + std::to_string(means_.boot_limit) + " s";
    }
    const bool absent = WIFEXITED(kernel_status_) && WEXITSTATUS(kernel_status_) == kNotFound;
    return absent ? " cannot be started: it is in Debian's package user-mode-linux" : " ended before the command did";
}

// Says what the kernel said last, and returns the exit status of a box that could not be made, or took too long.
int keeper::explain_failure() const {
    fprintf(stderr, "kova-box: the guest's kernel %s%s\n", means_.kernel.c_str(), what_failed().c_str());
    constexpr off_t kLastWords = 2000;
    std::array<char, kLastWords> words;
    const off_t size = lseek(log_.get(), 0, SEEK_END);
    const ssize_t got = pread(log_.get(), words.data(), words.size(), std::max<off_t>(0, size - kLastWords));
    fwrite(words.data(), 1, got < 0 ? 0 : static_cast<std::size_t>(got), stderr);
    return late_ && ready_ ? kTookTooLong : kNoBox;
}

// Waits for the end of the command, of the kernel or of their time. Returns false when kova-box is told to end.
bool keeper::wait_for_end(const unique_fd &told, const unique_fd &channel) {
    std::array<pollfd, 3> sources{{{told.get(), POLLIN, 0}, {channel.get(), POLLIN, 0}, {done_.get(), POLLIN, 0}}};
    for (;;) {
        if (poll(sources.data(), sources.size(), -1) < 0 && errno != EINTR) {
            return false;
        }
        if (sources[2].revents != 0) {
            return true;
        }
        if (sources[1].revents != 0) {
            return false;
        }
        signalfd_siginfo info{};
        if (sources[0].revents != 0 && read(told.get(), &info, sizeof info) == sizeof info) {
            if (info.ssi_signo == SIGTERM) {
                return false;
            }
            if (info.ssi_signo == SIGALRM) {
                late_ = true;
                return true;
            }
            if (has_ended(kernel_)) {
                end_kernel(); // what it still said is passed on to the end of the line
            }
        }
    }
}

int keeper::run(const unique_fd &channel) {
    sigset_t signals;
    sigemptyset(&signals);
    sigaddset(&signals, SIGTERM);
    sigaddset(&signals, SIGALRM);
    sigaddset(&signals, SIGCHLD);
    const unique_fd told{signalfd(-1, &signals, SFD_CLOEXEC)};
    require(told.get() >= 0 && done_.get() >= 0, "cannot wait for signals");
    alarm(means_.boot_limit);
    start_kernel();
    const raw_terminal terminal(job_.terminal);
    std::thread(&keeper::talk, this).detach();
    const bool over = wait_for_end(told, channel);
    end_kernel();
    if (!over) {
        return kNoBox;
    }
    return status_ < 0 ? explain_failure() : status_.load();
}

int keep_guest(guest_job job, guest_means means, const unique_fd &channel) {
    try {
        auto *guest = new keeper(std::move(job), std::move(means)); // as long as the process: its threads use it
        return guest->run(channel);
    } catch (const std::exception &error) {
        fprintf(stderr, "kova-box: %s\n", error.what());
        return kNoBox;
    }
}

} // namespace

int run_guest(const box_options &options, const std::vector<std::string> &arguments) {
    const guest_job job = job_of(options, arguments);
    const guest_means means{options.kernel, memory_for(options.size), options.boot_limit, options.limit};
    return supervise([&](terminal_use, const unique_fd &channel) { return keep_guest(job, means, channel); }, SIGTERM);
}

} // namespace kova
