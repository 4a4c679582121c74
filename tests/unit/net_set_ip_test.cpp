#include "support/fake_kernel.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

namespace {

const std::string kList = "/proc/net/if_inet6";

struct net_set_ip : unit_test {
    /** The interface's IPv6 addresses, as lines of the kernel's list. */
    void give_ipv6(const texts &lines) {
        std::string list;
        for (const std::string &line : lines) {
            list += line + "\n";
        }
        rig.replace_file(kList, list);
    }

    outcome set(const char *szFamily, const char *szIP, int prefix, const char *szAction) {
        return rig.observe([=] { return KOVANetSetIP(szFamily, "eth0", szIP, prefix, szAction); });
    }

    fake_kernel kernel{rig};
    fake_interface &eth0 = kernel.add("eth0", {.ip = "192.168.1.10", .mask = "255.255.255.0"});
};

const std::string kTakeDown = "/sbin/ifconfig eth0 0.0.0.0";
const std::string kRefresh = "/usr/kova/sbin/kovanetdtool --refresh-static-route-rules -4";

std::string ipv4_event(const std::string &old_ip, const std::string &new_ip, const std::string &link = "true") {
    return "net/ipv4_change 4 IFNAME=eth0 ORIGIN_ADDRESS=" + old_ip + " NEW_ADDRESS=" + new_ip +
           " PREFIX_LENGTH=-1 IS_LINK=" + link;
}

} // namespace

// ---- arguments

TEST_F(net_set_ip, KOVANetSetIP_missing_argument_is_refused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetSetIP(nullptr, "eth0", "10.0.0.1", 8, "add"); }),
                   refusal("net_set_ip", "((void *)0) != szFamily"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetSetIP("-4", nullptr, "10.0.0.1", 8, "add"); }),
                   refusal("net_set_ip", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetSetIP("-4", "", "10.0.0.1", 8, "add"); }),
                   refusal("net_set_ip", "'\\0' != *szIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetSetIP("-4", "eth0", "10.0.0.1", 8, nullptr); }),
                   refusal("net_set_ip", "((void *)0) != szAction"));
    for (const char *szAction : {"add", "del"}) {
        for (const char *szFamily : {"-4", "-6"}) {
            EXPECT_OUTCOME(set(szFamily, nullptr, 8, szAction), refusal("net_set_ip", "((void *)0) != szIP"));
        }
    }
}

TEST_F(net_set_ip, KOVANetSetIP_name_that_is_none_is_refused) {
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetSetIP("-4", name.c_str(), "10.0.0.1", 8, "add"); }),
                       refusal("net_set_ip", "is_interface_name(szIfname)"));
    }
}

TEST_F(net_set_ip, KOVANetSetIP_unknown_action_is_told) {
    for (const std::string &action : texts{"", "ADD", "adds", "ad", "replace", "flush ", long_text(4096)}) {
        EXPECT_OUTCOME(set("-4", "10.0.0.1", 8, action.c_str()),
                       {.result = -1, .log = {"ERR net_set_ip:N action command is wrong. your action is " + action}});
    }
}

TEST_F(net_set_ip, KOVANetSetIP_unknown_family_is_told) {
    for (const std::string &family : texts{"", "4", "-44", "inet", "-5", long_text(4096)}) {
        EXPECT_OUTCOME(set(family.c_str(), "10.0.0.1", 8, "add"),
                       {.result = -1, .log = {"ERR net_set_ip:N ip type is wrong, only -4 or -6"}});
    }
}

TEST_F(net_set_ip, KOVANetSetIP_prefix_out_of_range_is_told) {
    for (const int prefix : {-2147483647 - 1, -1, 33, 129, 2147483647}) {
        EXPECT_OUTCOME(set("-4", "10.0.0.1", prefix, "add"),
                       {.result = -1, .log = {"ERR net_set_ip:N prefix length is wrong"}});
    }
    for (const int prefix : {-2147483647 - 1, -1, 129, 2147483647}) {
        EXPECT_OUTCOME(set("-6", "fe80::1", prefix, "del"),
                       {.result = -1, .log = {"ERR net_set_ip:N prefix length is wrong"}});
    }
}

