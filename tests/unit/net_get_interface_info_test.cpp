#include "support/fake_kernel.h"
#include "support/memory.h"

#include <cerrno>
#include <climits>
#include <cstring>
#include <kovanetsdk/iface.h>

using namespace kova_test;

namespace {

constexpr unsigned kUp = IFF_UP | IFF_RUNNING;
constexpr int kHeartbeatBit = 0x04;
constexpr int kClusterBit = 0x10;

} // namespace

class net_get_interface_info : public unit_test {
protected:
    outcome get(int kind, int capacity = 32) {
        return rig.observe([&] { return KLIBNetGetInterfaceInfo(records, capacity, kind); });
    }
    outcome count(int kind) {
        return rig.observe([&] { return KOVANetEnumCard(kind); });
    }
    /** Names of the records, in their order. */
    texts names(long number) const {
        texts found;
        for (long i = 0; i < number; ++i) {
            found.emplace_back(records[i].szIfname);
        }
        return found;
    }
    texts selected(int kind) {
        const outcome got = get(kind);
        EXPECT_OUTCOME(got, {.result = got.result});
        return names(got.result);
    }
    static outcome refused(const std::string &condition) { return refusal("net_get_interface_info", condition); }

    fake_kernel kernel{rig};
    IFINFO records[40] = {};
};

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_oneCard_fillsTheWholeRecord) {
    kernel.add("eth0", {.flags = kUp | IFF_DYNAMIC, .ip = "192.168.1.10", .mask = "255.255.255.0"});
    EXPECT_OUTCOME(get(2), {.result = 1});
    EXPECT_STREQ("eth0", records[0].szIfname);
    EXPECT_STREQ("192.168.1.10", records[0].szIP);
    EXPECT_STREQ("255.255.255.0", records[0].szMask);
    EXPECT_EQ(2U, records[0].nLink);
    EXPECT_EQ(kUp | IFF_DYNAMIC, records[0].nFlags); // the highest of the 16
    EXPECT_EQ(0, memcmp("\x02\0\0\0\0\x01", records[0].abMac, 6));
    EXPECT_STREQ("", records[1].szIfname);
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_noAddressNoCarrier_isEmptyAndZero) {
    kernel.add("eth0", {.flags = IFF_UP});
    EXPECT_OUTCOME(get(2), {.result = 1});
    EXPECT_STREQ("", records[0].szIP);
    EXPECT_STREQ("", records[0].szMask);
    EXPECT_EQ(0U, records[0].nLink);
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_longestName_isWhole) {
    kernel.add("abcdefghijklmno");
    EXPECT_EQ(texts{"abcdefghijklmno"}, selected(2));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_selectors_excludeByTheirFlags) {
    kernel.add("bond0", {.flags = kUp | IFF_MASTER});
    kernel.add("eth0", {.flags = kUp | IFF_SLAVE});
    kernel.add("eth1", {.flags = kUp});
    kernel.add("lo", {.flags = kUp | IFF_LOOPBACK});
    kernel.add("ppp0", {.flags = kUp | IFF_POINTOPOINT});
    EXPECT_EQ((texts{"eth0", "eth1"}), selected(1));
    EXPECT_EQ((texts{"bond0", "eth1"}), selected(2));
    EXPECT_EQ((texts{"bond0", "eth1", "ppp0"}), selected(8));
    EXPECT_EQ((texts{"bond0", "eth0", "eth1"}), selected(3));
    EXPECT_EQ((texts{"bond0", "eth0", "eth1"}), selected(0x20));
    EXPECT_EQ((texts{"bond0", "eth0", "eth1"}), selected(-1));
    EXPECT_EQ((texts{"bond0", "eth0", "eth1"}), selected(INT_MIN));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_downInterface_isNeverSelected) {
    kernel.add("eth0", {.flags = IFF_RUNNING});
    for (const int kind : {1, 2, 8, 32}) {
        EXPECT_OUTCOME(get(kind), {.result = 0});
    }
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_selectorZero_isRefusedWithItsBitsOff) {
    kernel.add("eth0");
    for (const int kind : {0, kHeartbeatBit, kClusterBit, kHeartbeatBit | kClusterBit}) {
        EXPECT_OUTCOME(get(kind), refused("0 != selector"));
    }
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_negativeCapacity_isRefusedBeforeAnythingIsAsked) {
    rig.fail_from("KLIBCModuleIsLoad");
    EXPECT_OUTCOME(get(2, -1), refused("0 <= capacity"));
    EXPECT_OUTCOME(get(0, INT_MIN), refused("0 <= capacity"));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_capacity_boundsTheRecords) {
    for (const char *name : {"eth0", "eth1", "eth2"}) {
        kernel.add(name);
    }
    EXPECT_OUTCOME(get(2, 0), {.result = 0});
    EXPECT_STREQ("", records[0].szIfname);
    EXPECT_OUTCOME(get(2, 2), {.result = 2});
    EXPECT_EQ((texts{"eth0", "eth1", ""}), names(3));
    EXPECT_OUTCOME(get(2, INT_MAX), {.result = 3});
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_fortyInterfaces_stopsAtThirtyTwo) {
    for (int i = 10; i < 50; ++i) {
        kernel.add("eth" + std::to_string(i));
    }
    EXPECT_OUTCOME(get(2, 40), {.result = 32});
    EXPECT_STREQ("eth41", records[31].szIfname);
    EXPECT_STREQ("", records[32].szIfname);
}

