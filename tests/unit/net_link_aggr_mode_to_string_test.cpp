#include "support/rig.h"

#include <kovanetsdk/link.h>

using namespace kova_test;

using net_link_aggr_mode_to_string = unit_test;

TEST_F(net_link_aggr_mode_to_string, KOVANetLinkAggrModeToString_modes_haveTheirNames) {
    const texts names{"unknown",    "balance-alb",       "802.3ad",     "balance-xor", "active-backup",
                      "balance-rr", "ovs-active-backup", "balance-slb", "balance-tcp"};
    for (int mode = 0; mode < KOVA_LINK_AGGR_MODES; ++mode) {
        std::string name;
        EXPECT_OUTCOME(rig.observe([&] {
            name = KOVANetLinkAggrModeToString(mode);
            return 0;
        }),
                       {.result = 0});
        EXPECT_EQ(names[static_cast<size_t>(mode)], name);
        EXPECT_EQ(mode, KOVANetLinkAggrStringToMode(name.c_str())) << name;
    }
}

TEST_F(net_link_aggr_mode_to_string, KOVANetLinkAggrModeToString_otherNumbers_areUnknown) {
    for (const int mode : {-1, 9, 2147483647, -2147483647 - 1}) {
        EXPECT_STREQ("unknown", KOVANetLinkAggrModeToString(mode));
    }
}

TEST_F(net_link_aggr_mode_to_string, grgBondDesc_holdsTheModesOfTheKernel) {
    const texts expected{"||",
                         "6|balance-alb|\"mode=6 use_carrier=0 miimon=100 updelay=100\"",
                         "4|802.3ad|\"mode=4 use_carrier=0 miimon=100 updelay=100 lacp_rate=fast\"",
                         "2|balance-xor|\"mode=2 use_carrier=0 miimon=100 updelay=100\"",
                         "1|active-backup|\"mode=1 use_carrier=0 miimon=100 updelay=100\"",
                         "0|balance-rr|\"mode=0 use_carrier=0 miimon=100 updelay=100\"",
                         "||",
                         "||",
                         "||"};
    texts got;
    for (const KOVABONDDESC &entry : grgBondDesc) {
        got.push_back(std::string(entry.szKernelMode) + "|" + entry.szName + "|" + entry.szOptions);
    }
    EXPECT_EQ(expected, got);
}
