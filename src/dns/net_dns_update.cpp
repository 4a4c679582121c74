#include <kovanetsdk/dns.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/report.h"
#include "core/text.h"
#include "dns/resolver_file.h"

#include <kova/service.h>

using namespace kova;

namespace {

constexpr char kAutomaticIpv4[] = "/etc/iproute2/config/resolv4.conf";
constexpr char kAutomaticIpv6[] = "/etc/iproute2/config/resolv6.conf";
constexpr char kOptions[] = "/etc/resolv.conf.option";

constexpr size_t kLineSize = 1024;

/** Appends to a list, reporting on its own. */
int push(KLIBSZLIST *list, const char *text) {
    return KLIBCSzListPush(&list, text) < 0 ? fail_keeping_code(HERE, -1, "Cannot push the list") : 0;
}

/** What the sources are read into. */
struct source_reader {
    KLIBSZLIST *lines;
    KLIBSZLIST *servers;
    char server[kLineSize]; ///< of the last line that named one: another line repeats it

    /** Appends the servers of a source, one per line; a source that is not there has none. Reports on its own. */
    int read(const char *path) {
        if (KLIBCFileExist(path) != 1) {
            return 0;
        }
        KLIBCSzListRemoveAll(lines);
        if (KLIBCFileReadLines(path, lines) < 0) {
            return fail_keeping_code(HERE, -1, "Failed to read [%s], kovaerr=[0x%04X]", path, KLIBCErrGet());
        }
        for (int i = 0; i < count_of(lines); ++i) {
            char line[kLineSize];
            copy_text(line, KLIBCSzListGet(lines, i));
            // cppcheck-suppress invalidscanf ; the line is no longer than the server
            sscanf(KLIBCStrTrimSpace(line, line), "nameserver\t%s", server);
            if (push(servers, server) < 0) {
                return -1;
            }
        }
        return 0;
    }
};

/** Reads the sources of the mode. Reports on its own. */
int read_sources(KLIBSZLIST *lines, KLIBSZLIST *servers) {
    source_reader reader{lines, servers, ""};
    if (KLIBCFileCheckKeyValue(kKovaInfo, "dns_mode", "static", 0) == 1) {
        return reader.read(kStaticServers);
    }
    return reader.read(kAutomaticIpv4) < 0 ? -1 : reader.read(kAutomaticIpv6);
}

/** Appends the search domain's line, when there is one. Reports on its own. */
int add_domain(KLIBSZLIST *extra_lines) {
    constexpr int kBeginsWith = 2;
    char line[kLineSize];
    const bool has_domain =
        KLIBCFileExist(kOptions) == 1 && KLIBCFileGetLine(kOptions, "domain\t", line, sizeof line, kBeginsWith) > 0;
    return has_domain ? push(extra_lines, line) : 0;
}

/** Tells who works with the servers; they are not waited for. */
void reload_services() {
    KLIBServiceReload("ddns");
    if (KLIBServiceIsRunning("kovarelayd") == 1) {
        KLIBServiceReload("kovarelayd");
    }
}

} // namespace

extern "C" int KOVANetDNSUpdate(void) {
    const string_list lines = make_list(kServerCapacity);
    const string_list servers = make_list(kServerCapacity);
    const string_list extra_lines = make_list(kServerCapacity);
    if (!lines.is_held() || !servers.is_held() || !extra_lines.is_held()) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, -1, "Failed to alloc memory.");
    }
    const named_lock lock{kConfigExclusive};
    if (!lock.is_held()) {
        return fail_keeping_code(HERE, lock.result(), "KLIBCFileLock failed.[0x%04X %s:%d]", KLIBCErrGet(),
                                 KLIBCErrorGetFile(), KLIBCErrorGetLine());
    }
    if (read_sources(lines.get(), servers.get()) < 0) {
        return -1;
    }
    if (count_of(servers.get()) == 0) {
        return 0;
    }
    if (add_domain(extra_lines.get()) < 0 || KOVANetDNSFileSet(servers.get(), extra_lines.get()) < 0) {
        return -1;
    }
    reload_services();
    return 0;
}
