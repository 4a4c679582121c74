// Files of the appliance's kernel that the kernel of the host does not have.
#ifndef KOVA_LAB_BOX_KERNEL_FILES_H
#define KOVA_LAB_BOX_KERNEL_FILES_H

#include "options.h"

namespace kova {

// Shows the files that the options ask for. To be called inside the private root.
void add_kernel_files(const box_options &options);

} // namespace kova

#endif
