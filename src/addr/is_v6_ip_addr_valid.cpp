#include <kovanetsdk/addr.h>

#include "core/report.h"

#include <arpa/inet.h>
#include <cstring>

using namespace kova;

namespace {

bool is_ipv6(const char *text, size_t length) {
    constexpr size_t kLongest = 46;
    if (length > kLongest) {
        return false;
    }
    char address[kLongest + 1];
    memcpy(address, text, length);
    address[length] = '\0';
    in6_addr parsed;
    return inet_pton(AF_INET6, address, &parsed) == 1;
}

bool is_prefix_length(const char *text) {
    constexpr size_t kMostDigits = 3;
    int value = 0;
    size_t digits = 0;
    while (digits < kMostDigits && text[digits] >= '0' && text[digits] <= '9') {
        value = value * 10 + (text[digits++] - '0');
    }
    return digits != 0 && text[digits] == '\0' && value <= 128;
}

} // namespace

extern "C" int BlKLIBIsv6IpAddrValid(const char *szV6IPAddr) {
    if (refuses_null_text(HERE, "szV6IPAddr", szV6IPAddr)) {
        return 0;
    }
    const size_t length = strcspn(szV6IPAddr, "/");
    const bool has_prefix = szV6IPAddr[length] == '/';
    if (!is_ipv6(szV6IPAddr, length) || (has_prefix && !is_prefix_length(szV6IPAddr + length + 1))) {
        return fail_quietly(HERE, NET_ERR_BAD_ADDRESS, 0);
    }
    return 1;
}
