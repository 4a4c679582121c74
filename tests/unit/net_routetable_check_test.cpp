#include "support/fake_kernel.h"
#include "support/memory.h"

#include <kovanetsdk/routing.h>
#include <numeric>

using namespace kova_test;

namespace {

const texts kOneQuestion{"+0x105", "+0x105", "-0x100", "-0x100"}; // its own lock around one interface's DHCP question
const texts kNoQuestion{"+0x105", "-0x100"};

std::string deleted(const std::string &name, const std::string &network) {
    return "/sbin/ip route del " + network + ".0/24 dev " + name + " src " + network + ".10";
}

} // namespace

class net_routetable_check : public unit_test {
protected:
    outcome check() {
        return rig.observe([] { return NetRoutetableCheck(); });
    }
    void add(const std::string &name, const std::string &network, unsigned flags) {
        kernel.add(name, {.flags = flags});
        write_file(ifcfg(name), "BOOTPROTO=static\nIPADDR=" + network + ".10\nNETMASK=255.255.255.0\n");
    }
    static outcome told(const std::string &text, const texts &locks = kNoQuestion) {
        return {.result = -1, .log = {"ERR net_routetable_check:N " + text}, .locks = locks};
    }

    static constexpr unsigned kLinked = IFF_UP | IFF_RUNNING;
    static constexpr unsigned kUnlinked = IFF_UP;
    fake_kernel kernel{rig};
};

TEST_F(net_routetable_check, NetRoutetableCheck_interfaceWithoutLink_losesItsRoute) {
    add("eth0", "10.0.0", kLinked);
    add("eth1", "10.0.1", kUnlinked);
    EXPECT_OUTCOME(check(), {.commands = {deleted("eth1", "10.0.1")}, .locks = kOneQuestion});
}

TEST_F(net_routetable_check, NetRoutetableCheck_everyInterfaceWithoutLink_isClearedInOrder) {
    add("eth0", "10.0.0", kUnlinked);
    add("eth1", "10.0.1", kLinked);
    add("eth2", "10.0.2", kUnlinked);
    EXPECT_OUTCOME(check(), {.commands = {deleted("eth0", "10.0.0"), deleted("eth2", "10.0.2")},
                             .locks = {"+0x105", "+0x105", "-0x100", "+0x105", "-0x100", "-0x100"}});
}

TEST_F(net_routetable_check, NetRoutetableCheck_everyInterfaceLinked_changesNothing) {
    add("eth0", "10.0.0", kLinked);
    add("eth1", "10.0.1", kLinked);
    EXPECT_OUTCOME(check(), {.locks = kNoQuestion});
}

TEST_F(net_routetable_check, NetRoutetableCheck_singleInterface_isLeftAlone) {
    add("eth0", "10.0.0", kUnlinked);
    kernel.add("lo", {.flags = IFF_UP | IFF_LOOPBACK});
    add("eth1", "10.0.1", 0); // down
    EXPECT_OUTCOME(check(), {.locks = kNoQuestion});
}

TEST_F(net_routetable_check, NetRoutetableCheck_noInterface_fails) {
    kernel.add("lo", {.flags = IFF_UP | IFF_LOOPBACK});
    EXPECT_OUTCOME(check(), told("No interface."));
}

TEST_F(net_routetable_check, NetRoutetableCheck_interfacesThatCannotBeListed_fails) {
    add("eth0", "10.0.0", kUnlinked);
    add("eth1", "10.0.1", kUnlinked);
    rig.fail("socket");
    const outcome got = check();
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x3400U, got.code);
    EXPECT_EQ("ERR net_routetable_check:N Get interface info fail.", got.log.back());
    EXPECT_EQ(texts{}, got.commands);
    EXPECT_EQ(kNoQuestion, got.locks);
}

TEST_F(net_routetable_check, NetRoutetableCheck_withoutMemory_fails) {
    NEEDS_OWN_ALLOCATOR();
    add("eth0", "10.0.0", kUnlinked);
    add("eth1", "10.0.1", kUnlinked);
    rig.fail("calloc");
    EXPECT_OUTCOME(check(), told("malloc fail"));
}

