#include <kovanetsdk/link.h>

#include "core/commands.h"
#include "link/bond_files.h"
#include "link/ifname_change.h"

#include <cstring>
#include <sys/stat.h>
#include <unistd.h>

using namespace kova;

namespace {

/** The bond first, then its members, as the network script and the event want them. */
class bond_names {
public:
    explicit bond_names(const KOVALINKAGGROPT &bond) : names_{bond.szName}, count_(bond.cSlaves + 1) {
        for (int i = 0; i < bond.cSlaves; ++i) {
            names_[i + 1] = bond.aszSlaves[i];
        }
    }
    [[nodiscard]] ifnames all() const { return {names_, count_}; }
    [[nodiscard]] ifnames bond() const { return {names_, 1}; }
    [[nodiscard]] ifnames slaves() const { return {names_ + 1, count_ - 1}; }

private:
    const char *names_[1 + KOVA_LINK_AGGR_MAX_SLAVES];
    int count_;
};

void remove_file(const path_text &path) {
    if (unlink(path.c_str()) != 0) {
        log_info(HERE, "remove file %s failed", path.c_str());
    }
}

// ---- the files of a bond

/** Whether no interface is named twice: the copy of its file would be of what was written already. */
bool has_distinct_names(const KOVALINKAGGROPT &bond) {
    for (int i = 0; i < bond.cSlaves; ++i) {
        const char *const szSlave = bond.aszSlaves[i];
        bool is_named_before = strcmp(szSlave, bond.szName) == 0;
        for (int k = 0; k < i; ++k) {
            is_named_before = is_named_before || strcmp(szSlave, bond.aszSlaves[k]) == 0;
        }
        if (is_named_before) {
            return false;
        }
    }
    return true;
}

bool refuses_bond(const KOVALINKAGGROPT &bond) {
    constexpr int kFewestSlaves = 2;
    bool has_names = true;
    for (int i = 0; i < bond.cSlaves; ++i) {
        has_names = has_names && bond.aszSlaves[i][0] != '\0';
    }
    return refuses(HERE, bond.cSlaves >= kFewestSlaves, "2 <= pOpt->cSlaves") ||
           refuses(HERE, has_names, "'\\0' != *pOpt->aszSlaves[i]") ||
           refuses(HERE, has_distinct_names(bond), "has_distinct_names(*pOpt)");
}

/** The directory is everybody's: nothing is written through a link that somebody else may have made. */
void drop_link(const path_text &path) {
    struct stat status;
    if (lstat(path.c_str(), &status) == 0 && S_ISLNK(status.st_mode)) {
        unlink(path.c_str());
    }
}

/** The bond goes on with what its first member had: its settings, and the lease of its DHCP client. */
void take_over_first_slave(const KOVALINKAGGROPT &bond) {
    const char *const szFirst = bond.aszSlaves[0];
    (void)KLIBCExec("/bin/cp", "-f", ifcfg_path{szFirst}.c_str(), ifcfg_path{bond.szName}.c_str(), nullptr);
    const path_text lease{"/tmp/dhcpv4.leases.%s", bond.szName};
    drop_link(lease);
    (void)KLIBCExec("/bin/cp", "-f", path_text{"/tmp/dhcpv4.leases.%s", szFirst}.c_str(), lease.c_str(), nullptr);
    (void)KLIBCFileReplaceSubStr(lease.c_str(), szFirst, bond.szName);
}

int write_bond_file(const KOVALINKAGGROPT &bond) {
    key_changes changes;
    if (!changes.is_complete()) {
        return fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
    }
    take_over_first_slave(bond);
    const ifcfg_path path{bond.szName};
    if (KOVANetLinkAggrConfUpdateBootProto(path.c_str(), changes.to_set()) < 0) {
        return fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
    }
    changes.set(key::kDevice, bond.szName);
    changes.set(key::kOnBoot, "yes");
    changes.set(key::kUserCtl, "no");
    changes.set(key::kBondingOpts, grgBondDesc[bond.mode].szOptions);
    changes.remove(key::kMaster);
    changes.remove(key::kSlave);
    return changes.is_complete() ? changes.apply(path.c_str()) : fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
}

int write_slave_files(const KOVALINKAGGROPT &bond) {
    for (int i = 0; i < bond.cSlaves; ++i) {
        if (KOVANetLinkAggrConfSetSlave(bond.aszSlaves[i], 1, &bond) < 0) {
            return -1;
        }
    }
    return 0;
}

int write_bond(const KOVALINKAGGROPT &bond) {
    drop_old_copies(bond);
    if (write_bond_file(bond) < 0 || write_slave_files(bond) < 0) {
        restore_slaves(bond);
        remove_file(ifcfg_path{bond.szName});
        return -1;
    }
    for (int i = 0; i < bond.cSlaves; ++i) {
        remove_file(saved_path{bond.aszSlaves[i]});
    }
    return 0;
}

// ---- the three changes

/** Runs a change of the files between stop and start; what was restored is started, too. */
template<typename Change> int change_stopped(const KOVALINKAGGROPT &bond, Change change) {
    const bond_names names{bond};
    stop_interfaces(names.all().names, names.all().count);
    const int result = change();
    start_interfaces(names.all().names, names.all().count);
    return result;
}

/** The same, announced: interfaces come and go. */
template<typename Change>
int change_announced(const KOVALINKAGGROPT &bond, const ifnames &origin, const ifnames &now, Change change) {
    ifname_change_event event{origin, now};
    if (!event.open()) {
        return fail_keeping_code(HERE, -1, "plugin sdk init failed");
    }
    event.announce_before(HERE);
    const int result = change_stopped(bond, change);
    event.announce_after(HERE, result);
    return result;
}

int create_bond(const KOVALINKAGGROPT &bond) {
    const bond_names names{bond};
    return change_announced(bond, names.slaves(), names.bond(),
                            [&] { return refuses_bond(bond) ? -1 : write_bond(bond); });
}

int change_bond(const KOVALINKAGGROPT &bond, const KOVALINKAGGROPT &current) {
    return change_stopped(bond, [&] {
        if (refuses_bond(bond)) { // before the present bond is gone
            return -1;
        }
        (void)KOVANetLinkAggrConfDel(&current);
        return write_bond(bond);
    });
}

int delete_bond(KOVALINKAGGROPT &bond, const KOVALINKAGGROPT &current) {
    bond.cSlaves = current.cSlaves;
    memcpy(bond.aszSlaves, current.aszSlaves, sizeof bond.aszSlaves);
    const bond_names names{bond};
    return change_announced(bond, names.bond(), names.slaves(), [&] { return KOVANetLinkAggrConfDel(&bond); });
}

bool refuses_request(const KOVALINKAGGROPT *pOpt) {
    return refuses_null(HERE, "pOpt", pOpt) || refuses_text(HERE, "pOpt->szName", field_text{pOpt->szName}.c_str()) ||
           refuses(HERE, static_cast<uint32_t>(pOpt->mode) < KOVA_LINK_AGGR_MODES, "pOpt->mode <= 8") ||
           refuses(HERE, has_usable_name(*pOpt), "has_usable_name(*pOpt)") ||
           (pOpt->mode != KOVA_LINK_AGGR_UNKNOWN &&
            refuses(HERE, has_usable_slaves(*pOpt), "has_usable_slaves(*pOpt)"));
}

} // namespace

extern "C" int KOVANetLinkAggrSet(KOVALINKAGGROPT *pOpt) {
    KOVALINKAGGROPT current;
    if (refuses_request(pOpt) || KOVANetLinkAggrGet(pOpt->szName, &current) < 0) {
        return -1;
    }
    if (pOpt->mode == KOVA_LINK_AGGR_UNKNOWN) {
        return delete_bond(*pOpt, current);
    }
    if (current.mode == KOVA_LINK_AGGR_UNKNOWN) {
        return create_bond(*pOpt);
    }
    return memcmp(pOpt, &current, sizeof current) == 0 ? 0 : change_bond(*pOpt, current);
}
