#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/stats.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_topology_get";
const std::string kInfo = "/etc/kovainfo.conf";
const std::string kVlans = "/proc/net/vlan/config";
const std::string kVlanHeader = "VLAN Dev name    | VLAN ID\nName-Type: VLAN_NAME_TYPE_RAW_PLUS_VID_NO_PAD\n";
const std::string kMissing = "INFO net_topology_get:N Failed to get key[net_topology] in [/etc/kovainfo.conf]";
constexpr int kUntouched = 0x75757575;

} // namespace

class net_topology_get : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        rig.hide(kVlans);
    }
    static void store(const std::string &topology) {
        write_file(kInfo, "support_net_topology=\"yes\"\nnet_topology=\"" + topology + "\"\n");
    }
    outcome current() {
        return rig.observe([] { return KLIBNetTopologyGet(nullptr); });
    }
    outcome describe(int topology = 0) {
        memset(&info, 'u', sizeof info);
        info.nTopology = topology;
        return rig.observe([this] { return KLIBNetTopologyGet(&info); });
    }
    outcome set(const TOPOLOGYINFO &wanted) {
        return rig.observe([&] { return KLIBNETSetTopologyConfigs(&wanted); });
    }
    void expect_info(int topology, const std::string &name, const std::string &ifname, int is_client, int row) const {
        EXPECT_EQ(topology, info.nTopology);
        EXPECT_EQ(name, info.szName);
        EXPECT_EQ(ifname, info.szIfname);
        EXPECT_EQ(is_client, info.blClient);
        EXPECT_EQ(row, info.nIFInfoRow);
    }

    TOPOLOGYINFO info;
};

TEST_F(net_topology_get, KLIBNetTopologyGet_table_isThatOfTheTopologies) {
    for (int i = 0; i < KLIB_TOPOLOGY_COUNT; ++i) {
        EXPECT_EQ(i, gTopologyInfo[i].nTopology);
    }
    store("nothing known");
    EXPECT_OUTCOME(describe(), {.result = 0});
    expect_info(0, "unknown", "eth0", 0, 3);
    EXPECT_OUTCOME(describe(1), {.result = 1});
    expect_info(1, "client", "eth0", 1, 1);
    EXPECT_OUTCOME(describe(2), {.result = 2});
    expect_info(2, "bridge", "br0", 0, 2);
    EXPECT_OUTCOME(describe(3), {.result = 3});
    expect_info(3, "router", "eth0", 0, 3);
}

TEST_F(net_topology_get, KLIBNetTopologyGet_name_isFoundInAnyCase) {
    const struct {
        const char *name;
        int topology;
    } cases[] = {{"client", 1}, {"bridge", 2}, {"router", 3},  {"Router", 3},  {"ROUTER", 3}, {"unknown", 0},
                 {"", 0},       {"rout", 0},   {"router2", 0}, {" router", 0}, {"3", 0}};
    for (const auto &one : cases) {
        store(one.name);
        EXPECT_OUTCOME(current(), {.result = one.topology});
        EXPECT_OUTCOME(describe(), {.result = one.topology});
        EXPECT_EQ(one.topology, info.nTopology);
        EXPECT_STREQ(gTopologyInfo[one.topology].szName, info.szName);
    }
}

TEST_F(net_topology_get, KLIBNetTopologyGet_longName_isNone) {
    store(long_text(3000, 'r'));
    EXPECT_OUTCOME(current(), {.result = 0});
    store("router" + long_text(1100, ' '));
    EXPECT_OUTCOME(current(), {.result = 0});
}

TEST_F(net_topology_get, KLIBNetTopologyGet_noChoice_leavesTheRecord) {
    const texts contents{"", "net_topology=\"router\"\n", "support_net_topology=\"no\"\nnet_topology=\"router\"\n",
                         "support_net_topology=\"YES\"\nnet_topology=\"router\"\n",
                         "support_net_topology=\"\"\nnet_topology=\"router\"\n"};
    for (const std::string &content : contents) {
        write_file(kInfo, content);
        EXPECT_OUTCOME(current(), {.result = 0});
        EXPECT_OUTCOME(describe(kUntouched), {.result = 0});
        TOPOLOGYINFO before;
        memset(&before, 'u', sizeof before);
        EXPECT_EQ(0, memcmp(&before, &info, sizeof info)) << content;
        EXPECT_OUTCOME(describe(2), {.result = 0});
        EXPECT_EQ(2, info.nTopology);
    }
}

TEST_F(net_topology_get, KLIBNetTopologyGet_noKey_isUnknownAndLogged) {
    write_file(kInfo, "support_net_topology=\"yes\"\n");
    EXPECT_OUTCOME(current(), {.result = 0, .log = {kMissing}});
    EXPECT_OUTCOME(describe(), {.result = 0, .log = {kMissing}});
    expect_info(0, "unknown", "eth0", 0, 3);
    EXPECT_OUTCOME(describe(2), {.result = 2, .log = {kMissing}});
    expect_info(2, "bridge", "br0", 0, 2);
}

TEST_F(net_topology_get, KLIBNetTopologyGet_fileThatCannotBeRead_isUnknown) {
    EXPECT_EQ(0, current().result);
    store("router");
    rig.fail("KLIBCFileCheckKeyValue");
    EXPECT_EQ(0, current().result);
    rig.fail("KLIBCFileGetKeyValue");
    EXPECT_OUTCOME(current(), {.result = 0, .code = 0x900, .unit = "platform", .log = {kMissing}});
}

