#include <kovanetsdk/iface.h>

#include "core/commands.h"
#include "core/report.h"

#include <cstring>
#include <kovanetsdk/ipv6.h>

using namespace kova;

extern "C" int KOVANetFlushIP(const char *szFamily, const char *szIfname) {
    if (refuses_null_text(HERE, "szFamily", szFamily) || refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    if (strcmp(szFamily, "-4") == 0) {
        return run("/sbin/ip", "-4", "address", "flush", "dev", szIfname) == 0
                   ? 0
                   : fail_keeping_code(HERE, -1, "Failed to flush ipv4 address on [%s]", szIfname);
    }
    if (strcmp(szFamily, "-6") == 0) {
        return KOVALnxIPv6FlushAddr(szIfname) == 0
                   ? 0
                   : fail_keeping_code(HERE, -1, "Failed to flush ipv6 address on [%s]", szIfname);
    }
    return fail_keeping_code(HERE, -1, "ip type is wrong, only -4 or -6");
}
