#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/bridge.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_get_bridge_config";
const std::string kFile = ifcfg("br0");
const texts kCopy{"/bin/cp -f " + kFile + " " + kFile + ".saved"};
const outcome kNoMemory{.result = -1, .code = 0x200, .unit = kUnit};
const std::string kMissing = "INFO net_get_bridge_config:N Failed to get key[PRIMARY] in file[" + kFile + "].";

BRIDGEINFO bridge(int type, const std::string &peer = "", const std::string &name = "br0") {
    BRIDGEINFO info = {};
    info.nType = type;
    memcpy(info.szIfname, name.data(), std::min(name.size(), sizeof info.szIfname));
    memcpy(info.szPeer, peer.data(), std::min(peer.size(), sizeof info.szPeer));
    return info;
}

NETINFO address(uint32_t is_static, uint32_t on_boot, const std::string &name = "br0") {
    NETINFO info = {.nIPSource = is_static, .blLinkUp = on_boot, .szIP = "10.0.0.1", .szMask = "255.0.0.0"};
    memcpy(info.szIfname, name.data(), std::min(name.size(), sizeof info.szIfname));
    return info;
}

} // namespace

class net_get_bridge_config : public unit_test {
protected:
    outcome get(const char *ifname = "br0") {
        memset(&role, 'u', sizeof role);
        ip = {.nIPSource = 7, .blLinkUp = 7, .szIfname = "old", .szIP = "old", .szMask = "old"};
        return rig.observe([=, this] { return KOVANetGetBridgeConfig(ifname, &ip, &role); });
    }
    outcome set(const BRIDGEINFO &wanted, const NETINFO *pNetInfo = nullptr) {
        return rig.observe([&] { return KOVANetSetBridgeConfig(pNetInfo, &wanted); });
    }
    outcome disable(const NETINFO &wanted) {
        return rig.observe([&] { return KOVANetDisableBridgeSlave(&wanted); });
    }
    outcome is_type(const char *ifname, int type) {
        return rig.observe([=] { return KOVANetIsIfBridgeType(ifname, type); });
    }
    void expect_role(int type, const std::string &peer) const {
        const BRIDGEINFO expected = bridge(type, peer);
        EXPECT_EQ(0, memcmp(&expected, &role, sizeof role)) << role.nType << " " << role.szIfname << " " << role.szPeer;
    }

    BRIDGEINFO role;
    NETINFO ip;
};

// ---- reading

TEST_F(net_get_bridge_config, KOVANetGetBridgeConfig_roles_areReadFromTheirKeys) {
    const struct {
        const char *content;
        int type;
        const char *peer;
    } cases[] = {
        {"", 1, ""},
        {"BRIDGE=\n", 1, ""},
        {"BRIDGE=\"\"\n", 1, ""},
        {"TYPE=Bridge\nLOCAL_LAN=yes\nPRIMARY=eth0\n", 1, ""},
        {"BRIDGE=br9\n", 4, "br9"},
        {"TYPE=ethernet\nBRIDGE=\"br9\"", 4, "br9"},
        {"TYPE=bridge\nPRIMARY=eth0\n", 2, "eth0"},
        {"TYPE=bridge\nPRIMARY=eth0\nBRIDGE=br9\nLOCAL_LAN=YES\n", 2, "eth0"},
        {"TYPE=\"bridge\"\nPRIMARY=\"eth0\"\nLOCAL_LAN=\"yes\"\n", 3, "eth0"},
        {"TYPE=bridge\nPRIMARY=\n", 2, ""},
        {"TYPE=bridge\nPRIMARY=0123456789abcdefghi\n", 2, "0123456789abcde"},
    };
    for (const auto &one : cases) {
        write_file(kFile, one.content);
        EXPECT_OUTCOME(get(), {.result = 0});
        expect_role(one.type, one.peer);
    }
}

TEST_F(net_get_bridge_config, KOVANetGetBridgeConfig_bridgeWithoutPort_isTold) {
    write_file(kFile, "TYPE=bridge\n");
    EXPECT_OUTCOME(get(), {.result = 0, .log = {kMissing}});
    expect_role(2, "");
}

