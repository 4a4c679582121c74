#include "support/rig.h"

#include <kovanetsdk/link.h>

using namespace kova_test;

class net_link_aggr_string_to_mode : public unit_test {};

TEST_F(net_link_aggr_string_to_mode, KOVANetLinkAggrStringToMode_nameAsBeginning_givesItsMode) {
    for (const auto &[text, mode] : std::map<std::string, int>{{"balance-alb", 1},
                                                               {"802.3ad", 2},
                                                               {"802.3ad 4", 2},
                                                               {"balance-xor", 3},
                                                               {"active-backup", 4},
                                                               {"balance-rr", 5},
                                                               {"balance-rr-x", 5},
                                                               {"ovs-active-backup", 6},
                                                               {"balance-slb", 7},
                                                               {"balance-tcp" + long_text(4096), 8},
                                                               {"unknown", 0},
                                                               {"", 0},
                                                               {"balance-r", 0},
                                                               {" balance-rr", 0},
                                                               {"Balance-rr", 0},
                                                               {"802.3a", 0},
                                                               {long_text(4096), 0}}) {
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetLinkAggrStringToMode(text.c_str()); }), {.result = mode});
    }
}

TEST_F(net_link_aggr_string_to_mode, KOVANetLinkAggrStringToMode_noText_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetLinkAggrStringToMode(nullptr); }),
                   refusal("net_link_aggr_string_to_mode", "((void *)0) != szMode", 0));
}
