#include "tunnel/background_work.h"

#include <climits>
#include <fcntl.h>
#include <sys/wait.h>
#include <syslog.h>

namespace kova {

namespace {

/** Streams lead nowhere and one descriptor stays; takes no more room than there was. @return whether it could be done
 */
bool drop_descriptors_but(int kept) {
    closelog(); // which would go on writing into whatever has the number then
    constexpr int kFirst = STDERR_FILENO + 1;
    if (dup2(kept, kFirst) < 0 || close_range(kFirst + 1, UINT_MAX, 0) != 0) {
        return false;
    }
    const int nowhere = open("/dev/null", O_RDWR);
    for (const int stream : {STDIN_FILENO, STDOUT_FILENO, STDERR_FILENO}) {
        if (nowhere < 0 || dup2(nowhere, stream) < 0) {
            return false;
        }
    }
    return nowhere < kFirst || close(nowhere) == 0;
}

/** Whether the process was made shows in the status of this one. */
[[noreturn]] void run_in_background(void (*work)(const void *), const void *about, int end) {
    if (!drop_descriptors_but(end)) {
        _exit(1);
    }
    const pid_t worker = fork();
    if (worker == 0) {
        setsid();
        work(about);
    }
    _exit(worker < 0 ? 1 : 0);
}

/** @return whether a child ended well, or cannot be asked because its parent ignores its children */
bool ended_well(pid_t child) {
    int status = 0;
    pid_t ended = -1;
    do {
        ended = waitpid(child, &status, 0);
    } while (ended < 0 && errno == EINTR);
    return ended < 0 || (WIFEXITED(status) && WEXITSTATUS(status) == 0);
}

} // namespace

bool background_work::start(void (*work)(const void *), const void *about) {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC | O_NONBLOCK) != 0) {
        return false;
    }
    end_ = descriptor{ends[0]};
    const descriptor workers_end{ends[1]};
    const pid_t child = fork();
    if (child == 0) {
        run_in_background(work, about, workers_end.get());
    }
    if (child < 0 || ended_well(child)) {
        return child >= 0;
    }
    errno = EAGAIN;
    return false;
}

bool background_work::has_ended() const {
    char nothing = 0;
    return read(end_.get(), &nothing, sizeof nothing) == 0;
}

} // namespace kova
