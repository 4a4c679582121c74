#include <kovanetsdk/pppoe.h>

#include "core/commands.h"
#include "core/report.h"

using namespace kova;

namespace {

constexpr char kEnable[] = "pppoe_enable";

int start() {
    constexpr int kRefused = 19; // user or password are not the other side's, which callers tell from other failures
    const bool is_marked = KLIBCINFOSetKeyValue(kEnable, "yes") >= 0;
    const int status = is_marked ? run("/usr/sbin/pppoe-start") : -1;
    if (status == 0) {
        return 0;
    }
    (void)KLIBCINFOSetKeyValue(kEnable, "no");
    return status == kRefused ? status : -1;
}

int stop() {
    if (KLIBCINFOSetKeyValue(kEnable, "no") < 0) {
        (void)KLIBCINFOSetKeyValue(kEnable, "yes");
        return -1;
    }
    (void)run(kPppoeStop);
    return 0;
}

} // namespace

extern "C" int KOVAPPPoEService(int nOp) {
    if (refuses(HERE, nOp == 0 || nOp == 1, "(op == 1 || op == 0)")) {
        return -1;
    }
    return nOp == 1 ? start() : stop();
}
