#include "support/rig.h"

#include <kovanetsdk/events.h>

using namespace kova_test;

namespace {

class net_mtu_change_hook : public unit_test {
protected:
    outcome raise(const char *ifname, const char *mtu) {
        return rig.observe([&] { return KOVANetMTUChangeHook(ifname, mtu); });
    }
};

TEST_F(net_mtu_change_hook, KOVANetMTUChangeHook_raisesTheEventAfterTheChange) {
    EXPECT_OUTCOME(raise("eth0", "9000"), {.result = 0, .events = {"net/mtu_change 5 IFACE=eth0 MTU_VALUE=9000"}});
}

TEST_F(net_mtu_change_hook, KOVANetMTUChangeHook_texts_passUnchanged) {
    EXPECT_OUTCOME(raise("", "not a number"),
                   {.result = 0, .events = {"net/mtu_change 5 IFACE= MTU_VALUE=not a number"}});
    const std::string text = long_text(4096);
    EXPECT_OUTCOME(raise(text.c_str(), text.c_str()),
                   {.result = 0, .events = {"net/mtu_change 5 IFACE=" + text + " MTU_VALUE=" + text}});
}

TEST_F(net_mtu_change_hook, KOVANetMTUChangeHook_noEvent_fails) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(raise("eth0", "9000"),
                   {.result = -1, .code = 0x200, .unit = "platform", .log = {"ERR KLIBPluginSDKInit failed"}});
}

TEST_F(net_mtu_change_hook, KOVANetMTUChangeHook_anySetterFails_stops) {
    for (const int nth : {1, 2}) {
        rig.fail("KLIBPluginSetArg", nth);
        EXPECT_OUTCOME(raise("eth0", "9000"),
                       {.result = -1,
                        .code = 0x200,
                        .unit = "platform",
                        .log = {"ERR KLIBPluginSetArg failed, device = eth0, MTU value = 9000"}});
    }
}

TEST_F(net_mtu_change_hook, KOVANetMTUChangeHook_actionFails_fails) {
    rig.fail("KLIBPluginAction");
    EXPECT_OUTCOME(raise("eth0", "9000"), {.result = -1,
                                           .code = 0x2A00,
                                           .unit = "platform",
                                           .log = {"ERR KLIBPluginAction failed"},
                                           .events = {"net/mtu_change 5 IFACE=eth0 MTU_VALUE=9000"}});
}

TEST_F(net_mtu_change_hook, KOVANetMTUChangeHook_null_isRefused) {
    EXPECT_OUTCOME(raise(nullptr, "9000"), refusal("net_mtu_change_hook", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(raise("eth0", nullptr), refusal("net_mtu_change_hook", "((void *)0) != szMTU"));
}

} // namespace
