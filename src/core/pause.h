/**
 * @file
 * Waits of a fixed length.
 */
#pragma once

#include <ctime>

namespace kova {

/** Waits for all of the time: a signal that the caller handles does not end it. */
void pause_for(timespec time);

/** The same for whole seconds. */
inline void pause_for_seconds(time_t seconds) {
    pause_for({seconds, 0});
}

} // namespace kova
