/**
 * @file
 * The events that say an interface has got or lost its link.
 */
#pragma once

#include "core/report.h"

namespace kova {

/** Raises a link event after the fact; refuses the name as the caller, other failures stay silent. @return 0 or -1 */
[[nodiscard]] int raise_link_event(const place &at, const char *name, const char *szIfname);

} // namespace kova
