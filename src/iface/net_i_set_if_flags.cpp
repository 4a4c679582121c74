#include <kovanetsdk/iface.h>

#include "core/kernel.h"
#include "core/report.h"

using namespace kova;

extern "C" int KLIBNetISetIfFlags(const char *szIfname, unsigned flags, int on) {
    constexpr unsigned kEveryFlag = 0xffff;
    if (refuses_ifname(HERE, "szIfname", szIfname) || refuses(HERE, flags <= kEveryFlag, "flags <= 0xFFFF")) {
        return -1;
    }
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    unsigned current = 0;
    if (socket.flags(szIfname, current) < 0) {
        return fail(HERE, request_code(errno), -1, "Cannot get flags of %s: %m", szIfname);
    }
    if (socket.set_flags(szIfname, on != 0 ? current | flags : current & ~flags) < 0) {
        return fail(HERE, request_code(errno), -1, "Cannot set flags of %s: %m", szIfname);
    }
    return 0;
}

extern "C" int KLIBNetIfUp(const char *szIfname) {
    return KLIBNetISetIfFlags(szIfname, IFF_UP, 1);
}

extern "C" int KLIBNetIfDown(const char *szIfname) {
    return KLIBNetISetIfFlags(szIfname, IFF_UP, 0);
}

extern "C" int KLIBNetReInitIf(const char *szIfname) {
    return KLIBNetIfDown(szIfname) < 0 || KLIBNetIfUp(szIfname) < 0 ? -1 : 0;
}
