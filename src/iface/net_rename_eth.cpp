#include <kovanetsdk/iface.h>

#include "core/guards.h"
#include "core/kernel.h"
#include "core/report.h"

#include <cstring>
#include <kovanetsdk/stats.h>

using namespace kova;

namespace {

struct statistics_kind {
    static NETSTAT *none() { return nullptr; }
    static void release(NETSTAT *records) { KLIBNetStatFree(records); }
};

bool is_short(const char *szIfname) {
    return strlen(szIfname) < 17;
}

/** The kernel would fill in a number for "%d", and the caller would not learn which. */
bool is_new_name(const char *szIfname) {
    return strpbrk(szIfname, "%:") == nullptr;
}

/** Says what goes wrong. */
int require_known_and_down(const char *szIfname) {
    const owner<statistics_kind> statistics{KLIBNetStatInit(1)};
    if (!statistics.is_held()) {
        return fail_keeping_code(HERE, -1, "Failed to alloc memory.");
    }
    if (KLIBNetStatGetSingle(szIfname, statistics.get()) < 0) {
        return fail(HERE, NET_ERR_NOT_FOUND, -1, "No interface %s", szIfname);
    }
    if (KOVANetIsIFUp(szIfname) != 0) {
        return fail(HERE, NET_ERR_NOT_FOUND, -1, "Interface %s is up", szIfname);
    }
    return 0;
}

} // namespace

extern "C" int KOVANetRenameEth(const char *szOld, const char *szNew) {
    if (refuses_ifname(HERE, "szOld", szOld) || refuses_ifname(HERE, "szNew", szNew) ||
        refuses(HERE, is_short(szOld), "strlen(szOld) < 17") || refuses(HERE, is_short(szNew), "strlen(szNew) < 17") ||
        refuses(HERE, is_new_name(szNew), "is_new_name(szNew)") || require_known_and_down(szOld) < 0) {
        return -1;
    }
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    unsigned char mac[6];
    if (socket.hardware_address(szOld, mac) < 0) {
        return fail(HERE, request_code(errno), -1, "Cannot get hardware address of %s: %m", szOld);
    }
    if (socket.rename(szOld, szNew) < 0) {
        return fail(HERE, request_code(errno), -1, "Cannot rename %s to %s: %m", szOld, szNew);
    }
    return 0;
}
