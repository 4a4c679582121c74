#include <kovanetsdk/ipv6.h>

#include "core/guards.h"
#include "core/report.h"

#include <algorithm>

using namespace kova;

namespace {

constexpr int kDelete = 1;
constexpr uint16_t kDuplicateFound = 0x08;
constexpr int kUsualRoom = 16;

/** Removes the duplicates among some addresses. @return their number, or -1 */
int remove_duplicates(const char *szIfname, const KOVAV6IP *addresses, int count, KOVAV6IP *rgRemoved,
                      int cMaxRemoved) {
    int removed = 0;
    for (int i = 0; i < count; ++i) {
        const KOVAV6IP &address = addresses[i];
        if ((address.nFlags & kDuplicateFound) == 0) {
            continue;
        }
        if (KOVANetIPv6IPAction(kDelete, szIfname, address.szIP, address.nPrefixLength, nullptr) != 0) {
            return fail_keeping_code(HERE, -1, "Fail to remove DAD fail ipv6 address, %s:%s/%d", szIfname, address.szIP,
                                     static_cast<int>(address.nPrefixLength));
        }
        if (rgRemoved != nullptr && removed < cMaxRemoved) {
            rgRemoved[removed] = address;
        }
        ++removed;
    }
    return removed;
}

} // namespace

extern "C" int KOVANetIPv6RemoveDADFailedIP(const char *szIfname, KOVAV6IP *rgRemoved, int cMaxRemoved) {
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    KOVAV6IP usual[kUsualRoom];
    const int count = KOVALnxV6IPGet(szIfname, usual, kUsualRoom);
    if (count <= kUsualRoom) {
        return remove_duplicates(szIfname, usual, count, rgRemoved, cMaxRemoved);
    }
    const heap<KOVAV6IP> grown{static_cast<KOVAV6IP *>(calloc(static_cast<size_t>(count), sizeof(KOVAV6IP)))};
    if (!grown) {
        return fail_quietly(HERE, NET_ERR_UNKNOWN, -1);
    }
    const int listed = KOVALnxV6IPGet(szIfname, grown.get(), count); // there may be more of them by now
    return remove_duplicates(szIfname, grown.get(), std::min(listed, count), rgRemoved, cMaxRemoved);
}
