#include <kovanetsdk/link.h>

#include "core/ifcfg.h"
#include "core/kernel.h"
#include "core/kernel_files.h"

#include <cstring>
#include <kovanetsdk/iface.h>

namespace {

using namespace kova;

void start_record(KOVALINKAGGROPT &opt, const char *szName) {
    memset(&opt, 0, sizeof opt); // records are compared bytewise
    copy_text(opt.szName, szName);
}

/** A member that is there; one that is a bond itself is none, and would lead back here for ever. */
bool is_present_member(const char *szSlave) {
    return KLIBNetOVSIfIsMaster(szSlave) != kOvsBond && KOVANetIfIsLink(szSlave) >= 0;
}

/** Logs and answers 1, which tells callers a switch bond that cannot be read from one without members. */
int missing_key(const char *logged_key) {
    return fail_keeping_code(HERE, 1, "Failed to get key [%s]", logged_key);
}

int read_ovs_slaves(const ifcfg_path &path, KOVALINKAGGROPT &opt) {
    constexpr int kWords = 512;
    const string_list words = make_list(kWords);
    if (!words.is_held()) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, 1, "Failed to alloc memory.");
    }
    char list[1024];
    if (KLIBCFileGetKeyValue(path.c_str(), key::kSlaveList, list, sizeof list, 0) <= 0) {
        return missing_key("BLOCK_CNT");
    }
    if (split(KLIBCStrTrimSpace(list, list), " ", words.get()) < 0) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, 1, "Failed to alloc memory.");
    }
    for (int i = 0; const char *szSlave = KLIBCSzListGet(words.get(), i); ++i) {
        if (is_present_member(szSlave) && KOVANetLinkAggrOptSlsaveAdd(&opt, szSlave) < 0) {
            return fail_keeping_code(HERE, 1, "Failed to add the slave %s into KOVALINKAGGROPT", szSlave);
        }
    }
    return 0;
}

int read_ovs_bond(const char *szName, KOVALINKAGGROPT &opt) {
    const ifcfg_path path{szName};
    if (read_ovs_slaves(path, opt) != 0) {
        return 1;
    }
    char mode[64];
    if (KLIBCFileGetKeyValue(path.c_str(), key::kBondMode, mode, sizeof mode, 0) <= 0) {
        return missing_key(key::kBondMode);
    }
    opt.mode = KOVANetLinkAggrStringToMode(mode);
    return 0;
}

/** @return 1 members read; 0 no bond, or none without members; -1 with log and code */
int read_kernel_slaves(const char *szName, KOVALINKAGGROPT &opt) {
    const string_list words = make_list();
    if (!words.is_held()) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, -1, "Failed to alloc memory.");
    }
    if (KOVANetLinkAggrPhyGet(szName, words.get()) < 1) {
        return 0;
    }
    for (int i = 0; const char *szSlave = KLIBCSzListGet(words.get(), i); ++i) {
        if (KOVANetLinkAggrOptSlsaveAdd(&opt, szSlave) < 0) {
            return -1;
        }
    }
    return 1;
}

/** The kernel's names of the modes, with its own numbers. */
constexpr struct {
    const char *name;
    KOVA_LINK_AGGR_MODE mode;
} kKernelModes[] = {
    {"balance-alb 6", KOVA_LINK_AGGR_BALANCE_ALB}, {"802.3ad 4", KOVA_LINK_AGGR_8023AD},
    {"balance-xor 2", KOVA_LINK_AGGR_BALANCE_XOR}, {"active-backup 1", KOVA_LINK_AGGR_ACTIVE_BACKUP},
    {"balance-rr 0", KOVA_LINK_AGGR_BALANCE_RR},
};

int read_kernel_mode(const char *szName, KOVALINKAGGROPT &opt) {
    const path_text path{"/sys/class/net/%s/bonding/mode", szName};
    first_line line{path.c_str()};
    if (!line.is_open()) {
        return fail(HERE, NET_ERR_FILE_OPEN, -1, "Fail to open [%s], errno=[%d/%m]", path.c_str(), errno);
    }
    if (!line.is_read()) {
        return fail(HERE, NET_ERR_FILE_READ, -1, "Fail to read [%s], errno=[%d/%m]", path.c_str(), errno);
    }
    for (const auto &entry : kKernelModes) {
        if (strncmp(line.text(), entry.name, strlen(entry.name)) == 0) {
            opt.mode = entry.mode;
            return 0;
        }
    }
    log_warning(HERE, "Non-supported bonding mode [%s]", line.text());
    return 0;
}

/** Whether the bond's status names a partner of the aggregation. */
bool has_partner(const char *szName) {
    constexpr char kLine[] = "\tPartner Mac Address: ";
    const path_text path{"%s/%s", "/proc/net/bonding/", szName};
    const stream file{fopen(path.c_str(), "re")};
    if (!file.is_held()) {
        fail_quietly(HERE, NET_ERR_NOT_FOUND, 0);
        return false;
    }
    while (const heap<char> line = next_line(file)) {
        if (strncmp(line.get(), kLine, sizeof kLine - 1) == 0) {
            const char *partner = line.get() + sizeof kLine - 1;
            partner += strspn(partner, " \t\r\n");
            return *partner != '\0' && strcmp(partner, "00:00:00:00:00:00") != 0;
        }
    }
    return false;
}

int read_kernel_bond(const char *szName, KOVALINKAGGROPT &opt) {
    const int slaves = read_kernel_slaves(szName, opt);
    if (slaves < 1) {
        return slaves;
    }
    if (read_kernel_mode(szName, opt) < 0) {
        return -1;
    }
    if (opt.mode == KOVA_LINK_AGGR_8023AD) {
        opt.blNoPartner = has_partner(szName) ? 0 : 1;
    }
    return 0;
}

} // namespace

extern "C" int KOVANetLinkAggrGet(const char *szName, KOVALINKAGGROPT *pOpt) {
    if (refuses_ifname(HERE, "szName", szName) || refuses_null(HERE, "pOpt", pOpt)) {
        return -1;
    }
    start_record(*pOpt, szName);
    return KLIBNetOVSIfIsMaster(szName) == kOvsBond ? read_ovs_bond(szName, *pOpt) : read_kernel_bond(szName, *pOpt);
}
