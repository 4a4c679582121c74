// kova-box outside the box: makes it, waits for it, and ends it when kova-box is told to end.
#ifndef KOVA_LAB_BOX_SUPERVISOR_H
#define KOVA_LAB_BOX_SUPERVISOR_H

#include "channel.h"
#include "options.h"
#include "system.h"

#include <functional>

namespace kova {

/**
 * Makes a process that does the work, and waits for it; when kova-box is told to end, it ends the process first.
 * @param work    what the process does. Its result is the process's exit status; the end of file of the channel is the
 *                news that kova-box is gone
 * @param ending  signal that ends the process
 * @return the exit status of kova-box
 */
int supervise(const std::function<int(terminal_use use, const unique_fd &channel)> &work, int ending);

// Runs the command of the options in a new box. Returns the exit status of kova-box.
int run_box(const box_options &options);

} // namespace kova

#endif
