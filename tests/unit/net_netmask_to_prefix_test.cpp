#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class net_netmask_to_prefix : public unit_test {};

TEST_F(net_netmask_to_prefix, KOVANetNetmaskToPrefix_mask_countsItsBits) {
    const std::map<std::string, long> masks{{"255.255.255.0", 24}, {"255.255.255.255", 32}, {"0.0.0.0", 0},
                                            {"128.0.0.0", 1},      {"255.0.255.0", 16},     {"0xff.0377.0.0", 16},
                                            {"0.0.0.1", 1}};
    for (const auto &[mask, prefix] : masks) {
        SCOPED_TRACE(mask);
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetNetmaskToPrefix(mask.c_str()); }), {.result = prefix});
    }
}

TEST_F(net_netmask_to_prefix, KOVANetNetmaskToPrefix_noAddress_failsWithoutCode) {
    texts bad = bad_names();
    for (const char *text : {"", "255.255.255.256", "255.255.255.0.0", "255.255.255.", "-1", "::", "\n"}) {
        bad.emplace_back(text);
    }
    for (const std::string &mask : bad) {
        SCOPED_TRACE(mask);
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetNetmaskToPrefix(mask.c_str()); }), {.result = -1});
    }
}

TEST_F(net_netmask_to_prefix, KOVANetNetmaskToPrefix_null_failsWithoutCode) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetNetmaskToPrefix(nullptr); }), {.result = -1});
}

} // namespace
