#include "support/memory.h"
#include "support/rig.h"

#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

std::string subnet(const std::string &ifname, int number) {
    return "/etc/dhcpd/dhcpd-" + ifname + "-subnet" + std::to_string(number) + ".conf";
}

/** A fragment with such a range. */
void write_range(const std::string &ifname, int number, const std::string &range) {
    write_file(subnet(ifname, number), "interface=" + ifname + "\ndhcp-range=" + range + "\n");
}

/** An interface that serves one subnet. */
void serve(const std::string &ifname, const std::string &start, const std::string &mask) {
    write_file("/etc/dhcpd/dhcpd-" + ifname + ".info", "enable=\"yes\"\n");
    write_range(ifname, 0, "set:" + ifname + "0," + start + "," + start + "," + mask + ",86400");
}

std::string wrong_key(int number) {
    return "ERR dhcp_range:N Wrong dhcp-range key in subnet [" + std::to_string(number) + "] in interface [eth0]";
}

std::string no_range(int number) {
    return "ERR dhcp_range:N Failed to get dhcp ranges from subnet [" + std::to_string(number) +
           "] in interface [eth0]";
}

} // namespace

class dhcp_range : public unit_test {
protected:
    /** Reads the ranges and notes them as "start end netmask". */
    outcome ranges(const char *ifname) {
        found.clear();
        return rig.observe([&]() -> long {
            DHCP_RANGE *head = nullptr;
            const int count = DHCPGetInterfaceRanges(ifname, &head);
            for (const DHCP_RANGE *range = head; range != nullptr; range = range->next) {
                found.push_back(std::string(range->start) + " " + range->end + " " + range->netmask);
            }
            DHCPRangeFree(head);
            return count;
        });
    }
    outcome conflict(const char *ifname, const char *start, const char *mask, const char *end = "x") {
        return rig.observe([&] { return DHCPIsRangeConflict(ifname, start, end, mask, other, sizeof other); });
    }

    texts found;
    char other[16] = "untouched";
};

