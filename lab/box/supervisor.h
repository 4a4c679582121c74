// kova-box outside the box: makes it, waits for it, and ends it when kova-box is told to end.
#ifndef KOVA_LAB_BOX_SUPERVISOR_H
#define KOVA_LAB_BOX_SUPERVISOR_H

#include "options.h"

namespace kova {

// Runs the command of the options in a new box. Returns the exit status of kova-box.
int run_box(const box_options &options);

} // namespace kova

#endif
