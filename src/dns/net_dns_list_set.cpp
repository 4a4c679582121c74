#include <kovanetsdk/dns.h>

#include "core/replacement_file.h"
#include "core/report.h"
#include "dns/resolver_file.h"

#include <kova/plugin.h>
#include <kovanetsdk/addr.h>
#include <kovanetsdk/events.h>

using namespace kova;

namespace {

constexpr char kAllInterfaces[] = "";

/** Whether every entry is an address. */
bool are_addresses(const KLIBSZLIST *servers) {
    for (int i = 0; i < count_of(servers); ++i) {
        const char *const server = KLIBCSzListGet(servers, i);
        if (server == nullptr || KOVANetGetAddrType(server) == 0) {
            return false;
        }
    }
    return true;
}

int write_static_servers(const KLIBSZLIST *servers) {
    replacement_file file{kStaticServers};
    if (fill_resolver_file(HERE, file, servers, nullptr) < 0) {
        return -1;
    }
    return file.replace() ? 0 : fail_quietly(HERE, NET_ERR_RENAME, -1);
}

} // namespace

extern "C" int KOVANetDNSListSet(KLIBSZLIST *pServers) {
    if (refuses_null(HERE, "pServers", pServers) || refuses(HERE, count_of(pServers) > 0, "0 < pServers->nItem") ||
        refuses(HERE, are_addresses(pServers), "are_addresses(pServers)")) {
        return -1;
    }
    KOVANetDnsConfigChangeHook(KLIB_PLUGIN_PRE, kAllInterfaces, pServers);
    if (write_static_servers(pServers) < 0 || KOVANetDNSModeSet("static") < 0) {
        return -1;
    }
    KOVANetDnsConfigChangeHook(KLIB_PLUGIN_POST, kAllInterfaces, pServers);
    return 0;
}
