/**
 * @file
 * The contests, by what they are about.
 */
#pragma once

#include "contest.h"

namespace kova {

contests address_contests();
contests interface_contests();
contests key_contests();
contests load_contests();
contests start_contests();
contests tool_contests();

} // namespace kova
