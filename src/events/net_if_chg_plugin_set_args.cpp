#include <kovanetsdk/events.h>

#include "core/report.h"

#include <kova/plugin.h>

using namespace kova;

extern "C" int KLIBNetIFChgPluginSetArgs(uint64_t hPlugin, const char *const *rgszOrigin, int cOrigin,
                                         const char *const *rgszNew, int cNew, int nResult) {
    if (refuses(HERE, hPlugin != 0, "0 != hPlugin") || refuses_null(HERE, "rgszOrigin", rgszOrigin) ||
        refuses_null(HERE, "rgszNew", rgszNew)) {
        return -1;
    }
    const bool is_set = KLIBPluginSetArgByArray(hPlugin, "ORIGIN_IFNAME", rgszOrigin, cOrigin) >= 0 &&
                        KLIBPluginSetArgByArray(hPlugin, "IFNAME", rgszNew, cNew) >= 0 &&
                        KLIBPluginSetArgByInt(hPlugin, "RESULT", nResult) >= 0;
    return is_set ? 0 : -1;
}
