#include "support/rig.h"

#include <kovanetsdk/events.h>

using namespace kova_test;

namespace {

class net_hostname_change_hook : public unit_test {
protected:
    outcome raise(const char *hostname) {
        return rig.observe([&] { return KOVANetHostnameChangeHook(hostname); });
    }
};

TEST_F(net_hostname_change_hook, KOVANetHostnameChangeHook_raisesTheEventAfterTheChange) {
    EXPECT_OUTCOME(raise("nas"), {.result = 0, .events = {"net/hostname_change 5 HOSTNAME=nas"}});
    EXPECT_OUTCOME(raise(""), {.result = 0, .events = {"net/hostname_change 5 HOSTNAME="}});
    EXPECT_OUTCOME(raise(long_text(4096).c_str()),
                   {.result = 0, .events = {"net/hostname_change 5 HOSTNAME=" + long_text(4096)}});
}

TEST_F(net_hostname_change_hook, KOVANetHostnameChangeHook_anyStepFails_fails) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(raise("nas"),
                   {.result = -1, .code = 0x200, .unit = "platform", .log = {"ERR KLIBPluginSDKInit failed"}});
    rig.fail("KLIBPluginSetArg");
    EXPECT_OUTCOME(
        raise("nas"),
        {.result = -1, .code = 0x200, .unit = "platform", .log = {"ERR KLIBPluginSetArg failed, hostname = nas"}});
    rig.fail("KLIBPluginAction");
    EXPECT_OUTCOME(raise("nas"), {.result = -1,
                                  .code = 0x2A00,
                                  .unit = "platform",
                                  .log = {"ERR KLIBPluginAction failed"},
                                  .events = {"net/hostname_change 5 HOSTNAME=nas"}});
}

TEST_F(net_hostname_change_hook, KOVANetHostnameChangeHook_null_isRefused) {
    EXPECT_OUTCOME(raise(nullptr), refusal("net_hostname_change_hook", "((void *)0) != szHostname"));
}

} // namespace
