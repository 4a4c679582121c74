#include "events/dns_list.h"

#include "core/text.h"

#include <kova/plugin.h>

namespace kova {

int set_dns_list(const place &at, uint64_t event, const KLIBSZLIST *pDnsList) {
    const int number = static_cast<int>(pDnsList->nItem);
    const built_text<16> items{"%d", number};
    if (KLIBPluginSetArg(event, "NITEMS", items.c_str()) < 0) {
        return fail_keeping_code(at, -1, "KLIBPluginSetArg failed, dns_number = %d", number);
    }
    for (int i = 0; i < number; ++i) {
        const built_text<16> key{"DNS_%d", i + 1};
        const char *const szServer = KLIBCSzListGet(pDnsList, i);
        if (KLIBPluginSetArg(event, key.c_str(), szServer) < 0) {
            return fail_keeping_code(at, -1, "KLIBPluginSetArg failed, dns[%d] = %s", i + 1, szServer);
        }
    }
    return 0;
}

} // namespace kova
