#include <kovanetsdk/link.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/kernel.h"
#include "link/mtu_key.h"

#include <cstring>
#include <kovanetsdk/iface.h>

using namespace kova;

namespace {

/** The interface whose key counts: for a port of the virtual switch the one behind it. */
class configured_ifname {
public:
    explicit configured_ifname(const char *szIfname) : szName_(szIfname) {
        if (KLIBNetOVSIfIsMaster(szIfname) != kOvsPort) {
            return;
        }
        if (KLIBNetOVSGetOriginalIf(szIfname, szOriginal_, sizeof szOriginal_) == 0) {
            szName_ = szOriginal_;
        } else {
            log_info(HERE, "Failed to fetch slave interface from OVS master %s", szIfname);
        }
    }
    configured_ifname(const configured_ifname &) = delete;
    configured_ifname &operator=(const configured_ifname &) = delete;
    [[nodiscard]] const char *c_str() const { return szName_; }

private:
    char szOriginal_[1024];
    const char *szName_;
};

bool refuses_key(const mtu_key &key) {
    return refuses(HERE, key.fits(), "strlen(szIfname) <= IFNAMSIZ");
}

bool store(const char *szValue, const char *szIfname) {
    const bool is_stored = KLIBCFileSetKeyValue(kKovaInfo, mtu_key{szIfname}.c_str(), szValue, kQuotedLine) >= 0;
    if (!is_stored) {
        log_err(HERE, "Failed to set %s MTU config value[0x%04X %s:%d]", szIfname, REGISTER);
    }
    return is_stored;
}

/** A VLAN's setting is also its row device's: both are written under one lock. */
int store_locked(const char *szValue, const char *szIfname, const char *szRowDevice) {
    named_lock lock{kInfoExclusive};
    if (!lock.is_held()) {
        return fail_keeping_code(HERE, -1, "Failed to lock kovainfo [0x%04X %s:%d]", REGISTER);
    }
    const bool has_row = szRowDevice == nullptr || store(szValue, szRowDevice);
    const bool has_own = store(szValue, szIfname);
    if (lock.release() < 0) {
        return fail_keeping_code(HERE, -1, "Failed to unlock kovainfo[0x%04X %s:%d]", REGISTER);
    }
    return has_row && has_own ? 0 : -1;
}

} // namespace

extern "C" int KOVAConfGetMTUValue(const char *szIfname, char *szValue, int cbValue) {
    if (refuses_ifname(HERE, "szIfname", szIfname) || refuses_null_text(HERE, "szValue", szValue) ||
        refuses(HERE, cbValue >= 1, "1 <= cbValue")) {
        return -1;
    }
    const configured_ifname ifname{szIfname};
    const mtu_key key{ifname.c_str()};
    if (refuses_key(key)) {
        return -1;
    }
    memset(szValue, 0, static_cast<size_t>(cbValue));
    const int length = KLIBCFileGetKeyValue(kKovaInfo, key.c_str(), szValue, cbValue, 0);
    if (length < 0) {
        return fail_keeping_code(HERE_SPACED, -1, "Failed to get %s_mtu (%X)", ifname.c_str(), KLIBCErrGet());
    }
    if (length == 0) {
        copy_cut(szValue, static_cast<size_t>(cbValue), "1500");
    }
    return 0;
}

extern "C" int KOVAConfSetMTUValue(const char *szValue, const char *szIfname) {
    if (refuses_null_text(HERE, "szValue", szValue) || refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    const configured_ifname ifname{szIfname};
    if (refuses_key(mtu_key{ifname.c_str()})) {
        return -1;
    }
    VLANINFO vlan;
    const int is_vlan = KLIBNetVlanGet(szIfname, &vlan);
    if (is_vlan < 0) {
        return 0; // an interface that cannot be asked about has no setting to keep
    }
    return store_locked(szValue, ifname.c_str(), is_vlan == 1 ? vlan.szRowDevice : nullptr);
}
