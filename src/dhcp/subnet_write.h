/**
 * @file
 * Writing the fragment of a numbered subnet. Failures are logged at the caller's place.
 */
#pragma once

#include "core/report.h"

#include <kovanetsdk/dhcp.h>

namespace kova {

/** A numbered subnet of an interface, whose name has passed refuses_ifname. */
struct subnet_id {
    const char *ifname;
    unsigned number;
    int type;
};

/** Whether name and texts of a subnet make the lines they are meant for; the options are looked at when written. */
[[nodiscard]] bool is_writable(const subnet_id &subnet, const DHCP_TAG_CONF &conf);

/** Write a subnet that is_writable; an option that is not valid leaves the lines before it. @return 0; -1, logged */
[[nodiscard]] int write_v4_subnet(const place &at, const subnet_id &subnet, const DHCP_TAG_CONF &conf);
[[nodiscard]] int write_v6_subnet(const place &at, const subnet_id &subnet, const DHCP_TAG_CONF &conf);

} // namespace kova
