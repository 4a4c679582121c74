#include <kovanetsdk/iface.h>

#include "core/ifcfg.h"
#include "core/kernel_files.h"

namespace {

using namespace kova;

/** The shipped number of ports, for kernels that do not tell theirs. */
int default_number() {
    char text[16];
    int number = 0;
    const bool is_present = KLIBCFileGetKeyValue(kKovaInfoDefaults, "maxlanport", text, sizeof text, 0) > 0;
    return is_present && leading_number(text, number) && number > 0 ? number : 1;
}

} // namespace

extern "C" int KOVANetInternalLanNumGet(void) {
    first_line line{"/proc/sys/kernel/kova_internal_netif_num"};
    if (!line.is_open()) {
        return fail(HERE, NET_ERR_FILE_OPEN, -1, "open file /proc/sys/kernel/kova_internal_netif_num failed");
    }
    int number = 0;
    return line.is_read() && leading_number(line.text(), number) && number > 0 ? number : default_number();
}
