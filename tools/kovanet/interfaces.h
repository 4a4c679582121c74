/**
 * @file
 * What several objects need of an interface.
 */
#pragma once

#include "table.h"

#include <kovanetsdk/iface.h>
#include <kovanetsdk/ipv6.h>
#include <kovanetsdk/stats.h>
#include <optional>
#include <string>
#include <vector>

namespace kova {

/** Holds the configuration lock while it lives; ends the program when it cannot be had. */
class config_lock {
public:
    enum mode { kShared = 0x105, kExclusive = 0x106 };
    explicit config_lock(mode wanted);
    config_lock(const config_lock &) = delete;
    config_lock &operator=(const config_lock &) = delete;
    ~config_lock();
};

/** What the kernel says of an interface, nothing when it knows none of that name. Ends the program for a bad name. */
std::optional<IFINFO> find_interface(const std::string &name);
/** The same, ending the program also for an unknown name. */
IFINFO require_interface(const std::string &name);
/** All interfaces there are, sorted by name, without those whose names the library refuses. */
std::vector<IFINFO> all_interfaces();

/** The IPv6 addresses that an interface has now, the widest scope first. Ends the program when they cannot be listed.
 */
std::vector<KOVAV6IP> ipv6_addresses(const std::string &name);

/** Counters of all interfaces, sorted by name. */
std::vector<NETSTAT> all_counters();

/** A hardware address as "52:54:00:12:34:56". */
std::string mac_text(const unsigned char (&mac)[6]);
/** Values that JSON shows as null when they are unknown. */
json known_number(int value, int lowest);
json known_text(const char *text);
json duplex_word(int duplex);
const char *link_word(bool has_link);

} // namespace kova
