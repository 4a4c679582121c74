/**
 * @file
 * The relay's settings: a directory with a file for each interface.
 */
#pragma once

#include "core/text.h"

#include <sys/types.h>

namespace kova {

inline constexpr char kRelayDirectory[] = "/etc/sysconfig/pppoe-relay/";

/** Path of an interface's settings: the name is cut to 16 characters. */
class relay_path : public built_text<sizeof kRelayDirectory + 16> {
public:
    explicit relay_path(const char *szIfname) : built_text("%s%s", kRelayDirectory, szIfname) {}
};

/** Whether the directory is there, or could be made. errno tells why not. */
[[nodiscard]] bool has_relay_directory(mode_t mode);

} // namespace kova
