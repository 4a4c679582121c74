#include <kovanetsdk/iface.h>

#include "core/kernel.h"
#include "core/kernel_files.h"

extern "C" int KOVANetIfIsBondingPassive(const char *szIfname) {
    using namespace kova;
    if (refuses_text(HERE, "szIfname", szIfname)) {
        return 0;
    }
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, 0);
    }
    unsigned flags = 0;
    if (socket.flags(szIfname, flags) == 0 && (flags & IFF_SLAVE) != 0) {
        return 1;
    }
    return is_ovs_bond_member(HERE, szIfname) ? 1 : 0;
}
