#include "support/rig.h"

#include <kovanetsdk/bridge.h>

using namespace kova_test;

class net_bridge_if_is_master : public unit_test {
protected:
    outcome is_master(const char *ifname) {
        return rig.observe([=] { return KLIBNetBridgeIfIsMaster(ifname); });
    }
};

TEST_F(net_bridge_if_is_master, KLIBNetBridgeIfIsMaster_realBridge_isOne) {
    shell("ip link add kbr0 type bridge && ip link add kv0 type veth peer name kv1 && ip link set kv0 master kbr0");
    EXPECT_OUTCOME(is_master("kbr0"), {.result = 1});
    EXPECT_OUTCOME(is_master("kv0"), {.result = 0});
    EXPECT_OUTCOME(is_master("kv1"), {.result = 0});
    shell("ip link del kv0 && ip link del kbr0");
    EXPECT_OUTCOME(is_master("kbr0"), {.result = 0});
}

TEST_F(net_bridge_if_is_master, KLIBNetBridgeIfIsMaster_whatIsNoDirectory_isNone) {
    rig.replace_file("/sys/class/net/br0/bridge", "a file");
    EXPECT_OUTCOME(is_master("br0"), {.result = 0});
}

TEST_F(net_bridge_if_is_master, KLIBNetBridgeIfIsMaster_longNames_areLookedForWhole) {
    shell("mkdir -p /tmp/sys-long/bridge");
    rig.redirect("/sys/class/net/" + long_text(15), "/tmp/sys-long");
    EXPECT_OUTCOME(is_master(long_text(15).c_str()), {.result = 1});
    for (const size_t length : {16, 17, 255, 4096}) {
        EXPECT_EQ(0, is_master(long_text(length).c_str()).result);
    }
}

TEST_F(net_bridge_if_is_master, KLIBNetBridgeIfIsMaster_badNames_areRefused) {
    EXPECT_OUTCOME(is_master(nullptr), refusal("net_bridge_if_is_master", "((void *)0) != szIfname", 0));
    EXPECT_OUTCOME(is_master(""), refusal("net_bridge_if_is_master", "'\\0' != *szIfname", 0));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(is_master(name.c_str()), refusal("net_bridge_if_is_master", "is_interface_name(szIfname)", 0));
    }
}