TEST_F(net_set_ip, KOVANetSetIP_text_that_is_no_address_is_told) {
    const texts addresses{"",         "1.2.3",         "1.2.3.4.5",   "127.0.0.1",   "0.1.2.3",  "224.0.0.1",
                          "fe80::1",  "1.2.3.4/24",    "1.2.3.4\n",   "1.2.3.4 ",    "-1.2.3.4", "256.1.1.1",
                          "1.2.3.4;", long_text(4096), long_text(64), long_text(15), "..",       "a.b.c.d"};
    for (const std::string &address : addresses) {
        const outcome got = set("-4", address.c_str(), 24, "add");
        EXPECT_EQ(-1, got.result) << address;
        EXPECT_EQ(texts{"ERR net_set_ip:N your ip " + address + " is not valid"}, got.log);
        EXPECT_EQ(texts{}, got.commands);
        EXPECT_EQ(texts{}, got.events);
    }
}

TEST_F(net_set_ip, KOVANetSetIP_text_that_only_begins_with_an_address_is_told_and_takes_nothing_down) {
    const std::string longest = "10.0.0." + long_text(23, '0') + "1"; // 31 characters, all that the check looks at
    EXPECT_OUTCOME(set("-4", longest.c_str(), 24, "del"),
                   {.commands = {"/sbin/ip -4 address del " + longest + "/24 dev eth0"}});
    for (const std::string &rest : texts{"x", "1", ".1", long_text(28, '0'), long_text(60, '0')}) {
        const std::string address = longest + rest;
        EXPECT_OUTCOME(set("-4", address.c_str(), 24, "add"),
                       {.result = -1, .log = {"ERR net_set_ip:N your ip " + address + " is not valid"}});
    }
}

TEST_F(net_set_ip, KOVANetSetIP_longest_ipv6_text_fits) {
    give_ipv6({});
    const std::string longest = "ffff:ffff:ffff:ffff:ffff:ffff:255.255.255.255";
    EXPECT_OUTCOME(set("-6", longest.c_str(), 128, "del"),
                   {.commands = {"/sbin/ip -6 address del " + longest + "/128 dev eth0"}});
}

TEST_F(net_set_ip, KOVANetSetIP_text_that_is_no_ipv6_address_is_told) {
    give_ipv6({});
    const texts addresses{"",         "10.0.0.1",    "fe80::1::2",  "fe80::1%eth0", "fe80::1\n", "g::1", "fe80::1/129",
                          "fe80::1/", long_text(46), long_text(47), long_text(4096)};
    for (const std::string &address : addresses) {
        const outcome got = set("-6", address.c_str(), 64, "add");
        EXPECT_EQ(-1, got.result) << address;
        EXPECT_EQ(texts{"ERR net_set_ip:N your v6ip " + address + " is not valid"}, got.log);
        EXPECT_EQ(texts{}, got.commands);
        EXPECT_EQ(texts{}, got.events);
    }
}

// ---- flush

TEST_F(net_set_ip, KOVANetSetIP_flush_ignores_address_and_prefix) {
    EXPECT_OUTCOME(set("-4", nullptr, 999, "flush"), {.commands = {"/sbin/ip -4 address flush dev eth0"}});
    EXPECT_OUTCOME(set("-4", "no address", -1, "flush"), {.commands = {"/sbin/ip -4 address flush dev eth0"}});
}

TEST_F(net_set_ip, KOVANetSetIP_flush_failing_is_told) {
    rig.answer("/sbin/ip", 2);
    EXPECT_OUTCOME(set("-4", nullptr, 0, "flush"), {.result = -1,
                                                    .log = {"ERR net_flush_ip:N Failed to flush ipv4 address on [eth0]",
                                                            "ERR net_set_ip:N flush ip failed"},
                                                    .commands = {"/sbin/ip -4 address flush dev eth0"}});
}

TEST_F(net_set_ip, KOVANetSetIP_flush_comes_before_the_family) {
    EXPECT_OUTCOME(set("-5", nullptr, 0, "flush"),
                   {.result = -1,
                    .log = {"ERR net_flush_ip:N ip type is wrong, only -4 or -6", "ERR net_set_ip:N flush ip failed"}});
}

// ---- IPv4

TEST_F(net_set_ip, KOVANetSetIP_new_ipv4_address_is_announced_and_set) {
    EXPECT_OUTCOME(set("-4", "10.1.2.3", 20, "add"),
                   {.commands = {kTakeDown, "/sbin/ifconfig eth0 10.1.2.3 netmask 255.255.240.0"},
                    .events = {ipv4_event("192.168.1.10", "10.1.2.3")}});
}