TEST_F(net_get_bridge_config, KOVANetGetBridgeConfig_address_isReadWhenStatic) {
    write_file(kFile, "ONBOOT=yes\nBOOTPROTO=static\nIPADDR=10.0.0.2\nNETMASK=255.255.0.0\n");
    EXPECT_OUTCOME(get(), {.result = 0});
    EXPECT_EQ(1U, ip.blLinkUp);
    EXPECT_EQ(1U, ip.nIPSource);
    EXPECT_STREQ("br0", ip.szIfname);
    EXPECT_STREQ("10.0.0.2", ip.szIP);
    EXPECT_STREQ("255.255.0.0", ip.szMask);
    for (const char *content : {"", "ONBOOT=no\nBOOTPROTO=dhcp\n", "ONBOOT=YES\nBOOTPROTO=STATIC\nIPADDR=1.1.1.1\n"}) {
        write_file(kFile, content);
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_EQ(0U, ip.blLinkUp);
        EXPECT_EQ(0U, ip.nIPSource);
        EXPECT_STREQ("old", ip.szIP) << "not asked for";
    }
}

TEST_F(net_get_bridge_config, KOVANetGetBridgeConfig_staticWithoutAddress_isToldTwiceAsTheSameKey) {
    write_file(kFile, "BOOTPROTO=static\n");
    EXPECT_OUTCOME(get(), {.result = 0, .log = {kMissing, kMissing}});
    EXPECT_STREQ("", ip.szIP);
    EXPECT_STREQ("", ip.szMask);
}

TEST_F(net_get_bridge_config, KOVANetGetBridgeConfig_oneRecord_isEnough) {
    write_file(kFile, "TYPE=bridge\nBOOTPROTO=static\n");
    EXPECT_EQ(0, rig.observe([this] { return KOVANetGetBridgeConfig("br0", nullptr, &role); }).result);
    EXPECT_EQ(1U, rig.now.log.size());
    EXPECT_EQ(0, rig.observe([this] { return KOVANetGetBridgeConfig("br0", &ip, nullptr); }).result);
    EXPECT_EQ(2U, rig.now.log.size());
}

TEST_F(net_get_bridge_config, KOVANetGetBridgeConfig_longNames_areCutInTheRecords) {
    for (const size_t length : {15, 16, 17, 200}) {
        write_file(ifcfg(long_text(length)), "");
        EXPECT_OUTCOME(get(long_text(length).c_str()), {.result = 0});
        EXPECT_EQ(long_text(15), role.szIfname);
        EXPECT_EQ(long_text(15), ip.szIfname);
    }
}

TEST_F(net_get_bridge_config, KOVANetGetBridgeConfig_directory_hasNoKeys) {
    shell("mkdir " + kFile);
    const outcome got = get();
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(texts{}, got.log);
    expect_role(1, "");
    EXPECT_EQ(0U, ip.blLinkUp);
    EXPECT_EQ(0U, ip.nIPSource);
}

TEST_F(net_get_bridge_config, KOVANetGetBridgeConfig_noFile_isLogged) {
    EXPECT_OUTCOME(get(), {.result = -1, .log = {"ERR net_get_bridge_config:N Failed to access [" + kFile + "]."}});
}

