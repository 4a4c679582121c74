#include "support/fake_kernel.h"

#include <cstring>
#include <kovanetsdk/link.h>

using namespace kova_test;

namespace {

const std::string kInfo = "/etc/kovainfo.conf";
const std::string kUnit = "conf_get_mtu_value";
const texts kLocked{"+0x806", "-0x800"};
const std::string kNoOrigin = "INFO conf_get_mtu_value:N Failed to fetch slave interface from OVS master ovs_eth0";

} // namespace

class conf_get_mtu_value : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        kernel.add("eth0");
        kernel.add("eth0.10", {.row_device = "eth0", .vlan_id = 10});
        write_file(kInfo, "dns_mode=\"static\"\n");
    }
    outcome get(const char *ifname, int size = 16) {
        memset(value, 'u', sizeof value);
        return rig.observe([=, this] { return KOVAConfGetMTUValue(ifname, value, size); });
    }
    outcome set(const char *text, const char *ifname) {
        return rig.observe([=] { return KOVAConfSetMTUValue(text, ifname); });
    }

    fake_kernel kernel{rig};
    char value[32];
};

TEST_F(conf_get_mtu_value, KOVAConfGetMTUValue_key_isTheValue) {
    for (const std::string line : {"eth0_mtu=\"9000\"", "eth0_mtu=9000"}) {
        write_file(kInfo, "eth_mtu=1\neth00_mtu=2\nxeth0_mtu=3\n" + line);
        EXPECT_OUTCOME(get("eth0"), {.result = 0});
        EXPECT_STREQ("9000", value);
    }
}

TEST_F(conf_get_mtu_value, KOVAConfGetMTUValue_noKey_is1500) {
    EXPECT_OUTCOME(get("eth0"), {.result = 0});
    EXPECT_STREQ("1500", value);
    write_file(kInfo, "");
    EXPECT_OUTCOME(get("eth9"), {.result = 0});
    EXPECT_STREQ("1500", value);
}

TEST_F(conf_get_mtu_value, KOVAConfGetMTUValue_buffer_isZeroedAndBoundsTheValue) {
    write_file(kInfo, "eth0_mtu=\"123456789\"\n");
    EXPECT_OUTCOME(get("eth0", 16), {.result = 0});
    EXPECT_EQ(std::string("123456789\0\0\0\0\0\0\0u", 17), std::string(value, 17));
    EXPECT_OUTCOME(get("eth0", 5), {.result = 0});
    EXPECT_EQ(std::string("1234\0u", 6), std::string(value, 6));
    EXPECT_OUTCOME(get("eth0", 1), {.result = 0});
    EXPECT_EQ(std::string("\0u", 2), std::string(value, 2));
    EXPECT_OUTCOME(get("eth9", 3), {.result = 0});
    EXPECT_STREQ("15", value);
}

TEST_F(conf_get_mtu_value, KOVAConfGetMTUValue_switchPort_hasTheKeyOfTheInterfaceBehindIt) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
    write_file(kInfo, "eth0_mtu=1\novs_eth0_mtu=2\novs_bond0_mtu=3\novs_eth1_mtu=4\n");
    EXPECT_OUTCOME(get("ovs_eth0"), {.result = 0});
    EXPECT_STREQ("1", value);
    EXPECT_OUTCOME(get("ovs_bond0"), {.result = 0});
    EXPECT_STREQ("3", value);
    EXPECT_OUTCOME(get("ovs_eth1"), {.result = 0});
    EXPECT_STREQ("4", value);
}

TEST_F(conf_get_mtu_value, KOVAConfGetMTUValue_switchPortOfNoInterface_hasItsOwnKey) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    write_file(kInfo, "eth0_mtu=1\novs_eth0_mtu=2\n");
    rig.fail("KLIBNetOVSGetOriginalIf");
    EXPECT_OUTCOME(get("ovs_eth0"), {.result = 0, .log = {kNoOrigin}});
    EXPECT_STREQ("2", value);
}

