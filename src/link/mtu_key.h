/**
 * @file
 * The key of /etc/kovainfo.conf that holds the MTU set for an interface.
 */
#pragma once

#include "core/text.h"

#include <net/if.h>

namespace kova {

/** Fits for every name of at most IFNAMSIZ characters. */
class mtu_key : public built_text<IFNAMSIZ + sizeof "_mtu"> {
public:
    explicit mtu_key(const char *szIfname) : built_text("%s_mtu", szIfname) {}
};

} // namespace kova
