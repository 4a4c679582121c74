/**
 * @file
 * The DNS servers as arguments of an event.
 */
#pragma once

#include "core/report.h"

#include <kova/core.h>

namespace kova {

/** Sets "NITEMS" and the keys "DNS_1", "DNS_2" ...; logs what fails as the caller. @return 0 or -1 */
[[nodiscard]] int set_dns_list(const place &at, uint64_t event, const KLIBSZLIST *pDnsList);

} // namespace kova
