#include <kovanetsdk/bridge.h>

#include "core/report.h"
#include "core/text.h"

#include <unistd.h>

extern "C" int KLIBNetBridgeIfIsSlave(const char *szIfname) {
    using namespace kova;
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return 0;
    }
    const path_text port{"/sys/class/net/%s/brport", szIfname};
    return access(port.c_str(), R_OK) == 0 ? 1 : 0;
}
