/**
 * @file
 * The IPv6 modes as the interface files name them.
 */
#pragma once

#include <iterator>
#include <strings.h>

namespace kova {

/** By NET_IPV6_... */
inline constexpr const char *kIpv6Modes[] = {"auto", "off", "dhcp", "static", "auto_dhcp"};
inline constexpr int kIpv6ModeCount = std::size(kIpv6Modes);

inline bool is_ipv6_mode(const char *text, int mode) {
    return strcasecmp(text, kIpv6Modes[mode]) == 0;
}

} // namespace kova
