#include "support/rig.h"

#include <kovanetsdk/bridge.h>

using namespace kova_test;

class net_bridge_if_is_slave : public unit_test {
protected:
    outcome is_slave(const char *ifname) {
        return rig.observe([&] { return KLIBNetBridgeIfIsSlave(ifname); });
    }
};

TEST_F(net_bridge_if_is_slave, KLIBNetBridgeIfIsSlave_realBridge_hasItsPort) {
    shell("ip link add kbr0 type bridge && ip link add kv0 type veth peer name kv1 && ip link set kv0 master kbr0");
    EXPECT_OUTCOME(is_slave("kv0"), {.result = 1});
    EXPECT_OUTCOME(is_slave("kv1"), {.result = 0});
    EXPECT_OUTCOME(is_slave("kbr0"), {.result = 0});
    shell("ip link set kv0 nomaster");
    EXPECT_OUTCOME(is_slave("kv0"), {.result = 0});
    shell("ip link del kv0 && ip link del kbr0");
    EXPECT_OUTCOME(is_slave("kv0"), {.result = 0});
}

TEST_F(net_bridge_if_is_slave, KLIBNetBridgeIfIsSlave_longNames_areLookedForWhole) {
    shell("mkdir -p /tmp/sys-long/brport");
    rig.redirect("/sys/class/net/" + long_text(15), "/tmp/sys-long");
    EXPECT_OUTCOME(is_slave(long_text(15).c_str()), {.result = 1});
    for (const size_t length : {16, 17, 255, 4096}) {
        EXPECT_EQ(0, is_slave(long_text(length).c_str()).result);
    }
}

TEST_F(net_bridge_if_is_slave, KLIBNetBridgeIfIsSlave_badNames_areRefused) {
    EXPECT_OUTCOME(is_slave(nullptr), refusal("net_bridge_if_is_slave", "((void *)0) != szIfname", 0));
    EXPECT_OUTCOME(is_slave(""), refusal("net_bridge_if_is_slave", "'\\0' != *szIfname", 0));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(is_slave(name.c_str()), refusal("net_bridge_if_is_slave", "is_interface_name(szIfname)", 0));
    }
}
