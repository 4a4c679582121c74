/**
 * @file
 * The resolver files and the one form in which they are written.
 */
#pragma once

#include "core/replacement_file.h"
#include "core/report.h"

#include <kova/core.h>

namespace kova {

inline constexpr char kResolverFile[] = "/etc/resolv.conf";
inline constexpr char kStaticServers[] = "/etc/resolv.conf.static";

/** Capacity of a list of servers to begin with; it grows. */
inline constexpr int kServerCapacity = 512;

/** Number of entries, 0 for no list. */
[[nodiscard]] inline int count_of(const KLIBSZLIST *list) {
    return list == nullptr ? 0 : static_cast<int>(list->nItem);
}

/**
 * Writes a line per server, then the extra lines, and brings the file to the disk.
 * @return 0; -1 with NET_ERR_FILE_OPEN or NET_ERR_FILE_WRITE under the caller's place
 */
[[nodiscard]] int fill_resolver_file(const place &at, const replacement_file &file, const KLIBSZLIST *servers,
                                     const KLIBSZLIST *extra_lines);

} // namespace kova
