#include <kovanetsdk/pppoe.h>

#include "core/commands.h"
#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/report.h"

#include <cstring>
#include <strings.h>

using namespace kova;

namespace {

constexpr char kEnable[] = "pppoe_enable";
constexpr char kConnection[] = "pppoe-connect";

/** Brings switch and process into step. @return 1 up; 0; -1 */
int check(bool is_to_fix) {
    char szEnable[64];
    const int found = KLIBCFileGetKeyValue(kKovaInfo, kEnable, szEnable, sizeof szEnable, 0);
    if (found <= 0) {
        return found < 0 ? -1 : 0;
    }
    const int running = KLIBCPs(kConnection, nullptr, 0, 0);
    if (strcasecmp(szEnable, "yes") != 0) {
        if (running > 0) {
            (void)run(kPppoeStop);
        }
        return 0;
    }
    if (running != 0) {
        return running < 0 ? -1 : 1;
    }
    if (is_to_fix && KLIBCFileSetKeyValue(kKovaInfo, kEnable, "no", kQuotedLine) < 0) {
        return -1;
    }
    return 0;
}

} // namespace

extern "C" int KOVAPPPoECheckStatus(int blFix) {
    named_lock lock{blFix != 0 ? kInfoExclusive : kInfoShared};
    if (!lock.is_held()) {
        return fail_lock(HERE, -1);
    }
    const int status = check(blFix != 0);
    return lock.release() < 0 ? -1 : status;
}

extern "C" int KLIBDisablePPPoEOnIf(const char *szIfname) {
    if (refuses_text(HERE, "szIfname", szIfname)) {
        return -1;
    }
    const int status = KOVAPPPoECheckStatus(1);
    if (status < 1) {
        return status;
    }
    PPPOE_CONF conf;
    if (PPPoEConfigGet(&conf) < 0) {
        return -1;
    }
    const int result = strcmp(conf.szIfname, szIfname) == 0 ? KOVAPPPoEService(0) : 0;
    explicit_bzero(&conf, sizeof conf);
    return result;
}
