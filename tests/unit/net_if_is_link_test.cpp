#include "support/fake_kernel.h"

#include <cerrno>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_if_is_link : public unit_test {
protected:
    outcome is_link(const char *ifname) {
        return rig.observe([&] { return KOVANetIfIsLink(ifname); });
    }
    void add_switch_bond(const std::string &slaves) {
        rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
        write_file(ifcfg("ovs_bond0"), "SLAVE_LIST=\"" + slaves + "\"\nBOND_MODE=balance-slb\n");
    }

    fake_kernel kernel{rig};
};

TEST_F(net_if_is_link, KOVANetIfIsLink_runningFlag_decides) {
    kernel.add("eth0", {.flags = IFF_UP | IFF_RUNNING});
    kernel.add("eth1", {.flags = IFF_UP});
    EXPECT_OUTCOME(is_link("eth0"), {.result = 1});
    EXPECT_OUTCOME(is_link("eth1"), {.result = 0});
}

TEST_F(net_if_is_link, KOVANetIfIsLink_unknownInterface_isNotedOnly) {
    EXPECT_OUTCOME(is_link("eth9"), {.result = -1,
                                     .code = 0x3400,
                                     .unit = "net_if_is_link",
                                     .log = {"INFO net_if_is_link:N Cannot get link status of the eth9: No such device",
                                             "INFO net_if_is_link:N get link status failed on eth9"}});
}

TEST_F(net_if_is_link, KOVANetIfIsLink_refusedRequest_is3600) {
    kernel.add("eth0", {.failing = {{SIOCGIFFLAGS, EPERM}}});
    EXPECT_OUTCOME(is_link("eth0"),
                   {.result = -1,
                    .code = 0x3600,
                    .unit = "net_if_is_link",
                    .log = {"INFO net_if_is_link:N Cannot get link status of the eth0: Operation not permitted",
                            "INFO net_if_is_link:N get link status failed on eth0"}});
}

TEST_F(net_if_is_link, KOVANetIfIsLink_noSocket_isAnError) {
    rig.fail("socket");
    EXPECT_OUTCOME(is_link("eth0"), {.result = -1,
                                     .code = 0x3400,
                                     .unit = "net_if_is_link",
                                     .log = {"ERR net_if_is_link:N Cannot open control socket",
                                             "INFO net_if_is_link:N get link status failed on eth0"}});
}

TEST_F(net_if_is_link, KOVANetIfIsLink_switchPort_hasTheLinkOfWhatIsBehindIt) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    kernel.add("eth0", {.flags = IFF_UP | IFF_RUNNING});
    kernel.add("ovs_eth0", {.flags = IFF_UP});
    EXPECT_OUTCOME(is_link("ovs_eth0"), {.result = 1});
}

TEST_F(net_if_is_link, KOVANetIfIsLink_switchPortOverNothing_namesTheMissingOne) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    EXPECT_OUTCOME(is_link("ovs_eth0"),
                   {.result = -1,
                    .code = 0x3400,
                    .unit = "net_if_is_link",
                    .log = {"INFO net_if_is_link:N Cannot get link status of the eth0: No such device",
                            "INFO net_if_is_link:N get link status failed on eth0"}});
}

TEST_F(net_if_is_link, KOVANetIfIsLink_switchPortWithALongName_isAnOriginThatCannotBe) {
    const std::string name = "ovs_" + long_text(16);
    rig.replace_file("/sys/devices/virtual/net/" + name, "");
    EXPECT_OUTCOME(is_link(name.c_str()),
                   {.result = -1,
                    .code = 0xD00,
                    .unit = "net_ovs_get_original_if",
                    .log = {"ERR net_ovs_get_original_if:N Invaild Argument (strlen(szIfname) - 4 < size)=[0]",
                            "ERR net_if_is_link:N get ovs origin interface error"}});
}

TEST_F(net_if_is_link, KOVANetIfIsLink_switchBond_firstMemberWithLinkDecides) {
    kernel.add("eth0", {.flags = IFF_UP});
    kernel.add("eth1");
    add_switch_bond("eth0 eth1");
    const outcome got = is_link("ovs_bond0");
    EXPECT_EQ(1, got.result);
    EXPECT_EQ(texts{}, got.log);
}

TEST_F(net_if_is_link, KOVANetIfIsLink_switchBondWithoutCarrier_isZero) {
    kernel.add("eth0", {.flags = IFF_UP});
    kernel.add("eth1", {.flags = 0});
    add_switch_bond("eth0 eth1");
    EXPECT_EQ(0, is_link("ovs_bond0").result);
}

TEST_F(net_if_is_link, KOVANetIfIsLink_switchBondWithoutMembers_isAnError) {
    add_switch_bond("eth0");
    EXPECT_EQ(-1, is_link("ovs_bond0").result);
}

TEST_F(net_if_is_link, KOVANetIfIsLink_switchBondMemberVanishes_decidesByItsFailure) {
    fake_interface &eth0 = kernel.add("eth0", {.flags = IFF_UP});
    kernel.add("eth1");
    add_switch_bond("eth0 eth1");
    int asked = 0;
    rig.answer_ioctl([&, next = rig.on_ioctl](unsigned long request, void *argument) -> std::optional<int> {
        if (++asked > 2) { // both were there when the bond was read
            eth0.failing[SIOCGIFFLAGS] = ENODEV;
        }
        return next(request, argument);
    });
    const outcome got = is_link("ovs_bond0");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x3400U, got.code);
    EXPECT_EQ(texts{"INFO net_if_is_link:N Cannot get link status of the eth0: No such device"}, got.log);
}

TEST_F(net_if_is_link, KOVANetIfIsLink_switchBondWithoutFile_isLogged) {
    rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
    EXPECT_OUTCOME(is_link("ovs_bond0"), {.result = -1,
                                          .code = 0x900,
                                          .unit = "key_value",
                                          .log = {"ERR net_link_aggr_get:N Failed to get key [BLOCK_CNT]",
                                                  "ERR net_if_is_link:N Failed to get OVS bond slave of ovs_bond0"}});
}

TEST_F(net_if_is_link, KOVANetIfIsLink_switchBondThatNamesItself_ends) {
    kernel.add("eth0");
    rig.replace_file("/sys/devices/virtual/net/ovs_bond1", "");
    write_file(ifcfg("ovs_bond1"), "SLAVE_LIST=\"ovs_bond0\"\nBOND_MODE=balance-slb\n");
    add_switch_bond("ovs_bond0 ovs_bond1 eth0");
    EXPECT_EQ(1, is_link("ovs_bond0").result);
    EXPECT_EQ(-1, is_link("ovs_bond1").result);
}

TEST_F(net_if_is_link, KOVANetIfIsLink_badNames_areRefused) {
    EXPECT_OUTCOME(is_link(nullptr), refusal("net_if_is_link", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(is_link(""), refusal("net_if_is_link", "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(is_link(name.c_str()), refusal("net_if_is_link", "is_interface_name(szIfname)"));
    }
}

TEST_F(net_if_is_link, KOVANetIfIsLink_realPair_hasLinkWhenBothEndsAreUp) {
    rig.answer_ioctl({});
    shell("ip link add kv0 type veth peer name kv1 && ip link set kv0 up");
    EXPECT_OUTCOME(is_link("kv0"), {.result = 0});
    shell("ip link set kv1 up"); // the kernel tells the other end a little later
    shell("timeout 10 sh -c 'until ip link show kv0 | grep -q \"state UP\"; do sleep 0.02; done'");
    EXPECT_OUTCOME(is_link("kv0"), {.result = 1});
    shell("ip link del kv0");
}
