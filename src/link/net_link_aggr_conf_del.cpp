#include <kovanetsdk/link.h>

#include "core/ifcfg.h"
#include "link/bond_files.h"

#include <cstring>
#include <kovanetsdk/iface.h>
#include <unistd.h>

using namespace kova;

namespace {

/** The bond's configured address, "" for none. */
void read_bond_address(const char *szBond, char (&szIP)[20]) {
    if (KOVAILnxGetIPFromCfg(szBond, szIP, sizeof szIP) < 0) {
        log_info(HERE, "get IP of %s failed", szBond);
        szIP[0] = '\0';
    }
}

/** Only the first member goes on with the bond's address. */
int drop_address(const char *szSlave, const char *szBondIP) {
    char szIP[20];
    if (KOVAILnxGetIPFromCfg(szSlave, szIP, sizeof szIP) < 0) {
        return fail_keeping_code(HERE, -1, "get IP on %s failed", szSlave);
    }
    const ifcfg_path path{szSlave};
    if (strcmp(szIP, szBondIP) == 0 && KLIBCFileSetKeyValue(path.c_str(), key::kBootProto, "none", kPlainLine) < 0) {
        return fail_keeping_code(HERE, -1, "set %s %s=%s failed", path.c_str(), key::kBootProto, "none");
    }
    return 0;
}

int release_slaves(const KOVALINKAGGROPT &bond, const char *szBondIP) {
    for (int i = 0; i < bond.cSlaves; ++i) {
        const char *const szSlave = bond.aszSlaves[i];
        if (*szSlave == '\0') {
            continue;
        }
        if (i > 0 && *szBondIP != '\0' && drop_address(szSlave, szBondIP) < 0) {
            return -1;
        }
        if (KOVANetLinkAggrConfSetSlave(szSlave, 0, nullptr) < 0) {
            return -1;
        }
    }
    return 0;
}

int dissolve(const KOVALINKAGGROPT &bond) {
    char szBondIP[20];
    read_bond_address(bond.szName, szBondIP);
    if (release_slaves(bond, szBondIP) < 0) {
        return -1;
    }
    const ifcfg_path path{bond.szName};
    return unlink(path.c_str()) == 0 ? 0 : fail_keeping_code(HERE, -1, "remove file %s failed", path.c_str());
}

/** Its copy holds the bond's settings: as they are, the first member would be taken for a bond itself. */
void rejoin_first_slave(const KOVALINKAGGROPT &bond) {
    const char *const szFirst = bond.aszSlaves[0];
    key_changes changes;
    set_member_keys(changes, szFirst, bond.szName);
    changes.remove(key::kBondingOpts);
    if (changes.is_complete()) {
        (void)changes.apply(ifcfg_path{szFirst}.c_str());
    }
}

/** Whether it is the file of a bond, not of any other interface, that nothing belongs to any more. */
bool is_bond_without_members(const KOVALINKAGGROPT &bond) {
    char szOptions[512];
    return bond.cSlaves == 0 &&
           KLIBCFileGetKeyValue(ifcfg_path{bond.szName}.c_str(), key::kBondingOpts, szOptions, sizeof szOptions, 0) > 0;
}

} // namespace

extern "C" int KOVANetLinkAggrConfDel(const KOVALINKAGGROPT *pOpt) {
    if (refuses_null(HERE, "pOpt", pOpt) || refuses_text(HERE, "pOpt->szName", field_text{pOpt->szName}.c_str()) ||
        refuses(HERE, has_usable_name(*pOpt), "has_usable_name(*pOpt)") ||
        refuses(HERE, has_usable_slaves(*pOpt), "has_usable_slaves(*pOpt)")) {
        return -1;
    }
    if (is_bond_without_members(*pOpt)) {
        return dissolve(*pOpt);
    }
    if (refuses(HERE, pOpt->cSlaves > 0 && pOpt->aszSlaves[0][0] != '\0', "'\\0' != *pOpt->aszSlaves[0]")) {
        return -1;
    }
    drop_old_copies(*pOpt);
    const ifcfg_path path{pOpt->szName};
    const ifcfg_path first{pOpt->aszSlaves[0]};
    if (KLIBCExec("/bin/cp", "-f", path.c_str(), first.c_str(), nullptr) != 0) {
        restore_slaves(*pOpt);
        if (KLIBCFileCheckKeyValue(first.c_str(), key::kDevice, pOpt->szName, 0) == 1) { // it was copied all the same
            rejoin_first_slave(*pOpt);
        }
        return fail(HERE, NET_ERR_EXEC, -1, "Failed to copy %s to %s", path.c_str(), first.c_str());
    }
    if (dissolve(*pOpt) < 0) {
        restore_slaves(*pOpt);
        rejoin_first_slave(*pOpt);
        return -1;
    }
    return 0;
}
