#include <kovanetsdk/iface.h>

#include "core/kernel.h"
#include "core/report.h"
#include "core/text.h"

#include <cstring>
#include <unistd.h>

extern "C" int KLIBNetOVSIfIsMaster(const char *szIfname) {
    using namespace kova;
    if (refuses_ifname(HERE, "szIfname", szIfname) || strncmp(szIfname, "ovs_", 4) != 0) {
        return kOvsNone;
    }
    const path_text device{"/sys/devices/virtual/net/%s", szIfname};
    if (access(device.c_str(), R_OK) != 0) {
        return kOvsNone;
    }
    return strncmp(szIfname, "ovs_bond", 8) == 0 ? kOvsBond : kOvsPort;
}
