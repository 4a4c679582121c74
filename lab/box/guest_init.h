// The first process of a guest's kernel: makes that kernel a system in which kova-box runs as on any other.
#ifndef KOVA_LAB_BOX_GUEST_INIT_H
#define KOVA_LAB_BOX_GUEST_INIT_H

namespace kova {

// The word on the command line by which kova-box knows that it is this process.
constexpr const char *kGuestInit = "guest-init";

// Follows the job that comes over the line to the outside. Does not return: the outside ends the kernel.
[[noreturn]] void guest_init();

} // namespace kova

#endif
