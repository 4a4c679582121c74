/** @file Waiting for something that can only be asked about: short sleeps that grow, up to a limit on the steady clock.
 */
#ifndef KOVA_PLATFORM_BACKOFF_H
#define KOVA_PLATFORM_BACKOFF_H

#include <cstdint>
#include <ctime>

namespace kova {

class backoff {
public:
    explicit backoff(int64_t limit_ms) : deadline_(now() + limit_ms * kMillisecond) {}

    /** Sleeps a little. @return false, without sleeping, when the time is up */
    bool pause() {
        const int64_t left = deadline_ - now();
        if (left <= 0)
            return false;
        const int64_t nap = left < step_ ? left : step_;
        const timespec time = {0, static_cast<long>(nap)};
        nanosleep(&time, nullptr);
        step_ = step_ < 10 * kMillisecond ? step_ * 2 : 20 * kMillisecond;
        return true;
    }

private:
    static constexpr int64_t kMillisecond = 1000 * 1000;

    static int64_t now() {
        timespec time = {};
        clock_gettime(CLOCK_MONOTONIC, &time);
        return time.tv_sec * 1000 * kMillisecond + time.tv_nsec;
    }

    int64_t deadline_;
    int64_t step_ = kMillisecond;
};

} // namespace kova

#endif