TEST_F(dhcp_range, DHCPGetInterfaceRanges_withoutSubnets_isZero) {
    EXPECT_OUTCOME(ranges("eth0"), {.result = 0});
    write_range("eth0", 1, "set:eth01,10.0.0.1,10.0.0.9,255.0.0.0,60");
    EXPECT_OUTCOME(ranges("eth0"), {.result = 0});
    EXPECT_EQ(texts{}, found);
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_subnets_areReadUpToTheFirstGap) {
    write_range("eth0", 0, "set:eth00,10.0.0.1,10.0.0.9,255.0.0.0,60");
    write_range("eth0", 1, "set:eth01,192.168.100.100,192.168.100.200,255.255.255.240,60");
    write_range("eth0", 3, "set:eth03,10.3.0.1,10.3.0.9,255.0.0.0,60");
    write_range("eth1", 2, "set:eth12,10.4.0.1,10.4.0.9,255.0.0.0,60");
    EXPECT_OUTCOME(ranges("eth0"), {.result = 2});
    EXPECT_EQ((texts{"10.0.0.1 10.0.0.9 255.0.0.0", "192.168.100.100 192.168.100.200 255.255.255.240"}), found);
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_manySubnets_areAllRead) {
    for (int i = 0; i < 120; ++i) {
        write_range("eth0", i, "set:t,10.0.0." + std::to_string(i) + ",10.0.1.0,255.0.0.0,60");
    }
    EXPECT_OUTCOME(ranges("eth0"), {.result = 120});
    EXPECT_EQ("10.0.0.119 10.0.1.0 255.0.0.0", found.back());
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_leaseTagAndNetmask_areNotChecked) {
    write_range("eth0", 0, ",0.0.0.0,0.0.0.0,nonsense of a mask,");
    write_range("eth0", 1, "x,255.255.255.254,255.255.255.255,1,infinite");
    EXPECT_OUTCOME(ranges("eth0"), {.result = 2});
    EXPECT_EQ((texts{"0.0.0.0 0.0.0.0 nonsense of a m", "255.255.255.254 255.255.255.255 1"}), found);
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_missingOrEmptyKey_fails) {
    for (const std::string &content :
         {std::string(), std::string("interface=eth0\n"), std::string("dhcp-range=\n"), std::string("#dhcp-range=a\n"),
          std::string("dhcp-range\n"), std::string("\0\xff\0dhcp-range=a\n", 16), long_text(4096)}) {
        write_file(subnet("eth0", 0), content);
        EXPECT_OUTCOME(ranges("eth0"), {.result = -1, .log = {no_range(0)}});
    }
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_unreadableFragment_fails) {
    shell("mkdir -p " + subnet("eth0", 0));
    EXPECT_OUTCOME(ranges("eth0"), {.result = -1, .code = 0x900, .unit = "key_value", .log = {no_range(0)}});
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_otherNumberOfFields_fails) {
    for (const std::string &range :
         texts{"set:t", "set:t,10.0.0.1,10.0.0.9,255.0.0.0", "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60,",
               "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60,x", "set:t,::,constructor:eth0,ra-only,64,60", ",,,,", ",,,,,",
               "set:t,,10.0.0.9,255.0.0.0,60", "set:t,10.0.0.1,,255.0.0.0,60", "set:t,10.0.0.1,10.0.0.9,,60",
               "set:" + long_text(1023) + ",10.0.0.1,10.0.0.9,255.0.0.0,60"}) {
        write_range("eth0", 0, range);
        EXPECT_OUTCOME(ranges("eth0"), {.result = -1, .log = {wrong_key(0)}});
    }
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_addresses_haveToBeAddresses) {
    const std::vector<std::pair<std::string, std::string>> pairs{{"10.0.0", "10.0.0.9"},
                                                                 {"10.0.0.1", "10.0.0.256"},
                                                                 {"::1", "::a"},
                                                                 {"a", "b"},
                                                                 {" 10.0.0.1", "10.0.0.9"},
                                                                 {"10.0.0.1", long_text(100, '1')},
                                                                 {"%s%n", "10.0.0.9"},
                                                                 {"10.0.0.1", "10.0.0.9/24"}};
    for (const auto &[start, end] : pairs) {
        write_range("eth0", 0, "set:t," + start + "," + end + ",255.0.0.0,60");
        EXPECT_OUTCOME(
            ranges("eth0"),
            {.result = -1,
             .log = {"ERR dhcp_range:N Failed to convert IPs [" + start + ", " + end + "] to in_addr", wrong_key(0)}});
    }
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_startBehindEnd_fails) {
    write_range("eth0", 0, "set:t,10.0.0.9,10.0.0.9,255.0.0.0,60");
    EXPECT_OUTCOME(ranges("eth0"), {.result = 1});
    write_range("eth0", 0, "set:t,10.0.0.10,10.0.0.9,255.0.0.0,60");
    EXPECT_OUTCOME(ranges("eth0"), {.result = -1, .log = {wrong_key(0)}});
    write_range("eth0", 0, "set:t,200.0.0.1,100.0.0.1,255.0.0.0,60"); // above half of all addresses
    EXPECT_OUTCOME(ranges("eth0"), {.result = -1, .log = {wrong_key(0)}});
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_laterFailure_givesNothingBack) {
    write_range("eth0", 0, "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60");
    write_range("eth0", 1, "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60");
    write_range("eth0", 2, "set:t");
    EXPECT_OUTCOME(ranges("eth0"), {.result = -1, .log = {wrong_key(2)}});
    EXPECT_EQ(texts{}, found);
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_badStorage_isRefused) {
    const texts log{"ERR dhcp_range:N Wrong dhcp range storage"};
    write_range("eth0", 0, "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60");
    DHCP_RANGE used{};
    DHCP_RANGE *head = &used;
    EXPECT_OUTCOME(rig.observe([] { return DHCPGetInterfaceRanges("eth0", nullptr); }), {.result = -1, .log = log});
    EXPECT_OUTCOME(rig.observe([&] { return DHCPGetInterfaceRanges("eth0", &head); }), {.result = -1, .log = log});
    EXPECT_EQ(&used, head);
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_badNames_areRefused) {
    EXPECT_OUTCOME(ranges(nullptr), {.result = -1, .log = {"ERR dhcp_range:N Wrong interface name [(null)]"}});
    EXPECT_OUTCOME(ranges(""), {.result = -1, .log = {"ERR dhcp_range:N Wrong interface name []"}});
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(ranges(name.c_str()),
                       {.result = -1, .log = {"ERR dhcp_range:N Wrong interface name [" + name + "]"}});
    }
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_unusualNames_areReadLikeOthers) {
    for (const std::string &name : texts{"eth0.10", "a-b", "-", "%s%n", "ovs_bond0", long_text(235)}) {
        write_range(name, 0, "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60");
        EXPECT_OUTCOME(ranges(name.c_str()), {.result = 1});
    }
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_noMemory_fails) {
    write_range("eth0", 0, "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60");
    write_range("eth0", 1, "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60");
    const texts log{"ERR dhcp_range:N KLIBCSzListAlloc() failed"};
    rig.fail("KLIBCSzListAlloc", 2);
    EXPECT_OUTCOME(ranges("eth0"), {.result = -1, .code = 0x200, .unit = "platform", .log = log});
    rig.fail("KLIBCSzListPush", 9);
    EXPECT_OUTCOME(ranges("eth0"), {.result = -1, .code = 0x200, .unit = "platform", .log = log});
    EXPECT_EQ(texts{}, found);
}