TEST_F(net_get_interface_info, KOVANetEnumCard_kind_countsOnly) {
    kernel.add("eth0");
    kernel.add("eth1");
    EXPECT_OUTCOME(count(2), {.result = 2});
    EXPECT_OUTCOME(count(0), refused("0 != selector"));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_guestDevices_areSkipped) {
    for (const char *name : {"gbr0", "xgbr", "gwlan0", "agwlanb", "gb", "eth0"}) {
        kernel.add(name);
    }
    EXPECT_EQ((texts{"eth0", "gb"}), selected(2));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_bridgeMember_isSkipped) {
    kernel.add("br0");
    kernel.add("eth0");
    rig.replace_file("/sys/class/net/eth0/brport", "");
    EXPECT_EQ(texts{"br0"}, selected(2));
    EXPECT_EQ(texts{"br0"}, selected(1));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_switchBondMember_isSkipped) {
    kernel.add("eth0");
    kernel.add("eth1");
    rig.replace_file("/sys/class/net/kova_ovs_bonds", "ovs_bond0 eth1\n");
    EXPECT_EQ(texts{"eth0"}, selected(2));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_switchName_hasTheLinkBehindIt) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    kernel.add("eth0", {.flags = IFF_UP});
    kernel.add("ovs_eth0", {.flags = kUp});
    EXPECT_OUTCOME(get(2), {.result = 2});
    EXPECT_STREQ("ovs_eth0", records[1].szIfname);
    EXPECT_EQ(0U, records[1].nLink);
    kernel.add("eth0", {.flags = kUp});
    kernel.add("ovs_eth0", {.flags = IFF_UP});
    EXPECT_OUTCOME(get(2), {.result = 2});
    EXPECT_EQ(2U, records[1].nLink);
    rig.replace_file("/sys/devices/virtual/net/ovs_eth1", "");
    kernel.add("ovs_eth1"); // over nothing
    EXPECT_EQ(3, get(2).result);
    EXPECT_EQ(0U, records[2].nLink);
}

// ---- VLANs

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_logical_replacesTheRowDeviceByItsVlan) {
    kernel.load_vlan_module();
    kernel.add("eth0");
    kernel.add("eth0.10", {.row_device = "eth0"});
    EXPECT_EQ(texts{"eth0.10"}, selected(2));
    EXPECT_EQ((texts{"eth0", "eth0.10"}), selected(8));
    EXPECT_EQ(texts{"eth0"}, selected(1));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_noVlanModule_asksNobodyAboutVlans) {
    kernel.add("eth0");
    kernel.add("eth0.10", {.row_device = "eth0"});
    EXPECT_EQ((texts{"eth0", "eth0.10"}), selected(2));
    EXPECT_EQ((texts{"eth0", "eth0.10"}), selected(1));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_lastRecord_takesThePlaceOfADroppedOne) {
    kernel.load_vlan_module();
    for (const char *name : {"eth0", "eth1", "eth2"}) {
        kernel.add(name);
    }
    kernel.add("eth0.10", {.row_device = "eth0"});
    EXPECT_EQ((texts{"eth2", "eth0.10", "eth1"}), selected(2)); // of eth0 eth0.10 eth1 eth2
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_movedRecord_isLookedAtToo) {
    kernel.load_vlan_module();
    kernel.add("eth0");
    kernel.add("eth5");
    kernel.add("eth0.10", {.row_device = "eth0"});
    kernel.add("eth0.11", {.row_device = "eth5"});
    EXPECT_EQ((texts{"eth0.11", "eth0.10"}), selected(2)); // of eth0 eth0.10 eth0.11 eth5
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_downVlan_stillDropsItsRowDevice) {
    kernel.load_vlan_module();
    kernel.add("eth0");
    kernel.add("eth1");
    kernel.add("eth0.10", {.flags = 0, .row_device = "eth0"});
    EXPECT_EQ(texts{"eth1"}, selected(2));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_moreRowDevicesThanRecords_keepsTheCount) {
    kernel.load_vlan_module();
    kernel.add("eth0");
    kernel.add("eth0.10", {.flags = 0, .row_device = "eth0"});
    kernel.add("eth0.11", {.flags = 0, .row_device = "eth0"});
    EXPECT_OUTCOME(get(2), {.result = 1, .code = 0xD00, .unit = "net_get_interface_info"});
    EXPECT_EQ(texts{"eth0"}, names(1));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_rowDevices_areOfThisCallOnly) {
    kernel.load_vlan_module();
    kernel.add("eth0");
    kernel.add("eth0.10", {.row_device = "eth0"});
    EXPECT_EQ(texts{"eth0.10"}, selected(2));
    kernel.add("eth0.10");
    EXPECT_EQ((texts{"eth0", "eth0.10"}), selected(2));
}

