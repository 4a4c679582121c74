/** @file Time that only goes forward. */
#ifndef KOVA_PLATFORM_STEADY_CLOCK_H
#define KOVA_PLATFORM_STEADY_CLOCK_H

#include <cstdint>
#include <ctime>

namespace kova {

inline int64_t steady_ms() {
    timespec time = {};
    clock_gettime(CLOCK_MONOTONIC, &time);
    return int64_t{time.tv_sec} * 1000 + time.tv_nsec / 1000000;
}

} // namespace kova

#endif
