/**
 * @file
 * Interfaces as a test wants the kernel to describe them.
 */
#pragma once

#include "support/rig.h"

#include <net/if.h>

namespace kova_test {

struct kernel_interface {
    int flags = IFF_UP | IFF_BROADCAST | IFF_RUNNING | IFF_MULTICAST;
    std::string ip;      ///< none when empty
    std::string mask;    ///< of the address
    int refusal = 0;     ///< errno of every request that sets something
    std::string renamed; ///< the name it was given
};

/** Interfaces that answer interface requests in the kernel's place; every other name is unknown. */
class kernel_interfaces {
public:
    kernel_interfaces(test_rig &rig, const std::map<std::string, kernel_interface> &interfaces);
    kernel_interface &operator[](const std::string &name) { return interfaces_[name]; }

private:
    int answer(unsigned long request, void *argument);

    std::map<std::string, kernel_interface> interfaces_;
};

} // namespace kova_test
