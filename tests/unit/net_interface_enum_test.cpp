#include "support/fake_kernel.h"
#include "support/memory.h"

#include <cerrno>
#include <climits>
#include <kovanetsdk/iface.h>

using namespace kova_test;

namespace {

constexpr unsigned kUp = IFF_UP | IFF_RUNNING;

} // namespace

class net_interface_enum : public unit_test {
protected:
    outcome get(int kind, int capacity = 32) {
        return rig.observe([&] { return KLIBNetInterfaceEnum(records, capacity, kind); });
    }
    texts selected(int kind) {
        const outcome got = get(kind);
        EXPECT_OUTCOME(got, {.result = got.result});
        texts found;
        for (long i = 0; i < got.result; ++i) {
            found.emplace_back(records[i].szIfname);
        }
        return found;
    }
    static outcome refused(const std::string &condition) { return refusal("net_interface_enum", condition); }

    fake_kernel kernel{rig};
    IFINFO records[40] = {};
};

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_all_excludesLoopbackAndBondMembersOnly) {
    kernel.load_vlan_module();
    kernel.add("bond0", {.flags = kUp | IFF_MASTER});
    kernel.add("down0", {.flags = 0});
    kernel.add("eth0", {.flags = kUp | IFF_SLAVE});
    kernel.add("eth1");
    kernel.add("eth1.5", {.row_device = "eth1"});
    kernel.add("gbr0");
    kernel.add("gwlan0");
    kernel.add("lo", {.flags = kUp | IFF_LOOPBACK});
    kernel.add("ppp0", {.flags = kUp | IFF_POINTOPOINT});
    EXPECT_EQ((texts{"bond0", "eth1", "eth1.5", "gbr0", "gwlan0", "ppp0"}), selected(0));
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_record_isWhole) {
    kernel.add("eth0", {.flags = kUp, .ip = "10.0.0.1", .mask = "255.0.0.0", .last_mac_byte = 9});
    EXPECT_OUTCOME(get(0), {.result = 1});
    EXPECT_STREQ("eth0", records[0].szIfname);
    EXPECT_STREQ("10.0.0.1", records[0].szIP);
    EXPECT_STREQ("255.0.0.0", records[0].szMask);
    EXPECT_EQ(9, records[0].abMac[5]);
    EXPECT_EQ(2U, records[0].nLink);
    EXPECT_EQ(kUp, records[0].nFlags);
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_switchName_hasItsOwnRunningFlag) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    kernel.add("eth0", {.flags = IFF_UP});
    kernel.add("ovs_eth0", {.flags = kUp});
    EXPECT_OUTCOME(get(0), {.result = 2});
    EXPECT_EQ(2U, records[1].nLink);
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_kinds_filterByLocalLan) {
    for (const char *name : {"eth0", "eth1", "eth2", "eth3"}) {
        kernel.add(name);
    }
    write_file(ifcfg("eth0"), "LOCAL_LAN=\"yes\"\n");
    write_file(ifcfg("eth1"), "LOCAL_LAN=YES\n");
    write_file(ifcfg("eth2"), "LOCAL_LAN=yes\n");
    rig.observe([] { return KLIBNetIFIsLocalLan("eth0"); });
    const outcome others = get(1); // eth3 has no file: the read leaves its code, and that is no failure
    EXPECT_EQ(2, others.result);
    EXPECT_EQ(texts{}, others.log);
    EXPECT_STREQ("eth1", records[0].szIfname);
    EXPECT_STREQ("eth3", records[1].szIfname);
    EXPECT_EQ(2, get(2).result);
    EXPECT_STREQ("eth0", records[0].szIfname);
    EXPECT_STREQ("eth2", records[1].szIfname);
    EXPECT_EQ(4, get(0).result);
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_cluster_dropsHeartbeatAndShowsItsAddresses) {
    kernel.add("eth0", {.ip = "10.0.0.1", .mask = "255.0.0.0"});
    kernel.add("eth1");
    kernel.add("eth2");
    write_file("/etc/kova/platform.conf",
               "ha_running=yes\nha_heartbeat_if=eth1\nha_ip_eth0=172.16.0.9\nha_mask_eth0=255.255.0.0\n");
    EXPECT_EQ((texts{"eth0", "eth2"}), selected(0));
    EXPECT_STREQ("10.0.0.1", records[0].szIP);
    EXPECT_EQ(texts{"eth0"}, selected(0x10));
    EXPECT_STREQ("172.16.0.9", records[0].szIP);
    EXPECT_STREQ("255.255.0.0", records[0].szMask);
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_activeNodeWithoutAddresses_isNoted) {
    kernel.add("eth0");
    write_file("/etc/kova/platform.conf", "ha_running=yes\nha_active=yes\nha_heartbeat_if=eth9\n");
    EXPECT_OUTCOME(get(0x10),
                   {.result = 0, .log = {"INFO net_interface_enum:N HA is running but HA IP not ready (0)"}});
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_membersOfBridgesAndSwitchBonds_areSkipped) {
    kernel.add("eth0");
    kernel.add("eth1");
    kernel.add("eth2");
    rig.replace_file("/sys/class/net/eth0/brport", "");
    rig.replace_file("/sys/class/net/kova_ovs_bonds", "ovs_bond0 eth1\n");
    EXPECT_EQ(texts{"eth2"}, selected(0));
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_capacity_boundsTheRecords) {
    kernel.add("eth0");
    kernel.add("eth1");
    EXPECT_OUTCOME(get(0, 0), {.result = 0});
    EXPECT_OUTCOME(get(0, 1), {.result = 1});
    EXPECT_OUTCOME(get(0, INT_MAX), {.result = 2});
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetInterfaceEnum(nullptr, 32, 0); }), {.result = 2});
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_badArguments_areRefused) {
    EXPECT_OUTCOME(get(0, -1), refused("0 <= capacity"));
    EXPECT_OUTCOME(get(0, INT_MIN), refused("0 <= capacity"));
    EXPECT_OUTCOME(get(3), refused("0 <= selector && selector <= 2"));
    EXPECT_OUTCOME(get(-1), refused("0 <= selector && selector <= 2"));
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_interfaceThatVanishes_isLeftOut) {
    for (const unsigned long request : {SIOCGIFFLAGS, SIOCGIFHWADDR, SIOCGIFADDR, SIOCGIFNETMASK}) {
        kernel.add("eth0", {.ip = "10.0.0.1", .mask = "255.0.0.0", .failing = {{request, ENODEV}}});
        kernel.add("eth1");
        EXPECT_EQ(texts{"eth1"}, selected(0));
    }
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_unreadableList_fails) {
    rig.hide("/proc/net/dev");
    EXPECT_OUTCOME(get(0), {.result = -1,
                            .code = 0x900,
                            .unit = "net_stat_init",
                            .log = {"ERR net_interface_enum:N Failed to list interfaces, kovaerr=[0x0900]"}});
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_noSocket_is3400) {
    kernel.add("eth0");
    rig.fail("socket");
    EXPECT_OUTCOME(get(0), {.result = -1,
                            .code = 0x3400,
                            .unit = "net_interface_enum",
                            .log = {"ERR net_interface_enum:N Cannot open control socket"}});
}

TEST_F(net_interface_enum, KLIBNetInterfaceEnum_noMemory_is200) {
    NEEDS_OWN_ALLOCATOR();
    kernel.add("eth0");
    rig.fail("malloc");
    rig.fail("calloc");
    EXPECT_OUTCOME(get(0), {.result = -1,
                            .code = 0x200,
                            .unit = "net_interface_enum",
                            .log = {"ERR net_interface_enum:N Failed to alloc memory."}});
}