TEST_F(dhcp_range, DHCPGetInterfaceRanges_noMemoryForARange_fails) {
    NEEDS_OWN_ALLOCATOR();
    write_range("eth0", 0, "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60");
    rig.fail("malloc");
    EXPECT_OUTCOME(ranges("eth0"), {.result = -1, .log = {"ERR dhcp_range:N malloc() failed"}});
}

TEST_F(dhcp_range, DHCPRangeFree_nothing_isAllowed) {
    EXPECT_OUTCOME(rig.observe([] {
        DHCPRangeFree(nullptr);
        return 0;
    }),
                   {});
}

TEST_F(dhcp_range, DHCPIsRangeConflict_otherInterfacesSubnets_areCompared) {
    struct row {
        const char *start, *mask, *served, *served_mask;
        int expected;
    };
    for (const row &each : std::vector<row>{
             {"192.168.1.10", "255.255.255.0", "192.168.1.200", "255.255.255.0", 1}, // the same
             {"192.168.0.1", "255.255.0.0", "192.168.5.1", "255.255.255.0", 1},      // inside
             {"192.168.5.1", "255.255.255.0", "192.168.0.1", "255.255.0.0", 1},      // around
             {"192.168.0.1", "255.255.0.0", "192.168.0.1", "255.255.255.0", 1},      // inside, first addresses equal
             {"192.168.0.1", "255.255.0.0", "192.168.255.1", "255.255.255.0", 1},    // inside, last addresses equal
             {"10.0.1.1", "255.255.255.0", "10.0.2.1", "255.255.255.0", 0},
             {"10.0.2.1", "255.255.255.0", "10.0.1.1", "255.255.255.0", 0},
             {"10.0.0.1", "255.255.255.255", "10.0.0.1", "255.255.255.255", 1},
             {"10.0.0.1", "255.255.255.255", "10.0.0.2", "255.255.255.255", 0},
             {"1.2.3.4", "0.0.0.0", "200.1.1.1", "255.255.255.0", 1},
             {"0.0.0.0", "128.0.0.0", "200.1.1.1", "255.255.255.0", 0},
             {"10.0.0.1", "255.0.255.0", "10.0.0.1", "255.255.0.0", 1}, // masks with a hole, by the same operations
             {"10.0.5.1", "255.0.255.0", "10.0.0.1", "255.255.0.0", 0},
         }) {
        serve("eth1", each.served, each.served_mask);
        EXPECT_OUTCOME(conflict("eth0", each.start, each.mask), {.result = each.expected});
        EXPECT_STREQ(each.expected == 1 ? "eth1" : "", other) << each.start << " " << each.served;
    }
}