TEST_F(net_topology_get, KLIBNetTopologyGet_askedForTopology_isDescribedWhateverTheCurrentOne) {
    for (const char *stored : {"client", "router", "", "unknown"}) {
        store(stored);
        EXPECT_OUTCOME(describe(2), {.result = 2});
        expect_info(2, "bridge", "br0", 0, 2);
    }
    store("client");
    for (const int number : {0, 4, -1, 100, INT32_MAX, INT32_MIN}) {
        EXPECT_OUTCOME(describe(number), {.result = 1});
        expect_info(1, "client", "eth0", 1, 1);
    }
}

TEST_F(net_topology_get, KLIBNetTopologyGet_vlanOnTheInterface_isNamedInItsPlace) {
    store("client");
    const struct {
        const char *lines;
        const char *client, *bridge;
    } cases[] = {
        {"", "eth0", "br0"},
        {"eth0.10        | 10  | eth0\n", "eth0.10", "br0"},
        {"eth1.20        | 20  | eth1\n", "eth0", "br0"},
        {"br0.5          | 5  | br0\neth0.7  | 7  | eth0\neth0.10 | 10  | eth0\n", "eth0.7", "br0.5"},
        {"eth00.10       | 10  | eth00\n", "eth0", "br0"},
        {"vlan-of-my-card| 10  | eth0\n", "vlan-of-my-card", "br0"},
        // a VLAN on a VLAN is not followed
        {"eth0.10        | 10  | eth0\neth0.10.3 | 3  | eth0.10\n", "eth0.10", "br0"},
    };
    for (const auto &one : cases) {
        SCOPED_TRACE(one.lines);
        rig.replace_file(kVlans, kVlanHeader + one.lines);
        EXPECT_OUTCOME(describe(), {.result = 1});
        expect_info(1, "client", one.client, 1, 1);
        EXPECT_OUTCOME(describe(3), {.result = 3});
        expect_info(3, "router", one.client, 0, 3);
        EXPECT_OUTCOME(describe(2), {.result = 2});
        expect_info(2, "bridge", one.bridge, 0, 2);
        EXPECT_OUTCOME(current(), {.result = 1});
        EXPECT_STREQ("eth0", gTopologyInfo[1].szIfname);
    }
}

TEST_F(net_topology_get, KLIBNetTopologyGet_vlansThatCannotBeRead_countAsNone) {
    store("client");
    rig.replace_file(kVlans, kVlanHeader + "eth0.10        | 10  | eth0\n");
    rig.fail("KLIBCFileReadLines");
    EXPECT_OUTCOME(describe(), {.result = 1, .code = 0x900, .unit = "platform"});
    expect_info(1, "client", "eth0", 1, 1);
    rig.replace_file(kVlans, kVlanHeader + "eth0.10        | 10  | eth0\nno VLAN\n");
    EXPECT_OUTCOME(describe(), {.result = 1,
                                .code = 0x4000,
                                .unit = "net_vlan_enum",
                                .log = {"ERR net_vlan_enum:N Get wrong format from /proc/net/vlan/config: no VLAN"}});
    expect_info(1, "client", "eth0", 1, 1);
}

// ---- storing

TEST_F(net_topology_get, KLIBNETSetTopologyConfigs_name_isStored) {
    write_file(kInfo, "support_net_topology=\"yes\"\nunique=\"x\"\n");
    for (int i = 0; i < KLIB_TOPOLOGY_COUNT; ++i) {
        EXPECT_OUTCOME(set(gTopologyInfo[i]), {.result = 0});
        EXPECT_EQ("support_net_topology=\"yes\"\nunique=\"x\"\nnet_topology=\"" + std::string(gTopologyInfo[i].szName) +
                      "\"\n",
                  read_file(kInfo));
        EXPECT_OUTCOME(current(), {.result = i});
    }
    TOPOLOGYINFO other = {};
    strcpy(other.szName, "Router");
    EXPECT_OUTCOME(set(other), {.result = 0});
    EXPECT_OUTCOME(current(), {.result = 3});
}

TEST_F(net_topology_get, KLIBNETSetTopologyConfigs_noFile_isMade) {
    EXPECT_OUTCOME(set(gTopologyInfo[2]), {.result = 0});
    EXPECT_EQ("net_topology=\"bridge\"\n", read_file(kInfo));
}

TEST_F(net_topology_get, KLIBNETSetTopologyConfigs_nameWithoutAnEnd_isTheWholeField) {
    TOPOLOGYINFO wanted;
    memset(&wanted, 'x', sizeof wanted);
    EXPECT_OUTCOME(set(wanted), {.result = 0});
    EXPECT_EQ("net_topology=\"" + long_text(64, 'x') + "\"\n", read_file(kInfo));
}

TEST_F(net_topology_get, KLIBNETSetTopologyConfigs_failures_areMinusOne) {
    EXPECT_OUTCOME(rig.observe([] { return KLIBNETSetTopologyConfigs(nullptr); }), refusal(kUnit, "NULL != pInfo"));
    store("client");
    const std::string before = read_file(kInfo);
    rig.fail("KLIBCINFOSetKeyValue");
    EXPECT_OUTCOME(set(gTopologyInfo[3]), {.result = -1, .code = 0xB00, .unit = "platform"});
    TOPOLOGYINFO wanted = {};
    strcpy(wanted.szName, "router\nroot=\"x");
    EXPECT_OUTCOME(set(wanted), {.result = -1, .code = 0xD00, .unit = "key_value"});
    EXPECT_EQ(before, read_file(kInfo));
}
