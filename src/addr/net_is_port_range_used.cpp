#include <kovanetsdk/addr.h>

#include "core/bounded_lines.h"
#include "core/guards.h"
#include "core/report.h"

#include <cstdio>

namespace {

using namespace kova;

constexpr int kTcp = 1;
constexpr unsigned kListening = 10;
constexpr unsigned kPorts = 65536;

struct port_range {
    int low;
    int high;

    /** Numbers that are no ports are in no range. */
    [[nodiscard]] bool holds(unsigned port) const {
        return port < kPorts && low <= static_cast<int>(port) && static_cast<int>(port) <= high;
    }
};

/** Shows the lines of one of the kernel's socket tables, until one is enough. @return whether one was */
template<typename Enough> bool read_table(const char *path, const Enough &is_enough) {
    const stream table{fopen(path, "re")};
    if (!table.is_held()) {
        log_info(HERE, "Fail to open [%s], errno=[%d/%m]", path, errno);
        return false;
    }
    char line[512];
    bounded_lines lines{table.get(), line, sizeof line};
    while (lines.next()) {
        if (is_enough(line)) {
            return true;
        }
    }
    if (ferror(table.get()) != 0) {
        log_info(HERE, "Fail to read [%s], errno=[%d/%m]", path, errno);
    }
    return false;
}

/** The same for the tables of a protocol. */
template<typename Enough> bool read_tables(int nProtocol, const Enough &is_enough) {
    return nProtocol == kTcp ? read_table("/proc/net/tcp", is_enough) || read_table("/proc/net/tcp6", is_enough)
                             : read_table("/proc/net/udp", is_enough) || read_table("/proc/net/udp6", is_enough);
}

/** Whether a line of such a table tells a listening socket, and its port. */
bool read_listener(const char *line, unsigned &port) {
    constexpr char kLine[] = "%*d: %*64[0-9A-Fa-f]:%X %*64[0-9A-Fa-f]:%*X %X %*X:%*X %*X:%*X %*X %*d %*d %*d ";
    unsigned state = 0;
    return sscanf(line, kLine, &port, &state) == 2 && state == kListening;
}

/** Ports of which each is stored once, as long as there is room; a bit for each keeps this independent of their number.
 */
class port_set {
public:
    port_set(int *ports, int room) : ports_(ports), room_(room) {}

    [[nodiscard]] bool is_full() const { return count_ == room_; }
    [[nodiscard]] int count() const { return count_; }
    void add(unsigned port) {
        constexpr unsigned kBits = 8;
        const auto bit = static_cast<unsigned char>(1U << port % kBits);
        if ((known_[port / kBits] & bit) == 0 && !is_full()) {
            known_[port / kBits] |= bit;
            ports_[count_++] = static_cast<int>(port);
        }
    }

private:
    int *ports_;
    int room_;
    int count_ = 0;
    unsigned char known_[kPorts / 8] = {};
};

} // namespace

extern "C" int KOVANetIsPortRangeUsed(int nLow, int nHigh, int nProtocol) {
    const port_range range{nLow, nHigh};
    const bool is_used = read_tables(nProtocol, [&range](const char *line) {
        unsigned port = 0;
        return sscanf(line, "%*d: %*64[0-9A-Fa-f]:%X", &port) == 1 && range.holds(port);
    });
    return is_used ? 1 : 0;
}

extern "C" int KOVANetGetPortUsedInRange(int *rgPort, int *pcPort, int nLow, int nHigh, int nProtocol) {
    if (refuses_null(HERE, "rgPort", rgPort) || refuses_null(HERE, "pcPort", pcPort) ||
        refuses(HERE, 0 <= *pcPort, "0 <= *pcPort")) {
        return -1;
    }
    const port_range range{nLow, nHigh};
    port_set found{rgPort, *pcPort};
    read_tables(nProtocol, [&](const char *line) {
        unsigned port = 0;
        if (read_listener(line, port) && range.holds(port)) {
            found.add(port);
        }
        return found.is_full();
    });
    *pcPort = found.count();
    return 0;
}
