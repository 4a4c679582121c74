#include <kovanetsdk/routing.h>

#include "core/ifcfg.h"
#include "core/report.h"

#include <cstring>

using namespace kova;

namespace {

constexpr char kNetworkFile[] = "/etc/sysconfig/network";
constexpr char kGateway[] = "GATEWAY";

} // namespace

extern "C" int KOVANetDefaultGatewayGetConf(char *szGateway, int cbGateway) {
    if (szGateway == nullptr || cbGateway <= 0) {
        return fail_keeping_code(HERE_SPACED, -1, "Bad parameter.");
    }
    memset(szGateway, 0, static_cast<size_t>(cbGateway));
    if (KLIBCFileGetKeyValue(kNetworkFile, kGateway, szGateway, cbGateway, 0) < 0) {
        return fail_keeping_code(HERE_FUNCTION, -1, "Failed to get default gateway.");
    }
    return 0;
}

extern "C" int KOVANetDefaultGatewaySetConf(const char *szGateway) {
    const bool removes = szGateway == nullptr || *szGateway == '\0';
    const int result = removes ? KLIBCFileRemoveKey(kNetworkFile, kGateway)
                               : KLIBCFileSetKeyValue(kNetworkFile, kGateway, szGateway, kPlainLine);
    return result < 0 ? -1 : 0;
}
