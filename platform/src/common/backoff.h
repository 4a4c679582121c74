/** @file Waiting for something that can only be asked about: short sleeps that grow, up to a limit. */
#ifndef KOVA_PLATFORM_BACKOFF_H
#define KOVA_PLATFORM_BACKOFF_H

#include <algorithm>

#include "common/steady_clock.h"

namespace kova {

class backoff {
public:
    explicit backoff(int64_t limit_ms) : deadline_(steady_ms() + limit_ms) {}

    /** Sleeps a little. @return false, without sleeping, when the time is up */
    bool pause() {
        const int64_t left = deadline_ - steady_ms();
        if (left <= 0)
            return false;
        const timespec time = {0, static_cast<long>(std::min(left, step_)) * 1000 * 1000};
        nanosleep(&time, nullptr);
        step_ = std::min(step_ * 2, kLongestStep);
        return true;
    }

private:
    static constexpr int64_t kLongestStep = 20;

    int64_t deadline_;
    int64_t step_ = 1;
};

} // namespace kova

#endif
