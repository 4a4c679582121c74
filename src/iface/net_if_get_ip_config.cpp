#include <kovanetsdk/iface.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/report.h"

#include <kovanetsdk/dhcp.h>

namespace {

using namespace kova;

template<size_t Size> bool reads(const char *path, const char *wanted, char (&field)[Size]) {
    return KLIBCFileGetKeyValue(path, wanted, field, Size, 0) > 0;
}

/** Reads address and mask; the register stays as the read leaves it. */
int read_address(const char *path, NETINFO *pNetInfo) {
    if (!reads(path, key::kIpAddr, pNetInfo->szIP)) {
        return fail_keeping_code(HERE, -1, "Failed to get [%s] from [%s]", key::kIpAddr, path);
    }
    if (!reads(path, key::kNetmask, pNetInfo->szMask)) {
        return fail_keeping_code(HERE, -1, "Failed to get [%s] from [%s]", key::kNetmask, path);
    }
    return 0;
}

int read_lease(const char *szIfname, NETINFO *pNetInfo) {
    const lease_path path{szIfname};
    if (KLIBCFileExist(path.c_str()) == 0) {
        log_info(HERE, "/etc/dhclient/ipv4/dhcpcd-%s.info is not exist", szIfname);
        return 0;
    }
    return read_address(path.c_str(), pNetInfo);
}

} // namespace

extern "C" int KOVANetIFGetIPConfig(const char *szIfname, NETINFO *pNetInfo) {
    if (refuses_ifname(HERE, "szIfname", szIfname) || refuses_null(HERE, "pNetInfo", pNetInfo)) {
        return -1;
    }
    const named_lock lock{kConfigShared};
    if (!lock.is_held()) {
        return fail_lock(HERE, -1);
    }
    pNetInfo->szIP[0] = '\0';
    pNetInfo->szMask[0] = '\0';
    pNetInfo->nIPSource = BlKOVALnxIsDHCP(szIfname) != 0 ? 0 : 1;
    return pNetInfo->nIPSource == 0 ? read_lease(szIfname, pNetInfo)
                                    : read_address(ifcfg_path{szIfname}.c_str(), pNetInfo);
}
