// The first process of a box: makes what the box consists of, runs the command, and is the parent of all orphans.
#ifndef KOVA_LAB_BOX_INIT_H
#define KOVA_LAB_BOX_INIT_H

#include "channel.h"
#include "options.h"
#include "system.h"

namespace kova {

// Exit statuses of kova-box itself.
constexpr int kTookTooLong = 124;
constexpr int kNoBox = 125;
constexpr int kCannotExecute = 126;
constexpr int kNotFound = 127;

/**
 * Makes the box, runs the command and waits for it.
 * @param mapped   the box is an ordinary user's
 * @param channel  to the supervisor outside; its end of file ends the box
 * @return the exit status of the box
 */
int box_init(const box_options &options, bool mapped, terminal_use use, const unique_fd &channel);

} // namespace kova

#endif
