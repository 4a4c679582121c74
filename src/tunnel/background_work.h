/**
 * @file
 * Work that a process of its own does, and that may outlast the call that started it.
 */
#pragma once

#include "core/guards.h"

namespace kova {

/**
 * The process is nobody's child: the caller neither has to wait for it nor finds a dead one among its children. It is a
 * session of its own, so that what ends the caller from its terminal leaves it alone, and holds none of the caller's
 * descriptors.
 */
class background_work {
public:
    /** @return whether the process was made; errno tells why not */
    [[nodiscard]] bool start(void (*work)(const void *), const void *about);
    /** Asks without waiting. */
    [[nodiscard]] bool has_ended() const;

private:
    descriptor end_; ///< at its end when the process has ended
};

} // namespace kova
