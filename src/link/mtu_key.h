/**
 * @file
 * An MTU as text: the key of /etc/kovainfo.conf that holds it for an interface, and its number.
 */
#pragma once

#include "core/text.h"

#include <cstdlib>
#include <net/if.h>

namespace kova {

/** Fits for every name of at most IFNAMSIZ characters. */
class mtu_key : public built_text<IFNAMSIZ + sizeof "_mtu"> {
public:
    explicit mtu_key(const char *szIfname) : built_text("%s_mtu", szIfname) {}
};

/** The number that the kernel is given: what the text begins with, 0 for none. */
inline int mtu_number(const char *szValue) {
    return static_cast<int>(strtol(szValue, nullptr, 10));
}

} // namespace kova
