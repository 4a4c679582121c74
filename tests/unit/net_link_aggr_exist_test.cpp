#include "support/rig.h"

#include <kovanetsdk/link.h>

using namespace kova_test;

namespace {

const std::string kMasters = "/sys/class/net/bonding_masters";
const outcome kUnreadable{.result = -1,
                          .code = 0xA00,
                          .unit = "net_link_aggr_exist",
                          .log = {"ERR net_link_aggr_exist:N Fail to read [/sys/class/net/bonding_masters], "
                                  "errno=[21/Is a directory]"}};

} // namespace

class net_link_aggr_exist : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        bonds = KLIBCSzListAlloc(4);
    }
    void TearDown() override {
        KLIBCSzListFree(bonds);
        unit_test::TearDown();
    }
    outcome exist() {
        return rig.observe([] { return KOVANetLinkAggrExist(); });
    }
    outcome list() {
        KLIBCSzListRemoveAll(bonds);
        return rig.observe([this] { return KOVANetLinkAggrEnum(bonds); });
    }
    void add_bond(const std::string &name, const std::string &slaves) {
        rig.replace_file("/sys/class/net/" + name + "/bonding/slaves", slaves);
    }
    texts names() const {
        texts got;
        for (int i = 0; const char *name = KLIBCSzListGet(bonds, i); ++i) {
            got.emplace_back(name);
        }
        return got;
    }

    KLIBSZLIST *bonds = nullptr;
};

TEST_F(net_link_aggr_exist, KOVANetLinkAggrExist_saysWhetherTheDriverIsThere) {
    rig.hide(kMasters);
    EXPECT_OUTCOME(exist(), {.result = 0});
    rig.replace_file(kMasters, "");
    EXPECT_OUTCOME(exist(), {.result = 0});
    for (const std::string &line : texts{"\n", "bond0\n", "bond0 bond1", long_text(100000), std::string("\0\n", 2)}) {
        rig.replace_file(kMasters, line);
        EXPECT_OUTCOME(exist(), {.result = 1});
    }
}

TEST_F(net_link_aggr_exist, KOVANetLinkAggrExist_fileThatCannotBeOpened_isNone) {
    rig.replace_file(kMasters, "bond0\n");
    rig.fail("fopen");
    EXPECT_OUTCOME(exist(), {.result = 0});
}

TEST_F(net_link_aggr_exist, KOVANetLinkAggrExist_fileThatCannotBeRead_isA00) {
    rig.redirect(kMasters, "/etc");
    EXPECT_OUTCOME(exist(), kUnreadable);
}

TEST_F(net_link_aggr_exist, KOVANetLinkAggrEnum_bondsWithMembers_areListedAndAllAreCounted) {
    rig.replace_file(kMasters, "bond0 bond1\tbond2 \n");
    add_bond("bond0", "eth0 eth1\n");
    add_bond("bond1", "\n");
    add_bond("bond2", "eth2\n");
    EXPECT_OUTCOME(list(), {.result = 3});
    EXPECT_EQ((texts{"bond0", "bond2"}), names());
}

TEST_F(net_link_aggr_exist, KOVANetLinkAggrEnum_namesThatAreNoBonds_areCountedAlone) {
    rig.replace_file(kMasters, "bond9 ../../../etc\n");
    const outcome got = list();
    EXPECT_EQ(2, got.result);
    EXPECT_EQ(texts{}, names());
    EXPECT_EQ(texts{"ERR net_link_aggr_phy_get:N Invaild Argument (is_interface_name(szBond))=[0]"}, got.log);
}

TEST_F(net_link_aggr_exist, KOVANetLinkAggrEnum_list_isAppendedTo) {
    rig.replace_file(kMasters, "bond0");
    add_bond("bond0", "eth0 eth1");
    KLIBCSzListPush(&bonds, "first");
    EXPECT_OUTCOME(rig.observe([this] { return KOVANetLinkAggrEnum(bonds); }), {.result = 1});
    EXPECT_EQ((texts{"first", "bond0"}), names());
}

TEST_F(net_link_aggr_exist, KOVANetLinkAggrEnum_manyBonds_areAllListed) {
    std::string line;
    texts expected;
    for (int i = 0; i < 100; ++i) {
        expected.push_back("bond" + std::to_string(i));
        line += expected.back() + " ";
        add_bond(expected.back(), "eth0\n");
    }
    rig.replace_file(kMasters, line + "\n");
    EXPECT_OUTCOME(list(), {.result = 100});
    EXPECT_EQ(expected, names());
}

TEST_F(net_link_aggr_exist, KOVANetLinkAggrEnum_noDriver_isZero) {
    rig.hide(kMasters);
    EXPECT_OUTCOME(list(), {.result = 0});
    for (const char *content : {"", "\n", " \t \n"}) {
        rig.replace_file(kMasters, content);
        EXPECT_OUTCOME(list(), {.result = 0});
    }
}

TEST_F(net_link_aggr_exist, KOVANetLinkAggrEnum_fileThatCannotBeRead_isA00) {
    rig.redirect(kMasters, "/etc");
    EXPECT_OUTCOME(list(), kUnreadable);
}

TEST_F(net_link_aggr_exist, KOVANetLinkAggrEnum_noMemory_is200) {
    rig.replace_file(kMasters, "bond0\n");
    add_bond("bond0", "eth0\n");
    for (const int nth : {1, 2}) {
        rig.fail("KLIBCSzListAlloc", nth);
        EXPECT_OUTCOME(list(), {.result = -1,
                                .code = 0x200,
                                .unit = "net_link_aggr_exist",
                                .log = {"ERR net_link_aggr_exist:N Failed to alloc memory."}});
    }
    for (const int nth : {1, 3}) { // the bond's name when the line is cut up, the bond for the caller
        rig.fail("KLIBCSzListPush", nth);
        EXPECT_OUTCOME(list(), {.result = -1, .code = 0x200, .unit = "platform"});
    }
}

TEST_F(net_link_aggr_exist, KOVANetLinkAggrEnum_noList_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetLinkAggrEnum(nullptr); }),
                   refusal("net_link_aggr_exist", "NULL != pBonds"));
}
