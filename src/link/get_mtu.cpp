#include <kovanetsdk/link.h>

#include "core/kernel.h"
#include "core/report.h"

#include <cstring>

extern "C" int KOVAGetMTU(const char *szIfname) {
    using namespace kova;
    if (refuses_text(HERE, "szIfname", szIfname)) {
        return -1;
    }
    if (strlen(szIfname) > IFNAMSIZ) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, -1, "interface name is too long");
    }
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    int mtu = 0;
    return socket.mtu(szIfname, mtu) < 0 ? fail(HERE, request_code(errno), 0, "Cannot get MTU of %s: %m", szIfname)
                                         : mtu;
}
