#include <kovanetsdk/routing.h>

#include "core/ifcfg.h"
#include "core/report.h"
#include "core/text.h"

#include <cstring>
#include <kovanetsdk/bridge.h>
#include <kovanetsdk/dhcp.h>
#include <kovanetsdk/iface.h>

using namespace kova;

namespace {

constexpr int kLogicalInterfaces = 2;

/** The interface that has the address: of a member of a bond of the virtual switch its port there. */
class addressed_name : public path_text {
public:
    explicit addressed_name(const char *szIfname) : path_text("%s%s", prefix(szIfname), szIfname) {}

private:
    static const char *prefix(const char *szIfname) {
        return KLIBNetOVSIfIsSlave(szIfname) != 0 && strncmp(szIfname, "eth", 3) == 0 ? "ovs_" : "";
    }
};

/** Whether somebody else sets the interface's routes, or it has none of its own. */
bool adds_nothing(const char *name, bool uses_dhcp) {
    return uses_dhcp || KLIBNetBridgeIfIsSlave(name) != 0 || KOVANetIfIsBondingPassive(name) != 0;
}

/** Edits the route of the address that a file holds. */
int edit_route(int type, const char *name, const char *source) {
    char ip[20];
    char netmask[20];
    if (KLIBCFileGetKeyValue(source, key::kIpAddr, ip, sizeof ip, 0) <= 0) {
        return fail_keeping_code(HERE, -1, "Get IP from %s fail", source);
    }
    if (KLIBCFileGetKeyValue(source, key::kNetmask, netmask, sizeof netmask, 0) <= 0) {
        return fail_keeping_code(HERE, -1, "Get netmask from %s fail", source);
    }
    NetRoutetableEdit(type, ip, netmask, name);
    return 0;
}

} // namespace

extern "C" int NetRoutetableHandler(int type, const char *szIfname) {
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    const addressed_name owner{szIfname};
    const char *const name = owner.c_str();
    if (KOVANetIsDevTypeMatch(name, kLogicalInterfaces) == 0) {
        return 0;
    }
    const bool uses_dhcp = BlKOVALnxIsDHCP(name) != 0;
    const lease_path lease{name};
    if (uses_dhcp && KLIBCFileExist(lease.c_str()) == 0) {
        return fail_keeping_code(HERE, -1, "/etc/dhclient/ipv4/dhcpcd-%s.info is not exist", name);
    }
    const bool adds = type == NET_ROUTE_ADD && !adds_nothing(name, uses_dhcp);
    if (!adds && type != NET_ROUTE_DELETE) {
        return 0;
    }
    const ifcfg_path file{name};
    return edit_route(type, name, uses_dhcp ? lease.c_str() : file.c_str());
}
