#include <kovanetsdk/addr.h>

#include "core/commands.h"
#include "core/report.h"

#include <arpa/inet.h>
#include <cerrno>
#include <cstring>
#include <kovanetsdk/iface.h>

namespace {

using namespace kova;

/** Whether two texts are one IPv4 address, whatever way its numbers are written. */
bool is_same_address(const char *szIP, const char *szOther) {
    in_addr address;
    in_addr other;
    return inet_aton(szIP, &address) != 0 && inet_aton(szOther, &other) != 0 && address.s_addr == other.s_addr;
}

} // namespace

extern "C" int KOVAIIpConflict(const char *szIfname, const char *szIP) {
    constexpr char kPing[] = "/bin/ping";
    if (refuses_text(HERE, "szIfname", szIfname) || refuses_text(HERE, "szIP", szIP) ||
        refuses(HERE, *szIP != '-', "'-' != *szIP")) { // an option of the tool
        return -1;
    }
    char own[256];
    const int result = KOVAILnxGetIP(szIfname, own, sizeof own);
    if (result < 0) {
        return fail_keeping_code(HERE_FUNCTION, result, "KOVAILnxGetIP failed.(%X)", KLIBCErrGet());
    }
    if (is_same_address(szIP, own)) {
        return 0;
    }
    const int status = run(kPing, "-c", "1", "-w", "2", szIP);
    if (status == -1 || status == 127) {
        return fail(HERE_FUNCTION_COLON, NET_ERR_EXEC, -1, "system(%s) failed.(strerror=%s)", kPing, strerror(errno));
    }
    return status == 0 ? 1 : 0;
}
