#include <kovanetsdk/routing.h>

#include "core/commands.h"
#include "core/report.h"

extern "C" int KOVANetDefaultGatewaySet(const char *szGateway) {
    using namespace kova;
    // the tool would take it for an option and succeed without a route
    if (szGateway != nullptr && refuses(HERE, *szGateway != '-', "'-' != *szGateway")) {
        return -1;
    }
    (void)run("/sbin/route", "delete", "default"); // there may be none
    if (szGateway == nullptr || *szGateway == '\0') {
        return 0;
    }
    const int status = run("/sbin/route", "add", "default", "gw", szGateway);
    if (status != 0) {
        return fail(HERE, NET_ERR_EXEC, -1, "failed to set default gateway %s (%d).", szGateway, status);
    }
    return 0;
}
