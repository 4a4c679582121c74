#include <kovanetsdk/iface.h>

#include "core/text.h"
#include "iface/interface_record.h"

#include <cstring>
#include <kovanetsdk/addr.h>

extern "C" int KOVANetIP2If(const char *szIP, char *szIfname, int cbIfname) {
    using namespace kova;
    if (refuses_text(HERE, "szIP", szIP) || refuses_null_text(HERE, "szIfname", szIfname) ||
        refuses(HERE, 0 < cbIfname, "0 < cbIfname")) {
        return -1;
    }
    *szIfname = '\0';
    if (BlKLIBIsIpAddr(szIP) == 0) {
        return fail(HERE, NET_ERR_BAD_ADDRESS, -1, "[%s] is not an IP address", szIP);
    }
    IFINFO records[kMaxInterfaces];
    const int count = KLIBNetInterfaceEnum(records, kMaxInterfaces, 0);
    if (count < 0) {
        return fail_keeping_code(HERE, -1, "Get interface info fail.");
    }
    for (int i = 0; i < count; ++i) {
        if (strcmp(records[i].szIP, szIP) == 0) {
            const bool fits = copy_whole(szIfname, cbIfname, records[i].szIfname);
            return refuses(HERE, fits, "strlen(szFound) < cbIfname") ? -1 : 1;
        }
    }
    return 0;
}
