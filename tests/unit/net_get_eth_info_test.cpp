#include "support/fake_kernel.h"

#include <cerrno>
#include <cstring>
#include <kovanetsdk/iface.h>
#include <linux/ethtool.h>

using namespace kova_test;

class net_get_eth_info : public unit_test {
protected:
    outcome get(const char *ifname) {
        memset(&info, 'u', sizeof info);
        return rig.observe([&] { return KOVANetGetEthInfo(&info, ifname); });
    }
    /** Speed, duplex, MTU, modes, best speed, best duplex, best name. */
    std::string shown() const {
        char text[128];
        snprintf(text, sizeof text, "%d %d %d 0x%x %d %d %s", info.nSpeed, info.nDuplex, info.nMTU, info.nSupported,
                 info.nBestSpeed, info.nBestDuplex, info.szBestMode);
        return text;
    }
    std::string shown_for(const fake_interface &device) {
        kernel.add("eth0", device);
        EXPECT_OUTCOME(get("eth0"), {.result = 0});
        return shown();
    }
    void add_switch_bond(const std::string &slaves) {
        rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
        write_file(ifcfg("ovs_bond0"), "SLAVE_LIST=" + slaves + "\nBOND_MODE=balance-slb\n");
    }

    fake_kernel kernel{rig};
    ETHINFO info;
};

