#include <kovanetsdk/iface.h>

#include "core/ifcfg.h"
#include "core/report.h"
#include "iface/if_block.h"

#include <cstdlib>

using namespace kova;

extern "C" int KOVANetGetIfBlock(const char *szIfname, int *pMask) {
    if (refuses_ifname(HERE, "szIfname", szIfname) || refuses_null(HERE, "pMask", pMask)) {
        return -1;
    }
    const ifcfg_path path{szIfname};
    block_value value;
    if (KLIBCFileGetKeyValue(path.c_str(), kBlockCount, value, sizeof value, 0) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get key [%s]", kBlockCount);
    }
    if (strtol(value, nullptr, 10) == 0) {
        return 0;
    }
    unsigned mask = 0;
    for (const block_reason &reason : kBlockReasons) {
        if (KLIBCFileGetKeyValue(path.c_str(), reason.key, value, sizeof value, 0) < 0) {
            return fail_keeping_code(HERE, -1, "Failed to get key [%s]", reason.key);
        }
        mask |= is_set(value) ? reason.bit : 0;
    }
    *pMask |= static_cast<int>(mask);
    return 0;
}
