#include "iface/interface_record.h"

#include "core/text.h"

#include <cstring>
#include <kova/ha.h>
#include <kovanetsdk/bridge.h>
#include <kovanetsdk/net_int.h>

namespace kova {

namespace {

constexpr uint32_t kLink = 2;

using address_request = int (interface_socket::*)(const char *, uint32_t &) const;

/** Reads an address; there may be none. @return 0; -1 with errno */
template<size_t Size>
int read_address(const interface_socket &socket, address_request request, const char *szIfname, char (&field)[Size]) {
    uint32_t address = 0;
    if ((socket.*request)(szIfname, address) < 0) {
        return errno == EADDRNOTAVAIL ? 0 : -1;
    }
    address_text text;
    write_address(address, text);
    copy_text(field, text);
    return 0;
}

} // namespace

bool wants_cluster_address(int kind) {
    return (kind & kClusterAddress) != 0 && KOVAHAIsRunning() != 0;
}

cluster_view::cluster_view(const place &at, int kind) : kind_(kind), is_running_(KOVAHAIsRunning() != 0) {
    if (is_running_ && KOVAHAGetHeartbeatIF(heartbeat_, sizeof heartbeat_) < 0) {
        heartbeat_[0] = '\0';
        log_info(at, "Failed to get heartbeat interface.");
    }
}

bool cluster_view::admits(const char *szIfname, cluster_address &address) const {
    if ((kind_ & kKeepHeartbeat) == 0 && strcmp(szIfname, heartbeat_) == 0) {
        return false;
    }
    return !gives_addresses() || KOVAHAGetRelatedIFInfo(szIfname, address.szIP, address.szMask) != 0;
}

void cluster_view::note_result(const place &at, int count) const {
    if (gives_addresses() && count == 0 && KOVAHAIsActive() != 0) {
        log_info(at, "HA is running but HA IP not ready (%d)", selector_of(kind_));
    }
}

bool is_eligible(const char *szIfname, unsigned flags, unsigned excluded_flags) {
    return (flags & IFF_UP) != 0 && (flags & excluded_flags) == 0 && KLIBNetBridgeIfIsSlave(szIfname) == 0 &&
           KLIBNetOVSIfIsSlave(szIfname) == 0;
}

int read_record(const interface_socket &socket, const char *szIfname, unsigned flags, IFINFO &record) {
    record = {};
    copy_text(record.szIfname, szIfname);
    record.nFlags = flags;
    record.nLink = (flags & IFF_RUNNING) != 0 ? kLink : 0;
    if (socket.hardware_address(szIfname, record.abMac) < 0 ||
        read_address(socket, &interface_socket::address, szIfname, record.szIP) < 0) {
        return -1;
    }
    return read_address(socket, &interface_socket::netmask, szIfname, record.szMask);
}

void correct_switch_link(IFINFO &record) {
    if (strncmp(record.szIfname, "ovs_", 4) == 0) {
        record.nLink = KOVANetIfIsLink(record.szIfname) == 1 ? kLink : 0;
    }
}

void show_cluster_address(const cluster_address &address, IFINFO &record) {
    copy_text(record.szIP, address.szIP);
    copy_text(record.szMask, address.szMask);
}

int fill_card(const IFINFO &record, bool shows_cluster_address, NETINFO *pNetInfo) {
    if (init_net_info(pNetInfo, &record) < 0 || KOVANetIFGetIPConfig(record.szIfname, pNetInfo) < 0) {
        return -1;
    }
    if (shows_cluster_address) {
        copy_text(pNetInfo->szIP, record.szIP);
        copy_text(pNetInfo->szMask, record.szMask);
    }
    return 0;
}

} // namespace kova
