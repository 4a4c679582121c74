#include <kovanetsdk/iface.h>

#include "core/commands.h"
#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/report.h"
#include "core/text.h"

#include <cstring>
#include <kova/service.h>
#include <kovanetsdk/addr.h>

using namespace kova;

namespace {

constexpr char kDhcpSwitch[] = "KOVAILnxSetDHCP";

template<size_t Size> bool is_same_field(const char (&one)[Size], const char (&other)[Size]) {
    return strncmp(one, other, Size) == 0;
}

/** What the PPPoE client left for the time after it. */
void delete_pppoe_leftovers() {
    unlink("/etc/ppp/old_gateway.bak");
    unlink("/etc/resolv.conf.bak");
}

int set_static(const NETINFO &wanted, const NETINFO *pOld) {
    const field_text ifname{wanted.szIfname};
    const field_text ip{wanted.szIP};
    const field_text mask{wanted.szMask};
    if (!BlKLIBIsValidIpMask(ip.c_str(), mask.c_str()) ||
        KOVAILnxSetIPNetmask(ifname.c_str(), ip.c_str(), mask.c_str()) < 0) {
        return -1;
    }
    delete_pppoe_leftovers();
    if (pOld == nullptr || !is_same_field(pOld->szIP, wanted.szIP) || !is_same_field(pOld->szMask, wanted.szMask)) {
        KLIBServiceReload("ddns");
    }
    return 0;
}

/** @return 0; -1 nothing was written; -2 the client was started, only the file could not be written */
int switch_to_dhcp(const char *szIfname) {
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    if (stop_dhcp_client(szIfname) != 0) {
        log_warning(HERE_AS(kDhcpSwitch), "unable to stop dhcp-client instance on %s", szIfname);
    }
    if (start_dhcp_client(szIfname) != 0) {
        return fail(HERE_AS(kDhcpSwitch), NET_ERR_EXEC, -1, "unable to start dhcp-client instance on %s", szIfname);
    }
    const ifcfg_path path{szIfname};
    if (rewrite_keys(HERE, path.c_str(), {{key::kDevice, szIfname}, {key::kOnBoot, "yes"}, {key::kBootProto, "dhcp"}},
                     {key::kIpAddr, key::kNetmask, key::kMaster, key::kSlave}) < 0) {
        return fail_keeping_code(HERE, -2, "Set %s error.", path.c_str());
    }
    return 0;
}

} // namespace

extern "C" int KOVANetSetCard1(NETINFO *pNew, NETINFO *pOld) {
    if (refuses_null(HERE, "pNew", pNew)) {
        return -1;
    }
    const named_lock lock{kConfigExclusive};
    if (!lock.is_held()) {
        return fail_lock(HERE, lock.result());
    }
    if (pNew->nIPSource != 0) {
        return set_static(*pNew, pOld);
    }
    return switch_to_dhcp(field_text{pNew->szIfname}.c_str());
}
