/**
 * @file
 * The DHCPv6 client of an interface, a job in one of two kinds.
 */
#pragma once

namespace kova {

inline constexpr char kDhcp6Client[] = "client"; ///< asks for an address
inline constexpr char kDhcp6Info[] = "info";     ///< asks for everything else

/** The kind of the client that runs on an interface, nothing when none does. */
[[nodiscard]] const char *running_dhcp6_client(const char *szIfname);

/** Both return the exit status, before the client has done its work. Nothing is logged. */
[[nodiscard]] int start_dhcp6_client(const char *szIfname, const char *kind);
[[nodiscard]] int stop_dhcp6_client(const char *szIfname, const char *kind);

} // namespace kova
