#include "support/rig.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_if_is_local_lan : public unit_test {
protected:
    outcome is_local(const char *ifname) {
        return rig.observe([&] { return KLIBNetIFIsLocalLan(ifname); });
    }
};

TEST_F(net_if_is_local_lan, KLIBNetIFIsLocalLan_value_hasToBeYesExactly) {
    for (const auto &[line, expected] : std::map<std::string, int>{{"LOCAL_LAN=yes", 1},
                                                                   {"LOCAL_LAN=\"yes\"", 1},
                                                                   {"LOCAL_LAN=YES", 0},
                                                                   {"LOCAL_LAN=yess", 0},
                                                                   {"LOCAL_LAN=no", 0},
                                                                   {"LOCAL_LAN=", 0},
                                                                   {"LOCAL_LAN=yes" + long_text(5000), 0},
                                                                   {"DEVICE=eth0", 0}}) {
        write_file(ifcfg("eth0"), line + "\n");
        EXPECT_OUTCOME(is_local("eth0"), {.result = expected});
    }
}

TEST_F(net_if_is_local_lan, KLIBNetIFIsLocalLan_noFile_isNo) {
    const outcome got = is_local("eth0");
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(texts{}, got.log);
}

TEST_F(net_if_is_local_lan, KLIBNetIFIsLocalLan_writerElsewhere_isNotWaitedFor) {
    write_file(ifcfg("eth0"), "LOCAL_LAN=yes\n");
    const lock_elsewhere holder{0x106};
    EXPECT_OUTCOME(is_local("eth0"), {.result = 1});
}

TEST_F(net_if_is_local_lan, KLIBNetIFIsLocalLan_badNames_areRefused) {
    const auto refused = [](const std::string &condition) { return refusal("net_if_is_local_lan", condition, 0); };
    EXPECT_OUTCOME(is_local(nullptr), refused("((void *)0) != szIfname"));
    EXPECT_OUTCOME(is_local(""), refused("'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(is_local(name.c_str()), refused("is_interface_name(szIfname)"));
    }
}
