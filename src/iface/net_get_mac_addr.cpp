#include <kovanetsdk/iface.h>

#include "core/kernel.h"
#include "core/report.h"
#include "iface/interface_record.h"

#include <cstdio>
#include <kova/ha.h>

namespace {

using namespace kova;

constexpr int kMacSize = sizeof "aa:bb:cc:dd:ee:ff";
constexpr int kCards = 2; // numbered like the cards of KOVANetGetCard1

bool refuses_buffer(const place &at, const char *szMac, int cbMac) {
    return refuses_null_text(at, "szMac", szMac) || refuses(at, kMacSize <= cbMac, "18 <= cbMac");
}

void write_mac(const unsigned char (&mac)[6], char *szMac) {
    snprintf(szMac, kMacSize, "%02x:%02x:%02x:%02x:%02x:%02x", mac[0], mac[1], mac[2], mac[3], mac[4], mac[5]);
}

} // namespace

extern "C" int KLIBNetGetMacAddr(int index, char *szMac, int cbMac) {
    if (refuses(HERE, 0 <= index && index < kMaxInterfaces, "0 <= index && index < 32") ||
        refuses_buffer(HERE, szMac, cbMac)) {
        return -1;
    }
    *szMac = '\0';
    if (KOVAHAGetMac(index, szMac, cbMac) >= 0 && *szMac != '\0') {
        return 0;
    }
    *szMac = '\0';
    IFINFO records[kMaxInterfaces];
    const int count = KLIBNetGetInterfaceInfo(records, kMaxInterfaces, kCards);
    if (count < 0) {
        return fail_keeping_code(HERE, -1, "Get interface info fail.");
    }
    if (index >= count) {
        return fail(HERE, NET_ERR_NOT_FOUND, -1, "No interface of index [%d]", index);
    }
    write_mac(records[index].abMac, szMac);
    return 0;
}

extern "C" int KLIBNetGetMacAddrByInterface(const char *szIfname, char *szMac, int cbMac) {
    if (refuses_text(HERE, "szIfname", szIfname) || refuses_buffer(HERE, szMac, cbMac)) {
        return -1;
    }
    *szMac = '\0';
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    unsigned char mac[6];
    if (socket.hardware_address(szIfname, mac) < 0) {
        return fail(HERE, request_code(errno), -1, "Cannot get hardware address of %s: %m", szIfname);
    }
    write_mac(mac, szMac);
    return 0;
}
