#include "support/fake_kernel.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_if_is_bonding_slave : public unit_test {
protected:
    outcome is_slave(const char *ifname) {
        return rig.observe([&] { return KOVANetIfIsBondingPassive(ifname); });
    }
    fake_kernel kernel{rig};
};

TEST_F(net_if_is_bonding_slave, KOVANetIfIsBondingPassive_kernelFlag_isEnough) {
    kernel.add("eth0", {.flags = IFF_SLAVE});
    EXPECT_OUTCOME(is_slave("eth0"), {.result = 1});
}

TEST_F(net_if_is_bonding_slave, KOVANetIfIsBondingPassive_switchBond_decidesOtherwise) {
    kernel.add("eth0", {.flags = IFF_UP | IFF_MASTER});
    EXPECT_OUTCOME(is_slave("eth0"), {.result = 0});
    rig.replace_file("/sys/class/net/kova_ovs_bonds", "ovs_bond0 eth0 eth9\n");
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    EXPECT_OUTCOME(is_slave("eth0"), {.result = 1});
    EXPECT_OUTCOME(is_slave("eth9"), {.result = 1}); // the kernel does not know it
    EXPECT_OUTCOME(is_slave("../eth9"), {.result = 0});
}

TEST_F(net_if_is_bonding_slave, KOVANetIfIsBondingPassive_noSocket_isLogged) {
    rig.fail("socket");
    EXPECT_OUTCOME(is_slave("eth0"), {.result = 0,
                                      .code = 0x3400,
                                      .unit = "net_if_is_bonding_slave",
                                      .log = {"ERR net_if_is_bonding_slave:N Cannot open control socket"}});
}

TEST_F(net_if_is_bonding_slave, KOVANetIfIsBondingPassive_unreadableBonds_areLogged) {
    rig.replace_file("/sys/class/net/kova_ovs_bonds", "ovs_bond0 eth0\n");
    rig.fail("fopen");
    EXPECT_OUTCOME(is_slave("eth0"),
                   {.result = 0,
                    .code = 0x900,
                    .unit = "net_if_is_bonding_slave",
                    .log = {"ERR net_if_is_bonding_slave:N Failed to open /sys/class/net/kova_ovs_bonds."}});
}

TEST_F(net_if_is_bonding_slave, KOVANetIfIsBondingPassive_noName_isRefused) {
    EXPECT_OUTCOME(is_slave(nullptr), refusal("net_if_is_bonding_slave", "((void *)0) != szIfname", 0));
    EXPECT_OUTCOME(is_slave(""), refusal("net_if_is_bonding_slave", "'\\0' != *szIfname", 0));
}