TEST_F(dhcp_range, DHCPIsRangeConflict_ownSubnets_areNotCompared) {
    serve("eth0", "10.0.0.1", "255.0.0.0");
    EXPECT_OUTCOME(conflict("eth0", "10.0.0.1", "255.0.0.0"), {.result = 0});
    EXPECT_STREQ("", other);
    EXPECT_OUTCOME(conflict("eth", "10.0.0.1", "255.0.0.0"), {.result = 1});
    EXPECT_STREQ("eth0", other);
}

TEST_F(dhcp_range, DHCPIsRangeConflict_firstConflict_isNamed) {
    serve("eth3", "10.0.0.1", "255.0.0.0");
    serve("eth2", "10.0.0.1", "255.0.0.0");
    serve("eth1", "172.16.0.1", "255.240.0.0");
    write_range("eth1", 1, "set:t,10.9.9.9,10.9.9.9,255.255.255.255,60"); // its second subnet
    EXPECT_OUTCOME(conflict("eth0", "10.1.1.1", "255.0.0.0"), {.result = 1});
    EXPECT_STREQ("eth1", other);
    EXPECT_OUTCOME(conflict("eth1", "10.1.1.1", "255.0.0.0"), {.result = 1});
    EXPECT_STREQ("eth2", other);
}

TEST_F(dhcp_range, DHCPIsRangeConflict_nothingServed_isNoConflict) {
    EXPECT_OUTCOME(conflict("eth0", "10.0.0.1", "255.0.0.0"), {.result = 0});
    write_range("eth1", 0, "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60"); // without the interface's info file
    EXPECT_OUTCOME(conflict("eth0", "10.0.0.1", "255.0.0.0"), {.result = 0});
    write_file("/etc/dhcpd/dhcpd6-eth1.info", "enable=\"yes\"\n");
    EXPECT_OUTCOME(conflict("eth0", "10.0.0.1", "255.0.0.0"), {.result = 0});
    write_file("/etc/dhcpd/dhcpd-eth1.info", "enable=\"no\"\n"); // whether it is on does not matter
    EXPECT_OUTCOME(conflict("eth0", "10.0.0.1", "255.0.0.0"), {.result = 1});
}

TEST_F(dhcp_range, DHCPIsRangeConflict_nameOfTheOther_isCutOrLeftOut) {
    serve("bond0", "10.0.0.1", "255.0.0.0");
    const auto ask = [&](char *name, unsigned size) {
        return rig.observe(
            [&, name, size] { return DHCPIsRangeConflict("eth0", "10.0.0.1", "x", "255.0.0.0", name, size); });
    };
    EXPECT_OUTCOME(ask(nullptr, 0), {.result = 1});
    EXPECT_OUTCOME(ask(nullptr, 16), {.result = 1});
    EXPECT_OUTCOME(ask(other, 4), {.result = 1});
    EXPECT_EQ(std::string("bon\0uched", 9), std::string(other, 9));
    EXPECT_OUTCOME(ask(other, 1), {.result = 1});
    EXPECT_STREQ("", other);
    EXPECT_OUTCOME(ask(other, 6), {.result = 1});
    EXPECT_STREQ("bond0", other);
}

