#include <kovanetsdk/addr.h>

#include "core/report.h"
#include "core/text.h"

#include <arpa/inet.h>

using namespace kova;

extern "C" int BlKLIBIsValidIpMask(const char *szIP, const char *szMask) {
    if (refuses(HERE, szIP != nullptr, "((void *)0) != szIP") || refuses(HERE, szMask != nullptr, "NULL != szMask")) {
        return 0;
    }
    char mask_text[20];
    copy_text(mask_text, szMask);
    if (BlKLIBIsIpAddr(szIP) == 0 || BlKLIBIsIpMask(mask_text) == 0) {
        return 0;
    }
    in_addr ip;
    in_addr mask;
    if (inet_aton(szIP, &ip) == 0 || inet_aton(mask_text, &mask) == 0) {
        return fail_quietly(HERE, NET_ERR_BAD_ADDRESS, 0);
    }
    const uint32_t host_bits = ~mask.s_addr;
    const bool is_broadcast = host_bits != 0 && (ip.s_addr & host_bits) == host_bits;
    return is_broadcast ? fail_quietly(HERE, NET_ERR_BAD_ADDRESS, 0) : 1;
}
