// The box on a kernel of its own: a user-mode Linux kernel, an ordinary process of the host, in which kova-box runs.
#ifndef KOVA_LAB_BOX_GUEST_H
#define KOVA_LAB_BOX_GUEST_H

#include "options.h"

#include <string>
#include <vector>

namespace kova {

/**
 * Runs the command of the options in a box in a guest.
 * @param arguments  the command line of kova-box, which is followed inside
 * @return the exit status of kova-box
 */
int run_guest(const box_options &options, const std::vector<std::string> &arguments);

} // namespace kova

#endif
