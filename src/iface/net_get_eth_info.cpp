#include <kovanetsdk/iface.h>

#include "core/kernel.h"
#include "core/report.h"
#include "core/text.h"

#include <cstring>
#include <kovanetsdk/link.h>
#include <span>

namespace {

using namespace kova;

struct link_mode {
    uint32_t bit;
    int32_t speed;
    int32_t duplex;
    const char *name;
};

/** In the order of speed, not of bits: the last row that is supported is the best. */
constexpr link_mode kLinkModes[] = {
    {0x1, 10, 0, "baseT"},
    {0x2, 10, 1, "baseT"},
    {0x4, 100, 0, "baseT"},
    {0x8, 100, 1, "baseT"},
    {0x10, 1000, 0, "baseT"},
    {0x20, 1000, 1, "baseT"},
    {0x20000, 1000, 1, "baseKX"},
    {0x8000, 2500, 1, "baseX"},
    {0x1000, 10000, 1, "baseT"},
    {0x40000, 10000, 1, "baseKX4"},
    {0x80000, 10000, 1, "baseKR"},
    {0x200000, 20000, 1, "baseMLD2"},
    {0x400000, 20000, 1, "baseKR2"},
    {0x800000, 40000, 1, "baseKR4"},
    {0x1000000, 40000, 1, "baseCR4"},
    {0x2000000, 40000, 1, "baseSR4"},
    {0x4000000, 40000, 1, "baseLR4"},
};

constexpr int32_t kUnknown = -1;

constexpr ETHINFO kNothingKnown = {kUnknown, kUnknown, kUnknown, UINT32_MAX, kUnknown, kUnknown, ""};

int32_t speed_of(const link_settings &settings) {
    if (settings.speed_low == 0 || settings.speed_low == 0xFFFF) {
        return kUnknown;
    }
    return static_cast<int32_t>(static_cast<uint32_t>(settings.speed_high) << 16 | settings.speed_low);
}

int32_t duplex_of(const link_settings &settings) {
    return settings.duplex <= 1 ? settings.duplex : kUnknown;
}

void take_best_mode(ETHINFO &info) {
    for (size_t row = std::size(kLinkModes); row-- > 0;) {
        const link_mode &mode = kLinkModes[row];
        if ((info.nSupported & mode.bit) != 0) {
            info.nBestSpeed = mode.speed;
            info.nBestDuplex = mode.duplex;
            copy_text(info.szBestMode, mode.name);
            return;
        }
    }
}

/** The members of a bond answer for its duplex; speed and modes of a bond are unknown. */
int read_ovs_bond(const char *szBond, ETHINFO &info) {
    KOVALINKAGGROPT bond;
    if (KOVANetLinkAggrGet(szBond, &bond) != 0) {
        log_err(HERE, "Failed to get bond slave of %s", szBond);
        return fail_keeping_code(HERE, -1, "Failed to get ovs bond setting");
    }
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail(HERE, NET_ERR_SOCKET, -1, "Failed to get ovs bond setting");
    }
    link_settings settings;
    for (int i = 0; i < bond.cSlaves; ++i) {
        if (socket.ethernet_settings(bond.aszSlaves[i], settings) == 0) {
            info.nDuplex = duplex_of(settings);
            break;
        }
    }
    return 0;
}

/** Asks the driver; one that does not answer at all leaves everything unknown. */
int read_link(const char *szIfname, ETHINFO &info) {
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    link_settings settings;
    if (socket.ethernet_settings(szIfname, settings) == 0) {
        info.nSpeed = speed_of(settings);
        info.nDuplex = duplex_of(settings);
        info.nSupported = settings.supported;
        take_best_mode(info);
    } else if (errno != EOPNOTSUPP) {
        return fail(HERE, request_code(errno), -1, "Cannot get link settings of %s: %m", szIfname);
    }
    bool has_link = true;
    if (socket.ethernet_link(szIfname, has_link) < 0 && errno != EOPNOTSUPP) {
        return fail(HERE, request_code(errno), -1, "Cannot get link status of the %s: %m", szIfname);
    }
    if (!has_link) {
        info.nSpeed = kUnknown;
    }
    return 0;
}

/** The interface to ask for one that is no bond; switch ports stand for another one. */
const char *asked_interface(const char *szIfname, int role, std::span<char> original) {
    if (role != kOvsPort) {
        return szIfname;
    }
    if (KLIBNetOVSGetOriginalIf(szIfname, original.data(), static_cast<int>(original.size())) < 0) {
        log_info(HERE, "Failed to fetch slave interface from OVS master %s", szIfname);
        return szIfname;
    }
    return original.data();
}

} // namespace

extern "C" int KOVANetGetEthInfo(ETHINFO *pEthInfo, const char *szIfname) {
    if (refuses_null(HERE, "pEthInfo", pEthInfo) || refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    *pEthInfo = kNothingKnown;
    const int role = KLIBNetOVSIfIsMaster(szIfname);
    char original[256];
    const char *const szAsked = asked_interface(szIfname, role, original);
    if (refuses(HERE, strlen(szAsked) <= IFNAMSIZ, "16 >= strlen(szIfname)")) {
        return -1;
    }
    const int result = role == kOvsBond ? read_ovs_bond(szAsked, *pEthInfo) : read_link(szAsked, *pEthInfo);
    if (result < 0) {
        return -1;
    }
    const int mtu = KOVAGetMTUSetting(szAsked);
    if (mtu < 1) {
        return fail_keeping_code(HERE, -1, "Failed to get MTU of %s", szAsked);
    }
    pEthInfo->nMTU = mtu;
    return 0;
}
