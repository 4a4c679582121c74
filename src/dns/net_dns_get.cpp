#include <kovanetsdk/dns.h>

#include "core/guards.h"
#include "core/report.h"
#include "dns/resolver_file.h"

#include <cstring>

using namespace kova;

extern "C" int KOVANetDNSGet(char *szBuf, int size) {
    if (refuses_null_text(HERE, "szBuf", szBuf) || refuses(HERE, size > 0, "0 < size")) {
        return -1;
    }
    memset(szBuf, 0, static_cast<size_t>(size));
    string_list servers = make_list(kServerCapacity);
    if (!servers.is_held()) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, -1, "Failed to alloc memory.");
    }
    if (KOVANetDNSListGet(servers.out()) < 0) {
        return -1;
    }
    if (count_of(servers.get()) > 0) {
        snprintf(szBuf, static_cast<size_t>(size), "%s", KLIBCSzListGet(servers.get(), 0));
    }
    return 0;
}
