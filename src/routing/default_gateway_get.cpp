#include <kovanetsdk/routing.h>

#include "core/guards.h"
#include "core/kernel.h"
#include "core/report.h"

#include <cstring>
#include <net/route.h>

using namespace kova;

namespace {

using line_text = char[256];

/** A line of the kernel's table. */
struct route {
    line_text device;
    unsigned long destination; ///< this and the next two: as the kernel prints them, in network byte order
    unsigned long gateway;
    unsigned long mask;
    unsigned flags;
    int unused[6]; ///< counters, metric, limits
};

bool read_route(const line_text &line, route &found) {
    int(&rest)[6] = found.unused;
    // the device has room for a whole line, and numbers too large match no default route
    // cppcheck-suppress invalidscanf
    // NOLINTNEXTLINE(cert-err34-c)
    return sscanf(line, "%s%lx%lx%X%d%d%d%lx%d%d%d", found.device, &found.destination, &found.gateway, &found.flags,
                  &rest[0], &rest[1], &rest[2], &found.mask, &rest[3], &rest[4], &rest[5]) == 11;
}

bool is_default(const route &one) {
    constexpr unsigned kInUse = RTF_UP | RTF_GATEWAY;
    return (one.flags & kInUse) == kInUse && one.destination == 0 && one.mask == 0;
}

/** Looks for the first default route. @return 1, 0 when there is none; -1 for a line or a file that cannot be read */
int find_default(const stream &table, route &found) {
    line_text line;
    errno = 0; // a line of another format has none
    const bool has_header = fgets(line, sizeof line, table.get()) != nullptr;
    while (has_header && fgets(line, sizeof line, table.get()) != nullptr) {
        if (!read_route(line, found)) {
            return -1;
        }
        if (is_default(found)) {
            return 1;
        }
    }
    return ferror(table.get()) != 0 ? -1 : 0;
}

void give(char *buffer, int size, const char *text) {
    if (buffer != nullptr && size > 0) {
        snprintf(buffer, static_cast<size_t>(size), "%s", text);
    }
}

} // namespace

extern "C" int DefaultGatewayGet(char *szGateway, int cbGateway, char *szIfname, int cbIfname) {
    const stream table{fopen("/proc/net/route", "re")};
    if (!table.is_held()) {
        return fail_keeping_code(HERE_SPACED, -1, "Failed to open /proc/net/route, errno=[%s/%d]", strerror(errno),
                                 errno);
    }
    route found;
    const int result = find_default(table, found);
    if (result < 0) {
        return fail_keeping_code(HERE_SPACED, -1, "Unknow kernel routing table format, errno=[%s/%d]", strerror(errno),
                                 errno);
    }
    if (result > 0) {
        address_text gateway;
        write_address(static_cast<uint32_t>(found.gateway), gateway);
        give(szGateway, cbGateway, gateway);
        give(szIfname, cbIfname, found.device);
    }
    return 0;
}

extern "C" int KOVANetDefaultGatewayGet(char *szGateway, int cbGateway) {
    return DefaultGatewayGet(szGateway, cbGateway, nullptr, 0);
}

extern "C" int KOVANetDefaultGatewayInterfaceGet(char *szIfname, int cbIfname) {
    return DefaultGatewayGet(nullptr, 0, szIfname, cbIfname);
}
