#include <kovanetsdk/events.h>

#include "core/guards.h"
#include "core/report.h"

using namespace kova;

extern "C" int KOVANetGatewayConfigChangeHook(int nPhase, const char *szType, const char *szInterface,
                                              const char *szGatewayOld, const char *szGatewayNew) {
    if (refuses_null_text(HERE, "szType", szType) || refuses_null_text(HERE, "szInterface", szInterface) ||
        refuses_null_text(HERE, "szGatewayOld", szGatewayOld) ||
        refuses_null_text(HERE, "szGatewayNew", szGatewayNew)) {
        return -1;
    }
    plugin_handle event;
    if (KLIBPluginSDKInit("net", "net/gateway_config_change", event.out()) < 0) {
        return fail_keeping_code(HERE, -1, "KLIBPluginSDKInit failed");
    }
    if (KLIBPluginSetArg(event.get(), "TYPE", szType) < 0) {
        return fail_keeping_code(HERE, -1, "KLIBPluginSetArg failed, Type = %s", szType);
    }
    if (KLIBPluginSetArg(event.get(), "INTERFACE", szInterface) < 0) {
        return fail_keeping_code(HERE, -1, "KLIBPluginSetArg failed, Interface = %s", szInterface);
    }
    if (KLIBPluginSetArg(event.get(), "GATEWAY_OLD", szGatewayOld) < 0) {
        return fail_keeping_code(HERE, -1, "KLIBPluginSetArg failed, GatewayOld = %s", szGatewayOld);
    }
    if (KLIBPluginSetArg(event.get(), "GATEWAY_NEW", szGatewayNew) < 0) {
        return fail_keeping_code(HERE, -1, "KLIBPluginSetArg failed, GatewayNew = %s", szGatewayNew);
    }
    if (KLIBPluginAction(nPhase, event.get()) < 0) {
        return fail_keeping_code(HERE, -1, "KLIBPluginAction failed");
    }
    return 0;
}
