#include "interrupt.h"

#include <atomic>
#include <csignal>

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

} // namespace kova