TEST_F(net_get_bridge_config, KOVANetGetBridgeConfig_badArguments_areRefused) {
    EXPECT_OUTCOME(
        rig.observe([] { return KOVANetGetBridgeConfig("br0", nullptr, nullptr); }),
        {.result = -1, .code = 0xD00, .unit = kUnit, .log = {"ERR net_get_bridge_config:N Wrong Parameter."}});
    EXPECT_OUTCOME(get(nullptr), refusal(kUnit, "((void *)0) != szIfname"));
    EXPECT_OUTCOME(get(""), refusal(kUnit, "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str()), refusal(kUnit, "is_interface_name(szIfname)"));
    }
}

TEST_F(net_get_bridge_config, KOVANetIsIfBridgeType_role_isCompared) {
    write_file(kFile, "TYPE=bridge\nPRIMARY=eth0\n");
    for (const int type : {-1, 0, 1, 2, 3, 4, 5}) {
        EXPECT_OUTCOME(is_type("br0", type), {.result = type == 2 ? 1 : 0});
    }
}

TEST_F(net_get_bridge_config, KOVANetIsIfBridgeType_failures_areZeroAndLogged) {
    EXPECT_OUTCOME(is_type(nullptr, 1),
                   {.result = 0, .code = 0xD00, .unit = kUnit, .log = {"ERR net_get_bridge_config:N Bad parameter"}});
    EXPECT_OUTCOME(is_type("br0", 1), {.result = 0,
                                       .log = {"ERR net_get_bridge_config:N Failed to access [" + kFile + "].",
                                               "ERR net_get_bridge_config:N Failed to get PPPoE relay config"}});
    outcome refused = refusal(kUnit, "'\\0' != *szIfname", 0);
    refused.log.emplace_back("ERR net_get_bridge_config:N Failed to get PPPoE relay config");
    EXPECT_OUTCOME(is_type("", 1), refused);
}

// ---- writing

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_roles_setAndRemoveTheirKeys) {
    const std::string old = "# mine\nDEVICE=x\nTYPE=y\nPRIMARY=z\nBRIDGE=q\nLOCAL_LAN=no\nBOOTPROTO=dhcp\nONBOOT=yes\n";
    const std::string rest = "BOOTPROTO=dhcp\nONBOOT=yes\n";
    const std::map<int, std::string> written{
        {1, "# mine\nDEVICE=br0\n" + rest},
        {2, "# mine\nDEVICE=br0\nTYPE=bridge\nPRIMARY=peer0\n" + rest},
        {3, "# mine\nDEVICE=br0\nTYPE=bridge\nPRIMARY=peer0\nLOCAL_LAN=yes\n" + rest},
        {4, "# mine\nDEVICE=br0\nBRIDGE=peer0\n" + rest},
    };
    for (const auto &[type, content] : written) {
        write_file(kFile, old);
        EXPECT_OUTCOME(set(bridge(type, "peer0")), {.commands = kCopy});
        EXPECT_EQ(content, read_file(kFile));
        EXPECT_EQ(old, read_file(kFile + ".saved"));
    }
}

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_localLanNoMore_losesItsKey) {
    EXPECT_EQ(0, set(bridge(3, "eth0")).result);
    EXPECT_EQ("DEVICE=br0\nTYPE=bridge\nPRIMARY=eth0\nLOCAL_LAN=yes\n", read_file(kFile));
    EXPECT_EQ(0, set(bridge(2, "eth0")).result);
    EXPECT_EQ("DEVICE=br0\nTYPE=bridge\nPRIMARY=eth0\n", read_file(kFile));
}

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_address_isWrittenWhenGiven) {
    const NETINFO fixed = address(1, 7);
    EXPECT_OUTCOME(set(bridge(1), &fixed), {.result = 0}); // no file, no copy
    EXPECT_EQ("DEVICE=br0\nONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\nBOOTPROTO=static\n", read_file(kFile));
    const NETINFO dhcp = address(0, 0);
    EXPECT_OUTCOME(set(bridge(1), &dhcp), {.commands = kCopy});
    EXPECT_EQ("DEVICE=br0\nONBOOT=no\nBOOTPROTO=dhcp\n", read_file(kFile));
}

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_sixteenCharacters_areAName) {
    EXPECT_EQ(0, set(bridge(4, long_text(16, 'p'), long_text(16))).result);
    EXPECT_EQ("DEVICE=" + long_text(16) + "\nBRIDGE=" + long_text(16, 'p') + "\n", read_file(ifcfg(long_text(16))));
}

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_wrongRole_changesNothing) {
    write_file(kFile, "DEVICE=br0\n");
    for (const int type : {0, 5, -1, 2147483647}) {
        EXPECT_OUTCOME(
            set(bridge(type)),
            {.result = -1, .log = {"ERR net_get_bridge_config:N Failed to set bridge config with wrong type."}});
    }
    EXPECT_EQ("DEVICE=br0\n", read_file(kFile));
    EXPECT_EQ("<absent>", read_file(kFile + ".saved"));
}

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_copyThatFails_isNotLookedAt) {
    write_file(kFile, "");
    rig.answer("/bin/cp", 1);
    EXPECT_OUTCOME(set(bridge(1)), {.commands = kCopy});
    EXPECT_EQ("DEVICE=br0\n", read_file(kFile));
}

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_rewriteThatFails_leavesTheFile) {
    write_file(kFile, "DEVICE=old\n");
    rig.fail("KLIBCFileSetKeys");
    EXPECT_OUTCOME(set(bridge(1)), {.result = -1, .code = 0xB00, .unit = "platform", .commands = kCopy});
    EXPECT_OUTCOME(set(bridge(4, "br1\nTYPE=bridge")),
                   {.result = -1, .code = 0xD00, .unit = "key_value", .commands = kCopy});
    EXPECT_EQ("DEVICE=old\n", read_file(kFile));
    EXPECT_EQ("DEVICE=old\n", read_file(kFile + ".saved")) << "stays, and is not put back";
}

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_directory_cannotBeRewritten) {
    shell("mkdir " + kFile);
    const outcome got = set(bridge(1));
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ("file_rewrite", got.unit);
    EXPECT_EQ(kCopy, got.commands);
    EXPECT_EQ(texts{"ifcfg-br0"}, list_dir("/etc/sysconfig/network-scripts"));
}

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_readOnlyFileWithoutNewline_isRewritten) {
    write_file(kFile, "# mine\nBRIDGE=br9");
    shell("chmod 0400 " + kFile);
    EXPECT_OUTCOME(set(bridge(2, "eth0")), {.commands = kCopy});
    EXPECT_EQ("# mine\nDEVICE=br0\nTYPE=bridge\nPRIMARY=eth0\n", read_file(kFile));
}

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_noMemory_is200) {
    write_file(kFile, "DEVICE=old\n");
    const NETINFO fixed = address(1, 1);
    for (const int nth : {1, 2}) {
        rig.fail("KLIBCSzHashAlloc", nth);
        EXPECT_OUTCOME(set(bridge(1)), kNoMemory);
    }
    for (int nth = 1; nth <= 9; ++nth) {
        rig.fail("KLIBCSzHashSetValue", nth);
        EXPECT_OUTCOME(set(bridge(3, "eth0"), &fixed), kNoMemory);
    }
    EXPECT_EQ("DEVICE=old\n", read_file(kFile));
}

