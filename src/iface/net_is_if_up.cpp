#include <kovanetsdk/iface.h>

#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"

#include <net/if.h>

using namespace kova;

extern "C" int KOVANetIsIFUp(const char *szIfname) {
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return 0;
    }
    const path_text path{"/sys/class/net/%s/flags", szIfname};
    const stream file{fopen(path.c_str(), "re")};
    if (!file.is_held()) {
        return 0;
    }
    unsigned flags = 0;
    if (fscanf(file.get(), "0x%8x", &flags) != 1) { // as many digits as a flags word has
        log_err(HERE, "fscanf failed. %m");
        return 0;
    }
    return (flags & IFF_UP) != 0 ? 1 : 0;
}
