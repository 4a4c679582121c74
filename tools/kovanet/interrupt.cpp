#include "interrupt.h"

#include <atomic>
#include <chrono>
#include <csignal>
#include <poll.h>

namespace kova {
namespace {

std::atomic<bool> interrupted{false};

} // namespace

void stop_on_signals() {
    struct sigaction action {};
    action.sa_handler = [](int) { interrupted = true; };
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
}

bool is_interrupted() {
    return interrupted;
}

bool sleep_unless_interrupted(double seconds) {
    using std::chrono::steady_clock;
    const auto end = steady_clock::now() + std::chrono::duration<double>(seconds);
    sigset_t stopping;
    sigset_t before;
    sigemptyset(&stopping);
    sigaddset(&stopping, SIGINT);
    sigaddset(&stopping, SIGTERM);
    sigprocmask(SIG_BLOCK, &stopping, &before); // they come while it sleeps, never between the look and the sleep
    for (std::chrono::duration<double> left{}; !interrupted && (left = end - steady_clock::now()).count() > 0;) {
        const auto whole = static_cast<time_t>(left.count());
        const timespec rest{whole, static_cast<long>((left.count() - static_cast<double>(whole)) * 1e9)};
        ppoll(nullptr, 0, &rest, &before);
    }
    sigprocmask(SIG_SETMASK, &before, nullptr);
    return !interrupted;
}

} // namespace kova
