// Starting a program from a caller that holds much memory.
#include "rows.h"
#include "world.h"

#include <csignal>
#include <cstring>
#include <kova/core.h>
#include <memory>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

namespace kova {

namespace {

constexpr char kProgram[] = "/bin/true";
constexpr size_t kMegabyte = size_t{1} << 20;

/** How a caller starts the program. */
enum class way : char { library, fork };

void start_by_library() {
    require_done(KLIBCExec(kProgram, nullptr, nullptr, nullptr, nullptr) == 0, "KLIBCExec failed");
}

void start_by_fork() {
    const pid_t pid = fork();
    require(pid >= 0, "cannot fork");
    if (pid == 0) {
        execl(kProgram, kProgram, nullptr);
        _exit(127);
    }
    int status;
    require(waitpid(pid, &status, 0) == pid && status == 0, "the program failed");
}

/** A process that holds touched memory, and starts the program when it is told to. */
class caller {
public:
    explicit caller(size_t size) {
        int ends[2];
        require(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends) == 0, "cannot make a pair of sockets");
        to_caller_ = unique_fd{ends[0]};
        const unique_fd own{ends[1]};
        pid_ = fork();
        require(pid_ >= 0, "cannot fork");
        if (pid_ == 0) {
            prctl(PR_SET_PDEATHSIG, SIGKILL);
            serve(own.get(), size);
            _exit(0);
        }
        start(way::library); // its memory is touched when it answers
    }
    ~caller() {
        kill(pid_, SIGKILL);
        waitpid(pid_, nullptr, 0);
    }
    caller(const caller &) = delete;
    caller &operator=(const caller &) = delete;

    /** Nanoseconds that a start took, measured by the caller itself. */
    double start(way how) {
        double taken = 0;
        require(write(to_caller_.get(), &how, sizeof how) == sizeof how &&
                    read(to_caller_.get(), &taken, sizeof taken) == sizeof taken && taken > 0,
                "the caller failed");
        return taken;
    }

private:
    static void serve(int orders, size_t size) noexcept {
        void *const memory = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
        if (memory == MAP_FAILED) {
            return;
        }
        madvise(memory, size, MADV_NOHUGEPAGE); // as a heap grows: page by page
        memset(memory, 1, size);
        const measure ways[] = {timed(start_by_library), timed(start_by_fork)};
        way how;
        while (read(orders, &how, sizeof how) == sizeof how) {
            const double taken = ways[static_cast<int>(how)]();
            if (write(orders, &taken, sizeof taken) != sizeof taken) {
                return;
            }
        }
    }

    unique_fd to_caller_;
    pid_t pid_;
};

sides against_small_caller() {
    const auto big = std::make_shared<caller>(1024 * kMegabyte);
    const auto small = std::make_shared<caller>(10 * kMegabyte);
    return {[big] { return big->start(way::library); }, [small] { return small->start(way::library); }};
}

sides against_fork() {
    const auto big = std::make_shared<caller>(1024 * kMegabyte);
    return {[big] { return big->start(way::library); }, [big] { return big->start(way::fork); }};
}

} // namespace

contests start_contests() {
    const std::string start = "KLIBCExec from a caller with 1 GiB";
    return {
        {"start", "small", start, "KLIBCExec from a caller with 10 MiB", 1.2, 100, against_small_caller},
        {"start", "fork", start, "fork and exec from the same caller", std::nullopt, 20, against_fork},
    };
}

} // namespace kova
