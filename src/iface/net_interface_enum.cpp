#include <kovanetsdk/iface.h>

#include "iface/interface_record.h"

#include <memory>

namespace {

using namespace kova;

enum selector { kAll = 0, kNotLocalLan = 1, kOnlyLocalLan = 2 };

struct free_statistics {
    void operator()(NETSTAT *list) const { KLIBNetStatFree(list); }
};

bool is_of_kind(const char *szIfname, int selector) {
    return selector == kAll || (KLIBNetIFIsLocalLan(szIfname) != 0) == (selector == kOnlyLocalLan);
}

/** Whether an interface is selected; its record is filled then. */
bool selects(const interface_socket &socket, const cluster_view &cluster, int selector, const char *szIfname,
             IFINFO &record) {
    unsigned flags = 0;
    cluster_address address;
    if (socket.flags(szIfname, flags) < 0 || !is_eligible(szIfname, flags, IFF_LOOPBACK | IFF_SLAVE) ||
        !is_of_kind(szIfname, selector) || !cluster.admits(szIfname, address) ||
        read_record(socket, szIfname, flags, record) < 0) { // the last one: it is gone since
        return false;
    }
    if (cluster.gives_addresses()) {
        show_cluster_address(address, record);
    }
    return true;
}

} // namespace

extern "C" int KLIBNetInterfaceEnum(IFINFO *pInfo, int capacity, int kind) {
    const int selector = selector_of(kind);
    if (refuses(HERE, 0 <= capacity, "0 <= capacity") ||
        refuses(HERE, kAll <= selector && selector <= kOnlyLocalLan, "0 <= selector && selector <= 2")) {
        return -1;
    }
    const std::unique_ptr<NETSTAT, free_statistics> statistics{KLIBNetStatInit(kMaxInterfaces)};
    if (statistics == nullptr) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, -1, "Failed to alloc memory.");
    }
    const int interfaces = KLIBNetStatGetAll(statistics.get(), kMaxInterfaces);
    if (interfaces < 1) {
        return fail_keeping_code(HERE, -1, "Failed to list interfaces, kovaerr=[0x%04X]", KLIBCErrGet());
    }
    const cluster_view cluster{HERE, kind};
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    int count = 0;
    for (int i = 0; i < interfaces && count < capacity; ++i) {
        IFINFO record;
        if (selects(socket, cluster, selector, statistics.get()[i].szIfname, record)) {
            if (pInfo != nullptr) {
                pInfo[count] = record;
            }
            ++count;
        }
    }
    cluster.note_result(HERE, count);
    return count;
}
