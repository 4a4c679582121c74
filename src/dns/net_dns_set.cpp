#include <kovanetsdk/dns.h>

#include "core/guards.h"
#include "core/report.h"
#include "dns/resolver_file.h"

#include <kovanetsdk/addr.h>

using namespace kova;

extern "C" int KOVANetDNSSet(const char *szServer) {
    if (refuses_text(HERE, "szServer", szServer) ||
        refuses(HERE, KOVANetGetAddrType(szServer) != 0, "0 != KOVANetGetAddrType(szServer)")) {
        return -1;
    }
    string_list servers = make_list(kServerCapacity);
    if (!servers.is_held() || KLIBCSzListPush(servers.out(), szServer) < 0) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, -1, "Failed to alloc memory.");
    }
    return KOVANetDNSListSet(servers.get()) < 0 ? -1 : 0;
}
