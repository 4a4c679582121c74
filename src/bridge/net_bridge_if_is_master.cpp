#include <kovanetsdk/bridge.h>

#include "core/report.h"
#include "core/text.h"

#include <unistd.h>

extern "C" int KLIBNetBridgeIfIsMaster(const char *szIfname) {
    using namespace kova;
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return 0;
    }
    const path_text bridge{"/sys/class/net/%s/bridge/", szIfname};
    return access(bridge.c_str(), R_OK) == 0 ? 1 : 0;
}
