#include <kovanetsdk/dhcp.h>

#include "core/ifcfg.h"
#include "core/report.h"
#include "dhcp/dhcpd_files.h"

using namespace kova;

namespace {

bool refuses_interface(const place &at, const char *ifname, int type) {
    if (ifname == nullptr || *ifname == '\0') {
        log_err(at, "no interface is given");
        return true;
    }
    if (refuses_ifname(at, "ifname", ifname)) {
        return true;
    }
    if (!is_dhcp_type(type)) {
        log_err(at, "Wrong DHCPD ip type");
        return true;
    }
    return false;
}

} // namespace

extern "C" int DHCPIsEnabled(void) {
    return says_enabled(path_text{"/etc/dhcpd/dhcpd.info"}) ? 1 : 0;
}

extern "C" int DHCPInterfaceIsEnabled(const char *ifname, int type) {
    if (refuses_interface(HERE, ifname, type)) {
        return -1;
    }
    return says_enabled(dhcpd_info_path(type, ifname)) ? 1 : 0;
}

extern "C" int DHCPInterfaceSetEnabled(const char *ifname, int type, int enable) {
    if (refuses_interface(HERE, ifname, type) || !make_dhcpd_dir(HERE)) {
        return -1;
    }
    const path_text path = dhcpd_info_path(type, ifname);
    if (KLIBCFileSetKeyValue(path.c_str(), kEnable, yes_or_no(enable == 1), kQuotedLine) < 0) {
        return fail_keeping_code(HERE, 0, "Failed to set [%s] Dhcp info file", ifname); // told in the log alone
    }
    return 0;
}
