#include <kovanetsdk/addr.h>

#include "core/guards.h"
#include "core/report.h"

#include <algorithm>

using namespace kova;

namespace {

using tool_line = char[512];

/** Reads the first line that the tool prints, of at most the size of the caller's buffer; empty when there is none. */
int read_ipcalc(const place &at, const char *option, const char *szSubnet, int cbOutput, tool_line &line) {
    const process_stream tool{KLIBCPopen("/bin/ipcalc", "r", option, szSubnet, static_cast<const char *>(nullptr))};
    if (!tool.is_held()) {
        return fail_keeping_code(at, -1, "excute cmd /bin/ipcalc -b %s failed", szSubnet);
    }
    if (fgets(line, std::min(cbOutput, static_cast<int>(sizeof line)), tool.get()) == nullptr) {
        line[0] = '\0';
    }
    return 0;
}

} // namespace

int KOVANetCalNetwork(const char *szSubnet, char *szNetwork, int cbNetwork) {
    if (refuses_text(HERE, "szSubnet", szSubnet) || refuses_null(HERE, "szNetwork", szNetwork) ||
        refuses(HERE, cbNetwork > 0, "0 < cbNetwork")) {
        return -1;
    }
    tool_line line;
    if (read_ipcalc(HERE, "-n", szSubnet, cbNetwork, line) < 0) {
        return -1;
    }
    sscanf(line, "NETWORK=%s", szNetwork); // shorter than the line, and so than the buffer
    return 0;
}

int KOVANetCalBroadcast(const char *szSubnet, char *szBroadcast, int cbBroadcast) {
    if (refuses_text(HERE, "szSubnet", szSubnet) || refuses_null(HERE, "szBroadcast", szBroadcast) ||
        refuses(HERE, cbBroadcast > 0, "0 < cbBroadcast")) {
        return -1;
    }
    tool_line line;
    if (read_ipcalc(HERE, "-b", szSubnet, cbBroadcast, line) < 0) {
        return -1;
    }
    sscanf(line, "BROADCAST=%s", szBroadcast); // shorter than the line, and so than the buffer
    return 0;
}
