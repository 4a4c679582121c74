#include "support/rig.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_if_is_static_ip : public unit_test {
protected:
    outcome is_static(const char *ifname) {
        return rig.observe([&] { return KOVANetIfIsStaticIP(ifname); });
    }
    const texts locks{"+0x105", "-0x100"};
};

TEST_F(net_if_is_static_ip, KOVANetIfIsStaticIP_value_hasToBeStaticExactly) {
    for (const auto &[line, expected] : std::map<std::string, int>{{"BOOTPROTO=static", 1},
                                                                   {"BOOTPROTO=\"static\"", 1},
                                                                   {"BOOTPROTO=STATIC", 0},
                                                                   {"BOOTPROTO=static6", 0},
                                                                   {"BOOTPROTO=dhcp", 0},
                                                                   {"BOOTPROTO=", 0},
                                                                   {"OTHER=static", 0},
                                                                   {"BOOTPROTO=static" + long_text(5000), 0}}) {
        write_file(ifcfg("eth0"), line + "\n");
        EXPECT_OUTCOME(is_static("eth0"), {.result = expected, .locks = locks});
    }
}

TEST_F(net_if_is_static_ip, KOVANetIfIsStaticIP_noFile_isNotStaticAndStaysAbsent) {
    const outcome got = is_static("eth0");
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(texts{}, got.log);
    EXPECT_EQ(locks, got.locks);
    EXPECT_EQ("<absent>", read_file(ifcfg("eth0")));
}

TEST_F(net_if_is_static_ip, KOVANetIfIsStaticIP_lockElsewhere_isLoggedWithItsCode) {
    write_file(ifcfg("eth0"), "BOOTPROTO=static\n");
    const lock_elsewhere holder{0x106};
    const outcome got = is_static("eth0");
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(0x400U, got.code);
    EXPECT_EQ(texts{"ERR net_if_is_static_ip:N KLIBCFileLock() failed.(400)"}, got.log);
    EXPECT_EQ(texts{}, got.locks);
}

TEST_F(net_if_is_static_ip, KOVANetIfIsStaticIP_badNames_areRefused) {
    const auto refused = [](const std::string &condition) { return refusal("net_if_is_static_ip", condition, 0); };
    EXPECT_OUTCOME(is_static(nullptr), refused("((void *)0) != szIfname"));
    EXPECT_OUTCOME(is_static(""), refused("'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(is_static(name.c_str()), refused("is_interface_name(szIfname)"));
    }
}
