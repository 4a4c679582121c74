#include <kovanetsdk/link.h>

#include "core/commands.h"
#include "core/guards.h"
#include "core/pause.h"
#include "link/ifname_change.h"
#include "link/mtu_key.h"
#include "link/vlan_change.h"

#include <unistd.h>

using namespace kova;

namespace {

/** The row device's file: its own settings, and the addresses that the VLAN had. */
int write_row_file(const VLANINFO &vlan, new_ifcfg &file) {
    if (!file.is_open()) {
        return -1;
    }
    if (file.copy_lines(HERE, ifcfg_path{vlan.szRowDevice}.c_str(),
                        {"BOOTPROTO=", "IPV6INIT=", "IPV6ADDR=", "IPV6PREFIXLENG="}, false) < 0 ||
        file.copy_lines(HERE, ifcfg_path{vlan.szIfname}.c_str(),
                        {"BOOTPROTO=", "IPADDR=", "NETMASK=", "IPV6INIT=", "IPV6ADDR=", "IPV6PREFIXLENG=",
                         "IPV6_DEFAULTGW=", "IPV6DNS"},
                        true) < 0) {
        return -1;
    }
    return file.finish(HERE);
}

int move_to_row_device(const VLANINFO &vlan) {
    if (disable_pppoe(HERE, vlan.szIfname) < 0) {
        return -1;
    }
    (void)KLIBCINFORemoveKey(mtu_key{vlan.szIfname}.c_str()); // a setting of what is gone does no harm
    new_ifcfg row_file{vlan.szRowDevice, "/etc/sysconfig/network-scripts/DEV_XXXXXX"};
    if (write_row_file(vlan, row_file) < 0) {
        return -1;
    }
    const char *const names[] = {vlan.szRowDevice, vlan.szIfname};
    stop_interfaces(names, 2);
    if (row_file.replace(HERE) < 0) {
        return -1;
    }
    unlink(ifcfg_path{vlan.szIfname}.c_str());
    start_interfaces(names, 1);
    pause_for_seconds(kVlanSettleSeconds);
    return tell_new_name(HERE, vlan.szIfname, vlan.szRowDevice);
}

} // namespace

extern "C" int KLIBNetVlanRemove(const char *szVlan) {
    VLANINFO vlan;
    if (refuses_ifname(HERE, "szVlan", szVlan) || KLIBNetVlanGet(szVlan, &vlan) != 1) {
        return -1;
    }
    const char *const szRowDevice = vlan.szRowDevice;
    ifname_change_event event{{&szVlan, 1}, {&szRowDevice, 1}};
    if (!event.open()) {
        return fail_keeping_code(HERE, -1, "Fail to init plugin) [0x%04X %s:%d]", REGISTER);
    }
    event.announce_before(HERE);
    const int result = move_to_row_device(vlan);
    event.announce_after(HERE, result);
    return result;
}
