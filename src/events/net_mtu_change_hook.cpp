#include <kovanetsdk/events.h>

#include "core/guards.h"
#include "core/report.h"

using namespace kova;

extern "C" int KOVANetMTUChangeHook(const char *szIfname, const char *szMTU) {
    if (refuses_null_text(HERE, "szIfname", szIfname) || refuses_null_text(HERE, "szMTU", szMTU)) {
        return -1;
    }
    plugin_handle event;
    if (KLIBPluginSDKInit("net", "net/mtu_change", event.out()) < 0) {
        return fail_keeping_code(HERE_BARE, -1, "KLIBPluginSDKInit failed");
    }
    if (KLIBPluginSetArg(event.get(), "IFACE", szIfname) < 0 || KLIBPluginSetArg(event.get(), "MTU_VALUE", szMTU) < 0) {
        return fail_keeping_code(HERE_BARE, -1, "KLIBPluginSetArg failed, device = %s, MTU value = %s", szIfname,
                                 szMTU);
    }
    if (KLIBPluginAction(KLIB_PLUGIN_POST, event.get()) < 0) {
        return fail_keeping_code(HERE_BARE, -1, "KLIBPluginAction failed");
    }
    return 0;
}
