#include <kovanetsdk/iface.h>

#include "iface/interface_record.h"

#include <kova/ha.h>

namespace {

using namespace kova;

/** @return 0; -1 with log and code when the cluster has no address for the interface yet */
int take_cluster_address(const place &at, int kind, IFINFO &record) {
    cluster_address address;
    if (KOVAHAGetRelatedIFInfo(record.szIfname, address.szIP, address.szMask) == 0) {
        return fail(at, NET_ERR_OUT_OF_MEMORY, -1, "HA is running but HA IP not ready (%d)", selector_of(kind));
    }
    show_cluster_address(address, record);
    return 0;
}

int read_interface(const place &at, const char *szIfname, IFINFO &record) {
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(at, -1);
    }
    unsigned flags = 0;
    if (socket.flags(szIfname, flags) < 0 || read_record(socket, szIfname, flags, record) < 0) {
        return fail(at, NET_ERR_IOCTL, -1, "Cannot get interface info of %s: %m", szIfname);
    }
    correct_switch_link(record);
    return 0;
}

int get_info(const place &at, const char *szIfname, int kind, IFINFO *pInfo, NETINFO *pNetInfo) {
    const bool is_for_cluster = wants_cluster_address(kind);
    IFINFO record;
    if (read_interface(at, szIfname, record) < 0 || (is_for_cluster && take_cluster_address(at, kind, record) < 0)) {
        return -1;
    }
    if (pInfo != nullptr) {
        *pInfo = record;
    }
    return pNetInfo != nullptr ? fill_card(record, is_for_cluster, pNetInfo) : 0;
}

} // namespace

extern "C" int KOVANetIFGetInfo(const char *szIfname, IFINFO *pInfo, NETINFO *pNetInfo) {
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    return get_info(HERE, szIfname, 0, pInfo, pNetInfo);
}

extern "C" int KOVANetIFGetInfoEx(const char *szIfname, int kind, IFINFO *pInfo, NETINFO *pNetInfo) {
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    return get_info(HERE, szIfname, kind, pInfo, pNetInfo);
}
