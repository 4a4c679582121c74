#include "support/rig.h"

#include <kovanetsdk/events.h>

using namespace kova_test;

namespace {

class net_gateway_config_change_hook : public unit_test {
protected:
    outcome raise(int phase, const char *type, const char *interface, const char *gateway_old,
                  const char *gateway_new) {
        return rig.observe(
            [&] { return KOVANetGatewayConfigChangeHook(phase, type, interface, gateway_old, gateway_new); });
    }
    outcome raise() { return raise(4, "set", "eth0", "10.0.0.1", "10.0.0.2"); }

    const std::string raised = " TYPE=set INTERFACE=eth0 GATEWAY_OLD=10.0.0.1 GATEWAY_NEW=10.0.0.2";
};

TEST_F(net_gateway_config_change_hook, KOVANetGatewayConfigChangeHook_phase_isTheCallers) {
    for (const int phase : {4, 5, 0, -1, 99}) {
        EXPECT_OUTCOME(raise(phase, "set", "eth0", "10.0.0.1", "10.0.0.2"),
                       {.result = 0, .events = {"net/gateway_config_change " + std::to_string(phase) + raised}});
    }
}

TEST_F(net_gateway_config_change_hook, KOVANetGatewayConfigChangeHook_texts_passUnchanged) {
    EXPECT_OUTCOME(raise(5, "", "", "", ""),
                   {.result = 0, .events = {"net/gateway_config_change 5 TYPE= INTERFACE= GATEWAY_OLD= GATEWAY_NEW="}});
    EXPECT_OUTCOME(raise(5, "a b", "../x", long_text(4096).c_str(), "not an address"),
                   {.result = 0,
                    .events = {"net/gateway_config_change 5 TYPE=a b INTERFACE=../x GATEWAY_OLD=" + long_text(4096) +
                               " GATEWAY_NEW=not an address"}});
}

TEST_F(net_gateway_config_change_hook, KOVANetGatewayConfigChangeHook_noEvent_fails) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(raise(), {.result = -1,
                             .code = 0x200,
                             .unit = "platform",
                             .log = {"ERR net_gateway_config_change_hook:N KLIBPluginSDKInit failed"}});
}

TEST_F(net_gateway_config_change_hook, KOVANetGatewayConfigChangeHook_anySetterFails_namesIt) {
    const texts messages{"Type = set", "Interface = eth0", "GatewayOld = 10.0.0.1", "GatewayNew = 10.0.0.2"};
    for (size_t i = 0; i < messages.size(); ++i) {
        rig.fail("KLIBPluginSetArg", static_cast<int>(i) + 1);
        EXPECT_OUTCOME(raise(),
                       {.result = -1,
                        .code = 0x200,
                        .unit = "platform",
                        .log = {"ERR net_gateway_config_change_hook:N KLIBPluginSetArg failed, " + messages[i]}});
    }
}

TEST_F(net_gateway_config_change_hook, KOVANetGatewayConfigChangeHook_actionFails_fails) {
    rig.fail("KLIBPluginAction");
    EXPECT_OUTCOME(raise(), {.result = -1,
                             .code = 0x2A00,
                             .unit = "platform",
                             .log = {"ERR net_gateway_config_change_hook:N KLIBPluginAction failed"},
                             .events = {"net/gateway_config_change 4" + raised}});
}

TEST_F(net_gateway_config_change_hook, KOVANetGatewayConfigChangeHook_null_isRefused) {
    const auto expect_refused = [&](const outcome &got, const std::string &name) {
        EXPECT_OUTCOME(got, refusal("net_gateway_config_change_hook", "((void *)0) != " + name));
    };
    expect_refused(raise(4, nullptr, "eth0", "", ""), "szType");
    expect_refused(raise(4, "set", nullptr, "", ""), "szInterface");
    expect_refused(raise(4, "set", "eth0", nullptr, ""), "szGatewayOld");
    expect_refused(raise(4, "set", "eth0", "", nullptr), "szGatewayNew");
}

} // namespace
