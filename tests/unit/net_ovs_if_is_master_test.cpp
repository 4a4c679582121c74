#include "support/rig.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_ovs_if_is_master : public unit_test {
protected:
    outcome role(const char *ifname) {
        return rig.observe([&] { return KLIBNetOVSIfIsMaster(ifname); });
    }
};

TEST_F(net_ovs_if_is_master, KLIBNetOVSIfIsMaster_devices_haveTheirRole) {
    for (const auto &[name, expected] : std::map<std::string, int>{{"ovs_eth0", 1},
                                                                   {"ovs_", 1},
                                                                   {"ovs_bon", 1},
                                                                   {"ovs_bond", 2},
                                                                   {"ovs_bond0", 2},
                                                                   {"eth0", 0},
                                                                   {"OVS_eth0", 0}}) {
        rig.replace_file("/sys/devices/virtual/net/" + name, "");
        EXPECT_OUTCOME(role(name.c_str()), {.result = expected});
    }
}

TEST_F(net_ovs_if_is_master, KLIBNetOVSIfIsMaster_missingDevice_isNone) {
    for (const std::string &name : texts{"ovs_eth0", "ovs_bond0", "ovs_" + long_text(12), "ovs_" + long_text(200)}) {
        EXPECT_OUTCOME(role(name.c_str()), {.result = 0});
    }
}

TEST_F(net_ovs_if_is_master, KLIBNetOVSIfIsMaster_badNames_areRefused) {
    EXPECT_OUTCOME(role(nullptr), refusal("net_ovs_if_is_master", "((void *)0) != szIfname", 0));
    EXPECT_OUTCOME(role(""), refusal("net_ovs_if_is_master", "'\\0' != *szIfname", 0));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(role(name.c_str()), refusal("net_ovs_if_is_master", "is_interface_name(szIfname)", 0));
    }
}
