#include "support/rig.h"

#include <kovanetsdk/routing.h>

using namespace kova_test;

namespace {

const std::string kDelete = "/sbin/route delete default";
const std::string kAdd = "/sbin/route add default gw ";

} // namespace

class net_default_gateway_set : public unit_test {
protected:
    outcome set(const char *szGateway) {
        return rig.observe([=] { return KOVANetDefaultGatewaySet(szGateway); });
    }
};

TEST_F(net_default_gateway_set, KOVANetDefaultGatewaySet_gateway_takesTheOldOnesPlace) {
    EXPECT_OUTCOME(set("192.168.1.1"), {.commands = {kDelete, kAdd + "192.168.1.1"}});
}

TEST_F(net_default_gateway_set, KOVANetDefaultGatewaySet_noOldRoute_doesNotMatter) {
    for (const int status : {7, 127, -1}) {
        rig.answer(kDelete, status);
        EXPECT_OUTCOME(set("192.168.1.1"), {.commands = {kDelete, kAdd + "192.168.1.1"}});
        EXPECT_OUTCOME(set(""), {.commands = {kDelete}});
    }
}

TEST_F(net_default_gateway_set, KOVANetDefaultGatewaySet_noGateway_onlyRemovesTheRoute) {
    EXPECT_OUTCOME(set(""), {.commands = {kDelete}});
    EXPECT_OUTCOME(set(nullptr), {.commands = {kDelete}});
}

TEST_F(net_default_gateway_set, KOVANetDefaultGatewaySet_routeThatCannotBeAdded_isTold) {
    for (const int status : {1, 7, 127, 137, -1}) {
        rig.answer("/sbin/route add", status);
        EXPECT_OUTCOME(set("10.9.9.9"), {.result = -1,
                                         .code = 0x2A00,
                                         .unit = "net_default_gateway_set",
                                         .log = {"ERR net_default_gateway_set:N failed to set default gateway "
                                                 "10.9.9.9 (" +
                                                 std::to_string(status) + ")."},
                                         .commands = {kDelete, kAdd + "10.9.9.9"}});
    }
}

TEST_F(net_default_gateway_set, KOVANetDefaultGatewaySet_oddText_isOneArgument) {
    for (const std::string &text :
         texts{"a b", "; reboot", "$(reboot)", "1-h", "10.0.0.1\n", long_text(63), long_text(64), long_text(4096)}) {
        EXPECT_OUTCOME(set(text.c_str()), {.commands = {kDelete, kAdd + text}});
    }
}

TEST_F(net_default_gateway_set, KOVANetDefaultGatewaySet_option_isRefusedBeforeTheOldRouteIsGone) {
    for (const char *szGateway : {"-", "-h", "--help", "-10.0.0.1"}) {
        EXPECT_OUTCOME(set(szGateway), refusal("net_default_gateway_set", "'-' != *szGateway"));
    }
}