TEST_F(conf_get_mtu_value, KOVAConfGetMTUValue_fileThatCannotBeRead_fails) {
    shell("rm " + kInfo);
    EXPECT_OUTCOME(get("eth0"), {.result = -1,
                                 .code = 0x900,
                                 .unit = "key_value",
                                 .log = {"ERR conf_get_mtu_value (N) Failed to get eth0_mtu (900)"}});
    EXPECT_STREQ("", value);
    shell("mkdir " + kInfo);
    EXPECT_EQ(-1, get("eth0").result);
    EXPECT_EQ(0x900U, rig.now.code);
}

TEST_F(conf_get_mtu_value, KOVAConfGetMTUValue_longName_isOneOfSixteenCharacters) {
    write_file(kInfo, long_text(15) + "_mtu=15\n" + long_text(16) + "_mtu=16\n");
    EXPECT_OUTCOME(get(long_text(15).c_str()), {.result = 0});
    EXPECT_STREQ("15", value);
    EXPECT_OUTCOME(get(long_text(16).c_str()), {.result = 0});
    EXPECT_STREQ("16", value);
    EXPECT_OUTCOME(get(long_text(17).c_str()), refusal(kUnit, "strlen(szIfname) <= IFNAMSIZ"));
}

TEST_F(conf_get_mtu_value, KOVAConfGetMTUValue_badArguments_areRefused) {
    EXPECT_OUTCOME(get(nullptr), refusal(kUnit, "((void *)0) != szIfname"));
    EXPECT_OUTCOME(get(""), refusal(kUnit, "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str()), refusal(kUnit, "is_interface_name(szIfname)"));
    }
    EXPECT_OUTCOME(rig.observe([] { return KOVAConfGetMTUValue("eth0", nullptr, 16); }),
                   refusal(kUnit, "((void *)0) != szValue"));
    for (const int size : {0, -1, -2147483647 - 1}) {
        EXPECT_OUTCOME(get("eth0", size), refusal(kUnit, "1 <= cbValue"));
    }
}

// ---- storing

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_interface_getsItsKeyUnderTheLock) {
    EXPECT_OUTCOME(set("9000", "eth0"), {.locks = kLocked});
    EXPECT_EQ("dns_mode=\"static\"\neth0_mtu=\"9000\"\n", read_file(kInfo));
    EXPECT_OUTCOME(set("1500", "eth0"), {.locks = kLocked});
    EXPECT_EQ("dns_mode=\"static\"\neth0_mtu=\"1500\"\n", read_file(kInfo));
    EXPECT_OUTCOME(set("1500", "gone0"), {.locks = kLocked});
    EXPECT_EQ("dns_mode=\"static\"\neth0_mtu=\"1500\"\ngone0_mtu=\"1500\"\n", read_file(kInfo));
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_noFile_isMade) {
    shell("rm " + kInfo);
    EXPECT_OUTCOME(set("9000", "eth0"), {.locks = kLocked});
    EXPECT_EQ("eth0_mtu=\"9000\"\n", read_file(kInfo));
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_vlan_storesForItsRowDeviceFirst) {
    EXPECT_OUTCOME(set("9000", "eth0.10"), {.locks = kLocked});
    EXPECT_EQ("dns_mode=\"static\"\neth0_mtu=\"9000\"\neth0.10_mtu=\"9000\"\n", read_file(kInfo));
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_switchPort_storesForTheInterfaceBehindIt) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    EXPECT_OUTCOME(set("9000", "ovs_eth0"), {.locks = kLocked});
    EXPECT_EQ("dns_mode=\"static\"\neth0_mtu=\"9000\"\n", read_file(kInfo));
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_switchPortAboveAVlan_isNoVlanItself) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0.10", "");
    EXPECT_OUTCOME(set("9000", "ovs_eth0.10"), {.locks = kLocked});
    EXPECT_EQ("dns_mode=\"static\"\neth0.10_mtu=\"9000\"\n", read_file(kInfo));
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_switchPortOfNoInterface_getsItsOwnKey) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    rig.fail("KLIBNetOVSGetOriginalIf");
    EXPECT_OUTCOME(set("9000", "ovs_eth0"), {.log = {kNoOrigin}, .locks = kLocked});
    EXPECT_EQ("dns_mode=\"static\"\novs_eth0_mtu=\"9000\"\n", read_file(kInfo));
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_anyText_isStoredAsItIs) {
    for (const std::string &text : texts{"", "-1", "many", "999999999999", "9000 # jumbo"}) {
        EXPECT_EQ(0, set(text.c_str(), "eth0").result);
        EXPECT_EQ("dns_mode=\"static\"\neth0_mtu=\"" + text + "\"\n", read_file(kInfo));
    }
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_secondLine_isRefusedByTheFile) {
    EXPECT_OUTCOME(set("9000\"\npppoe_enable=\"yes", "eth0"),
                   {.result = -1,
                    .code = 0xD00,
                    .unit = "key_value",
                    .log = {"ERR conf_get_mtu_value:N Failed to set eth0 MTU config value[0x0D00 key_value:N]"},
                    .locks = kLocked});
    EXPECT_EQ("dns_mode=\"static\"\n", read_file(kInfo));
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_interfaceThatCannotBeAskedAbout_isNothingToStore) {
    rig.fail("socket");
    EXPECT_OUTCOME(set("9000", "eth0"), {.result = 0,
                                         .code = 0x3400,
                                         .unit = "net_vlan_get",
                                         .log = {"ERR net_vlan_get:N Cannot open control socket"}});
    EXPECT_EQ("dns_mode=\"static\"\n", read_file(kInfo));
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_lockThatCannotBeHad_storesNothing) {
    rig.fail("KLIBCFileLock");
    EXPECT_OUTCOME(set("9000", "eth0.10"),
                   {.result = -1,
                    .code = 0x400,
                    .unit = "platform",
                    .log = {"ERR conf_get_mtu_value:N Failed to lock kovainfo [0x0400 platform:N]"}});
    EXPECT_EQ("dns_mode=\"static\"\n", read_file(kInfo));
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_lockThatSomebodyHolds_isWaitedFor) {
    const lock_elsewhere holder(0x805);
    const outcome got = set("9000", "eth0");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x400U, got.code);
    EXPECT_EQ("dns_mode=\"static\"\n", read_file(kInfo));
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_oneKeyFails_theOtherIsStored) {
    for (const int nth : {1, 2}) {
        write_file(kInfo, "");
        rig.fail("KLIBCFileSetKeyValue", nth);
        EXPECT_OUTCOME(set("9000", "eth0.10"),
                       {.result = -1,
                        .code = 0xB00,
                        .unit = "platform",
                        .log = {std::string("ERR conf_get_mtu_value:N Failed to set ") +
                                (nth == 1 ? "eth0" : "eth0.10") + " MTU config value[0x0B00 platform:N]"},
                        .locks = kLocked});
        EXPECT_EQ(nth == 1 ? "eth0.10_mtu=\"9000\"\n" : "eth0_mtu=\"9000\"\n", read_file(kInfo));
    }
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_unlockThatFails_fails) {
    rig.fail("KLIBCFileUnlock");
    EXPECT_OUTCOME(set("9000", "eth0"),
                   {.result = -1,
                    .code = 0xD00,
                    .unit = "platform",
                    .log = {"ERR conf_get_mtu_value:N Failed to unlock kovainfo[0x0D00 platform:N]"},
                    .locks = kLocked});
}

TEST_F(conf_get_mtu_value, KOVAConfSetMTUValue_badArguments_areRefused) {
    EXPECT_OUTCOME(set(nullptr, "eth0"), refusal(kUnit, "((void *)0) != szValue"));
    EXPECT_OUTCOME(set("9000", nullptr), refusal(kUnit, "((void *)0) != szIfname"));
    EXPECT_OUTCOME(set("9000", ""), refusal(kUnit, "'\\0' != *szIfname"));
    EXPECT_OUTCOME(set("9000", long_text(17).c_str()), refusal(kUnit, "strlen(szIfname) <= IFNAMSIZ"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(set("9000", name.c_str()), refusal(kUnit, "is_interface_name(szIfname)"));
    }
    EXPECT_EQ("dns_mode=\"static\"\n", read_file(kInfo));
}
