#include "link/bond_files.h"

#include "core/commands.h"

#include <cstring>
#include <unistd.h>

namespace kova {

namespace {

bool is_usable_name(const char (&name)[16]) {
    return memchr(name, '\0', sizeof name) != nullptr && is_interface_name(name);
}

} // namespace

void drop_old_copies(const KOVALINKAGGROPT &bond) {
    for (int i = 0; i < bond.cSlaves; ++i) {
        if (bond.aszSlaves[i][0] != '\0') {
            unlink(saved_path{bond.aszSlaves[i]}.c_str());
        }
    }
}

void restore_slaves(const KOVALINKAGGROPT &bond) {
    for (int i = 0; i < bond.cSlaves; ++i) {
        const char *const szSlave = bond.aszSlaves[i];
        if (*szSlave != '\0') {
            (void)KLIBCExec("/bin/mv", "-f", saved_path{szSlave}.c_str(), ifcfg_path{szSlave}.c_str(), nullptr);
        }
    }
}

void set_member_keys(key_changes &changes, const char *szSlave, const char *szBond) {
    changes.set(key::kDevice, szSlave);
    changes.set(key::kUserCtl, "no");
    changes.set(key::kMaster, szBond);
    changes.set(key::kSlave, "yes");
}

bool has_usable_name(const KOVALINKAGGROPT &bond) {
    return is_usable_name(bond.szName);
}

bool has_usable_slaves(const KOVALINKAGGROPT &bond) {
    if (bond.cSlaves < 0 || bond.cSlaves > KOVA_LINK_AGGR_MAX_SLAVES) {
        return false;
    }
    for (int i = 0; i < bond.cSlaves; ++i) {
        if (bond.aszSlaves[i][0] != '\0' && !is_usable_name(bond.aszSlaves[i])) {
            return false;
        }
    }
    return true;
}

} // namespace kova
