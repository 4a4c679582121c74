#include <kovanetsdk/events.h>

#include "core/guards.h"
#include "core/report.h"

using namespace kova;

extern "C" int KOVANetHostnameChangeHook(const char *szHostname) {
    if (refuses_null_text(HERE, "szHostname", szHostname)) {
        return -1;
    }
    plugin_handle event;
    if (KLIBPluginSDKInit("net", "net/hostname_change", event.out()) < 0) {
        return fail_keeping_code(HERE_BARE, -1, "KLIBPluginSDKInit failed");
    }
    if (KLIBPluginSetArg(event.get(), "HOSTNAME", szHostname) < 0) {
        return fail_keeping_code(HERE_BARE, -1, "KLIBPluginSetArg failed, hostname = %s", szHostname);
    }
    if (KLIBPluginAction(KLIB_PLUGIN_POST, event.get()) < 0) {
        return fail_keeping_code(HERE_BARE, -1, "KLIBPluginAction failed");
    }
    return 0;
}
