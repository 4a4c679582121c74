#include <kovanetsdk/ipv6.h>

#include "core/ifcfg.h"
#include "core/kernel_files.h"
#include "core/report.h"
#include "ipv6/mode.h"

#include <arpa/inet.h>
#include <cstring>
#include <kovanetsdk/iface.h>

using namespace kova;

namespace {

constexpr int kLogicalInterfaces = 2;

/** Longer than every value that is valid, so that a cut one is not. */
using value_text = char[64];

/** Reads a mode. @return whether the text is one */
bool parse_mode(const char *text, int &mode) {
    for (mode = 0; mode < kIpv6ModeCount; ++mode) {
        if (is_ipv6_mode(text, mode)) {
            return true;
        }
    }
    mode = 0;
    return false;
}

int read_mode(const char *path, int &mode) {
    value_text value;
    const int found = KLIBCFileGetKeyValue(path, key::kIpv6Init, value, sizeof value, 0);
    if (found < 0) {
        return fail_keeping_code(HERE, found, "can not get ipv6 key value %s, %s,", path, key::kIpv6Init);
    }
    if (found == 0) {
        log_info(HERE, "no ipv6 configtype, first time set IPv6");
        return 0;
    }
    if (!parse_mode(value, mode)) {
        return fail(HERE, NET_ERR_PARSE, -1, "ipv6 init type undefined %s, %s,", path, value);
    }
    return 1;
}

/** Copies an address of the file out, if it is one. */
int copy_address(const char *path, const char *value, char *szOut, int cbOut) {
    in6_addr parsed;
    if (inet_pton(AF_INET6, value, &parsed) != 1) {
        return fail(HERE, NET_ERR_BAD_ADDRESS, -1, "not valid ipv6 address %s, %s,", path, value);
    }
    copy_cut(szOut, static_cast<size_t>(cbOut), value);
    return 0;
}

int read_address(const char *path, char *szV6IPAddr, int cbV6IPAddr) {
    value_text value;
    const int found = KLIBCFileGetKeyValue(path, key::kIpv6Addr, value, sizeof value, 0);
    if (found < 0) {
        return fail_keeping_code(HERE, found, "error when get ipv6 key value %s, %s,", path, key::kIpv6Addr);
    }
    return found == 0 ? 0 : copy_address(path, value, szV6IPAddr, cbV6IPAddr);
}

int read_prefix_length(const char *path, int &prefix) {
    value_text value;
    const int found = KLIBCFileGetKeyValue(path, key::kIpv6PrefixLength, value, sizeof value, 0);
    if (found < 0) {
        return fail_keeping_code(HERE, found, "error when get ipv6 key value %s, %s,", path, key::kIpv6PrefixLength);
    }
    if (found > 0 && !leading_number(value, prefix)) {
        return fail(HERE, NET_ERR_PARSE, -1, "not valid prefix length %s, %s,", path, value);
    }
    return 0;
}

int read_gateway(const char *path, char *szGateway, int cbGateway) {
    value_text value;
    const int found = KLIBCFileGetKeyValue(path, key::kIpv6DefaultGateway, value, sizeof value, 0);
    if (found < 0) {
        return fail_keeping_code(HERE, found, "can not get ipv6 key value %s, %s,", path, key::kIpv6DefaultGateway);
    }
    return found == 0 ? 0 : copy_address(path, value, szGateway, cbGateway);
}

} // namespace

extern "C" int KOVANetIPv6ConfGet(const char *szIfname, int *pMode, char *szV6IPAddr, int cbV6IPAddr,
                                  int *pPrefixLength, char *szGateway, int cbGateway) {
    if (refuses_ifname(HERE, "szIfname", szIfname) || refuses_null(HERE, "pMode", pMode) ||
        refuses_null_text(HERE, "szV6IPAddr", szV6IPAddr) ||
        refuses(HERE, cbV6IPAddr >= INET6_ADDRSTRLEN, "46 <= cbV6IPAddr") ||
        refuses_null(HERE, "pPrefixLength", pPrefixLength) || refuses_null_text(HERE, "szGateway", szGateway) ||
        refuses(HERE, cbGateway >= INET6_ADDRSTRLEN, "46 <= cbGateway")) {
        return -1;
    }
    if (KOVANetIsDevTypeMatch(szIfname, kLogicalInterfaces) == 0) {
        return 0;
    }
    *pPrefixLength = -1;
    *pMode = NET_IPV6_AUTO;
    memset(szV6IPAddr, 0, static_cast<size_t>(cbV6IPAddr));
    memset(szGateway, 0, static_cast<size_t>(cbGateway));

    const ifcfg_path path{szIfname};
    const int found = read_mode(path.c_str(), *pMode);
    if (found <= 0) {
        return found;
    }
    if (read_address(path.c_str(), szV6IPAddr, cbV6IPAddr) < 0 ||
        read_prefix_length(path.c_str(), *pPrefixLength) < 0 || read_gateway(path.c_str(), szGateway, cbGateway) < 0) {
        return -1;
    }
    return 1;
}
