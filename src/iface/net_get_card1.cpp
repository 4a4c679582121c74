#include <kovanetsdk/iface.h>

#include "iface/interface_record.h"

#include <cstring>

namespace {

using namespace kova;

/** Kind of the cards a caller counts: bonds instead of their members, VLANs instead of what is below them. */
constexpr int kCards = 2;

struct query {
    int index;
    const char *szIP;
    bool is_for_cluster; ///< addresses are the cluster's
};

bool has_address(const IFINFO &record, const query &asked) {
    if (asked.is_for_cluster) {
        return strcmp(record.szIP, asked.szIP) == 0;
    }
    char szIP[20];
    return KOVAILnxGetIP(record.szIfname, szIP, sizeof szIP) == 0 && strcmp(szIP, asked.szIP) == 0;
}

/** The record asked for; an index past the end finds nothing, whatever the address. */
const IFINFO *find_record(const IFINFO *records, int count, const query &asked) {
    if (asked.index >= count) {
        return nullptr;
    }
    if (asked.szIP == nullptr) {
        return &records[asked.index];
    }
    for (int i = 0; i < count; ++i) {
        if (has_address(records[i], asked)) {
            return &records[i];
        }
    }
    return nullptr;
}

/** Reports at a place of the exported function. */
int get_card(const place &at, const query &asked, int kind, NETINFO *pNetInfo) {
    const place named{at.unit, at.function, at.line, lead::function_colon};
    const named_lock lock{kConfigShared};
    if (!lock.is_held()) {
        return fail_lock(at, -1);
    }
    const heap<IFINFO> records{static_cast<IFINFO *>(calloc(kMaxInterfaces, sizeof(IFINFO)))};
    if (records == nullptr) {
        return fail(at, NET_ERR_OUT_OF_MEMORY, -1, "Failed to alloc memory.");
    }
    const int count = KLIBNetGetInterfaceInfo(records.get(), kMaxInterfaces, kind);
    if (count < 1) {
        return fail_keeping_code(named, count, "%s", count < 0 ? "Get interface info fail." : "No interface.");
    }
    const IFINFO *const found = find_record(records.get(), count, asked);
    if (found == nullptr) {
        return 0;
    }
    return fill_card(*found, asked.is_for_cluster, pNetInfo) < 0 ? -1 : 1;
}

bool refuses_query(const place &at, int index, const char *szIP, const NETINFO *pNetInfo) {
    return refuses_null(at, "pNetInfo", pNetInfo) ||
           refuses(at, szIP != nullptr || (0 <= index && index < kMaxInterfaces),
                   "((void *)0) != szIP || (0 <= index && index < 32)") ||
           refuses(at, szIP == nullptr || *szIP != '\0', "'\\0' != *szIP");
}

} // namespace

extern "C" int KOVANetGetCard1(int index, const char *szIP, NETINFO *pNetInfo) {
    if (refuses_query(HERE, index, szIP, pNetInfo)) {
        return -1;
    }
    return get_card(HERE, {index, szIP, false}, kCards, pNetInfo);
}

extern "C" int KOVANetGetCard1Ex(int index, const char *szIP, int kind, NETINFO *pNetInfo) {
    if (refuses_query(HERE, index, szIP, pNetInfo)) {
        return -1;
    }
    return get_card(HERE, {index, szIP, wants_cluster_address(kind)}, kind, pNetInfo);
}
