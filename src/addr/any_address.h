/**
 * @file
 * An address of either family as bytes, highest first, so that memcmp compares addresses as numbers.
 */
#pragma once

#include <arpa/inet.h>
#include <cstddef>

namespace kova {

struct any_address {
    int family; ///< AF_INET, AF_INET6, or 0 for what is no address
    unsigned char bytes[sizeof(in6_addr)];

    [[nodiscard]] size_t size() const { return family == AF_INET ? sizeof(in_addr) : sizeof(in6_addr); }
};

/** Reads an address of one family. */
inline any_address read_address(int family, const char *szIP) {
    any_address address = {};
    address.family = inet_pton(family, szIP, address.bytes) == 1 ? family : 0;
    return address;
}

/** Reads an address of either family. */
inline any_address read_address(const char *szIP) {
    const any_address address = read_address(AF_INET, szIP);
    return address.family != 0 ? address : read_address(AF_INET6, szIP);
}

} // namespace kova