TEST_F(net_set_ip, KOVANetSetIP_first_ipv4_address_is_announced_with_an_empty_origin) {
    eth0.ip = "";
    EXPECT_OUTCOME(set("-4", "10.1.2.3", 8, "add"),
                   {.commands = {kTakeDown, "/sbin/ifconfig eth0 10.1.2.3 netmask 255.0.0.0"},
                    .events = {ipv4_event("", "10.1.2.3")}});
}

TEST_F(net_set_ip, KOVANetSetIP_same_ipv4_address_refreshes_rules_without_event) {
    EXPECT_OUTCOME(set("-4", "192.168.1.10", 24, "add"),
                   {.commands = {kTakeDown, "/sbin/ifconfig eth0 192.168.1.10 netmask 255.255.255.0", kRefresh}});
}

TEST_F(net_set_ip, KOVANetSetIP_rules_not_refreshed_is_only_told) {
    rig.answer(kRefresh, 127);
    EXPECT_OUTCOME(set("-4", "192.168.1.10", 24, "add"),
                   {.log = {"ERR net_set_ip:N Failed to refresh static route rules."},
                    .commands = {kTakeDown, "/sbin/ifconfig eth0 192.168.1.10 netmask 255.255.255.0", kRefresh}});
}

TEST_F(net_set_ip, KOVANetSetIP_ipv4_prefix_at_its_bounds_passes) {
    EXPECT_OUTCOME(set("-4", "192.168.1.10", 32, "add"),
                   {.commands = {kTakeDown, "/sbin/ifconfig eth0 192.168.1.10 netmask 255.255.255.255", kRefresh}});
    EXPECT_OUTCOME(set("-4", "192.168.1.10", 1, "add"),
                   {.commands = {kTakeDown, "/sbin/ifconfig eth0 192.168.1.10 netmask 128.0.0.0", kRefresh}});
}

TEST_F(net_set_ip, KOVANetSetIP_ipv4_prefix_zero_is_told_and_passes) {
    EXPECT_OUTCOME(set("-4", "192.168.1.10", 0, "add"),
                   {.code = 0x1000,
                    .unit = "subnet_to_ip_mask",
                    .log = {"ERR net_set_ip:N translate subnet to ip/netmask failed"},
                    .commands = {kTakeDown, "/sbin/ifconfig eth0 192.168.1.10 netmask 0", kRefresh}});
}

TEST_F(net_set_ip, KOVANetSetIP_without_link_the_subnet_route_is_deleted) {
    eth0.flags = IFF_UP;
    rig.answer("/bin/ipcalc", 0, "NETWORK=10.1.0.0\n");
    EXPECT_OUTCOME(set("-4", "10.1.2.3", 16, "add"),
                   {.commands = {kTakeDown, "/sbin/ifconfig eth0 10.1.2.3 netmask 255.255.0.0",
                                 "/bin/ipcalc -n 10.1.2.3/16", "/sbin/ip -4 route del 10.1.0.0/16 dev eth0"},
                    .events = {ipv4_event("192.168.1.10", "10.1.2.3", "false")}});
}

TEST_F(net_set_ip, KOVANetSetIP_subnet_route_not_deleted_is_only_noted) {
    eth0.flags = IFF_UP;
    rig.answer("/bin/ipcalc", 0, "NETWORK=192.168.1.0\n");
    rig.answer("/sbin/ip", 2);
    EXPECT_OUTCOME(set("-4", "192.168.1.10", 24, "add"),
                   {.log = {"INFO net_set_ip:N excute cmd /sbin/ip route del 192.168.1.0/24 dev eth0 failed"},
                    .commands = {kTakeDown, "/sbin/ifconfig eth0 192.168.1.10 netmask 255.255.255.0", kRefresh,
                                 "/bin/ipcalc -n 192.168.1.10/24", "/sbin/ip -4 route del 192.168.1.0/24 dev eth0"}});
}

TEST_F(net_set_ip, KOVANetSetIP_network_not_calculated_fails) {
    eth0.flags = IFF_UP;
    rig.fail("KLIBCPopen");
    EXPECT_OUTCOME(set("-4", "192.168.1.10", 24, "add"),
                   {.result = -1,
                    .code = 0x2A00,
                    .unit = "platform",
                    .log = {"ERR net_cal_network:N excute cmd /bin/ipcalc -b 192.168.1.10/24 failed",
                            "ERR net_set_ip:N calculate Network IP failed"},
                    .commands = {kTakeDown, "/sbin/ifconfig eth0 192.168.1.10 netmask 255.255.255.0", kRefresh,
                                 "/bin/ipcalc -n 192.168.1.10/24"}});
}

