#include "support/rig.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

namespace {

const char *const kBonds = "/sys/class/net/kova_ovs_bonds";

} // namespace

class net_ovs_if_is_slave : public unit_test {
protected:
    outcome is_slave(const char *ifname) {
        return rig.observe([&] { return KLIBNetOVSIfIsSlave(ifname); });
    }
};

TEST_F(net_ovs_if_is_slave, KLIBNetOVSIfIsSlave_wordsBehindTheBond_areMembers) {
    rig.replace_file(kBonds, "ovs_bond0 eth0  eth1\n\n   ovs_bond1 eth10 \nlonely\n\tbond3 eth8\t\r\nbond2 eth5");
    for (const auto &[name, expected] : std::map<std::string, int>{{"eth0", 1},
                                                                   {"eth1", 1},
                                                                   {"eth10", 1},
                                                                   {"eth5", 1},
                                                                   {"eth8", 1},
                                                                   {"eth", 0},
                                                                   {"eth100", 0},
                                                                   {"ovs_bond0", 0},
                                                                   {"ovs_bond1", 0},
                                                                   {"lonely", 0}}) {
        EXPECT_OUTCOME(is_slave(name.c_str()), {.result = expected});
    }
}

TEST_F(net_ovs_if_is_slave, KLIBNetOVSIfIsSlave_ownPort_isNoMember) {
    rig.replace_file(kBonds, "ovs_bond0 eth0\n");
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    EXPECT_OUTCOME(is_slave("eth0"), {.result = 0});
}

TEST_F(net_ovs_if_is_slave, KLIBNetOVSIfIsSlave_noBonds_isNoSilently) {
    rig.hide(kBonds);
    EXPECT_OUTCOME(is_slave("eth0"), {.result = 0});
    rig.replace_file(kBonds, "");
    EXPECT_OUTCOME(is_slave("eth0"), {.result = 0});
}

TEST_F(net_ovs_if_is_slave, KLIBNetOVSIfIsSlave_binaryAndEndlessLines_areSurvived) {
    rig.replace_file(kBonds, std::string("\0\xff\n\0 eth0\n", 10) + long_text(200000) + "\nb eth7\n");
    EXPECT_OUTCOME(is_slave("eth0"), {.result = 0});
    EXPECT_OUTCOME(is_slave("eth7"), {.result = 1});
    rig.replace_file(kBonds, "bond " + long_text(4090, 'x') + " eth7 eth10\n"); // longer than any buffer of a page
    EXPECT_OUTCOME(is_slave("eth7"), {.result = 1});
    EXPECT_OUTCOME(is_slave("eth1"), {.result = 0});
}

TEST_F(net_ovs_if_is_slave, KLIBNetOVSIfIsSlave_unreadableBonds_areLogged) {
    rig.replace_file(kBonds, "ovs_bond0 eth0\n");
    rig.fail("fopen");
    EXPECT_OUTCOME(is_slave("eth0"),
                   {.result = 0,
                    .code = 0x900,
                    .unit = "net_ovs_if_is_slave",
                    .log = {"ERR net_ovs_if_is_slave:N Failed to open /sys/class/net/kova_ovs_bonds."}});
}

TEST_F(net_ovs_if_is_slave, KLIBNetOVSIfIsSlave_noMemory_isLogged) {
    rig.replace_file(kBonds, "ovs_bond0 eth0\n");
    for (const char *operation : {"KLIBCSzListAlloc", "KLIBCSzListPush"}) {
        rig.fail(operation);
        EXPECT_OUTCOME(is_slave("eth0"), {.result = 0,
                                          .code = 0x200,
                                          .unit = "net_ovs_if_is_slave",
                                          .log = {"ERR net_ovs_if_is_slave:N Failed to alloc memory."}});
    }
}

TEST_F(net_ovs_if_is_slave, KLIBNetOVSIfIsSlave_badNames_areRefused) {
    EXPECT_OUTCOME(is_slave(nullptr), refusal("net_ovs_if_is_slave", "((void *)0) != szIfname", 0));
    EXPECT_OUTCOME(is_slave(""), refusal("net_ovs_if_is_slave", "'\\0' != *szIfname", 0));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(is_slave(name.c_str()), refusal("net_ovs_if_is_slave", "is_interface_name(szIfname)", 0));
    }
}
