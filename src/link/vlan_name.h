/**
 * @file
 * The name of a VLAN interface.
 */
#pragma once

#include "core/text.h"

#include <net/if.h>

namespace kova {

/** "eth0.10"; cut to what the kernel can have. */
class vlan_name : public built_text<IFNAMSIZ> {
public:
    vlan_name(const char *szRowDevice, int nId) : built_text("%s.%d", szRowDevice, nId) {}
};

} // namespace kova