TEST_F(net_get_interface_info, KOVANetEnumCard_vlan_countsItsRowDeviceToo) {
    kernel.load_vlan_module();
    kernel.add("eth0");
    kernel.add("eth0.10", {.row_device = "eth0"});
    EXPECT_OUTCOME(count(2), {.result = 2});
}

// ---- cluster

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_cluster_dropsItsHeartbeatInterface) {
    kernel.add("eth0");
    kernel.add("eth1");
    write_file("/etc/kova/platform.conf", "ha_running=\"yes\"\nha_heartbeat_if=\"eth1\"\n");
    EXPECT_EQ(texts{"eth0"}, selected(2));
    EXPECT_EQ((texts{"eth0", "eth1"}), selected(2 | kHeartbeatBit));
    write_file("/etc/kova/platform.conf", "ha_running=\"no\"\nha_heartbeat_if=\"eth1\"\n");
    EXPECT_EQ((texts{"eth0", "eth1"}), selected(2));
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_clusterBit_showsClusterAddressesAndDropsTheRest) {
    kernel.add("eth0", {.ip = "10.0.0.1", .mask = "255.0.0.0"});
    kernel.add("eth1", {.ip = "10.0.1.1", .mask = "255.0.0.0"});
    write_file("/etc/kova/platform.conf", "ha_running=yes\nha_active=yes\nha_heartbeat_if=eth9\nha_ip_eth1=172.16.0.9\n"
                                          "ha_mask_eth1=255.255.0.0\n");
    EXPECT_EQ(texts{"eth1"}, selected(2 | kClusterBit));
    EXPECT_STREQ("172.16.0.9", records[0].szIP);
    EXPECT_STREQ("255.255.0.0", records[0].szMask);
    EXPECT_EQ((texts{"eth0", "eth1"}), selected(2));
    EXPECT_STREQ("10.0.1.1", records[1].szIP);
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_clusterBitWithoutCluster_changesNothing) {
    kernel.add("eth0", {.ip = "10.0.0.1", .mask = "255.0.0.0"});
    write_file("/etc/kova/platform.conf", "ha_ip_eth0=172.16.0.9\nha_mask_eth0=255.255.0.0\n");
    EXPECT_EQ(texts{"eth0"}, selected(2 | kClusterBit));
    EXPECT_STREQ("10.0.0.1", records[0].szIP);
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_activeNodeWithoutAddresses_isNoted) {
    kernel.add("eth0");
    write_file("/etc/kova/platform.conf", "ha_running=yes\nha_active=yes\nha_heartbeat_if=eth9\n");
    EXPECT_OUTCOME(get(2 | kClusterBit),
                   {.result = 0, .log = {"INFO net_get_interface_info:N HA is running but HA IP not ready (2)"}});
    write_file("/etc/kova/platform.conf", "ha_running=yes\nha_heartbeat_if=eth9\n");
    EXPECT_OUTCOME(get(2 | kClusterBit), {.result = 0});
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_unknownHeartbeat_isNotedAndDropsNothing) {
    kernel.add("eth0");
    write_file("/etc/kova/platform.conf", "ha_running=yes\n");
    EXPECT_OUTCOME(get(2), {.result = 1,
                            .code = 0xBC00,
                            .unit = "ha",
                            .log = {"INFO net_get_interface_info:N Failed to get heartbeat interface."}});
}

