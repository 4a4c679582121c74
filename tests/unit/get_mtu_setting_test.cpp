#include "support/fake_kernel.h"

#include <cerrno>
#include <kovanetsdk/link.h>

using namespace kova_test;

class get_mtu_setting : public unit_test {
protected:
    outcome get(const char *ifname) {
        return rig.observe([&] { return KOVAGetMTUSetting(ifname); });
    }
    void add_switch_bond(const std::string &slaves) {
        rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
        write_file(ifcfg("ovs_bond0"), "SLAVE_LIST=" + slaves + "\nBOND_MODE=balance-slb\n");
    }
    fake_kernel kernel{rig};
};

TEST_F(get_mtu_setting, KOVAGetMTUSetting_interface_hasItsOwn) {
    kernel.add("eth0", {.mtu = 9000});
    EXPECT_OUTCOME(get("eth0"), {.result = 9000});
}

TEST_F(get_mtu_setting, KOVAGetMTUSetting_unknownInterface_isZero) {
    EXPECT_EQ(0, get("eth9").result);
    EXPECT_EQ(texts{"ERR get_mtu:N Cannot get MTU of eth9: No such device"}, rig.now.log);
}

TEST_F(get_mtu_setting, KOVAGetMTUSetting_sixteenCharacters_areNoOtherInterface) {
    kernel.add(long_text(15), {.mtu = 9000});
    EXPECT_OUTCOME(get(long_text(15).c_str()), {.result = 9000});
    EXPECT_EQ(0, get(long_text(16).c_str()).result);
}

TEST_F(get_mtu_setting, KOVAGetMTUSetting_longName_isLoggedTwice) {
    EXPECT_OUTCOME(get("abcdefghijklmnopq"), {.result = -1,
                                              .code = 0xD00,
                                              .unit = "get_mtu",
                                              .log = {"ERR get_mtu:N interface name is too long",
                                                      "ERR get_mtu_setting:N Failed to get MTU of abcdefghijklmnopq"}});
}

TEST_F(get_mtu_setting, KOVAGetMTUSetting_switchPort_hasThatOfTheInterfaceBehindIt) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    kernel.add("eth0", {.mtu = 9000});
    kernel.add("ovs_eth0", {.mtu = 1500});
    EXPECT_OUTCOME(get("ovs_eth0"), {.result = 9000});
}

TEST_F(get_mtu_setting, KOVAGetMTUSetting_switchPortOfNoInterface_isMinusOne) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    kernel.add("ovs_eth0", {.mtu = 1500});
    rig.fail("KLIBNetOVSGetOriginalIf");
    EXPECT_OUTCOME(get("ovs_eth0"), {.result = -1, .log = {"ERR get_mtu_setting:N get ovs origin interface error"}});
}

TEST_F(get_mtu_setting, KOVAGetMTUSetting_switchBond_hasTheLargestOfItsMembers) {
    kernel.add("eth0", {.mtu = 1500});
    kernel.add("eth1", {.mtu = 9000});
    kernel.add("eth2", {.mtu = 1400});
    kernel.add("ovs_bond0", {.mtu = 65000});
    add_switch_bond("eth0 eth1 eth2");
    EXPECT_EQ(9000, get("ovs_bond0").result);
    EXPECT_EQ(texts{}, rig.now.log);
}

TEST_F(get_mtu_setting, KOVAGetMTUSetting_switchBondMemberFails_isTheLargestSoFar) {
    kernel.add("eth0", {.mtu = 1400});
    kernel.add("eth1", {.mtu = 1300, .failing = {{SIOCGIFMTU, ENODEV}}});
    kernel.add("eth2", {.mtu = 9000});
    add_switch_bond("eth0 eth1 eth2");
    const outcome got = get("ovs_bond0");
    EXPECT_EQ(1400, got.result);
    EXPECT_EQ((texts{"ERR get_mtu:N Cannot get MTU of eth1: No such device",
                     "ERR get_mtu_setting:N Failed to Get the MTU of eth1"}),
              got.log);
}

TEST_F(get_mtu_setting, KOVAGetMTUSetting_switchBondWithoutMembers_isMinusOne) {
    add_switch_bond("");
    EXPECT_OUTCOME(get("ovs_bond0"), {.result = -1});
}

TEST_F(get_mtu_setting, KOVAGetMTUSetting_switchBondWithoutFile_isLogged) {
    rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
    EXPECT_OUTCOME(get("ovs_bond0"), {.result = -1,
                                      .code = 0x900,
                                      .unit = "key_value",
                                      .log = {"ERR net_link_aggr_get:N Failed to get key [BLOCK_CNT]",
                                              "ERR get_mtu_setting:N Failed to get OVS bond slave of ovs_bond0"}});
}

TEST_F(get_mtu_setting, KOVAGetMTUSetting_badNames_areRefused) {
    EXPECT_OUTCOME(get(nullptr), refusal("get_mtu_setting", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(get(""), refusal("get_mtu_setting", "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str()), refusal("get_mtu_setting", "is_interface_name(szIfname)"));
    }
}
