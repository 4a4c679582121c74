#include <kovanetsdk/dns.h>

#include "core/report.h"

#include <cstring>

using namespace kova;

extern "C" int KOVANetDNSModeSet(const char *szMode) {
    if (refuses_null_text(HERE, "szMode", szMode)) {
        return -1;
    }
    const bool is_mode = strcmp(szMode, "static") == 0 || strcmp(szMode, "auto") == 0;
    if (refuses(HERE, is_mode, "is_mode(szMode)") || KLIBCINFOSetKeyValue("dns_mode", szMode) < 0) {
        return -1;
    }
    return KOVANetDNSUpdate() < 0 ? -1 : 0;
}