// ---- failures

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_unreadableModuleList_fails) {
    kernel.add("eth0");
    rig.fail("KLIBCModuleIsLoad");
    EXPECT_OUTCOME(get(2), {.result = -1,
                            .code = 0x900,
                            .unit = "platform",
                            .log = {"ERR net_get_interface_info:N Failed to look for module 8021q, kovaerr=[0x0900]"}});
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_noInterfaceList_fails) {
    rig.hide("/proc/net/dev");
    EXPECT_OUTCOME(get(2), {.result = -1,
                            .code = 0x900,
                            .unit = "net_stat_init",
                            .log = {"ERR net_get_interface_info:N Failed to list interfaces, kovaerr=[0x0900]"}});
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_emptyInterfaceList_fails) {
    EXPECT_OUTCOME(get(2),
                   {.result = -1, .log = {"ERR net_get_interface_info:N Failed to list interfaces, kovaerr=[0x0000]"}});
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_binaryInterfaceList_isSurvived) {
    rig.replace_file("/proc/net/dev", "a\nb\n\xff\xfe\x01:1 2\n" + long_text(5000) + ":1\n" + std::string("\0:\n", 3));
    EXPECT_OUTCOME(get(2), {.result = 0});
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_noSocket_is3400) {
    kernel.add("eth0");
    rig.fail("socket");
    EXPECT_OUTCOME(get(2), {.result = -1,
                            .code = 0x3400,
                            .unit = "net_get_interface_info",
                            .log = {"ERR net_get_interface_info:N Cannot open control socket"}});
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_interfaceThatVanishes_isLeftOutAtEveryRequest) {
    for (const unsigned long request : {SIOCGIFFLAGS, SIOCGIFHWADDR, SIOCGIFADDR, SIOCGIFNETMASK}) {
        kernel.add("eth0", {.ip = "10.0.0.1", .mask = "255.0.0.0", .failing = {{request, ENODEV}}});
        kernel.add("eth1", {.ip = "10.0.0.2", .mask = "255.0.0.0"});
        EXPECT_EQ(texts{"eth1"}, selected(2)) << std::hex << request;
        EXPECT_OUTCOME(count(2), {.result = 1});
    }
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_noMemoryForTheList_failsAndIsTriedAgain) {
    NEEDS_OWN_ALLOCATOR();
    GTEST_FLAG_SET(death_test_style, "threadsafe"); // a process that never made its list
    EXPECT_EXIT(
        {
            kernel.add("eth0");
            rig.fail("malloc");
            rig.fail("calloc");
            const outcome got = get(2);
            EXPECT_EQ(-1, got.result);
            EXPECT_EQ(0x200U, got.code);
            rig.fail("malloc", 1000);
            rig.fail("calloc", 1000);
            EXPECT_EQ(texts{"eth0"}, selected(2));
            _exit(HasFailure() ? 1 : 0);
        },
        ::testing::ExitedWithCode(0), "");
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_list_isMadeOncePerProcess) {
    NEEDS_OWN_ALLOCATOR();
    kernel.add("eth0");
    EXPECT_OUTCOME(get(2), {.result = 1});
    rig.fail_from("calloc", 2); // one is for sorting; a list made anew would be another
    EXPECT_OUTCOME(get(2), {.result = 1});
}

TEST_F(net_get_interface_info, KLIBNetGetInterfaceInfo_realInterfaces_areRead) {
    rig.answer_ioctl({});
    rig.redirect("/proc/net/dev", "/proc/net/dev");
    shell("ip link add kv0 type veth peer name kv1 && ip addr add 10.99.1.7/24 dev kv0 && ip link set kv0 up");
    const outcome got = get(2);
    const texts found = names(got.result);
    const auto at = std::find(found.begin(), found.end(), "kv0");
    ASSERT_NE(found.end(), at);
    EXPECT_EQ(found.end(), std::find(found.begin(), found.end(), "kv1")); // down
    EXPECT_EQ(found.end(), std::find(found.begin(), found.end(), "lo"));
    const IFINFO &record = records[at - found.begin()];
    EXPECT_STREQ("10.99.1.7", record.szIP);
    EXPECT_STREQ("255.255.255.0", record.szMask);
    EXPECT_EQ(0U, record.nLink);
    EXPECT_NE(0U, record.nFlags & IFF_UP);
    shell("ip link add kbr0 type bridge && ip link set kv0 master kbr0");
    const outcome enslaved = get(2);
    const texts left = names(enslaved.result);
    EXPECT_EQ(left.end(), std::find(left.begin(), left.end(), "kv0"));
    shell("ip link del kv0 && ip link del kbr0");
}
