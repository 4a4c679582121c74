#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/bridge.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_get_bridge_info";

std::string missing(const std::string &key, const std::string &ifname) {
    return "INFO net_get_bridge_info:N Failed to get key[" + key + "] in file[" + ifcfg(ifname) + "].";
}

} // namespace

class net_get_bridge_info : public unit_test {
protected:
    /** An interface of the kernel; kind is "bridge", "brport" or "". */
    void add(const std::string &name, const std::string &kind, const std::string &flags = "0x1003") {
        const std::string place = "/tmp/sys-" + name;
        shell("rm -rf '" + place + "' && mkdir -p '" + place + "/" + kind + "'");
        write_file(place + "/flags", flags + "\n");
        rig.redirect("/sys/class/net/" + name, place);
    }
    outcome get(const char *ifname) {
        memset(&info, 'u', sizeof info);
        return rig.observe([=, this] { return KLIBNETGetBridgeInfo(ifname, &info); });
    }
    outcome by_topology(const char *ifname, int row) {
        memset(&info, 'u', sizeof info);
        return rig.observe([=, this] { return KLIBNETGetBridgeInfoByTopology(ifname, &info, row); });
    }
    void expect_info(int type, const std::string &ifname, const std::string &peer) const {
        BRIDGEINFO expected = {};
        expected.nType = type;
        memcpy(expected.szIfname, ifname.data(), ifname.size());
        memcpy(expected.szPeer, peer.data(), peer.size());
        EXPECT_EQ(0, memcmp(&expected, &info, sizeof info)) << info.nType << " " << info.szIfname << " " << info.szPeer;
    }
    bool is_untouched() const {
        BRIDGEINFO untouched;
        memset(&untouched, 'u', sizeof untouched);
        return memcmp(&untouched, &info, sizeof info) == 0;
    }

    BRIDGEINFO info;
};

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfo_bridge_hasItsFirstPort) {
    add("br0", "bridge");
    write_file(ifcfg("br0"), "TYPE=bridge\nPRIMARY=\"eth0\"\nBRIDGE=br9\n");
    EXPECT_OUTCOME(get("br0"), {.result = 2});
    expect_info(2, "br0", "eth0");
    write_file(ifcfg("br0"), "PRIMARY=eth0\nLOCAL_LAN=yes\n");
    EXPECT_OUTCOME(get("br0"), {.result = 3});
    expect_info(3, "br0", "eth0");
}

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfo_port_hasItsBridge) {
    add("eth0", "brport");
    write_file(ifcfg("eth0"), "BRIDGE=br0\nPRIMARY=eth9\n");
    EXPECT_OUTCOME(get("eth0"), {.result = 4});
    expect_info(4, "eth0", "br0");
}

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfo_plainInterface_readsNoFile) {
    add("eth0", "");
    write_file(ifcfg("eth0"), "BRIDGE=br0\nTYPE=bridge\nPRIMARY=eth9\n");
    EXPECT_OUTCOME(get("eth0"), {.result = 1});
    expect_info(1, "eth0", "");
}

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfo_interfaceThatIsDown_isZero) {
    add("br0", "bridge", "0x1002");
    EXPECT_OUTCOME(get("br0"), {.result = 0});
    EXPECT_TRUE(is_untouched());
    EXPECT_OUTCOME(get("gone0"), {.result = 0});
    EXPECT_TRUE(is_untouched());
}

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfo_missingPeer_isToldAndTheRoleStays) {
    add("br0", "bridge");
    add("eth0", "brport");
    write_file(ifcfg("br0"), "LOCAL_LAN=yes\n");
    write_file(ifcfg("eth0"), "");
    EXPECT_OUTCOME(get("br0"), {.result = 3, .log = {missing("PRIMARY", "br0")}});
    expect_info(3, "br0", "");
    EXPECT_OUTCOME(get("eth0"), {.result = 4, .log = {missing("BRIDGE", "eth0")}});
    expect_info(4, "eth0", "");
    shell("rm " + ifcfg("eth0"));
    const outcome unreadable{.result = 4, .code = 0x900, .unit = "key_value", .log = {missing("BRIDGE", "eth0")}};
    EXPECT_OUTCOME(get("eth0"), unreadable);
    shell("mkdir " + ifcfg("eth0"));
    EXPECT_OUTCOME(get("eth0"), unreadable);
    expect_info(4, "eth0", "");
}

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfo_longTexts_areCut) {
    for (const size_t length : {15, 16, 17}) {
        add(long_text(length), "brport");
        write_file(ifcfg(long_text(length)), "BRIDGE=" + long_text(40, 'b'));
        EXPECT_OUTCOME(get(long_text(length).c_str()), {.result = 4});
        expect_info(4, long_text(15), long_text(15, 'b'));
    }
}

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfo_withoutARecord_isTheRoleAlone) {
    add("br0", "bridge");
    EXPECT_EQ(2, rig.observe([] { return KLIBNETGetBridgeInfo("br0", nullptr); }).result);
    EXPECT_EQ(texts{}, rig.now.log);
}

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfo_badNames_areRefused) {
    EXPECT_OUTCOME(get(nullptr), refusal("net_is_if_up", "((void *)0) != szIfname", 0));
    EXPECT_OUTCOME(get(""), refusal("net_is_if_up", "'\\0' != *szIfname", 0));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str()), refusal("net_is_if_up", "is_interface_name(szIfname)", 0));
    }
}

// ---- topologies

TEST_F(net_get_bridge_info, grgTopologyIFInfo_holdsTheRolesOfTheTopologies) {
    std::string shown;
    for (const auto &row : grgTopologyIFInfo) {
        for (const BRIDGEINFO &entry : row) {
            shown += std::to_string(entry.nType) + entry.szIfname + "," + entry.szPeer + " ";
        }
        shown += "\n";
    }
    EXPECT_EQ("0, 0, 0, 0, \n"
              "1eth0, 1wlan0, 0, 0, \n"
              "4eth0,br0 4wlan0,br0 2br0,eth0 0, \n"
              "1eth0, 4wlan0,lbr0 3lbr0,wlan0 0, \n",
              shown);
}

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfoByTopology_knownName_isItsEntry) {
    EXPECT_OUTCOME(by_topology("lbr0", 3), {.result = 3});
    expect_info(3, "lbr0", "wlan0");
    EXPECT_OUTCOME(by_topology("wlan0", 1), {.result = 1});
    expect_info(1, "wlan0", "");
    EXPECT_OUTCOME(by_topology("eth0", 2), {.result = 4});
    expect_info(4, "eth0", "br0");
    EXPECT_EQ(2, KLIBNETGetBridgeInfoByTopology("br0", nullptr, 2));
}

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfoByTopology_unknownNameOrRow_isZero) {
    for (const int row : {0, 4, -1, 2147483647, -2147483647 - 1}) {
        EXPECT_OUTCOME(by_topology("eth0", row), {.result = 0});
        EXPECT_TRUE(is_untouched());
    }
    for (const std::string &name : texts{"", "eth1", "br0", "eth", "eth00", "ETH0", long_text(4096)}) {
        EXPECT_OUTCOME(by_topology(name.c_str(), 1), {.result = 0});
        EXPECT_TRUE(is_untouched());
    }
}

TEST_F(net_get_bridge_info, KLIBNETGetBridgeInfoByTopology_noName_isRefused) {
    EXPECT_OUTCOME(by_topology(nullptr, 1), refusal(kUnit, "((void *)0) != szIfname", 0));
}