TEST_F(net_routetable_check, NetRoutetableCheck_configurationLockedElsewhere_fails) {
    add("eth0", "10.0.0", kUnlinked);
    add("eth1", "10.0.1", kUnlinked);
    const lock_elsewhere other{0x106};
    outcome got = check();
    EXPECT_NEAR(5000, std::accumulate(got.sleeps.begin(), got.sleeps.end(), 0L), 100);
    got.sleeps.clear();
    EXPECT_OUTCOME(
        got, {.result = -1, .code = 0x400, .unit = "named_lock", .log = {"ERR net_routetable_check:N lock fail(400)"}});
}

TEST_F(net_routetable_check, NetRoutetableCheck_readerElsewhere_doesNotMatter) {
    add("eth0", "10.0.0", kUnlinked);
    add("eth1", "10.0.1", kLinked);
    const lock_elsewhere other{0x105};
    EXPECT_OUTCOME(check(), {.commands = {deleted("eth0", "10.0.0")}, .locks = kOneQuestion});
}

TEST_F(net_routetable_check, NetRoutetableCheck_interfaceThatFails_endsIt) {
    add("eth0", "10.0.0", kUnlinked);
    add("eth1", "10.0.1", kUnlinked);
    add("eth2", "10.0.2", kUnlinked);
    write_file(ifcfg("eth1"), "BOOTPROTO=dhcp\n");
    EXPECT_OUTCOME(check(), {.result = -1,
                             .log = {"ERR net_routetable_handler:N /etc/dhclient/ipv4/dhcpcd-eth1.info is not exist",
                                     "ERR net_routetable_check:N NetRoutetableHandler clear [eth1] route table fail"},
                             .commands = {deleted("eth0", "10.0.0")},
                             .locks = {"+0x105", "+0x105", "-0x100", "+0x105", "-0x100", "-0x100"}});
}

TEST_F(net_routetable_check, NetRoutetableCheck_routeThatCannotBeDeleted_doesNotEndIt) {
    add("eth0", "10.0.0", kUnlinked);
    add("eth1", "10.0.1", kUnlinked);
    rig.answer("/sbin/ip", 2);
    rig.answer("/sbin/route", 7);
    const outcome got = check();
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(4U, got.commands.size());
    EXPECT_EQ(4U, got.log.size());
}

TEST_F(net_routetable_check, NetRoutetableCheck_lease_isCleared) {
    add("eth0", "10.0.0", kLinked);
    add("eth1", "10.0.1", kUnlinked);
    write_file(ifcfg("eth1"), "BOOTPROTO=dhcp\n");
    write_file("/etc/dhclient/ipv4/dhcpcd-eth1.info", "IPADDR=10.0.1.10\nNETMASK=255.255.255.0\n");
    EXPECT_OUTCOME(check(), {.commands = {deleted("eth1", "10.0.1")}, .locks = kOneQuestion});
}

TEST_F(net_routetable_check, NetRoutetableCheck_pointToPointLinkWithoutLink_isPassedOver) {
    add("eth0", "10.0.0", kLinked);
    kernel.add("ppp0", {.flags = IFF_UP | IFF_POINTOPOINT}); // listed, but not of the kind that has subnet routes
    EXPECT_OUTCOME(check(), {.code = 0xBC00, .unit = "net_is_dev_type_match", .locks = kNoQuestion});
}

TEST_F(net_routetable_check, NetRoutetableCheck_moreThanThirtyTwo_looksAtTheFirst) {
    for (int i = 10; i < 50; ++i) {
        add("eth" + std::to_string(i), "10.0." + std::to_string(i), kUnlinked);
    }
    const outcome got = check();
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(32U, got.commands.size());
    EXPECT_EQ(deleted("eth41", "10.0.41"), got.commands.back());
}

TEST_F(net_routetable_check, NetRoutetableCheck_lock_isGivenBack) {
    add("eth0", "10.0.0", kUnlinked);
    add("eth1", "10.0.1", kUnlinked);
    check();
    const lock_elsewhere other{0x106}; // expects to get it
}
