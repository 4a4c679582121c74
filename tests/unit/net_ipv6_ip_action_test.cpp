#include "support/fake_kernel.h"

#include <kovanetsdk/ipv6.h>

using namespace kova_test;

class net_ipv6_ip_action : public unit_test {
protected:
    outcome act(int cmd, const char *szDevice, const char *szIP, unsigned prefix, const char *szGateway = nullptr) {
        return rig.observe([=] { return KOVANetIPv6IPAction(cmd, szDevice, szIP, prefix, szGateway); });
    }
    static outcome refused(const std::string &line) {
        return {.result = -1, .code = 0xD00, .unit = "net_ipv6_ip_action", .log = {"ERR net_ipv6_ip_action:N " + line}};
    }
};

TEST_F(net_ipv6_ip_action, KOVANetIPv6IPAction_checks_in_their_order) {
    EXPECT_OUTCOME(act(7, nullptr, nullptr, 129), refused("Paramter Prefix length 129 out of range [0, 128] "));
    EXPECT_OUTCOME(act(7, nullptr, nullptr, 4294967295U), refused("Paramter Prefix length -1 out of range [0, 128] "));
    EXPECT_OUTCOME(act(7, nullptr, nullptr, 128), refused("Paramter szV6IPAddr can not be NULL"));
    EXPECT_OUTCOME(act(7, nullptr, "", 128), refused("Paramter szV6IPAddr can not be NULL"));
    EXPECT_OUTCOME(act(7, nullptr, "fe80::1", 128), refused("Paramter szDevice can not be NULL"));
    EXPECT_OUTCOME(act(7, "", "fe80::1", 128), refused("Paramter szDevice can not be NULL"));
    for (const int cmd : {-1, 2, 7}) {
        EXPECT_OUTCOME(
            act(cmd, "eth0", "fe80::1", 128, "fe80::2"),
            {.result = -1, .log = {"ERR net_ipv6_ip_action:N Paramter KOVAIPV6IPCMD is not a legal parameter"}});
    }
}

TEST_F(net_ipv6_ip_action, KOVANetIPv6IPAction_name_that_is_none_is_refused) {
    for (const std::string &name : bad_names()) {
        for (const char *szGateway : {static_cast<const char *>(nullptr), "fe80::1"}) {
            EXPECT_OUTCOME(act(0, name.c_str(), "fe80::1", 64, szGateway),
                           refusal("net_ipv6_ip_action", "is_interface_name(szDevice)"));
        }
    }
}

TEST_F(net_ipv6_ip_action, KOVANetIPv6IPAction_gateway_changes_the_default_route_alone) {
    EXPECT_OUTCOME(act(0, "eth0", "fe80::1", 64, "fe80::1"),
                   {.commands = {"/sbin/ip -6 route add default via fe80::1 dev eth0"}});
    EXPECT_OUTCOME(act(1, "eth0", "no address", 0, "fe80::1"),
                   {.commands = {"/sbin/ip -6 route del default via fe80::1 dev eth0"}});
}

TEST_F(net_ipv6_ip_action, KOVANetIPv6IPAction_gives_the_route_commands_status) {
    for (const int status : {1, 2, 127, 137, -1}) {
        rig.answer("/sbin/ip", status);
        EXPECT_OUTCOME(act(0, "eth0", "fe80::1", 64, "fe80::1"),
                       {.result = status, .commands = {"/sbin/ip -6 route add default via fe80::1 dev eth0"}});
    }
}

TEST_F(net_ipv6_ip_action, KOVANetIPv6IPAction_without_gateway_changes_the_address) {
    fake_kernel kernel{rig};
    kernel.add("eth0");
    rig.replace_file("/proc/net/if_inet6", "");
    for (const char *szGateway : {static_cast<const char *>(nullptr), ""}) {
        EXPECT_OUTCOME(act(0, "eth0", "2001:db8::1", 64, szGateway),
                       {.commands = {"/sbin/ip -6 address add 2001:db8::1/64 dev eth0"},
                        .events = {"net/ipv6_change 4 IFNAME=eth0 ORIGIN_ADDRESS= NEW_ADDRESS=2001:db8::1 "
                                   "PREFIX_LENGTH=64 IS_LINK=true"}});
        EXPECT_OUTCOME(act(1, "eth0", "2001:db8::1", 0, szGateway),
                       {.commands = {"/sbin/ip -6 address del 2001:db8::1/0 dev eth0"}});
    }
}

TEST_F(net_ipv6_ip_action, KOVANetIPv6IPAction_address_not_changed_is_told_with_the_names_in_their_places) {
    rig.replace_file("/proc/net/if_inet6", "");
    rig.answer("/sbin/ip", 2);
    EXPECT_OUTCOME(act(1, "eth0", "2001:db8::1", 64),
                   {.result = -1,
                    .log = {"ERR net_set_ip:N excute cmd /sbin/ip address del 2001:db8::1/64 dev eth0 failed",
                            "ERR net_ipv6_ip_action:N set IP failed. IP = eth0, Netmask = 2001:db8::1, prefix = 64"},
                    .commands = {"/sbin/ip -6 address del 2001:db8::1/64 dev eth0"}});
    EXPECT_OUTCOME(act(0, "eth0", "nonsense", 64),
                   {.result = -1,
                    .code = 0x1000,
                    .unit = "is_v6_ip_addr_valid",
                    .log = {"ERR net_set_ip:N your v6ip nonsense is not valid",
                            "ERR net_ipv6_ip_action:N set IP failed. IP = eth0, Netmask = nonsense, prefix = 64"}});
}
