#include <kovanetsdk/events.h>

#include "core/guards.h"
#include "core/report.h"
#include "events/dns_list.h"

using namespace kova;

extern "C" int KOVANetDnsConfigChangeHook(int nPhase, const char *szInterface, const KLIBSZLIST *pDnsList) {
    if (refuses_null_text(HERE, "szInterface", szInterface) || refuses_null(HERE, "pDnsList", pDnsList)) {
        return -1;
    }
    plugin_handle event;
    if (KLIBPluginSDKInit("net", "net/dns_config_change", event.out()) < 0) {
        return fail_keeping_code(HERE, -1, "KLIBPluginSDKInit failed");
    }
    if (KLIBPluginSetArg(event.get(), "INTERFACE", szInterface) < 0) {
        return fail_keeping_code(HERE, -1, "KLIBPluginSetArg failed, interface = %s", szInterface);
    }
    if (set_dns_list(HERE, event.get(), pDnsList) < 0) {
        return -1;
    }
    if (KLIBPluginAction(nPhase, event.get()) < 0) {
        return fail_keeping_code(HERE, -1, "KLIBPluginAction failed");
    }
    return 0;
}
