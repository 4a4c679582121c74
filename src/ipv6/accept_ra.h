/**
 * @file
 * The kernel's switch for the router advertisements that reach an interface.
 */
#pragma once

#include "core/text.h"

#include <cstdint>

namespace kova {

class accept_ra_path : public path_text {
public:
    explicit accept_ra_path(const char *szIfname) : path_text("/proc/sys/net/ipv6/conf/%s/accept_ra", szIfname) {}
};

/** @return 0, NET_ERR_FILE_OPEN or NET_ERR_FILE_WRITE. Nothing is logged. */
[[nodiscard]] uint32_t write_accept_ra(const accept_ra_path &path, bool accepts);

} // namespace kova
