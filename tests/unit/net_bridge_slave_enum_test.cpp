#include "support/rig.h"

#include <kovanetsdk/bridge.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_bridge_slave_enum";

} // namespace

class net_bridge_slave_enum : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        shell("rm -rf /tmp/sys-br0 && mkdir -p /tmp/sys-br0/bridge /tmp/sys-br0/brif");
        rig.redirect("/sys/class/net/br0", "/tmp/sys-br0");
        members = KLIBCSzListAlloc(4);
    }
    void TearDown() override {
        KLIBCSzListFree(members);
        unit_test::TearDown();
    }
    outcome list(const char *bridge) {
        KLIBCSzListRemoveAll(members);
        return rig.observe([=, this] { return KLIBNetBridgeSlaveEnum(bridge, members); });
    }
    texts names() const {
        texts got;
        for (int i = 0; const char *name = KLIBCSzListGet(members, i); ++i) {
            got.emplace_back(name);
        }
        return got;
    }

    KLIBSZLIST *members = nullptr;
};

TEST_F(net_bridge_slave_enum, KLIBNetBridgeSlaveEnum_ports_areListedWhateverTheirType) {
    shell("cd /tmp/sys-br0/brif && ln -s /nowhere eth1 && touch eth0 && mkdir wlan0");
    EXPECT_OUTCOME(list("br0"), {.result = 3});
    EXPECT_EQ((texts{"eth0", "eth1", "wlan0"}), names());
}

TEST_F(net_bridge_slave_enum, KLIBNetBridgeSlaveEnum_realBridge_hasItsPorts) {
    shell("ip link add kbr0 type bridge && ip link add kv0 type veth peer name kv1 && ip link set kv0 master kbr0");
    EXPECT_OUTCOME(list("kbr0"), {.result = 1});
    EXPECT_EQ(texts{"kv0"}, names());
    shell("ip link del kv0 && ip link del kbr0");
}

TEST_F(net_bridge_slave_enum, KLIBNetBridgeSlaveEnum_bridgeWithoutPorts_isZero) {
    EXPECT_OUTCOME(list("br0"), {.result = 0});
}

TEST_F(net_bridge_slave_enum, KLIBNetBridgeSlaveEnum_list_isAppendedTo) {
    shell("touch /tmp/sys-br0/brif/eth0");
    KLIBCSzListPush(&members, "first");
    EXPECT_OUTCOME(rig.observe([this] { return KLIBNetBridgeSlaveEnum("br0", members); }), {.result = 1});
    EXPECT_EQ((texts{"first", "eth0"}), names());
}

TEST_F(net_bridge_slave_enum, KLIBNetBridgeSlaveEnum_whatIsNoBridge_isLogged) {
    for (const std::string &name : texts{"lo", "gone0", long_text(15), long_text(16), long_text(17)}) {
        EXPECT_OUTCOME(list(name.c_str()),
                       {.result = -1, .log = {"ERR net_bridge_slave_enum:N [" + name + "] is not bridge master."}});
    }
}

TEST_F(net_bridge_slave_enum, KLIBNetBridgeSlaveEnum_directoryThatCannotBeRead_fails) {
    rig.fail("KLIBCFileEnumDir");
    EXPECT_OUTCOME(list("br0"), {.result = -1, .code = 0x900, .unit = "platform"});
    shell("rmdir /tmp/sys-br0/brif");
    EXPECT_OUTCOME(list("br0"), {.result = -1, .code = 0x900, .unit = "plain_file"});
}

TEST_F(net_bridge_slave_enum, KLIBNetBridgeSlaveEnum_missingArguments_areLogged) {
    const outcome bad{
        .result = -1, .code = 0xD00, .unit = kUnit, .log = {"ERR net_bridge_slave_enum:N Bad Parameter."}};
    EXPECT_OUTCOME(list(nullptr), bad);
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetBridgeSlaveEnum("br0", nullptr); }), bad);
}

TEST_F(net_bridge_slave_enum, KLIBNetBridgeSlaveEnum_badNames_areRefused) {
    EXPECT_OUTCOME(list(""), refusal(kUnit, "'\\0' != *szBridge"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(list(name.c_str()), refusal(kUnit, "is_interface_name(szBridge)"));
    }
}
