#include <kovanetsdk/addr.h>

#include "core/kernel.h"
#include "core/report.h"
#include "core/text.h"

#include <algorithm>
#include <cstring>
#include <kovanetsdk/iface.h>
#include <kovanetsdk/link.h>

namespace {

using namespace kova;

/** Longest part of a member's name that is handed out, with its end. */
constexpr size_t kNameRoom = 5;

/** An IPv4 address as an interface file has it. */
using configured_address = char[256];

/** The address in a member's file; a member of the virtual switch has its file under the switch's name. */
int read_member_address(bool is_of_switch, const char *szMember, configured_address &address) {
    const path_text ifname{is_of_switch ? "ovs_%s" : "%s", szMember};
    return KOVAILnxGetIPFromCfg(ifname.c_str(), address, sizeof address);
}

} // namespace

extern "C" int KOVANetBondIPConflict(const char *szBond, char *szName, int cbName) {
    if (refuses_ifname(HERE, "szBond", szBond) || refuses_null(HERE, "szName", szName) ||
        refuses(HERE, 0 < cbName, "0 < cbName")) {
        return -1;
    }
    *szName = '\0';
    KOVALINKAGGROPT bond;
    if (KOVANetLinkAggrGet(szBond, &bond) != 0) {
        return fail_keeping_code(HERE, -1, "get %s information failed", szBond);
    }
    configured_address bond_address;
    if (KOVAILnxGetIPFromCfg(szBond, bond_address, sizeof bond_address) < 0) {
        return fail_keeping_code(HERE, -1, "get %s's IP failed", szBond);
    }
    const bool is_of_switch = KLIBNetOVSIfIsMaster(szBond) == kOvsBond;
    for (int i = 1; i < bond.cSlaves; ++i) {
        const char *const szMember = bond.aszSlaves[i];
        configured_address address;
        if (read_member_address(is_of_switch, szMember, address) < 0) {
            return fail_keeping_code(HERE, -1, "get %s's IP from config failed", szMember);
        }
        if (*address == '\0') {
            log_info(HERE, "%s's IP is empty", szMember);
        } else if (strcmp(address, bond_address) == 0) {
            copy_cut(szName, std::min(static_cast<size_t>(cbName), kNameRoom), szMember);
            return 1;
        }
    }
    return 0;
}