TEST_F(dhcp_range, DHCPIsRangeConflict_whatIsNoAddress_isLoggedAndPassedOver) {
    serve("eth1", "10.0.0.1", "no mask");
    write_range("eth1", 1, "set:t,10.0.0.1,10.0.0.9,255.0.0.0,60");
    EXPECT_OUTCOME(
        conflict("eth0", "10.0.0.1", "255.0.0.0"),
        {.result = 1,
         .log = {"ERR dhcp_range:N Failed to convert IPs [10.0.0.1, 10.0.0.1, 255.0.0.0, no mask] to in_addr"}});
    const std::vector<std::pair<std::string, std::string>> candidates{
        {"10.0.0", "255.0.0.0"}, {"10.0.0.1", "8"}, {"::1", "255.0.0.0"}, {long_text(200), "%s%n"}};
    for (const auto &[start, mask] : candidates) {
        const std::string line = "ERR dhcp_range:N Failed to convert IPs [" + start + ", 10.0.0.1, " + mask + ", ";
        EXPECT_OUTCOME(conflict("eth0", start.c_str(), mask.c_str()),
                       {.result = 0, .log = {line + "no mask] to in_addr", line + "255.0.0.0] to in_addr"}});
    }
}

TEST_F(dhcp_range, DHCPIsRangeConflict_badArguments_areRefused) {
    serve("eth1", "10.0.0.1", "255.0.0.0");
    const outcome refused{.result = -1, .log = {"ERR dhcp_range:N Parameters error"}};
    for (const char *bad : {static_cast<const char *>(nullptr), ""}) {
        EXPECT_OUTCOME(conflict(bad, "10.0.0.1", "255.0.0.0"), refused);
        EXPECT_OUTCOME(conflict("eth0", bad, "255.0.0.0"), refused);
        EXPECT_OUTCOME(conflict("eth0", "10.0.0.1", bad), refused);
        EXPECT_OUTCOME(conflict("eth0", "10.0.0.1", "255.0.0.0", bad), refused);
    }
    EXPECT_OUTCOME(rig.observe([&] { return DHCPIsRangeConflict("eth0", "10.0.0.1", "x", "255.0.0.0", other, 0); }),
                   refused);
    EXPECT_STREQ("untouched", other);
}

TEST_F(dhcp_range, DHCPIsRangeConflict_failedList_fails) {
    serve("eth1", "10.0.0.1", "255.0.0.0");
    rig.fail("KLIBCFileEnumDir");
    EXPECT_OUTCOME(
        conflict("eth0", "10.0.0.1", "255.0.0.0"),
        {.result = -1,
         .code = 0x900,
         .unit = "platform",
         .log = {"ERR dhcp_interface_list_get:N glob() error", "ERR dhcp_range:N Failed to get interface list"}});
    EXPECT_STREQ("", other);
    rig.fail("KLIBCSzListGet", 4); // the first are of the files
    EXPECT_OUTCOME(conflict("eth0", "10.0.0.1", "255.0.0.0"),
                   {.result = -1, .log = {"ERR dhcp_range:N Failed to get interface from interface list"}});
}

TEST_F(dhcp_range, DHCPIsRangeConflict_nameThatNoInterfaceHas_isPassedOver) {
    write_file("/etc/dhcpd/dhcpd-my eth.info", "enable=\"yes\"\n");
    serve("eth1", "10.0.0.1", "255.0.0.0");
    EXPECT_OUTCOME(conflict("eth0", "192.168.0.1", "255.255.255.0"), {.result = 0});
    EXPECT_OUTCOME(conflict("eth0", "10.0.0.1", "255.0.0.0"), {.result = 1});
}

TEST_F(dhcp_range, DHCPIsRangeConflict_otherInterfaceThatCannotBeRead_fails) {
    serve("eth1", "10.0.0.1", "255.0.0.0");
    write_file("/etc/dhcpd/dhcpd-eth2.info", "");
    write_file(subnet("eth2", 0), "");
    EXPECT_OUTCOME(conflict("eth0", "192.168.0.1", "255.255.255.0"),
                   {.result = -1,
                    .log = {"ERR dhcp_range:N Failed to get dhcp ranges from subnet [0] in interface [eth2]",
                            "ERR dhcp_range:N Failed to get DHCP ranges for interface [eth2]"}});
    EXPECT_OUTCOME(conflict("eth0", "10.0.0.1", "255.0.0.0"), {.result = 1}); // found before it is looked at
    EXPECT_OUTCOME(conflict("eth2", "192.168.0.1", "255.255.255.0"), {.result = 0});
}
