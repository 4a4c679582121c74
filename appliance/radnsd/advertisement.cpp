#include "advertisement.h"

#include <cstring>
#include <netinet/icmp6.h>

namespace kova {
namespace {

constexpr uint8_t kNameServers = 25; // the option's type
constexpr size_t kUnit = 8;          // of an option's length
constexpr size_t kHead = 8;          // of the option, before its addresses

uint32_t number_at(std::span<const uint8_t> bytes, size_t offset) {
    uint32_t number = 0;
    memcpy(&number, bytes.data() + offset, sizeof number);
    return ntohl(number);
}

/** Whether a host may be asked at an address. */
bool is_host(const in6_addr &address) {
    return !IN6_IS_ADDR_UNSPECIFIED(&address) && !IN6_IS_ADDR_LOOPBACK(&address) && !IN6_IS_ADDR_MULTICAST(&address);
}

void add_servers(std::span<const uint8_t> option, std::vector<announced_server> &servers) {
    for (size_t at = kHead; at + sizeof(in6_addr) <= option.size(); at += sizeof(in6_addr)) {
        announced_server server{};
        memcpy(&server.address, option.data() + at, sizeof server.address);
        server.lifetime = number_at(option, 4);
        if (is_host(server.address)) {
            servers.push_back(server);
        }
    }
}

} // namespace

std::optional<std::vector<announced_server>> announced_servers(std::span<const uint8_t> message) {
    if (message.size() < sizeof(nd_router_advert) || message[0] != ND_ROUTER_ADVERT || message[1] != 0) {
        return std::nullopt;
    }
    std::vector<announced_server> servers;
    for (auto rest = message.subspan(sizeof(nd_router_advert)); !rest.empty();) {
        const size_t size = rest.size() < 2 ? 0 : rest[1] * kUnit;
        if (size == 0 || size > rest.size()) {
            return std::nullopt;
        }
        if (rest[0] == kNameServers) {
            add_servers(rest.first(size), servers);
        }
        rest = rest.subspan(size);
    }
    return servers;
}

} // namespace kova
