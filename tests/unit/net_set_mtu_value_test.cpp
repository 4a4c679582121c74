#include "support/fake_kernel.h"

#include <cerrno>
#include <kovanetsdk/link.h>
#include <linux/ethtool.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_set_mtu_value";
const std::string kBegin = "ERR net_set_mtu_value:N ";
const std::string kInfo = "/etc/kovainfo.conf";
const std::string kNotice = "WARNING net_set_mtu_eth:N we temporarily do the eth up/down in sdk when setting MTU";
const texts kLocked{"+0x806", "-0x800"};

texts event(const std::string &ifname, const std::string &mtu = "9000") {
    return {"net/mtu_change 5 IFACE=" + ifname + " MTU_VALUE=" + mtu};
}

texts set_lines(const std::string &ifname) {
    return {ifname + " down", ifname + " mtu 9000", ifname + " up"};
}

} // namespace

class net_set_mtu_value : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        kernel.add("eth0");
        write_file(kInfo, "");
    }
    outcome set(const char *value, const char *ifname) {
        kernel.changes.clear();
        return rig.observe([=] { return KOVANetSetMTUValue(value, ifname); });
    }
    void add_switch_bond(const std::string &slaves) {
        rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
        write_file(ifcfg("ovs_bond0"), "SLAVE_LIST=" + slaves + "\nBOND_MODE=balance-slb\n");
    }

    fake_kernel kernel{rig};
};

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_interface_isStoredSetAndAnnounced) {
    texts before_the_wait;
    rig.on_sleep([&](long) {
        before_the_wait = kernel.changes;
        EXPECT_EQ("eth0_mtu=\"9000\"\n", read_file(kInfo));
        EXPECT_EQ(texts{}, rig.now.events);
    });
    EXPECT_OUTCOME(set("9000", "eth0"),
                   {.log = {kNotice}, .events = event("eth0"), .locks = kLocked, .sleeps = {5000}});
    EXPECT_EQ(set_lines("eth0"), before_the_wait);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_signal_doesNotShortenTheWait) {
    rig.fail("nanosleep");
    EXPECT_OUTCOME(set("9000", "eth0"),
                   {.log = {kNotice}, .events = event("eth0"), .locks = kLocked, .sleeps = {2500, 2500}});
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_vlan_isSetWithItsRowDevice) {
    kernel.add("eth0.10", {.row_device = "eth0", .vlan_id = 10});
    EXPECT_OUTCOME(set("9000", "eth0.10"),
                   {.log = {kNotice, kNotice}, .events = event("eth0.10"), .locks = kLocked, .sleeps = {5000}});
    EXPECT_EQ("eth0_mtu=\"9000\"\neth0.10_mtu=\"9000\"\n", read_file(kInfo));
    EXPECT_EQ(9000, kernel.at("eth0").mtu);
    EXPECT_EQ(9000, kernel.at("eth0.10").mtu);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_switchPort_isTheInterfaceBehindIt) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    EXPECT_OUTCOME(set("9000", "ovs_eth0"),
                   {.log = {kNotice}, .events = event("eth0"), .locks = kLocked, .sleeps = {5000}});
    EXPECT_EQ("eth0_mtu=\"9000\"\n", read_file(kInfo));
    EXPECT_EQ(set_lines("eth0"), kernel.changes);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_switchPortOfNoInterface_changesNothing) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    rig.fail("KLIBNetOVSGetOriginalIf");
    EXPECT_OUTCOME(set("9000", "ovs_eth0"), {.result = -1, .log = {kBegin + "get ovs origin interface error"}});
    EXPECT_EQ("", read_file(kInfo));
    EXPECT_EQ(texts{}, kernel.changes);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_jumboOnASlowLink_isStoredAndAnnouncedAlone) {
    for (const unsigned speed : {10U, 100U, 999U, 0U, 0xFFFFU}) { // the last two are unknown
        for (const std::string &mtu : texts{"1500", "9000"}) {
            kernel.add("eth0", {.speed = speed});
            EXPECT_OUTCOME(set(mtu.c_str(), "eth0"), {.log = {"WARNING net_set_mtu_value:N Skip setting Jumbo MTU " +
                                                              mtu + " to eth0 which link-speed is lower than 1Gbps."},
                                                      .events = event("eth0", mtu),
                                                      .locks = kLocked,
                                                      .sleeps = {5000}});
            EXPECT_EQ("eth0_mtu=\"" + mtu + "\"\n", read_file(kInfo));
            EXPECT_EQ(texts{}, kernel.changes);
        }
    }
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_valueOnASlowLink_isTheNumberThatTheKernelIsGiven) {
    for (const auto &[text, mtu] : std::map<std::string, std::string>{
             {"", "0"}, {"many", "0"}, {"-9000", "-9000"}, {"4294968696", "1400"}, {"99999999999999999999", "-1"}}) {
        kernel.add("eth0", {.speed = 100});
        EXPECT_EQ(0, set(text.c_str(), "eth0").result);
        EXPECT_EQ((texts{"eth0 down", "eth0 mtu " + mtu, "eth0 up"}), kernel.changes) << text;
    }
    kernel.add("eth0", {.speed = 100});
    EXPECT_EQ(0, set("1500 bytes", "eth0").result);
    EXPECT_EQ(texts{}, kernel.changes);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_smallMtuOrFastLink_isSet) {
    kernel.add("eth0", {.speed = 100});
    EXPECT_EQ(0, set("1499", "eth0").result);
    EXPECT_EQ(1499, kernel.at("eth0").mtu);
    kernel.add("eth0", {.speed = 1000});
    EXPECT_EQ(0, set("1500", "eth0").result);
    EXPECT_EQ(3U, kernel.changes.size());
    kernel.add("eth0", {.speed = 100000});
    EXPECT_EQ(0, set("9000", "eth0").result);
    EXPECT_EQ(9000, kernel.at("eth0").mtu);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_noLink_isUnknownSpeed) {
    kernel.add("eth0", {.has_link = false});
    EXPECT_EQ(0, set("9000", "eth0").result);
    EXPECT_EQ(texts{}, kernel.changes);
    EXPECT_EQ(event("eth0"), rig.now.events);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_cannotBeStored_changesNothing) {
    rig.fail("KLIBCFileLock");
    EXPECT_OUTCOME(set("9000", "eth0"), {.result = -1,
                                         .code = 0x400,
                                         .unit = "platform",
                                         .log = {"ERR conf_get_mtu_value:N Failed to lock kovainfo [0x0400 platform:N]",
                                                 kBegin + "Failed to ifconfig MTU Value(0x0400)",
                                                 kBegin + "Failed to set MTU 9000 of eth0"}});
    EXPECT_EQ(texts{}, kernel.changes);
    EXPECT_EQ("", read_file(kInfo));
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_linkThatCannotBeAsked_isStoredAlone) {
    kernel.add("eth0", {.failing = {{ETHTOOL_GSET, EIO}}});
    EXPECT_OUTCOME(set("9000", "eth0"),
                   {.result = -1,
                    .code = 0x3600,
                    .unit = "net_get_eth_info",
                    .log = {"ERR net_get_eth_info:N Cannot get link settings of eth0: Input/output error",
                            kBegin + "Can not get EthInfo(3600).", kBegin + "Failed to set MTU 9000 of eth0"},
                    .locks = kLocked});
    EXPECT_EQ("eth0_mtu=\"9000\"\n", read_file(kInfo));
    EXPECT_EQ(texts{}, kernel.changes);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_kernelRefuses_isNotAnnounced) {
    kernel.add("eth0", {.failing = {{SIOCSIFMTU, EINVAL}}});
    EXPECT_OUTCOME(set("9000", "eth0"),
                   {.result = -1,
                    .code = 0x8100,
                    .unit = "net_set_mtu_eth",
                    .log = {kNotice, "ERR net_set_mtu_eth:N Kernel refuses MTU 9000 of eth0: Invalid argument",
                            "ERR net_set_mtu_eth:N Failed to set MTU 9000 of eth0",
                            kBegin + "Failed to ifconfig MTU Value(0x8100)", kBegin + "Failed to set MTU 9000 of eth0"},
                    .locks = kLocked});
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_eventThatFails_isNoFailure) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(set("9000", "eth0"), {.code = 0x200,
                                         .unit = "platform",
                                         .log = {kNotice, "ERR KLIBPluginSDKInit failed"},
                                         .locks = kLocked,
                                         .sleeps = {5000}});
}