TEST_F(net_set_ip, KOVANetSetIP_failing_step_of_an_ipv4_address) {
    struct step {
        std::string command;
        int status;
        std::string log;
        texts commands;
    };
    const std::string set_new = "/sbin/ifconfig eth0 10.1.2.3 netmask 255.255.255.0";
    const std::string deleted = "/sbin/ip -4 address del 10.1.2.3/24 dev eth0";
    const step adding[] = {
        {kTakeDown, 1, "ERR net_set_ip:N excute command ifconfig eth0 0.0.0.0 failed", {kTakeDown}},
        {kTakeDown, 127, "ERR net_set_ip:N excute command ifconfig eth0 0.0.0.0 failed", {kTakeDown}},
        {set_new,
         -1,
         "ERR net_set_ip:N excute command ifconfig eth0 10.1.2.3 netmask 255.255.255.0 failed",
         {kTakeDown, set_new}},
    };
    for (const step &failing : adding) {
        test_rig fresh;
        fake_kernel fresh_kernel{fresh};
        fresh_kernel.add("eth0", {.ip = "192.168.1.10"});
        current_rig = &fresh;
        fresh.answer(failing.command, failing.status);
        EXPECT_OUTCOME(fresh.observe([] { return KOVANetSetIP("-4", "eth0", "10.1.2.3", 24, "add"); }),
                       {.result = -1,
                        .log = {failing.log},
                        .commands = failing.commands,
                        .events = {ipv4_event("192.168.1.10", "10.1.2.3")}});
    }
    current_rig = &rig;
    rig.answer("/sbin/ip", 2);
    EXPECT_OUTCOME(set("-4", "10.1.2.3", 24, "del"),
                   {.result = -1,
                    .log = {"ERR net_set_ip:N excute cmd /sbin/ip address del 10.1.2.3/24 dev eth0 failed"},
                    .commands = {deleted}});
}

TEST_F(net_set_ip, KOVANetSetIP_ipv4_address_is_deleted_without_event) {
    EXPECT_OUTCOME(set("-4", "192.168.1.10", 24, "del"),
                   {.commands = {"/sbin/ip -4 address del 192.168.1.10/24 dev eth0"}});
}

TEST_F(net_set_ip, KOVANetSetIP_interface_the_kernel_does_not_know_fails_before_anything) {
    for (const std::string &name : texts{"eth9", long_text(15), long_text(16), long_text(17), long_text(63)}) {
        for (const char *szAction : {"add", "del"}) {
            const outcome got = rig.observe([&] { return KOVANetSetIP("-4", name.c_str(), "10.0.0.1", 8, szAction); });
            EXPECT_EQ(-1, got.result);
            EXPECT_EQ(0x3400U, got.code);
            ASSERT_FALSE(got.log.empty());
            EXPECT_EQ("ERR net_set_ip:N get old v4 IP failed", got.log.back());
            EXPECT_EQ(texts{}, got.commands);
            EXPECT_EQ(texts{}, got.events);
        }
    }
}

TEST_F(net_set_ip, KOVANetSetIP_without_socket_fails_before_anything) {
    rig.fail("socket");
    const outcome got = set("-4", "10.0.0.1", 8, "add");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x3400U, got.code);
    EXPECT_EQ("ERR net_set_ip:N get old v4 IP failed", got.log.at(got.log.size() - 1));
    EXPECT_EQ(texts{}, got.commands);
}

TEST_F(net_set_ip, KOVANetSetIP_event_that_fails_does_not_stop_the_change) {
    for (const char *operation : {"KLIBPluginSDKInit", "KLIBPluginSetArg", "KLIBPluginAction"}) {
        rig.fail(operation);
        const outcome got = set("-4", "10.1.2.3", 24, "add");
        EXPECT_EQ(0, got.result) << operation;
        EXPECT_EQ((texts{kTakeDown, "/sbin/ifconfig eth0 10.1.2.3 netmask 255.255.255.0"}), got.commands);
    }
}

// ---- IPv6

