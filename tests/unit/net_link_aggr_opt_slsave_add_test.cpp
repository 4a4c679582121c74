#include "support/rig.h"

#include <climits>
#include <cstring>
#include <kovanetsdk/link.h>

using namespace kova_test;

class net_link_aggr_opt_slsave_add : public unit_test {
protected:
    outcome add(const char *slave) {
        return rig.observe([&] { return KOVANetLinkAggrOptSlsaveAdd(&bond, slave); });
    }
    static outcome added() { return {.result = 0, .code = 0xBC00, .unit = "net_link_aggr_opt_slsave_add"}; }

    KOVALINKAGGROPT bond = {};
};

TEST_F(net_link_aggr_opt_slsave_add, KOVANetLinkAggrOptSlsaveAdd_names_staySorted) {
    for (const char *name : {"eth2", "eth10", "wlan0", "eth1"}) {
        EXPECT_OUTCOME(add(name), added());
    }
    EXPECT_EQ(4, bond.cSlaves);
    EXPECT_STREQ("eth1", bond.aszSlaves[0]);
    EXPECT_STREQ("eth10", bond.aszSlaves[1]);
    EXPECT_STREQ("eth2", bond.aszSlaves[2]);
    EXPECT_STREQ("wlan0", bond.aszSlaves[3]);
}

TEST_F(net_link_aggr_opt_slsave_add, KOVANetLinkAggrOptSlsaveAdd_sameName_isBB00) {
    EXPECT_OUTCOME(add("eth0"), added());
    EXPECT_OUTCOME(add("eth0"), {.result = -1,
                                 .code = 0xBB00,
                                 .unit = "net_link_aggr_opt_slsave_add",
                                 .log = {"ERR net_link_aggr_opt_slsave_add:N Slave eth0 is already in []"}});
    EXPECT_EQ(1, bond.cSlaves);
}

TEST_F(net_link_aggr_opt_slsave_add, KOVANetLinkAggrOptSlsaveAdd_longName_isCutAndThenKnown) {
    EXPECT_OUTCOME(add("abcdefghijklmno-one"), added());
    EXPECT_STREQ("abcdefghijklmno", bond.aszSlaves[0]);
    EXPECT_EQ(0xBB00U, add("abcdefghijklmno-two").code);
    EXPECT_EQ(0xBB00U, add("abcdefghijklmno").code);
    EXPECT_EQ(1, bond.cSlaves);
}

TEST_F(net_link_aggr_opt_slsave_add, KOVANetLinkAggrOptSlsaveAdd_staleEntry_isOverwrittenWhole) {
    memset(bond.aszSlaves, 'u', sizeof bond.aszSlaves);
    EXPECT_OUTCOME(add("e"), added());
    EXPECT_EQ(0, memcmp("e\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0", bond.aszSlaves[0], 16));
}

TEST_F(net_link_aggr_opt_slsave_add, KOVANetLinkAggrOptSlsaveAdd_thirtyThirdName_isBD00) {
    for (int i = 0; i < 32; ++i) {
        EXPECT_OUTCOME(add(("eth" + std::to_string(i)).c_str()), added());
    }
    const outcome full{.result = -1,
                       .code = 0xBD00,
                       .unit = "net_link_aggr_opt_slsave_add",
                       .log = {"ERR net_link_aggr_opt_slsave_add:N No room for slave eth0 in []"}};
    EXPECT_OUTCOME(add("eth0"), full);
    EXPECT_EQ(32, bond.cSlaves);
    bond.cSlaves = INT_MAX;
    EXPECT_OUTCOME(add("eth0"), full);
}

TEST_F(net_link_aggr_opt_slsave_add, KOVANetLinkAggrOptSlsaveAdd_unterminatedFields_endWithTheirBytes) {
    memset(&bond, 'u', sizeof bond);
    for (const int row : {0, 1}) {
        memset(bond.aszSlaves[row], 'v', sizeof bond.aszSlaves[row]);
    }
    bond.cSlaves = 2;
    EXPECT_OUTCOME(add("eth0"), added());
    EXPECT_STREQ("eth0", bond.aszSlaves[0]);
    EXPECT_EQ(std::string(16, 'v'), std::string(bond.aszSlaves[1], 16));
    EXPECT_EQ(std::string(16, 'v'), std::string(bond.aszSlaves[2], 16));
    const std::string unit = "ERR net_link_aggr_opt_slsave_add:N ";
    const std::string name = "[" + long_text(16, 'u') + "]";
    EXPECT_EQ(texts{unit + "Slave eth0 is already in " + name}, add("eth0").log);
    bond.cSlaves = 32;
    EXPECT_EQ(texts{unit + "No room for slave eth1 in " + name}, add("eth1").log);
}

TEST_F(net_link_aggr_opt_slsave_add, KOVANetLinkAggrOptSlsaveAdd_badArguments_areRefused) {
    EXPECT_OUTCOME(add(nullptr), refusal("net_link_aggr_opt_slsave_add", "((void *)0) != szSlave"));
    EXPECT_OUTCOME(add(""), refusal("net_link_aggr_opt_slsave_add", "'\\0' != *szSlave"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetLinkAggrOptSlsaveAdd(nullptr, "eth0"); }),
                   refusal("net_link_aggr_opt_slsave_add", "NULL != pOpt"));
    bond.cSlaves = -1;
    EXPECT_OUTCOME(add("eth0"), refusal("net_link_aggr_opt_slsave_add", "0 <= pOpt->cSlaves"));
}