// ---- bonds of the virtual switch

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_switchBond_storesForAllAndSetsItsMembers) {
    kernel.add("eth1");
    add_switch_bond("\"eth1 eth0\"");
    EXPECT_OUTCOME(set("9000", "ovs_bond0"), {.code = 0xBC00, // a member was added to the record
                                              .unit = "net_link_aggr_opt_slsave_add",
                                              .log = {kNotice, kNotice},
                                              .events = event("ovs_bond0"),
                                              .locks = {"+0x806", "-0x800", "+0x806", "-0x800", "+0x806", "-0x800"},
                                              .sleeps = {5000}});
    EXPECT_EQ("ovs_bond0_mtu=\"9000\"\neth0_mtu=\"9000\"\neth1_mtu=\"9000\"\n", read_file(kInfo));
    EXPECT_EQ(9000, kernel.at("eth0").mtu);
    EXPECT_EQ(9000, kernel.at("eth1").mtu);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_switchBondOnSlowLinks_isSetAllTheSame) {
    kernel.add("eth0", {.speed = 100});
    add_switch_bond("eth0");
    EXPECT_EQ(0, set("9000", "ovs_bond0").result);
    EXPECT_EQ(9000, kernel.at("eth0").mtu);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_switchBondWithoutMembers_isStoredAndAnnounced) {
    add_switch_bond("");
    EXPECT_OUTCOME(set("9000", "ovs_bond0"),
                   {.result = 0, .events = event("ovs_bond0"), .locks = kLocked, .sleeps = {5000}});
    EXPECT_EQ("ovs_bond0_mtu=\"9000\"\n", read_file(kInfo));
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_switchBondThatFails_isAnnouncedAllTheSame) {
    kernel.add("eth1");
    add_switch_bond("\"eth0 eth1\"");
    rig.fail("KLIBCFileLock", 1);
    EXPECT_OUTCOME(set("9000", "ovs_bond0"),
                   {.result = -1,
                    .code = 0x400,
                    .unit = "platform",
                    .log = {"ERR conf_get_mtu_value:N Failed to lock kovainfo [0x0400 platform:N]",
                            kBegin + "Failed to ifconfig MTU Value(0x0400)"},
                    .events = event("ovs_bond0"),
                    .sleeps = {5000}});
    rig.fail("KLIBCFileLock", 2);
    EXPECT_OUTCOME(set("9000", "ovs_bond0"),
                   {.result = -1,
                    .code = 0x400,
                    .unit = "platform",
                    .log = {"ERR conf_get_mtu_value:N Failed to lock kovainfo [0x0400 platform:N]",
                            kBegin + "KOVAConfSetMTUValue [eth0] failed (0x0400)"},
                    .events = event("ovs_bond0"),
                    .locks = kLocked,
                    .sleeps = {5000}});
    EXPECT_EQ(texts{}, kernel.changes);
    kernel.add("eth0", {.failing = {{SIOCSIFMTU, EINVAL}}});
    EXPECT_OUTCOME(set("9000", "ovs_bond0"),
                   {.result = -1,
                    .code = 0x8100,
                    .unit = "net_set_mtu_eth",
                    .log = {kNotice, "ERR net_set_mtu_eth:N Kernel refuses MTU 9000 of eth0: Invalid argument",
                            "ERR net_set_mtu_eth:N Failed to set MTU 9000 of eth0",
                            kBegin + "KOVANetSetMTUEth [eth0] failed (0x8100)"},
                    .events = event("ovs_bond0"),
                    .locks = {"+0x806", "-0x800", "+0x806", "-0x800"},
                    .sleeps = {5000}});
    EXPECT_EQ((texts{"eth0 down", "eth0 up"}), kernel.changes);
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(set("9000", "ovs_bond0"),
                   {.result = -1,
                    .code = 0x8100, // of the change, not of the event
                    .unit = "net_set_mtu_eth",
                    .log = {kNotice, "ERR net_set_mtu_eth:N Kernel refuses MTU 9000 of eth0: Invalid argument",
                            "ERR net_set_mtu_eth:N Failed to set MTU 9000 of eth0",
                            kBegin + "KOVANetSetMTUEth [eth0] failed (0x8100)", "ERR KLIBPluginSDKInit failed"},
                    .locks = {"+0x806", "-0x800", "+0x806", "-0x800"},
                    .sleeps = {5000}});
    shell("rm " + ifcfg("ovs_bond0"));
    EXPECT_OUTCOME(set("9000", "ovs_bond0"), {.result = -1,
                                              .code = 0x900,
                                              .unit = "key_value",
                                              .log = {"ERR net_link_aggr_get:N Failed to get key [BLOCK_CNT]",
                                                      kBegin + "Failed to get OVS bond slave of ovs_bond0"},
                                              .events = event("ovs_bond0"),
                                              .locks = kLocked,
                                              .sleeps = {5000}});
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_switchBondMemberVanishes_stopsBehindTheFirstAndIsAnnounced) {
    kernel.add("eth1", {.failing = {{SIOCSIFMTU, ENODEV}}});
    kernel.add("eth2");
    add_switch_bond("\"eth0 eth1 eth2\"");
    EXPECT_OUTCOME(set("9000", "ovs_bond0"),
                   {.result = -1,
                    .code = 0x8100,
                    .unit = "net_set_mtu_eth",
                    .log = {kNotice, kNotice, "ERR net_set_mtu_eth:N Kernel refuses MTU 9000 of eth1: No such device",
                            "ERR net_set_mtu_eth:N Failed to set MTU 9000 of eth1",
                            kBegin + "KOVANetSetMTUEth [eth1] failed (0x8100)"},
                    .events = event("ovs_bond0"),
                    .locks = {"+0x806", "-0x800", "+0x806", "-0x800", "+0x806", "-0x800"},
                    .sleeps = {5000}});
    EXPECT_EQ((texts{"eth0 down", "eth0 mtu 9000", "eth0 up", "eth1 down", "eth1 up"}), kernel.changes);
    EXPECT_EQ("ovs_bond0_mtu=\"9000\"\neth0_mtu=\"9000\"\neth1_mtu=\"9000\"\n", read_file(kInfo));
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_longNames_areThoseThatTheKernelCanHave) {
    kernel.add(long_text(15));
    EXPECT_EQ(0, set("9000", long_text(15).c_str()).result);
    EXPECT_EQ(9000, kernel.at(long_text(15)).mtu);
    const outcome got = set("9000", long_text(16).c_str());
    EXPECT_EQ(-1, got.result) << "it has a setting, but is no interface";
    EXPECT_EQ(kBegin + "Failed to set MTU 9000 of " + long_text(16), got.log.back());
    EXPECT_EQ(texts{}, got.events);
    EXPECT_EQ(texts{}, kernel.changes);
}

TEST_F(net_set_mtu_value, KOVANetSetMTUValue_badArguments_areRefused) {
    EXPECT_OUTCOME(set(nullptr, "eth0"), refusal(kUnit, "((void *)0) != szValue"));
    EXPECT_OUTCOME(set("9000", nullptr), refusal(kUnit, "((void *)0) != szIfname"));
    EXPECT_OUTCOME(set("9000", ""), refusal(kUnit, "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(set("9000", name.c_str()), refusal(kUnit, "is_interface_name(szIfname)"));
    }
    const outcome got = set("9000", long_text(17).c_str());
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0xD00U, got.code);
    EXPECT_EQ(texts{}, got.events);
    EXPECT_EQ("", read_file(kInfo));
}
