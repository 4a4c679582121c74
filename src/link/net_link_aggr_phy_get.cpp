#include <kovanetsdk/link.h>

#include "core/kernel_files.h"
#include "core/text.h"

extern "C" int KOVANetLinkAggrPhyGet(const char *szBond, KLIBSZLIST *pSlaves) {
    using namespace kova;
    if (refuses_ifname(HERE, "szBond", szBond) || refuses_null(HERE, "pSlaves", pSlaves)) {
        return -1;
    }
    // being asked about what is no bond, or a bond without members, is everyday: the caller decides what to log
    first_line slaves{path_text{"/sys/class/net/%s/bonding/slaves", szBond}.c_str()};
    if (!slaves.is_open()) {
        return fail_quietly(HERE, NET_ERR_FILE_OPEN, -1);
    }
    if (!slaves.is_read()) {
        return fail_quietly(HERE, NET_ERR_FILE_READ, -1);
    }
    return split(slaves.text(), " \t\n", pSlaves);
}
