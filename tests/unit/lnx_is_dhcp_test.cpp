#include "support/rig.h"

#include <kovanetsdk/dhcp.h>

using namespace kova_test;

class lnx_is_dhcp : public unit_test {
protected:
    outcome is_dhcp(const char *ifname) {
        return rig.observe([&] { return BlKOVALnxIsDHCP(ifname); });
    }
    const texts locks{"+0x105", "-0x100"};
};

TEST_F(lnx_is_dhcp, BlKOVALnxIsDHCP_value_hasToBeDhcpExactly) {
    for (const auto &[line, expected] : std::map<std::string, int>{{"BOOTPROTO=dhcp", 1},
                                                                   {"BOOTPROTO=\"dhcp\"", 1},
                                                                   {"BOOTPROTO=dhcp\r", 1},
                                                                   {"BOOTPROTO=static", 0},
                                                                   {"BOOTPROTO=none", 0},
                                                                   {"BOOTPROTO=DHCP", 0},
                                                                   {"BOOTPROTO=dhcp6", 0},
                                                                   {"BOOTPROTO=", 0},
                                                                   {"BOOTPROTO=dhcp ", 0},
                                                                   {"BOOTPROTO=" + long_text(5000, 'd'), 0}}) {
        write_file(ifcfg("eth0"), line + "\n");
        EXPECT_OUTCOME(is_dhcp("eth0"), {.result = expected, .locks = locks});
        EXPECT_EQ(line + "\n", read_file(ifcfg("eth0")));
    }
}

TEST_F(lnx_is_dhcp, BlKOVALnxIsDHCP_missingKey_isRepairedToStatic) {
    write_file(ifcfg("eth0"), "DEVICE=eth0\n#BOOTPROTO=dhcp\n");
    EXPECT_OUTCOME(is_dhcp("eth0"),
                   {.result = 0, .log = {"ERR BlKOVALnxIsDHCP(N) Get BOOTPROTO failed.(0)"}, .locks = locks});
    EXPECT_EQ("DEVICE=eth0\n#BOOTPROTO=dhcp\nBOOTPROTO=static\n", read_file(ifcfg("eth0")));
}

TEST_F(lnx_is_dhcp, BlKOVALnxIsDHCP_missingFile_isMade) {
    EXPECT_OUTCOME(is_dhcp("eth0"), {.result = 0,
                                     .code = 0x900,
                                     .unit = "key_value",
                                     .log = {"ERR BlKOVALnxIsDHCP(N) Get BOOTPROTO failed.(900)"},
                                     .locks = locks});
    EXPECT_EQ("BOOTPROTO=static\n", read_file(ifcfg("eth0")));
}

TEST_F(lnx_is_dhcp, BlKOVALnxIsDHCP_failedRepair_isLoggedToo) {
    rig.fail("KLIBCFileSetKeyValue");
    EXPECT_OUTCOME(is_dhcp("eth0"),
                   {.result = 0,
                    .code = 0xB00,
                    .unit = "platform",
                    .log = {"ERR BlKOVALnxIsDHCP(N) Get BOOTPROTO failed.(900)",
                            "ERR BlKOVALnxIsDHCP(N) KLIBCFileSetKeyValue(/etc/sysconfig/network-scripts/ifcfg-eth0, "
                            "BOOTPROTO, static) failed.(B00)"},
                    .locks = locks});
    EXPECT_EQ("<absent>", read_file(ifcfg("eth0")));
}

TEST_F(lnx_is_dhcp, BlKOVALnxIsDHCP_lockElsewhere_isFalseAndNothingIsRepaired) {
    const lock_elsewhere holder{0x106};
    const outcome got = is_dhcp("eth0");
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(0x400U, got.code);
    EXPECT_EQ(texts{"ERR BlKOVALnxIsDHCP(N) KLIBCFileLock failed."}, got.log);
    EXPECT_EQ(texts{}, got.locks);
    EXPECT_EQ("<absent>", read_file(ifcfg("eth0")));
}

TEST_F(lnx_is_dhcp, BlKOVALnxIsDHCP_sharedLockElsewhere_doesNotMatter) {
    write_file(ifcfg("eth0"), "BOOTPROTO=dhcp\n");
    const lock_elsewhere holder{0x105};
    EXPECT_OUTCOME(is_dhcp("eth0"), {.result = 1, .locks = locks});
}

TEST_F(lnx_is_dhcp, BlKOVALnxIsDHCP_badNames_areRefusedAndNothingIsWritten) {
    const auto refused = [](const std::string &condition) { return refusal("lnx_is_dhcp", condition, 0); };
    EXPECT_OUTCOME(is_dhcp(nullptr), refused("((void *)0) != szIfname"));
    EXPECT_OUTCOME(is_dhcp(""), refused("'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(is_dhcp(name.c_str()), refused("is_interface_name(szIfname)"));
    }
    EXPECT_EQ(texts{}, list_dir("/etc/sysconfig/network-scripts"));
}

TEST_F(lnx_is_dhcp, BlKOVALnxIsDHCP_binaryFile_isRepaired) {
    const std::string binary = std::string("\0\x01\xff\n\0", 5);
    write_file(ifcfg("eth0"), binary + "\n");
    EXPECT_EQ(0, is_dhcp("eth0").result);
    EXPECT_EQ(binary + "\nBOOTPROTO=static\n", read_file(ifcfg("eth0")));
}
