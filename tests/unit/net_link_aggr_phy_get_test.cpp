#include "support/rig.h"

#include <kovanetsdk/link.h>

using namespace kova_test;

namespace {

const char *const kSlaves = "/sys/class/net/bond0/bonding/slaves";

} // namespace

class net_link_aggr_phy_get : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        list = KLIBCSzListAlloc(4);
    }
    void TearDown() override {
        KLIBCSzListFree(list);
        unit_test::TearDown();
    }
    outcome get(const char *bond) {
        return rig.observe([&] { return KOVANetLinkAggrPhyGet(bond, list); });
    }
    texts names() const {
        texts found;
        for (int i = 0; const char *name = KLIBCSzListGet(list, i); ++i) {
            found.emplace_back(name);
        }
        return found;
    }

    KLIBSZLIST *list = nullptr;
};

TEST_F(net_link_aggr_phy_get, KOVANetLinkAggrPhyGet_names_areAppended) {
    rig.replace_file(kSlaves, " eth1\teth0  \nnext line\n");
    EXPECT_OUTCOME(get("bond0"), {.result = 2});
    EXPECT_OUTCOME(get("bond0"), {.result = 2});
    EXPECT_EQ((texts{"eth1", "eth0", "eth1", "eth0"}), names());
}

TEST_F(net_link_aggr_phy_get, KOVANetLinkAggrPhyGet_manyNames_areAllTaken) {
    std::string line;
    for (int i = 0; i < 3000; ++i) {
        line += "eth" + std::to_string(i) + " ";
    }
    rig.replace_file(kSlaves, line);
    EXPECT_OUTCOME(get("bond0"), {.result = 3000});
    EXPECT_EQ("eth2999", names().back());
}

TEST_F(net_link_aggr_phy_get, KOVANetLinkAggrPhyGet_emptyLine_isZeroAndEmptyFileAnError) {
    rig.replace_file(kSlaves, "\n");
    EXPECT_OUTCOME(get("bond0"), {.result = 0});
    rig.replace_file(kSlaves, "");
    EXPECT_OUTCOME(get("bond0"), {.result = -1, .code = 0xA00, .unit = "net_link_aggr_phy_get"});
}

TEST_F(net_link_aggr_phy_get, KOVANetLinkAggrPhyGet_noBond_is900) {
    EXPECT_OUTCOME(get("bond0"), {.result = -1, .code = 0x900, .unit = "net_link_aggr_phy_get"});
    rig.replace_file(kSlaves, "eth0\n");
    rig.fail("fopen");
    EXPECT_OUTCOME(get("bond0"), {.result = -1, .code = 0x900, .unit = "net_link_aggr_phy_get"});
}

TEST_F(net_link_aggr_phy_get, KOVANetLinkAggrPhyGet_directoryInPlaceOfTheFile_isA00) {
    shell("mkdir -p /tmp/no-file");
    rig.redirect(kSlaves, "/tmp/no-file");
    EXPECT_OUTCOME(get("bond0"), {.result = -1, .code = 0xA00, .unit = "net_link_aggr_phy_get"});
    EXPECT_EQ(texts{}, names());
}

TEST_F(net_link_aggr_phy_get, KOVANetLinkAggrPhyGet_longNames_areAskedWhole) {
    for (const size_t length : {15U, 16U, 17U}) {
        rig.replace_file("/sys/class/net/" + long_text(length) + "/bonding/slaves", "of" + std::to_string(length));
    }
    for (const size_t length : {15U, 16U, 17U}) {
        EXPECT_OUTCOME(get(long_text(length).c_str()), {.result = 1});
    }
    EXPECT_OUTCOME(get(long_text(18).c_str()), {.result = -1, .code = 0x900, .unit = "net_link_aggr_phy_get"});
    EXPECT_EQ((texts{"of15", "of16", "of17"}), names());
}

TEST_F(net_link_aggr_phy_get, KOVANetLinkAggrPhyGet_noMemory_fails) {
    rig.replace_file(kSlaves, "eth0 eth1\n");
    rig.fail("KLIBCSzListPush", 2);
    EXPECT_OUTCOME(get("bond0"), {.result = -1, .code = 0x200, .unit = "platform"});
}

TEST_F(net_link_aggr_phy_get, KOVANetLinkAggrPhyGet_badArguments_areRefused) {
    EXPECT_OUTCOME(get(nullptr), refusal("net_link_aggr_phy_get", "((void *)0) != szBond"));
    EXPECT_OUTCOME(get(""), refusal("net_link_aggr_phy_get", "'\\0' != *szBond"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetLinkAggrPhyGet("bond0", nullptr); }),
                   refusal("net_link_aggr_phy_get", "NULL != pSlaves"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str()), refusal("net_link_aggr_phy_get", "is_interface_name(szBond)"));
    }
    EXPECT_EQ(texts{}, names());
}