TEST_F(net_set_ip, KOVANetSetIP_new_ipv6_address_is_announced_with_the_current_list) {
    give_ipv6({"fe80000000000000000000000000000a 02 40 20 80     eth0",
               "20010db8000000000000000000000001 02 40 00 80     eth0",
               "20010db8000000000000000000000009 03 40 00 80     eth1"});
    EXPECT_OUTCOME(set("-6", "2001:db8::2", 64, "add"),
                   {.commands = {"/sbin/ip -6 address add 2001:db8::2/64 dev eth0"},
                    .events = {"net/ipv6_change 4 IFNAME=eth0 ORIGIN_ADDRESS=fe80::a,2001:db8::1 "
                               "NEW_ADDRESS=2001:db8::2 PREFIX_LENGTH=64 IS_LINK=true"}});
}

TEST_F(net_set_ip, KOVANetSetIP_first_ipv6_address_is_announced_with_an_empty_list) {
    give_ipv6({});
    EXPECT_OUTCOME(set("-6", "2001:db8::2", 128, "add"),
                   {.commands = {"/sbin/ip -6 address add 2001:db8::2/128 dev eth0"},
                    .events = {"net/ipv6_change 4 IFNAME=eth0 ORIGIN_ADDRESS= NEW_ADDRESS=2001:db8::2 "
                               "PREFIX_LENGTH=128 IS_LINK=true"}});
}

TEST_F(net_set_ip, KOVANetSetIP_same_ipv6_address_in_any_spelling_raises_no_event) {
    give_ipv6({"20010db8000000000000000000000001 02 40 00 80     eth0"});
    for (const std::string &spelling : texts{"2001:db8::1", "2001:DB8::1", "2001:0db8:0:0:0:0:0:1"}) {
        EXPECT_OUTCOME(set("-6", spelling.c_str(), 64, "add"),
                       {.commands = {"/sbin/ip -6 address add " + spelling + "/64 dev eth0"}});
    }
}

TEST_F(net_set_ip, KOVANetSetIP_more_ipv6_addresses_than_room_gives_the_first_sixteen) {
    texts lines;
    std::string list;
    for (int i = 0; i < 20; ++i) {
        char line[80];
        snprintf(line, sizeof line, "fffffffffffffffffffffffffffff%03x 02 40 00 80     eth0", 0xf00 + i);
        lines.emplace_back(line);
        char text[48];
        snprintf(text, sizeof text, "ffff:ffff:ffff:ffff:ffff:ffff:ffff:ff%02x", i);
        list += i < 16 ? (i == 0 ? "" : ",") + std::string(text) : "";
    }
    give_ipv6(lines);
    EXPECT_OUTCOME(set("-6", "2001:db8::2", 64, "add"),
                   {.commands = {"/sbin/ip -6 address add 2001:db8::2/64 dev eth0"},
                    .events = {"net/ipv6_change 4 IFNAME=eth0 ORIGIN_ADDRESS=" + list +
                               " NEW_ADDRESS=2001:db8::2 PREFIX_LENGTH=64 IS_LINK=true"}});
}

TEST_F(net_set_ip, KOVANetSetIP_ipv6_address_is_deleted_without_event) {
    give_ipv6({});
    EXPECT_OUTCOME(set("-6", "2001:db8::2", 64, "del"),
                   {.commands = {"/sbin/ip -6 address del 2001:db8::2/64 dev eth0"}});
}

TEST_F(net_set_ip, KOVANetSetIP_failing_step_of_an_ipv6_address) {
    give_ipv6({"20010db8000000000000000000000002 02 40 00 80     eth0"});
    rig.answer("/sbin/ip", 2);
    EXPECT_OUTCOME(set("-6", "2001:db8::2", 64, "add"),
                   {.result = -1,
                    .log = {"ERR net_set_ip:N excute cmd /sbin/ip address add 2001:db8::2/64 dev eth0 failed"},
                    .commands = {"/sbin/ip -6 address add 2001:db8::2/64 dev eth0"}});
    EXPECT_OUTCOME(set("-6", "2001:db8::2", 64, "del"),
                   {.result = -1,
                    .log = {"ERR net_set_ip:N excute cmd /sbin/ip address del 2001:db8::2/64 dev eth0 failed"},
                    .commands = {"/sbin/ip -6 address del 2001:db8::2/64 dev eth0"}});
    rig.hide(kList);
    EXPECT_OUTCOME(
        set("-6", "2001:db8::2", 64, "add"),
        {.result = -1,
         .code = 0x900,
         .unit = "lnx_v6_ip_get",
         .log = {"ERR lnx_v6_ip_get:N Fail to open [/proc/net/if_inet6], errno=[2/No such file or directory]",
                 "ERR net_set_ip:N get old v6 IP failed"}});
}
