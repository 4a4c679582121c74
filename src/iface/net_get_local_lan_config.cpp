#include <kovanetsdk/iface.h>

#include "core/ifcfg.h"
#include "core/report.h"

#include <cstring>

namespace {

using namespace kova;

constexpr int kMaxLocalLans = 32;

struct lan_list {
    bool is_read;
    int number;
    char names[kMaxLocalLans][16];
};

/** The shipped list, read once per process; a failed read is tried again. */
lan_list local_lans;

/** @return 0; -1 with log and code */
int read_local_lans() {
    char list[4096]; // more than 32 names of any interface
    if (KLIBCFileGetKeyValue(kKovaInfoDefaults, "local_lan", list, sizeof list, 0) < 0) {
        return fail(HERE, NET_ERR_UNKNOWN, -1, "Failed to get [%s] from [%s], kovaerr=[0x%04X]", "local_lan",
                    kKovaInfoDefaults, KLIBCErrGet());
    }
    lan_list read = {};
    char *rest = nullptr;
    for (const char *name = KLIBCStrTok(list, " ", &rest); name != nullptr; name = KLIBCStrTok(nullptr, " ", &rest)) {
        if (read.number == kMaxLocalLans) {
            return fail(HERE_BARE, NET_ERR_UNKNOWN, -1, "local lan exceed NUM_MAXIFACES");
        }
        copy_text(read.names[read.number++], name);
    }
    read.is_read = true;
    local_lans = read;
    return 0;
}

} // namespace

extern "C" int KLIBNetGetLocalLanConfig(char names[32][16], int *pCount) {
    if (refuses_null(HERE, "names", names) || refuses_null(HERE, "pCount", pCount)) {
        return -1;
    }
    if (!local_lans.is_read && read_local_lans() < 0) {
        *pCount = -1;
        return -1;
    }
    memcpy(names, local_lans.names, sizeof local_lans.names);
    *pCount = local_lans.number;
    return 0;
}
