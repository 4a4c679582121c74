#include <kovanetsdk/link.h>

#include "core/kernel.h"
#include "core/pause.h"
#include "core/report.h"
#include "link/mtu_key.h"

#include <kovanetsdk/events.h>
#include <kovanetsdk/iface.h>

using namespace kova;

namespace {

/** Links need a while to come back; who listens to the event may rely on them. */
constexpr int kSettleSeconds = 5;

int announce(const char *szIfname, const char *szValue) {
    pause_for_seconds(kSettleSeconds);
    (void)KOVANetMTUChangeHook(szIfname, szValue); // what was changed stays changed
    return 0;
}

/** The register goes on telling why the change failed, whatever the event's listeners do. */
int announce_failure(const char *szIfname, const char *szValue) {
    const uint32_t code = KLIBCErrGet();
    const char *const unit = KLIBCErrorGetFile();
    const int line = KLIBCErrorGetLine();
    announce(szIfname, szValue);
    KLIBCErrSetEx(code, unit, line);
    return -1;
}

int set_ovs_slave(const char *szValue, const char *szSlave) {
    if (KOVAConfSetMTUValue(szValue, szSlave) < 0) {
        return fail_keeping_code(HERE, -1, "KOVAConfSetMTUValue [%s] failed (0x%04X)", szSlave, KLIBCErrGet());
    }
    if (KOVANetSetMTUEth(szValue, szSlave) < 0) {
        return fail_keeping_code(HERE, -1, "KOVANetSetMTUEth [%s] failed (0x%04X)", szSlave, KLIBCErrGet());
    }
    return 0;
}

int set_ovs_bond(const char *szValue, const char *szBond) {
    if (KOVAConfSetMTUValue(szValue, szBond) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to ifconfig MTU Value(0x%04X)", KLIBCErrGet());
    }
    KOVALINKAGGROPT bond;
    if (KOVANetLinkAggrGet(szBond, &bond) != 0) {
        return fail_keeping_code(HERE, -1, "Failed to get OVS bond slave of %s", szBond);
    }
    for (int i = 0; i < bond.cSlaves; ++i) {
        if (set_ovs_slave(szValue, bond.aszSlaves[i]) < 0) {
            return -1;
        }
    }
    return 0;
}

int fail_to_set(const char *szValue, const char *szIfname) {
    return fail_keeping_code(HERE, -1, "Failed to set MTU %s of %s", szValue, szIfname);
}

/** Whether a link is too slow for frames of a size; 1500 counts as jumbo, too. */
bool is_jumbo_on_slow_link(const char *szValue, int speed) {
    constexpr int kGigabit = 1000;
    constexpr int kLargestOrdinary = 1499;
    return speed < kGigabit && mtu_number(szValue) > kLargestOrdinary;
}

int set_interface(const char *szValue, const char *szIfname) {
    if (KOVAConfSetMTUValue(szValue, szIfname) < 0) {
        log_err(HERE, "Failed to ifconfig MTU Value(0x%04X)", KLIBCErrGet());
        return fail_to_set(szValue, szIfname);
    }
    ETHINFO link;
    if (KOVANetGetEthInfo(&link, szIfname) < 0) {
        log_err(HERE, "Can not get EthInfo(%X).", KLIBCErrGet());
        return fail_to_set(szValue, szIfname);
    }
    if (is_jumbo_on_slow_link(szValue, link.nSpeed)) {
        log_warning(HERE, "Skip setting Jumbo MTU %s to %s which link-speed is lower than 1Gbps.", szValue, szIfname);
    } else if (KOVANetSetMTUEth(szValue, szIfname) < 0) {
        log_err(HERE, "Failed to ifconfig MTU Value(0x%04X)", KLIBCErrGet());
        return fail_to_set(szValue, szIfname);
    }
    return announce(szIfname, szValue);
}

} // namespace

extern "C" int KOVANetSetMTUValue(const char *szValue, const char *szIfname) {
    if (refuses_null_text(HERE, "szValue", szValue) || refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    char szOriginal[1024];
    switch (KLIBNetOVSIfIsMaster(szIfname)) {
    case kOvsBond:
        return set_ovs_bond(szValue, szIfname) < 0 ? announce_failure(szIfname, szValue) : announce(szIfname, szValue);
    case kOvsPort:
        if (KLIBNetOVSGetOriginalIf(szIfname, szOriginal, sizeof szOriginal) < 0) {
            return fail_keeping_code(HERE, -1, "get ovs origin interface error");
        }
        return set_interface(szValue, szOriginal);
    default:
        return set_interface(szValue, szIfname);
    }
}
