#include <kovanetsdk/ipv6.h>

#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"

#include <arpa/inet.h>
#include <cstring>

using namespace kova;

namespace {

constexpr char kList[] = "/proc/net/if_inet6";
constexpr size_t kDigits = 32;

using line_text = char[256];

/** Reads one line, without its newline and cut to the buffer. @return whether there was one */
bool read_line(FILE *file, line_text &line) {
    size_t used = 0;
    int byte = getc(file);
    const bool is_there = byte != EOF;
    for (; byte != EOF && byte != '\n'; byte = getc(file)) {
        if (used + 1 < sizeof line) {
            line[used++] = static_cast<char>(byte);
        }
    }
    line[used] = '\0';
    return is_there;
}

/** The address of a line in canonical text; digits that are none give the empty address. */
void read_address(const char *digits, KOVAV6IP &address) {
    char groups[kDigits + kDigits / 4] = "";
    char *end = groups;
    for (size_t i = 0; i < kDigits; ++i) {
        if (i > 0 && i % 4 == 0) {
            *end++ = ':';
        }
        *end++ = digits[i];
    }
    *end = '\0';
    in6_addr binary = {};
    if (inet_pton(AF_INET6, groups, &binary) != 1) {
        log_info(HERE, "inet_pton failed. %m"); // the line counts all the same
    }
    inet_ntop(AF_INET6, &binary, address.szIP, sizeof address.szIP);
}

/** Reads a line: address, interface index, prefix length, scope, flags, interface. @return whether it is one */
bool read_record(const line_text &line, KOVAV6IP &address, line_text &device) {
    if (strlen(line) < kDigits) {
        return false;
    }
    address = {};
    read_address(line, address);
    unsigned flags = 0;
    if (sscanf(line + kDigits, "%*x %x %x %x %255s", &address.nPrefixLength, &address.nScope, &flags, device) != 4) {
        return false;
    }
    address.nFlags = static_cast<uint16_t>(flags);
    return true;
}

} // namespace

extern "C" int KOVALnxV6IPGet(const char *szIfname, KOVAV6IP *rgV6IP, int cMax) {
    if (refuses_text(HERE, "szIfname", szIfname) || refuses_null(HERE, "rgV6IP", rgV6IP) ||
        refuses(HERE, cMax > 0, "0 < cMax")) {
        return -1;
    }
    memset(rgV6IP, 0, static_cast<size_t>(cMax) * sizeof *rgV6IP);
    const stream file{fopen(kList, "re")};
    if (!file.is_held()) {
        return fail(HERE, NET_ERR_FILE_OPEN, -1, "Fail to open [%s], errno=[%d/%m]", kList, errno);
    }
    int count = 0;
    line_text line = "";
    line_text device;
    KOVAV6IP address;
    while (read_line(file.get(), line)) {
        if (!read_record(line, address, device) || strcmp(device, szIfname) != 0) {
            continue;
        }
        if (count < cMax) {
            rgV6IP[count] = address;
        }
        ++count;
    }
    return count;
}