TEST_F(net_get_bridge_config, KOVANetSetBridgeConfig_badArguments_areRefused) {
    EXPECT_OUTCOME(
        rig.observe([] { return KOVANetSetBridgeConfig(nullptr, nullptr); }),
        {.result = -1, .code = 0xD00, .unit = kUnit, .log = {"ERR net_get_bridge_config:N Wrong Parameter."}});
    EXPECT_OUTCOME(set(bridge(1, "", "")), refusal(kUnit, "'\\0' != *pBridge->szIfname"));
    for (const char *name : {"a b", "a/b", "../x", "..", "a\nb"}) {
        EXPECT_OUTCOME(set(bridge(1, "", name)), refusal(kUnit, "is_interface_name(pBridge->szIfname)"));
    }
    EXPECT_EQ(texts{}, list_dir("/etc/sysconfig/network-scripts"));
}

// ---- a port no more

TEST_F(net_get_bridge_config, KOVANetDisableBridgeSlave_port_standsAlone) {
    const std::string old = "DEVICE=br0\nBRIDGE=br9\nTYPE=x\nPRIMARY=kept\nIPADDR=1.1.1.1\nONBOOT=no\n";
    write_file(kFile, old);
    EXPECT_OUTCOME(disable(address(1, 0)), {.commands = kCopy});
    EXPECT_EQ("DEVICE=br0\nPRIMARY=kept\nIPADDR=10.0.0.1\nONBOOT=yes\nNETMASK=255.0.0.0\nBOOTPROTO=static\n",
              read_file(kFile));
    EXPECT_EQ(old, read_file(kFile + ".saved"));
    EXPECT_OUTCOME(disable(address(0, 0)), {.commands = kCopy});
    EXPECT_EQ("DEVICE=br0\nPRIMARY=kept\nONBOOT=yes\nBOOTPROTO=dhcp\n", read_file(kFile));
}

TEST_F(net_get_bridge_config, KOVANetDisableBridgeSlave_noFile_isMade) {
    EXPECT_OUTCOME(disable(address(0, 0)), {.commands = kCopy});
    EXPECT_EQ("DEVICE=br0\nONBOOT=yes\nBOOTPROTO=dhcp\n", read_file(kFile));
}

TEST_F(net_get_bridge_config, KOVANetDisableBridgeSlave_failures_leaveTheFile) {
    write_file(kFile, "DEVICE=old\n");
    for (const int nth : {1, 2}) {
        rig.fail("KLIBCSzHashAlloc", nth);
        EXPECT_OUTCOME(disable(address(1, 1)), kNoMemory);
    }
    rig.fail("KLIBCFileSetKeys");
    EXPECT_OUTCOME(disable(address(1, 1)), {.result = -1, .code = 0xB00, .unit = "platform", .commands = kCopy});
    EXPECT_EQ("DEVICE=old\n", read_file(kFile));
}

TEST_F(net_get_bridge_config, KOVANetDisableBridgeSlave_badArguments_areRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetDisableBridgeSlave(nullptr); }), refusal(kUnit, "NULL != pNetInfo"));
    EXPECT_OUTCOME(disable(address(1, 1, "")), refusal(kUnit, "'\\0' != *pNetInfo->szIfname"));
    EXPECT_OUTCOME(disable(address(1, 1, "../x")), refusal(kUnit, "is_interface_name(pNetInfo->szIfname)"));
    EXPECT_EQ(texts{}, list_dir("/etc/sysconfig/network-scripts"));
}
