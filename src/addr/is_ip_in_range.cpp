#include <kovanetsdk/addr.h>

#include "addr/any_address.h"
#include "core/report.h"

#include <cstring>

using namespace kova;

extern "C" int KLIBIsIpInRange(const char *szIP, const char *szBound1, const char *szBound2, int nFamily) {
    if (szIP == nullptr || szBound1 == nullptr || szBound2 == nullptr) {
        return -1;
    }
    if (nFamily != AF_INET && nFamily != AF_INET6) {
        return fail_keeping_code(HERE, -1, "Unknown address family, %d.", nFamily);
    }
    const any_address ip = read_address(nFamily, szIP);
    const any_address bound1 = read_address(nFamily, szBound1);
    const any_address bound2 = read_address(nFamily, szBound2);
    if (ip.family == 0 || bound1.family == 0 || bound2.family == 0) {
        return -1;
    }
    const int to_bound1 = memcmp(ip.bytes, bound1.bytes, ip.size());
    const int to_bound2 = memcmp(ip.bytes, bound2.bytes, ip.size());
    return (to_bound1 >= 0 && to_bound2 <= 0) || (to_bound1 <= 0 && to_bound2 >= 0) ? 1 : 0;
}
