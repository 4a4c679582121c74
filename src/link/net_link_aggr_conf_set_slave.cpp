#include <kovanetsdk/link.h>

#include "core/ifcfg.h"
#include "link/bond_files.h"

#include <cstring>
#include <strings.h>

using namespace kova;

extern "C" int KOVANetLinkAggrConfUpdateBootProto(const char *szPath, KLIBSZHASH *pKeys) {
    if (refuses_text(HERE, "szPath", szPath) || refuses_null(HERE, "pKeys", pKeys)) {
        return -1;
    }
    char szProto[64];
    const int found = KLIBCFileGetKeyValue(szPath, key::kBootProto, szProto, sizeof szProto, 0);
    if (found <= 0) {
        return KLIBCSzHashSetValue(pKeys, key::kBootProto, "dhcp");
    }
    if (strcasecmp(szProto, "static") == 0 || strcasecmp(szProto, "dhcp") == 0) {
        return 0;
    }
    // what has no addresses of its own, as a member of a bond, asks for one
    const bool is_set = KLIBCSzHashSetValue(pKeys, key::kBootProto, "dhcp") >= 0 &&
                        KLIBCSzHashSetValue(pKeys, key::kIpAddr, "") >= 0 &&
                        KLIBCSzHashSetValue(pKeys, key::kNetmask, "") >= 0;
    return is_set ? 0 : -1;
}

namespace {

bool refuses_bond(const KOVALINKAGGROPT *pOpt) {
    return refuses_null(HERE, "pOpt", pOpt) || refuses(HERE, has_usable_name(*pOpt), "has_usable_name(*pOpt)");
}

bool join(key_changes &changes, const char *szSlave, const char *szBond) {
    set_member_keys(changes, szSlave, szBond);
    return changes.is_complete();
}

bool leave(key_changes &changes, const char *szSlave, const char *path) {
    changes.set(key::kDevice, szSlave);
    if (!changes.is_complete() || KOVANetLinkAggrConfUpdateBootProto(path, changes.to_set()) < 0) {
        return false;
    }
    for (const char *const key : {key::kUserCtl, key::kBondingOpts, key::kMaster, key::kSlave}) {
        changes.remove(key);
    }
    return changes.is_complete();
}

} // namespace

extern "C" int KOVANetLinkAggrConfSetSlave(const char *szSlave, int blEnslave, const KOVALINKAGGROPT *pOpt) {
    if (refuses_ifname(HERE, "szSlave", szSlave) || (blEnslave != 0 && refuses_bond(pOpt))) {
        return -1;
    }
    const ifcfg_path path{szSlave};
    key_changes changes;
    const bool is_complete =
        blEnslave != 0 ? join(changes, szSlave, pOpt->szName) : leave(changes, szSlave, path.c_str());
    if (!is_complete) {
        return fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
    }
    (void)KLIBCExec("/bin/cp", "-f", path.c_str(), saved_path{szSlave}.c_str(), nullptr);
    return changes.apply(path.c_str());
}
