#include <kovanetsdk/events.h>

#include "core/guards.h"
#include "core/report.h"
#include "events/dns_list.h"

using namespace kova;

extern "C" int KOVANetDNSChangeHook(int nPhase, const KLIBSZLIST *pDnsList) {
    if (refuses_null(HERE, "pDnsList", pDnsList)) {
        return -1;
    }
    plugin_handle event;
    if (KLIBPluginSDKInit("net", "net/dns_change", event.out()) < 0) {
        return -1;
    }
    if (set_dns_list(HERE, event.get(), pDnsList) < 0) {
        return -1;
    }
    if (KLIBPluginAction(nPhase, event.get()) < 0) {
        return fail_keeping_code(HERE, -1, "KLIBPluginAction failed");
    }
    return 0;
}
