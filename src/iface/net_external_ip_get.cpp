#include <kovanetsdk/iface.h>

#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"

#include <cstring>

using namespace kova;

namespace {

constexpr int kAddressSize = 16;

} // namespace

extern "C" int KOVAExternalIPGet(char *szIP, int cbIP) {
    if (refuses_null_text(HERE, "szIP", szIP) || refuses(HERE, cbIP >= kAddressSize, "16 <= cbIP")) {
        return -1;
    }
    const int status = KLIBCExec("/usr/kova/sbin/ddnsd", "-e", nullptr, nullptr, nullptr);
    if (status != 0) {
        return fail_keeping_code(HERE, -1, "Failed to get external IP by /usr/kova/sbin/ddnsd, err=%d", status);
    }
    const heap<char> value{static_cast<char *>(malloc(kAddressSize))};
    if (!value) {
        const place at = HERE_BARE;
        return fail(at, NET_ERR_OUT_OF_MEMORY, -1, "(%s:%d:%s)failed to allocate space for parsing IP, errno=%s",
                    at.unit, at.line, at.function, strerror(errno));
    }
    if (KLIBCFileGetKeyValue("/run/ddns/externalIP.result", "externalIP", value.get(), kAddressSize, 0) <= 0 ||
        value.get()[0] == '\0') {
        return fail_keeping_code(HERE_FUNCTION, -1,
                                 "Failed to get external IP from /run/ddns/externalIP.result, kova_errno=[%X]",
                                 KLIBCErrGet());
    }
    snprintf(szIP, static_cast<size_t>(cbIP), "%s", value.get());
    return 0;
}
