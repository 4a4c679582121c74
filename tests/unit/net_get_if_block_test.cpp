#include "support/rig.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_get_if_block : public unit_test {
protected:
    outcome get(const std::string &content) {
        write_file(ifcfg("eth0"), content);
        return get();
    }
    outcome get() {
        return rig.observe([this] { return KOVANetGetIfBlock("eth0", &mask); });
    }

    int mask = 0;
};

TEST_F(net_get_if_block, KOVANetGetIfBlock_missing_argument_is_refused) {
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetGetIfBlock(nullptr, &mask); }),
                   refusal("net_get_if_block", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetGetIfBlock("", &mask); }),
                   refusal("net_get_if_block", "'\\0' != *szIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetGetIfBlock("eth0", nullptr); }),
                   refusal("net_get_if_block", "NULL != pMask"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetGetIfBlock(name.c_str(), &mask); }),
                       refusal("net_get_if_block", "is_interface_name(szIfname)"));
    }
}

TEST_F(net_get_if_block, KOVANetGetIfBlock_without_file_fails) {
    mask = 0x100;
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x900,
                           .unit = "key_value",
                           .log = {"ERR net_get_if_block:N Failed to get key [BLOCK_CNT]"}});
    EXPECT_EQ(0x100, mask);
}

TEST_F(net_get_if_block, KOVANetGetIfBlock_no_count_is_no_reason) {
    for (const char *count : {"", "BLOCK_CNT=0\n", "BLOCK_CNT=\"0\"\n", "BLOCK_CNT=\n", "BLOCK_CNT=many\n"}) {
        EXPECT_OUTCOME(get(count + std::string("BLOCK_HA=yes\n")), {.result = 0});
        EXPECT_EQ(0, mask) << count;
    }
}

TEST_F(net_get_if_block, KOVANetGetIfBlock_each_reason_has_its_bit) {
    const std::map<std::string, int> reasons{
        {"BLOCK_HA", 1}, {"BLOCK_AHA", 2}, {"BLOCK_VIRTUAL", 4}, {"BLOCK_ORLENA", 8}};
    std::string all = "BLOCK_CNT=\"4\"\n";
    for (const auto &[key, bit] : reasons) {
        for (const char *value : {"yes", "\"yes\"", "yes, and more of it than fits"}) {
            mask = 0;
            EXPECT_OUTCOME(get("BLOCK_CNT=1\n" + key + "=" + value + "\n"), {.result = 0});
            EXPECT_EQ(bit, mask) << key << value;
        }
        for (const char *value : {"no", "", "YES", "ye", " yes"}) {
            mask = 0;
            EXPECT_OUTCOME(get("BLOCK_CNT=1\n" + key + "=" + value + "\n"), {.result = 0});
            EXPECT_EQ(0, mask) << key << value;
        }
        all += key + "=\"yes\"\n";
    }
    EXPECT_OUTCOME(get(all), {.result = 0});
    EXPECT_EQ(15, mask);
}

TEST_F(net_get_if_block, KOVANetGetIfBlock_bits_are_added) {
    mask = 0x20 | 2;
    EXPECT_OUTCOME(get("BLOCK_CNT=-1\nBLOCK_HA=yes\n"), {.result = 0});
    EXPECT_EQ(0x20 | 2 | 1, mask);
}

TEST_F(net_get_if_block, KOVANetGetIfBlock_reason_that_cannot_be_read_fails_and_adds_nothing) {
    const char *const keys[] = {"BLOCK_CNT", "BLOCK_HA", "BLOCK_AHA", "BLOCK_VIRTUAL", "BLOCK_ORLENA"};
    for (int nth = 1; nth <= 5; ++nth) {
        rig.fail("KLIBCFileGetKeyValue", nth);
        EXPECT_OUTCOME(get("BLOCK_CNT=4\nBLOCK_HA=yes\nBLOCK_AHA=yes\nBLOCK_VIRTUAL=yes\nBLOCK_ORLENA=yes\n"),
                       {.result = -1,
                        .code = 0x900,
                        .unit = "platform",
                        .log = {"ERR net_get_if_block:N Failed to get key [" + std::string(keys[nth - 1]) + "]"}});
        EXPECT_EQ(0, mask);
    }
}
