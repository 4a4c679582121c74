#include "support/rig.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_if_link_up_event : public unit_test {
protected:
    outcome raise(const char *szIfname) {
        return rig.observe([=] { return KLIBNetIfLinkUpEvent(szIfname); });
    }
};

TEST_F(net_if_link_up_event, KLIBNetIfLinkUpEvent_bad_name_is_refused_without_event) {
    EXPECT_OUTCOME(raise(nullptr), refusal("net_if_link_up_event", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(raise(""), refusal("net_if_link_up_event", "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(raise(name.c_str()), refusal("net_if_link_up_event", "is_interface_name(szIfname)"));
    }
}

TEST_F(net_if_link_up_event, KLIBNetIfLinkUpEvent_is_raised_after_the_fact) {
    EXPECT_OUTCOME(raise("eth0"), {.events = {"net/if_link_up 5 IFNAME=eth0"}});
    EXPECT_OUTCOME(raise("gone"), {.events = {"net/if_link_up 5 IFNAME=gone"}});
}

TEST_F(net_if_link_up_event, KLIBNetIfLinkUpEvent_failing_step_releases_the_event) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(raise("eth0"), {.result = -1, .code = 0x200, .unit = "platform"});
    rig.fail("KLIBPluginSetArg");
    EXPECT_OUTCOME(raise("eth0"), {.result = -1, .code = 0x200, .unit = "platform"});
    rig.fail("KLIBPluginAction");
    EXPECT_OUTCOME(raise("eth0"),
                   {.result = -1, .code = 0x2A00, .unit = "platform", .events = {"net/if_link_up 5 IFNAME=eth0"}});
}

TEST_F(net_if_link_up_event, KLIBNetIfLinkUpEvent_event_not_opened_is_handed_back_too) {
    raise("");
    EXPECT_FALSE(rig.held.contains("event handles")); // no call of the event library at all
    rig.fail("KLIBPluginSDKInit");
    raise("eth0");
    EXPECT_TRUE(rig.held.contains("event handles")); // an exit leaves its mark, also when nothing was open
}
