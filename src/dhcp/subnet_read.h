/**
 * @file
 * Reading the fragment of a numbered subnet back. Failures are logged at the caller's place.
 */
#pragma once

#include "core/report.h"
#include "core/text.h"

#include <kovanetsdk/dhcp.h>

namespace kova {

/** Fill a record that is empty from a fragment that is there. @return 0; -1, logged, with the record partly filled */
[[nodiscard]] int read_v4_subnet(const place &at, const path_text &path, DHCP_TAG_CONF &conf);
[[nodiscard]] int read_v6_subnet(const place &at, const path_text &path, DHCP_TAG_CONF &conf);

} // namespace kova
