#include "support/fake_kernel.h"

#include <cerrno>
#include <kovanetsdk/link.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_set_mtu_eth";
const std::string kNotice = "WARNING net_set_mtu_eth:N we temporarily do the eth up/down in sdk when setting MTU";

} // namespace

class net_set_mtu_eth : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        kernel.add("eth0");
        kernel.add("eth0.10", {.row_device = "eth0", .vlan_id = 10});
    }
    outcome set(const char *value, const char *ifname) {
        kernel.changes.clear();
        return rig.observe([=] { return KOVANetSetMTUEth(value, ifname); });
    }
    void add_switch_bond(const std::string &slaves) {
        rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
        write_file(ifcfg("ovs_bond0"), "SLAVE_LIST=" + slaves + "\nBOND_MODE=balance-slb\n");
    }
    static std::string not_set(const std::string &ifname) {
        return "ERR net_set_mtu_eth:N Failed to set MTU 9000 of " + ifname;
    }

    fake_kernel kernel{rig};
};

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_interface_isDownMeanwhile) {
    EXPECT_OUTCOME(set("9000", "eth0"), {.log = {kNotice}});
    EXPECT_EQ((texts{"eth0 down", "eth0 mtu 9000", "eth0 up"}), kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_value_isTheNumberThatTheTextBeginsWith) {
    for (const auto &[text, mtu] : std::map<std::string, std::string>{
             {"", "0"}, {"many", "0"}, {" 1400", "1400"}, {"1400x", "1400"}, {"-1", "-1"}, {"0x100", "0"}}) {
        EXPECT_EQ(0, set(text.c_str(), "eth0").result);
        EXPECT_EQ((texts{"eth0 down", "eth0 mtu " + mtu, "eth0 up"}), kernel.changes) << text;
    }
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_vlan_setsItsRowDeviceFirst) {
    EXPECT_OUTCOME(set("9000", "eth0.10"), {.log = {kNotice, kNotice}});
    EXPECT_EQ((texts{"eth0 down", "eth0 mtu 9000", "eth0 up", "eth0.10 down", "eth0.10 mtu 9000", "eth0.10 up"}),
              kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_rowDevice_leavesItsVlansAlone) {
    EXPECT_EQ(0, set("1400", "eth0").result);
    EXPECT_EQ(1500, kernel.at("eth0.10").mtu);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_kernelRefuses_is8100AndTheInterfaceIsUpAgain) {
    kernel.add("eth0", {.failing = {{SIOCSIFMTU, EINVAL}}});
    EXPECT_OUTCOME(
        set("9000", "eth0"),
        {.result = -1,
         .code = 0x8100,
         .unit = kUnit,
         .log = {kNotice, "ERR net_set_mtu_eth:N Kernel refuses MTU 9000 of eth0: Invalid argument", not_set("eth0")}});
    EXPECT_EQ((texts{"eth0 down", "eth0 up"}), kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_rowDeviceFails_leavesTheVlan) {
    kernel.add("eth0", {.failing = {{SIOCSIFMTU, EINVAL}}});
    const outcome got = set("9000", "eth0.10");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x8100U, got.code);
    EXPECT_EQ(not_set("eth0.10"), got.log.back());
    EXPECT_EQ((texts{"eth0 down", "eth0 up", "eth0.10 up"}), kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_vlanOnItself_is8100) {
    kernel.add("odd0", {.row_device = "odd0", .vlan_id = 1});
    EXPECT_OUTCOME(set("9000", "odd0"),
                   {.result = -1,
                    .code = 0x8100,
                    .unit = kUnit,
                    .log = {"ERR net_set_mtu_eth:N VLAN odd0 is its own row device", not_set("odd0")}});
    EXPECT_EQ(texts{"odd0 up"}, kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_noSocket_is3400AndTheInterfaceIsUp) {
    rig.fail("socket", 1);
    EXPECT_OUTCOME(set("9000", "eth0"), {.result = -1,
                                         .code = 0x3400,
                                         .unit = "net_vlan_get",
                                         .log = {"ERR net_vlan_get:N Cannot open control socket", not_set("eth0")}});
    EXPECT_EQ(texts{"eth0 up"}, kernel.changes);
    rig.fail("socket", 2);
    EXPECT_OUTCOME(set("9000", "eth0"), {.result = -1,
                                         .code = 0x3400,
                                         .unit = kUnit,
                                         .log = {"ERR net_set_mtu_eth:N Cannot open control socket", not_set("eth0")}});
    EXPECT_EQ(texts{"eth0 up"}, kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_interfaceThatStaysUp_isSetAllTheSame) {
    kernel.add("eth0", {.failing = {{SIOCSIFFLAGS, EPERM}}});
    EXPECT_EQ(0, set("9000", "eth0").result);
    EXPECT_EQ(texts{"eth0 mtu 9000"}, kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_unknownInterface_is8100) {
    for (const std::string &name : texts{"gone0", long_text(15), long_text(16)}) {
        const outcome got = set("9000", name.c_str());
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ(not_set(name), got.log[got.log.size() - 1]);
        EXPECT_EQ("ERR net_set_mtu_eth:N Kernel refuses MTU 9000 of " + name + ": No such device", got.log[2]);
    }
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_seventeenCharacters_areRefused) {
    const std::string name = long_text(17);
    outcome expected = refusal(kUnit, "strlen(szIfname) <= IFNAMSIZ");
    expected.log.push_back(not_set(name));
    EXPECT_OUTCOME(set("9000", name.c_str()), expected);
    EXPECT_EQ(texts{}, kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_switchPort_setsTheInterfaceBehindIt) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    kernel.add("ovs_eth0");
    EXPECT_OUTCOME(set("9000", "ovs_eth0"), {.log = {kNotice}});
    EXPECT_EQ((texts{"eth0 down", "eth0 mtu 9000", "eth0 up"}), kernel.changes);
    kernel.add("eth0", {.failing = {{SIOCSIFMTU, EBUSY}}});
    EXPECT_EQ(not_set("eth0"), set("9000", "ovs_eth0").log.back());
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_switchPortOfNoInterface_isLeftAlone) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    kernel.add("ovs_eth0");
    rig.fail("KLIBNetOVSGetOriginalIf");
    EXPECT_OUTCOME(set("9000", "ovs_eth0"),
                   {.result = -1, .log = {"ERR net_set_mtu_eth:N get ovs origin interface error"}});
    EXPECT_EQ(texts{}, kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_switchBond_setsItsMembersAlone) {
    for (const char *name : {"eth1", "eth2", "ovs_bond0"}) {
        kernel.add(name);
    }
    add_switch_bond("\"eth2 eth1\"");
    EXPECT_EQ(0, set("9000", "ovs_bond0").result);
    EXPECT_EQ((texts{kNotice, kNotice}), rig.now.log);
    EXPECT_EQ((texts{"eth1 down", "eth1 mtu 9000", "eth1 up", "eth2 down", "eth2 mtu 9000", "eth2 up"}),
              kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_switchBondMemberFails_stopsThere) {
    kernel.add("eth1", {.failing = {{SIOCSIFMTU, EINVAL}}});
    kernel.add("eth2");
    add_switch_bond("\"eth1 eth2\"");
    const outcome got = set("9000", "ovs_bond0");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x8100U, got.code);
    EXPECT_EQ("ERR net_set_mtu_eth:N Failed to set the MTU 9000 to OVS bonding slave eth1", got.log.back());
    EXPECT_EQ((texts{"eth1 down", "eth1 up"}), kernel.changes);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_switchBondMemberVanishes_stopsBehindTheFirst) {
    kernel.add("eth1");
    kernel.add("eth2", {.failing = {{SIOCSIFMTU, ENODEV}}});
    kernel.add("eth3");
    add_switch_bond("\"eth1 eth2 eth3\"");
    EXPECT_OUTCOME(set("9000", "ovs_bond0"),
                   {.result = -1,
                    .code = 0x8100,
                    .unit = kUnit,
                    .log = {kNotice, kNotice, "ERR net_set_mtu_eth:N Kernel refuses MTU 9000 of eth2: No such device",
                            "ERR net_set_mtu_eth:N Failed to set the MTU 9000 to OVS bonding slave eth2"}});
    EXPECT_EQ((texts{"eth1 down", "eth1 mtu 9000", "eth1 up", "eth2 down", "eth2 up"}), kernel.changes);
    EXPECT_EQ(9000, kernel.at("eth1").mtu);
    EXPECT_EQ(1500, kernel.at("eth3").mtu);
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_switchBondWithoutMembersOrFile_fails) {
    add_switch_bond("");
    EXPECT_OUTCOME(set("9000", "ovs_bond0"), {.result = -1});
    shell("rm " + ifcfg("ovs_bond0"));
    EXPECT_OUTCOME(set("9000", "ovs_bond0"),
                   {.result = -1,
                    .code = 0x900,
                    .unit = "key_value",
                    .log = {"ERR net_link_aggr_get:N Failed to get key [BLOCK_CNT]",
                            "ERR net_set_mtu_eth:N Failed to get OVS bond slave of ovs_bond0"}});
}

TEST_F(net_set_mtu_eth, KOVANetSetMTUEth_badArguments_areRefused) {
    EXPECT_OUTCOME(set(nullptr, "eth0"), refusal(kUnit, "((void *)0) != szValue"));
    EXPECT_OUTCOME(set("9000", nullptr), refusal(kUnit, "((void *)0) != szIfname"));
    EXPECT_OUTCOME(set("9000", ""), refusal(kUnit, "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(set("9000", name.c_str()), refusal(kUnit, "is_interface_name(szIfname)"));
    }
    EXPECT_EQ(texts{}, kernel.changes);
}
