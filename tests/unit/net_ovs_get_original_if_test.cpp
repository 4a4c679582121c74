#include "support/rig.h"

#include <climits>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_ovs_get_original_if : public unit_test {
protected:
    outcome get(const char *ifname, int size = 64) {
        return rig.observe([&] { return KLIBNetOVSGetOriginalIf(ifname, original, size); });
    }
    char original[64] = "untouched";
};

TEST_F(net_ovs_get_original_if, KLIBNetOVSGetOriginalIf_prefix_isStripped) {
    EXPECT_OUTCOME(get("ovs_eth0"), {.result = 0});
    EXPECT_STREQ("eth0", original);
    EXPECT_OUTCOME(get("ovs_ovs_eth0"), {.result = 0});
    EXPECT_STREQ("ovs_eth0", original);
    EXPECT_OUTCOME(get("ovs_"), {.result = 0});
    EXPECT_STREQ("", original);
}

TEST_F(net_ovs_get_original_if, KLIBNetOVSGetOriginalIf_buffer_hasToBeLongerThanTheRest) {
    EXPECT_OUTCOME(get("ovs_eth0", 5), {.result = 0});
    EXPECT_STREQ("eth0", original);
    const outcome refused = refusal("net_ovs_get_original_if", "strlen(szIfname) - 4 < size");
    EXPECT_OUTCOME(get("ovs_eth0", 4), refused);
    EXPECT_OUTCOME(get("ovs_eth0", 0), refused);
    EXPECT_OUTCOME(get("ovs_eth0", INT_MIN), refused);
    EXPECT_OUTCOME(get("ovs_", 0), refused);
    EXPECT_OUTCOME(get(("ovs_" + long_text(4096)).c_str()), refused);
}

TEST_F(net_ovs_get_original_if, KLIBNetOVSGetOriginalIf_badArguments_areRefused) {
    EXPECT_OUTCOME(get(nullptr), refusal("net_ovs_get_original_if", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetOVSGetOriginalIf("ovs_eth0", nullptr, 9); }),
                   refusal("net_ovs_get_original_if", "((void *)0) != szOut"));
    for (const char *name : {"", "eth0", "ovs", "OVS_eth0", " ovs_eth0", "xovs_eth0"}) {
        EXPECT_OUTCOME(get(name), refusal("net_ovs_get_original_if", "0 == strncmp(szIfname, \"ovs_\", 4)"));
    }
    EXPECT_STREQ("untouched", original);
}
