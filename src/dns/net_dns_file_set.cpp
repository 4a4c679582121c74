#include <kovanetsdk/dns.h>

#include "core/replacement_file.h"
#include "core/report.h"
#include "dns/resolver_file.h"

#include <cstring>
#include <kova/plugin.h>
#include <kovanetsdk/events.h>
#include <sys/stat.h>

using namespace kova;

namespace {

/** Whether every entry can be written as one line. */
bool are_lines(const KLIBSZLIST *texts) {
    for (int i = 0; i < count_of(texts); ++i) {
        const char *const text = KLIBCSzListGet(texts, i);
        if (text == nullptr || strchr(text, '\n') != nullptr) {
            return false;
        }
    }
    return true;
}

} // namespace

extern "C" int KOVANetDNSFileSet(KLIBSZLIST *pServers, KLIBSZLIST *pExtraLines) {
    if (count_of(pServers) < 1) {
        return -1; // neither a code nor a line
    }
    if (refuses(HERE, are_lines(pServers), "are_lines(pServers)") ||
        refuses(HERE, are_lines(pExtraLines), "are_lines(pExtraLines)")) {
        return -1;
    }
    replacement_file file{kResolverFile};
    if (fill_resolver_file(HERE, file, pServers, pExtraLines) < 0) {
        return -1;
    }
    KOVANetDNSChangeHook(KLIB_PLUGIN_PRE, pServers);
    if (!file.replace()) {
        return fail_quietly(HERE, NET_ERR_RENAME, -1);
    }
    constexpr mode_t kReadableByAll = 0644;
    if (chmod(kResolverFile, kReadableByAll) != 0) {
        log_info(HERE, "chmod %s failed: %m", kResolverFile);
    }
    KOVANetDNSChangeHook(KLIB_PLUGIN_POST, pServers);
    return 0;
}
