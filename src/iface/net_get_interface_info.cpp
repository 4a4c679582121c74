#include <kovanetsdk/iface.h>

#include "core/text.h"
#include "iface/interface_record.h"

#include <cstring>

namespace {

using namespace kova;

/** Selectors with rules of their own; every other one takes all interfaces that are up. */
enum selector { kPhysicalCards = 1, kLogicalInterfaces = 2, kLogicalAndPeers = 8 };

/** Created once, kept for the process. */
NETSTAT *statistics;

/** The interfaces below VLANs; those of the walk that runs. */
struct {
    int number;
    char names[kMaxInterfaces][IFNAMSIZ];
} row_devices;

unsigned excluded_flags(int selector) {
    switch (selector) {
    case kPhysicalCards:
        return IFF_LOOPBACK | IFF_POINTOPOINT | IFF_MASTER;
    case kLogicalInterfaces:
        return IFF_LOOPBACK | IFF_POINTOPOINT | IFF_SLAVE;
    case kLogicalAndPeers:
        return IFF_LOOPBACK | IFF_SLAVE;
    default:
        return IFF_LOOPBACK | IFF_POINTOPOINT;
    }
}

/** @return number of interfaces in the statistics; below 1 on failure */
int read_statistics() {
    if (statistics == nullptr) {
        statistics = KLIBNetStatInit(kMaxInterfaces);
    }
    return statistics != nullptr ? KLIBNetStatGetAll(statistics, kMaxInterfaces) : -1;
}

/** One walk over the interfaces. */
class walk {
public:
    walk(const interface_socket &socket, const cluster_view &cluster, int selector, bool has_vlans)
        : socket_(socket), cluster_(cluster), selector_(selector), has_vlans_(has_vlans) {
        row_devices.number = 0;
    }

    /** Whether an interface is selected; its record is filled then. */
    bool selects(const char *szIfname, IFINFO &record) const {
        unsigned flags = 0;
        cluster_address address;
        if (strstr(szIfname, "gbr") != nullptr || strstr(szIfname, "gwlan") != nullptr ||
            socket_.flags(szIfname, flags) < 0 || is_skipped_vlan(szIfname) ||
            !is_eligible(szIfname, flags, excluded_flags(selector_)) || !cluster_.admits(szIfname, address) ||
            read_record(socket_, szIfname, flags, record) < 0) { // the last one: it is gone since
            return false;
        }
        correct_switch_link(record);
        if (cluster_.gives_addresses()) {
            show_cluster_address(address, record);
        }
        return true;
    }

private:
    /** Remembers the interface below a VLAN where VLANs replace it; a VLAN is no physical card. */
    bool is_skipped_vlan(const char *szIfname) const {
        char row_device[IFNAMSIZ];
        if (!has_vlans_ || socket_.vlan_row_device(szIfname, row_device) < 0) {
            return false;
        }
        if (selector_ == kLogicalInterfaces && row_devices.number < kMaxInterfaces) {
            copy_text(row_devices.names[row_devices.number++], row_device);
        }
        return selector_ == kPhysicalCards;
    }

    const interface_socket &socket_;
    const cluster_view &cluster_;
    int selector_;
    bool has_vlans_;
};

bool is_row_device(const IFINFO &record) {
    for (int i = 0; i < row_devices.number; ++i) {
        if (strcmp(row_devices.names[i], record.szIfname) == 0) {
            return true;
        }
    }
    return false;
}

/** Drops the interfaces below VLANs; the last record takes the place of a dropped one. @return number left */
int drop_row_devices(IFINFO *pInfo, int count) {
    if (row_devices.number > count) {
        return fail_quietly(HERE, NET_ERR_BAD_PARAMETER, count);
    }
    for (int i = 0; i < count;) {
        if (is_row_device(pInfo[i])) {
            pInfo[i] = pInfo[--count];
        } else {
            ++i;
        }
    }
    return count;
}

} // namespace

extern "C" int KLIBNetGetInterfaceInfo(IFINFO *pInfo, int capacity, int kind) {
    if (refuses(HERE, 0 <= capacity, "0 <= capacity")) {
        return -1;
    }
    const int has_vlans = KLIBCModuleIsLoad("8021q");
    if (has_vlans < 0) {
        return fail_keeping_code(HERE, -1, "Failed to look for module 8021q, kovaerr=[0x%04X]", KLIBCErrGet());
    }
    const cluster_view cluster{HERE, kind};
    if (refuses(HERE, selector_of(kind) != 0, "0 != selector")) {
        return -1;
    }
    const int interfaces = read_statistics();
    if (interfaces < 1) {
        return fail_keeping_code(HERE, -1, "Failed to list interfaces, kovaerr=[0x%04X]", KLIBCErrGet());
    }
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    const walk cards{socket, cluster, selector_of(kind), has_vlans != 0};
    int count = 0;
    for (int i = 0; i < interfaces && count < capacity; ++i) {
        IFINFO record;
        if (cards.selects(statistics[i].szIfname, record)) {
            if (pInfo != nullptr) {
                pInfo[count] = record;
            }
            ++count;
        }
    }
    if (pInfo != nullptr) {
        count = drop_row_devices(pInfo, count);
    }
    cluster.note_result(HERE, count);
    return count;
}

extern "C" int KOVANetEnumCard(int kind) {
    return KLIBNetGetInterfaceInfo(nullptr, kMaxInterfaces, kind);
}
