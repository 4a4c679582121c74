#include "support/rig.h"

#include <climits>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_get_if_cfg : public unit_test {
protected:
    outcome get(const char *ifname, const char *key, int size = 64) {
        return rig.observe([&] { return KLIBNetGetIfCfg(ifname, key, value, size); });
    }
    outcome set(const char *ifname, const char *key, const char *text) {
        return rig.observe([&] { return KLIBNetSetIfCfg(ifname, key, text); });
    }

    char value[64] = "untouched";
    const texts reading{"+0x105", "-0x100"};
    const texts writing{"+0x106", "-0x100"};
};

TEST_F(net_get_if_cfg, KLIBNetGetIfCfg_key_isFoundAlsoWhenEmpty) {
    write_file(ifcfg("eth0"), "DEVICE=\"eth0\"\nBRIDGE=\nDEVICE=second\n");
    EXPECT_OUTCOME(get("eth0", "DEVICE"), {.result = 1, .locks = reading});
    EXPECT_STREQ("eth0", value);
    EXPECT_OUTCOME(get("eth0", "BRIDGE"), {.result = 1, .locks = reading});
    EXPECT_STREQ("", value);
    EXPECT_OUTCOME(get("eth0", "DEVICE", 3), {.result = 1, .locks = reading});
    EXPECT_STREQ("et", value);
}

TEST_F(net_get_if_cfg, KLIBNetGetIfCfg_missingKey_isZero) {
    write_file(ifcfg("eth0"), "DEVICE=eth0\n");
    for (const std::string &key : texts{"DEVIC", "DEVICEX", "device", "TYPE", "TYPE\nDEVICE", long_text(4096)}) {
        EXPECT_OUTCOME(get("eth0", key.c_str()), {.result = 0, .locks = reading});
        EXPECT_STREQ("", value);
    }
}

TEST_F(net_get_if_cfg, KLIBNetGetIfCfg_missingFile_isAnError) {
    EXPECT_OUTCOME(get("eth0", "DEVICE"), {.result = -1,
                                           .code = 0x900,
                                           .unit = "key_value",
                                           .log = {"ERR net_get_if_cfg:N Failed to get [DEVICE] from "
                                                   "[/etc/sysconfig/network-scripts/ifcfg-eth0], kovaerr=[0x0900]"},
                                           .locks = reading});
}

TEST_F(net_get_if_cfg, KLIBNetGetIfCfg_badArguments_areRefused) {
    EXPECT_OUTCOME(get(nullptr, "DEVICE"), refusal("net_get_if_cfg", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(get("eth0", nullptr), refusal("net_get_if_cfg", "((void *)0) != szConf"));
    EXPECT_OUTCOME(get("eth0", ""), refusal("net_get_if_cfg", "'\\0' != *szConf"));
    EXPECT_OUTCOME(get("eth0", "DEVICE", 0), refusal("net_get_if_cfg", "0 < cbValue"));
    EXPECT_OUTCOME(get("eth0", "DEVICE", INT_MIN), refusal("net_get_if_cfg", "0 < cbValue"));
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetGetIfCfg("eth0", "DEVICE", nullptr, 9); }),
                   refusal("net_get_if_cfg", "((void *)0) != szValue"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str(), "DEVICE"), refusal("net_get_if_cfg", "is_interface_name(szIfname)"));
    }
    EXPECT_STREQ("untouched", value);
}

TEST_F(net_get_if_cfg, KLIBNetGetIfCfg_lockElsewhere_is400) {
    const lock_elsewhere holder{0x106};
    const outcome got = get("eth0", "DEVICE");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x400U, got.code);
    EXPECT_EQ(texts{"ERR net_get_if_cfg:N KLIBCFileLock() failed.(400)"}, got.log);
}

TEST_F(net_get_if_cfg, KLIBNetSetIfCfg_key_isReplacedQuotedAndTheRestKept) {
    write_file(ifcfg("eth0"), "# ours\nDEVICE=eth0\nBRIDGE=br0\nONBOOT=yes\n");
    EXPECT_OUTCOME(set("eth0", "BRIDGE", "br1"), {.result = 0, .locks = writing});
    EXPECT_EQ("# ours\nDEVICE=eth0\nBRIDGE=\"br1\"\nONBOOT=yes\n", read_file(ifcfg("eth0")));
    EXPECT_OUTCOME(set("eth0", "TYPE", ""), {.result = 0, .locks = writing});
    EXPECT_EQ("# ours\nDEVICE=eth0\nBRIDGE=\"br1\"\nONBOOT=yes\nTYPE=\"\"\n", read_file(ifcfg("eth0")));
}

TEST_F(net_get_if_cfg, KLIBNetSetIfCfg_missingFile_isMade) {
    EXPECT_OUTCOME(set("eth0", "DEVICE", "eth0"), {.result = 0, .locks = writing});
    EXPECT_EQ("DEVICE=\"eth0\"\n", read_file(ifcfg("eth0")));
}

TEST_F(net_get_if_cfg, KLIBNetSetIfCfg_valueWithNewline_isRefusedAndNothingIsWritten) {
    write_file(ifcfg("eth0"), "DEVICE=eth0\n");
    const outcome got = set("eth0", "DEVICE", "a\nIPADDR=1.2.3.4");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0xD00U, got.code);
    EXPECT_EQ(texts{"ERR net_get_if_cfg:N Failed to set key [DEVICE] with value [a\nIPADDR=1.2.3.4]"}, got.log);
    EXPECT_EQ(writing, got.locks);
    EXPECT_EQ("DEVICE=eth0\n", read_file(ifcfg("eth0")));
}

TEST_F(net_get_if_cfg, KLIBNetSetIfCfg_failedWrite_keepsItsCode) {
    rig.fail("KLIBCFileSetKeyValue");
    EXPECT_OUTCOME(set("eth0", "DEVICE", "eth0"),
                   {.result = -1,
                    .code = 0xB00,
                    .unit = "platform",
                    .log = {"ERR net_get_if_cfg:N Failed to set key [DEVICE] with value [eth0]"},
                    .locks = writing});
}

TEST_F(net_get_if_cfg, KLIBNetSetIfCfg_badArguments_areRefused) {
    EXPECT_OUTCOME(set(nullptr, "DEVICE", "x"), refusal("net_get_if_cfg", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(set("eth0", nullptr, "x"), refusal("net_get_if_cfg", "((void *)0) != szConf"));
    EXPECT_OUTCOME(set("eth0", "", "x"), refusal("net_get_if_cfg", "'\\0' != *szConf"));
    EXPECT_OUTCOME(set("eth0", "DEVICE", nullptr), refusal("net_get_if_cfg", "((void *)0) != szValue"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(set(name.c_str(), "DEVICE", "x"), refusal("net_get_if_cfg", "is_interface_name(szIfname)"));
    }
    EXPECT_EQ(texts{}, list_dir("/etc/sysconfig/network-scripts"));
}

TEST_F(net_get_if_cfg, KLIBNetSetIfCfg_readerElsewhere_is400) {
    const lock_elsewhere holder{0x105};
    EXPECT_EQ(0x400U, set("eth0", "DEVICE", "x").code);
    EXPECT_EQ("<absent>", read_file(ifcfg("eth0")));
}
