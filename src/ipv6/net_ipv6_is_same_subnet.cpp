#include <kovanetsdk/ipv6.h>

#include "core/report.h"

#include <arpa/inet.h>
#include <cstring>

using namespace kova;

namespace {

constexpr unsigned kLongestPrefix = 128;

/** Says which text is no address. */
bool parse(const char *text, in6_addr &address) {
    if (inet_pton(AF_INET6, text, &address) == 1) {
        return true;
    }
    log_err(HERE, "Invalid network address: %s", text);
    return false;
}

} // namespace

extern "C" int KOVANetIPv6IsSameSubnet(const char *szV6IPAddr1, const char *szV6IPAddr2, unsigned nPrefixLength) {
    if (szV6IPAddr1 == nullptr || szV6IPAddr2 == nullptr || nPrefixLength > kLongestPrefix) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, 0, "Bad parameter.");
    }
    in6_addr one;
    in6_addr other;
    if (!parse(szV6IPAddr1, one) || !parse(szV6IPAddr2, other)) {
        return -1;
    }
    const unsigned whole = nPrefixLength / 8;
    const unsigned rest = nPrefixLength % 8;
    if (memcmp(&one, &other, whole) != 0) {
        return 0;
    }
    return rest == 0 || one.s6_addr[whole] >> (8 - rest) == other.s6_addr[whole] >> (8 - rest) ? 1 : 0;
}
