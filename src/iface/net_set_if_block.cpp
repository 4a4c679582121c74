#include <kovanetsdk/iface.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/report.h"
#include "iface/if_block.h"

#include <cstdlib>

using namespace kova;

namespace {

int get_value(const char *path, const char *key, block_value &value) {
    if (KLIBCFileGetKeyValue(path, key, value, sizeof value, 0) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get key [%s]", key);
    }
    return 0;
}

int set_value(const char *path, const char *key, const char *value) {
    if (KLIBCFileSetKeyValue(path, key, value, kQuotedLine) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to set key [%s] with value [%s]", key, value);
    }
    return 0;
}

int change_count(const char *path, long by) {
    block_value value;
    if (get_value(path, kBlockCount, value) < 0) {
        return -1;
    }
    const built_text<32> count{"%ld", strtol(value, nullptr, 10) + by};
    return set_value(path, kBlockCount, count.c_str());
}

/** Notes one reason, which counts when it changes. */
int set_reason(const char *path, const char *key, int on) {
    block_value value;
    if (get_value(path, key, value) < 0) {
        return -1;
    }
    if (is_set(value) == (on != 0)) {
        return 0;
    }
    if (set_value(path, key, on == 1 ? "yes" : "no") < 0) {
        return -1;
    }
    return change_count(path, on != 0 ? 1 : -1);
}

int set_reasons(const char *szIfname, const char *path, unsigned mask, int on) {
    for (const block_reason &reason : kBlockReasons) {
        if ((mask & reason.bit) != 0 && set_reason(path, reason.key, on) < 0) {
            return fail_keeping_code(HERE, -1, "Failed to set mode [%s] of [%s]", reason.key, szIfname);
        }
    }
    return 0;
}

} // namespace

extern "C" int KOVANetSetIfBlock(const char *szIfname, unsigned mask, int on) {
    constexpr int kExclusive = 1;
    constexpr int kLimitSeconds = 30;
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    const ifcfg_path path{szIfname};
    file_lock lock;
    if (KLIBCFileLockTimeByFile(path.c_str(), kExclusive, kLimitSeconds, lock.out()) < 0) {
        log_err(HERE, "KLIBCFileLockTimeByFile failed!");
        return fail_keeping_code(HERE, -1, "Failed to get lock");
    }
    const int result = set_reasons(szIfname, path.c_str(), mask, on);
    if (KLIBCFileUnlockByFile(lock.give_up()) != 1) {
        return fail_keeping_code(HERE, -1, "Failed to release file lock of [%s]", path.c_str());
    }
    return result;
}
