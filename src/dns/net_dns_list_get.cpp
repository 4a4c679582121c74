#include <kovanetsdk/dns.h>

#include "core/guards.h"
#include "core/report.h"
#include "dns/resolver_file.h"

#include <cstring>

using namespace kova;

namespace {

/** Gives the configuration lock back on every return, also where it was not taken. */
struct config_unlock {
    config_unlock() = default;
    config_unlock(const config_unlock &) = delete;
    config_unlock &operator=(const config_unlock &) = delete;
    ~config_unlock() {
        const errno_keeper keep;
        KLIBCFileUnlock(kConfigName);
    }
};

bool refuses_list(const place &at, KLIBSZLIST *const *ppServers) {
    return refuses_null(at, "ppServers", ppServers) || refuses_null(at, "*ppServers", *ppServers);
}

/** The second word of a line that begins with "nameserver", nothing for another line. Cuts the line up. */
const char *server_of(char *line) {
    constexpr char kKeyword[] = "nameserver";
    constexpr char kSeparators[] = " \t\n";
    if (strncmp(line, kKeyword, strlen(kKeyword)) != 0) {
        return nullptr;
    }
    char *rest = line;
    strsep(&rest, kSeparators);
    return strsep(&rest, kSeparators);
}

int read_servers(const char *path, KLIBSZLIST **ppServers) {
    const stream file{fopen(path, "re")};
    if (!file.is_held()) {
        log_info(HERE, "Failed to open %s. (%s)", path, strerror(errno));
        return 0;
    }
    char line[512];
    while (fgets(line, sizeof line, file.get()) != nullptr) {
        const char *const server = server_of(line);
        if (server != nullptr && KLIBCSzListPush(ppServers, server) < 0) {
            return fail_keeping_code(HERE, -1, "Cannot push the list");
        }
    }
    return 0;
}

} // namespace

extern "C" int KOVANetStaticDNSListGet(KLIBSZLIST **ppServers) {
    return refuses_list(HERE, ppServers) ? -1 : read_servers(kStaticServers, ppServers);
}

extern "C" int KOVANetDNSListGet(KLIBSZLIST **ppServers) {
    const config_unlock at_return;
    if (refuses_list(HERE, ppServers)) {
        return -1;
    }
    const int locked = KLIBCFileLock(kConfigShared, kLockWaitSeconds);
    if (locked == -1) {
        return fail_lock(HERE, locked);
    }
    return read_servers(kResolverFile, ppServers);
}
