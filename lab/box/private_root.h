// The root file system of a box: the host's own below, everything written in memory above.
#ifndef KOVA_LAB_BOX_PRIVATE_ROOT_H
#define KOVA_LAB_BOX_PRIVATE_ROOT_H

#include "options.h"

namespace kova {

/**
 * Makes a private root and moves into it; nothing of the host is mounted afterwards but the shares. To be called in a
 * new mount, PID and network namespace (proc and sysfs show what they are mounted in).
 * @param mapped  an ordinary user's box: only files of this one user can be changed through an overlay
 */
void enter_private_root(const box_options &options, bool mapped);

} // namespace kova

#endif
