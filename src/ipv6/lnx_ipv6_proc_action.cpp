#include <kovanetsdk/ipv6.h>

#include "core/guards.h"
#include "core/pause.h"
#include "core/report.h"
#include "core/text.h"

#include <algorithm>
#include <kovanetsdk/iface.h>

using namespace kova;

namespace {

constexpr int kLogicalInterfaces = 2;
constexpr int kDisable = 1;
constexpr uint32_t kLinkLocal = 0x20;
constexpr uint16_t kTentative = 0x40;

bool is_unsettled(const KOVAV6IP &address) {
    return address.nScope == kLinkLocal && (address.nFlags & kTentative) != 0;
}

/** Whether there is nothing to wait for: settled addresses, more than are looked at, or none that can be listed. */
bool is_settled(const char *szIfname) {
    KOVAV6IP addresses[16];
    constexpr int kRoom = std::size(addresses);
    const int count = KOVALnxV6IPGet(szIfname, addresses, kRoom);
    if (count < 0 || count > kRoom) {
        return true;
    }
    return count > 0 && std::none_of(addresses, addresses + count, is_unsettled);
}

/** Gives the link-local address its time. */
void wait_for_addresses(const char *szIfname) {
    constexpr int kAttempts = 10;
    constexpr timespec kPause{0, 500'000'000};
    for (int i = 0; i < kAttempts && !is_settled(szIfname); ++i) {
        pause_for(kPause);
    }
}

} // namespace

extern "C" int KOVALnxIPv6ProcAction(const char *szIfname, int nSwitch) {
    if (refuses_ifname(HERE, "szIfname", szIfname) || !KOVANetIsDevTypeMatch(szIfname, kLogicalInterfaces)) {
        return -1;
    }
    const path_text path{"/proc/sys/net/ipv6/conf/%s/disable_ipv6", szIfname};
    const stream file{fopen(path.c_str(), "we")};
    if (!file.is_held()) {
        return fail_keeping_code(HERE, -1, "open file %s failed", path.c_str());
    }
    if (fputs(nSwitch == kDisable ? "1\n" : "0\n", file.get()) == EOF || fflush(file.get()) != 0) {
        return fail(HERE, NET_ERR_FILE_WRITE, -1, "write file %s failed", path.c_str());
    }
    if (nSwitch == 0) {
        wait_for_addresses(szIfname);
    }
    return 0;
}
