#include <kovanetsdk/events.h>

#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"

#include <kovanetsdk/iface.h>

using namespace kova;

namespace {

constexpr int kIPv4 = 0;
constexpr int kIPv6 = 1;

bool refuses_prefix(const place &at, int nFamily, int nPrefixLength) {
    if (nFamily == kIPv4) {
        return refuses(at, nPrefixLength >= 0 && nPrefixLength <= 32, "(0 <= nPrefixLength && nPrefixLength <= 32)");
    }
    return refuses(at, nPrefixLength >= 0 && nPrefixLength <= 128, "(0 <= nPrefixLength && nPrefixLength <= 128)");
}

} // namespace

extern "C" int KOVANetIPChangePreHook(int nFamily, const char *szIfname, const char *szOriginAddress,
                                      const char *szNewAddress, int nPrefixLength) {
    if (refuses(HERE, nFamily == kIPv4 || nFamily == kIPv6, "(0 == nFamily || 1 == nFamily)") ||
        refuses_null_text(HERE, "szIfname", szIfname) || refuses_null_text(HERE, "szOriginAddress", szOriginAddress) ||
        refuses_null_text(HERE, "szNewAddress", szNewAddress) || refuses_prefix(HERE, nFamily, nPrefixLength)) {
        return -1;
    }
    const int link = KOVANetIfIsLink(szIfname);
    if (link < 0) {
        return fail_keeping_code(HERE, -1, "error on link detect");
    }

    plugin_handle event;
    if (KLIBPluginSDKInit("net", nFamily == kIPv4 ? "net/ipv4_change" : "net/ipv6_change", event.out()) < 0) {
        return fail_keeping_code(HERE_BARE, -1, "KLIBPluginSDKInit failed");
    }
    // plug-ins rely on an IPv4 change never telling its prefix
    const built_text<16> prefix{"%d", nFamily == kIPv4 ? -1 : nPrefixLength};
    const bool is_raised = KLIBPluginSetArg(event.get(), "IFNAME", szIfname) >= 0 &&
                           KLIBPluginSetArg(event.get(), "ORIGIN_ADDRESS", szOriginAddress) >= 0 &&
                           KLIBPluginSetArg(event.get(), "NEW_ADDRESS", szNewAddress) >= 0 &&
                           KLIBPluginSetArg(event.get(), "PREFIX_LENGTH", prefix.c_str()) >= 0 &&
                           KLIBPluginSetArg(event.get(), "IS_LINK", link > 0 ? "true" : "false") >= 0 &&
                           KLIBPluginAction(KLIB_PLUGIN_PRE, event.get()) >= 0;
    return is_raised ? 0 : -1;
}
