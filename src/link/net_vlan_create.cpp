#include <kovanetsdk/link.h>

#include "core/commands.h"
#include "core/guards.h"
#include "core/pause.h"
#include "link/ifname_change.h"
#include "link/vlan_change.h"
#include "link/vlan_name.h"

#include <cstring>
#include <kovanetsdk/addr.h>
#include <kovanetsdk/iface.h>

using namespace kova;

namespace {

/** The VLAN to be: its names, and where its IPv4 address comes from. */
struct plan {
    const char *szRowDevice;
    int nId;
    const char *szVlan;
    const NETINFO &ip;
};

bool refuses_arguments(const char *szRowDevice, int nId, const NETINFO *pNetInfo) {
    constexpr size_t kLongestRowDevice = IFNAMSIZ - sizeof ".1"; // with a longer one the VLAN's name would have no id
    if (refuses_ifname(HERE, "szRowDevice", szRowDevice) ||
        refuses(HERE, strlen(szRowDevice) <= kLongestRowDevice, "strlen(szRowDevice) <= kLongestRowDevice") ||
        refuses(HERE, KLIBNetVlanValidId(nId) == 0, "0 == KLIBNetVlanValidId(nId)") ||
        refuses_null(HERE, "pNetInfo", pNetInfo)) {
        return true;
    }
    const field_text ip{pNetInfo->szIP};
    const field_text mask{pNetInfo->szMask};
    return pNetInfo->nIPSource != 0 &&
           refuses(HERE, BlKLIBIsValidIpMask(ip.c_str(), mask.c_str()), "BlKLIBIsValidIpMask(szIP, szMask)");
}

/** Whether a row device has a VLAN already, whatever its id: there may be one. */
bool has_vlan(const char *szRowDevice, const VLANINFO *vlans, int count) {
    for (int i = 0; i < count; ++i) {
        if (strcmp(vlans[i].szRowDevice, szRowDevice) == 0) {
            return true;
        }
    }
    return false;
}

/** @return 0 when there can be a VLAN on the row device; -1 with log and code */
int check_kernel(const char *szRowDevice, int nId) {
    if (KOVANetIFGetInfo(szRowDevice, nullptr, nullptr) < 0) {
        return fail(HERE, NET_ERR_NOT_FOUND, -1, "No interface %s", szRowDevice);
    }
    VLANINFO vlan;
    const int is_row_vlan = KLIBNetVlanGet(szRowDevice, &vlan);
    if (is_row_vlan != 0) {
        return is_row_vlan < 0 ? -1 : fail(HERE, NET_ERR_BAD_PARAMETER, -1, "%s is a VLAN itself", szRowDevice);
    }
    const int is_there = KLIBNetVlanGetByRowDev(szRowDevice, nId, &vlan);
    if (is_there != 0) {
        return is_there < 0 ? -1 : fail(HERE, NET_ERR_EXISTS, -1, "VLAN %s exists", vlan.szIfname);
    }
    heap<VLANINFO> vlans;
    VLANINFO *list = nullptr;
    int count = 0;
    if (KLIBNetVlanEnum(&list, &count) < 0) {
        return -1;
    }
    vlans.reset(list);
    return has_vlan(szRowDevice, list, count) ? fail(HERE, NET_ERR_EXISTS, -1, "%s has a VLAN already", szRowDevice)
                                              : 0;
}

int copy_mtu_setting(const plan &plan) {
    char szValue[16] = "";
    if (KOVAConfGetMTUValue(plan.szRowDevice, szValue, sizeof szValue) < 0 ||
        KOVAConfSetMTUValue(szValue, plan.szVlan) < 0) {
        return fail_keeping_code(HERE, -1, "Set mtu config %s mtu=%s Failed.[0x%04X %s:%d]", plan.szVlan, szValue,
                                 REGISTER);
    }
    return 0;
}

/** The VLAN's file: a new interface with the addresses of the row device. */
int write_vlan_file(const plan &plan, new_ifcfg &file) {
    if (!file.is_open()) {
        return -1;
    }
    fprintf(file.get(), "DEVICE=%s\n", plan.szVlan);
    fprintf(file.get(), "VLAN_ROW_DEVICE=%s\n", plan.szRowDevice);
    fprintf(file.get(), "VLAN_ID=%d\n", plan.nId);
    fputs("ONBOOT=yes\n", file.get());
    if (plan.ip.nIPSource != 0) {
        fputs("BOOTPROTO=static\n", file.get());
        fprintf(file.get(), "IPADDR=%s\n", field_text{plan.ip.szIP}.c_str());
        fprintf(file.get(), "NETMASK=%s\n", field_text{plan.ip.szMask}.c_str());
    } else {
        fputs("BOOTPROTO=dhcp\n", file.get());
    }
    const ifcfg_path row_path{plan.szRowDevice};
    for (const char *const key : {key::kIpv6Init, "IPV6ADDR", "IPV6PREFIXLENG", "IPV6_DEFAULTGW", "IPV6DNS"}) {
        char value[1024];
        const int found = KLIBCFileGetKeyValue(row_path.c_str(), key, value, sizeof value, 0);
        if (found < 0) { // or the setting would be lost
            return fail_keeping_code(HERE, -1, "Failed to get key[%s] in file[%s].", key, row_path.c_str());
        }
        if (found > 0 && value[0] != '\0') {
            fprintf(file.get(), kPlainLine, key, value);
        }
    }
    return file.finish(HERE);
}

/** The row device's file: what is left is an interface without an address. */
int write_row_file(const plan &plan, new_ifcfg &file) {
    if (!file.is_open() ||
        file.copy_lines(HERE, ifcfg_path{plan.szRowDevice}.c_str(),
                        {"BOOTPROTO=", "IPADDR=", "NETMASK=", "IPV6INIT=", "IPV6_DEFAULTGW=", "IPV6DNS="}, false) < 0) {
        return -1;
    }
    fputs("BOOTPROTO=none\n", file.get());
    fputs("IPV6INIT=off\n", file.get());
    return file.finish(HERE);
}

int move_to_vlan(const plan &plan) {
    if (disable_pppoe(HERE, plan.szRowDevice) < 0 || copy_mtu_setting(plan) < 0) {
        return -1;
    }
    new_ifcfg vlan_file{plan.szVlan, "/etc/sysconfig/network-scripts/VLAN_XXXXXX"};
    if (write_vlan_file(plan, vlan_file) < 0) {
        return -1;
    }
    new_ifcfg row_file{plan.szRowDevice, "/etc/sysconfig/network-scripts/DEVICE_XXXXXX"};
    if (write_row_file(plan, row_file) < 0) {
        return -1;
    }
    const char *const names[] = {plan.szRowDevice, plan.szVlan};
    stop_interfaces(names, 1);
    if (row_file.replace(HERE) < 0 || vlan_file.replace(HERE) < 0) {
        return -1;
    }
    start_interfaces(names, 2);
    pause_for_seconds(kVlanSettleSeconds);
    return tell_new_name(HERE, plan.szRowDevice, plan.szVlan);
}

} // namespace

extern "C" int KLIBNetVlanCreate(const char *szRowDevice, int nId, const NETINFO *pNetInfo) {
    if (refuses_arguments(szRowDevice, nId, pNetInfo) || check_kernel(szRowDevice, nId) < 0) {
        return -1;
    }
    const vlan_name name{szRowDevice, nId};
    const char *const szVlan = name.c_str();
    ifname_change_event event{{&szRowDevice, 1}, {&szVlan, 1}};
    if (!event.open()) {
        return fail_keeping_code(HERE, -1, "Fail to init plugin) [0x%04X %s:%d]", REGISTER);
    }
    event.announce_before(HERE);
    const int result = move_to_vlan({szRowDevice, nId, szVlan, *pNetInfo});
    event.announce_after(HERE, result);
    return result;
}