TEST_F(net_get_eth_info, KOVANetGetEthInfo_card_isDescribed) {
    EXPECT_EQ("1000 1 9000 0x2f 1000 1 baseT", shown_for({.mtu = 9000, .supported = 0x2f, .speed = 1000, .duplex = 1}));
    EXPECT_EQ("100 0 1500 0x4 100 0 baseT", shown_for({.supported = 0x4, .speed = 100, .duplex = 0}));
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_everyRow_isTheBestWhenAlone) {
    const std::vector<std::pair<unsigned, std::string>> rows{{0x1, "10 0 baseT"},
                                                             {0x2, "10 1 baseT"},
                                                             {0x4, "100 0 baseT"},
                                                             {0x8, "100 1 baseT"},
                                                             {0x10, "1000 0 baseT"},
                                                             {0x20, "1000 1 baseT"},
                                                             {0x20000, "1000 1 baseKX"},
                                                             {0x8000, "2500 1 baseX"},
                                                             {0x1000, "10000 1 baseT"},
                                                             {0x40000, "10000 1 baseKX4"},
                                                             {0x80000, "10000 1 baseKR"},
                                                             {0x200000, "20000 1 baseMLD2"},
                                                             {0x400000, "20000 1 baseKR2"},
                                                             {0x800000, "40000 1 baseKR4"},
                                                             {0x1000000, "40000 1 baseCR4"},
                                                             {0x2000000, "40000 1 baseSR4"},
                                                             {0x4000000, "40000 1 baseLR4"}};
    unsigned below = 0;
    for (const auto &[bit, best] : rows) {
        below |= bit;
        for (const unsigned modes : {bit, below}) { // alone, and with every worse one
            char expected[96];
            snprintf(expected, sizeof expected, "1000 1 1500 0x%x %s", modes, best.c_str());
            EXPECT_EQ(expected, shown_for({.supported = modes}));
        }
    }
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_tenGigabitCopper_winsOver2500) {
    EXPECT_EQ("1000 1 1500 0x9000 10000 1 baseT", shown_for({.supported = 0x9000}));
    EXPECT_EQ("1000 1 1500 0x28000 2500 1 baseX", shown_for({.supported = 0x28000}));
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_noKnownMode_hasNoBest) {
    EXPECT_EQ("1000 1 1500 0x0 -1 -1 ", shown_for({.supported = 0}));
    EXPECT_EQ("1000 1 1500 0x6f40 -1 -1 ", shown_for({.supported = 0x6f40}));
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_unknownSpeed_isMinusOne) {
    EXPECT_EQ(-1, (shown_for({.speed = 0}), info.nSpeed));
    EXPECT_EQ(-1, (shown_for({.speed = 0xFFFF}), info.nSpeed));
    EXPECT_EQ(-1, (shown_for({.speed = 0xFFFFFFFF}), info.nSpeed));
    EXPECT_EQ(-1, (shown_for({.speed = 0x10000}), info.nSpeed));
    EXPECT_EQ(100000, (shown_for({.speed = 100000}), info.nSpeed));
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_unknownDuplex_isMinusOne) {
    EXPECT_EQ(-1, (shown_for({.duplex = 2}), info.nDuplex));
    EXPECT_EQ(-1, (shown_for({.duplex = 0xFF}), info.nDuplex));
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_noLink_hasNoSpeed) {
    EXPECT_EQ("-1 1 1500 0x20 1000 1 baseT", shown_for({.supported = 0x20, .has_link = false}));
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_driverWithoutAnswers_leavesAllUnknown) {
    EXPECT_EQ("-1 -1 1500 0xffffffff -1 -1 ",
              shown_for({.failing = {{ETHTOOL_GSET, EOPNOTSUPP}, {ETHTOOL_GLINK, EOPNOTSUPP}}}));
    EXPECT_EQ("1000 1 1500 0x0 -1 -1 ", shown_for({.failing = {{ETHTOOL_GLINK, EOPNOTSUPP}}}));
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_failedRequest_isAnError) {
    kernel.add("eth0", {.failing = {{ETHTOOL_GSET, EPERM}}});
    EXPECT_OUTCOME(get("eth0"),
                   {.result = -1,
                    .code = 0x3600,
                    .unit = "net_get_eth_info",
                    .log = {"ERR net_get_eth_info:N Cannot get link settings of eth0: Operation not permitted"}});
    kernel.add("eth0", {.failing = {{ETHTOOL_GLINK, ENODEV}}}); // gone since
    EXPECT_OUTCOME(get("eth0"), {.result = -1,
                                 .code = 0x3400,
                                 .unit = "net_get_eth_info",
                                 .log = {"ERR net_get_eth_info:N Cannot get link status of the eth0: No such device"}});
    EXPECT_EQ(0x3400U, get("eth9").code);
    EXPECT_EQ("-1 -1 -1 0xffffffff -1 -1 ", shown());
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_noMtu_isAnErrorWithTheRestKnown) {
    kernel.add("eth0", {.supported = 0x20, .failing = {{SIOCGIFMTU, ENODEV}}});
    const outcome got = get("eth0");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ("1000 1 -1 0x20 1000 1 baseT", shown());
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_noSocket_is3400) {
    kernel.add("eth0");
    rig.fail("socket");
    EXPECT_OUTCOME(get("eth0"), {.result = -1,
                                 .code = 0x3400,
                                 .unit = "net_get_eth_info",
                                 .log = {"ERR net_get_eth_info:N Cannot open control socket"}});
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_sixteenCharacters_areAskedSeventeenRefused) {
    EXPECT_EQ(0x3400U, get(long_text(16).c_str()).code);
    for (const size_t length : {17U, 63U, 64U}) {
        EXPECT_OUTCOME(get(long_text(length).c_str()), refusal("net_get_eth_info", "16 >= strlen(szIfname)"));
    }
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_badArguments_areRefused) {
    EXPECT_OUTCOME(get(nullptr), refusal("net_get_eth_info", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(get(""), refusal("net_get_eth_info", "'\\0' != *szIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetGetEthInfo(nullptr, "eth0"); }),
                   refusal("net_get_eth_info", "NULL != pEthInfo"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str()), refusal("net_get_eth_info", "is_interface_name(szIfname)"));
    }
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_switchPort_isTheInterfaceBehindIt) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    kernel.add("eth0", {.mtu = 9000, .supported = 0x20});
    EXPECT_OUTCOME(get("ovs_eth0"), {.result = 0});
    EXPECT_EQ("1000 1 9000 0x20 1000 1 baseT", shown());
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_switchBond_hasTheDuplexOfTheFirstThatAnswers) {
    kernel.add("eth0", {.mtu = 1400, .failing = {{ETHTOOL_GSET, EOPNOTSUPP}}});
    kernel.add("eth1", {.mtu = 9000, .supported = 0x20, .duplex = 0});
    kernel.add("eth2", {.mtu = 1500, .supported = 0x20, .duplex = 1});
    add_switch_bond("eth0 eth1 eth2");
    EXPECT_EQ(0, get("ovs_bond0").result);
    EXPECT_EQ("-1 0 9000 0xffffffff -1 -1 ", shown());
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_switchBondWithoutAnswer_stillHasItsMtu) {
    kernel.add("eth0", {.failing = {{ETHTOOL_GSET, EOPNOTSUPP}}});
    add_switch_bond("eth0");
    EXPECT_EQ(0, get("ovs_bond0").result);
    EXPECT_EQ("-1 -1 1500 0xffffffff -1 -1 ", shown());
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_switchBondWithoutFile_isLoggedTwice) {
    rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
    const outcome got = get("ovs_bond0");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ((texts{"ERR net_link_aggr_get:N Failed to get key [BLOCK_CNT]",
                     "ERR net_get_eth_info:N Failed to get bond slave of ovs_bond0",
                     "ERR net_get_eth_info:N Failed to get ovs bond setting"}),
              got.log);
    EXPECT_EQ("-1 -1 -1 0xffffffff -1 -1 ", shown());
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_switchBondWithoutSocket_isLogged) {
    kernel.add("eth0");
    add_switch_bond("eth0");
    rig.fail("socket", 2); // the first one sees that eth0 is there
    EXPECT_OUTCOME(get("ovs_bond0"), {.result = -1,
                                      .code = 0x3400,
                                      .unit = "net_get_eth_info",
                                      .log = {"ERR net_get_eth_info:N Failed to get ovs bond setting"}});
}

TEST_F(net_get_eth_info, KOVANetGetEthInfo_realPair_isDescribed) {
    rig.answer_ioctl({});
    shell("ip link add kv0 mtu 1400 type veth peer name kv1 && ip link set kv0 up && ip link set kv1 up");
    EXPECT_OUTCOME(get("kv0"), {.result = 0});
    EXPECT_EQ(1400, info.nMTU);
    shell("ip link del kv0");
}
