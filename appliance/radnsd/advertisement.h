/**
 * @file
 * What a router advertisement says of name servers.
 */
#pragma once

#include <cstdint>
#include <netinet/in.h>
#include <optional>
#include <span>
#include <vector>

namespace kova {

struct announced_server {
    in6_addr address;
    uint32_t lifetime; /**< seconds from now; 0 takes it back, kForever never ends */
};

inline constexpr uint32_t kForever = UINT32_MAX;

/** The servers of a message in order; nothing for a message that is no well-formed router advertisement. */
std::optional<std::vector<announced_server>> announced_servers(std::span<const uint8_t> message);

} // namespace kova
