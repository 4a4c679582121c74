#include "support/fake_kernel.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_flush_ip : public unit_test {
protected:
    outcome flush(const char *szFamily, const char *szIfname = "eth0") {
        return rig.observe([=] { return KOVANetFlushIP(szFamily, szIfname); });
    }
};

TEST_F(net_flush_ip, KOVANetFlushIP_missing_argument_is_refused) {
    EXPECT_OUTCOME(flush(nullptr), refusal("net_flush_ip", "((void *)0) != szFamily"));
    EXPECT_OUTCOME(flush("-4", nullptr), refusal("net_flush_ip", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(flush("-6", ""), refusal("net_flush_ip", "'\\0' != *szIfname"));
    EXPECT_OUTCOME(flush(nullptr, nullptr), refusal("net_flush_ip", "((void *)0) != szFamily"));
}

TEST_F(net_flush_ip, KOVANetFlushIP_name_that_is_none_is_refused) {
    for (const std::string &name : bad_names()) {
        for (const char *szFamily : {"-4", "-6"}) {
            EXPECT_OUTCOME(flush(szFamily, name.c_str()), refusal("net_flush_ip", "is_interface_name(szIfname)"));
        }
    }
}

TEST_F(net_flush_ip, KOVANetFlushIP_ipv4_runs_the_tool) {
    EXPECT_OUTCOME(flush("-4"), {.commands = {"/sbin/ip -4 address flush dev eth0"}});
}

TEST_F(net_flush_ip, KOVANetFlushIP_ipv4_tool_that_fails_is_told) {
    for (const int status : {1, 2, 127, 137, -1}) {
        rig.answer("/sbin/ip", status);
        EXPECT_OUTCOME(flush("-4"), {.result = -1,
                                     .log = {"ERR net_flush_ip:N Failed to flush ipv4 address on [eth0]"},
                                     .commands = {"/sbin/ip -4 address flush dev eth0"}});
    }
}

TEST_F(net_flush_ip, KOVANetFlushIP_ipv6_switches_off_and_on) {
    fake_kernel kernel{rig};
    kernel.add("eth0");
    write_file(ifcfg("eth0"), "IPV6INIT=auto\n");
    rig.replace_file("/proc/sys/net/ipv6/conf/eth0/disable_ipv6", "");
    rig.replace_file("/proc/net/if_inet6", "fe80000000000000000000000000000a 02 40 20 80     eth0\n");
    EXPECT_OUTCOME(flush("-6"), {.result = 0});
}

TEST_F(net_flush_ip, KOVANetFlushIP_ipv6_without_interface_file_is_told) {
    EXPECT_OUTCOME(flush("-6"), {.result = -1,
                                 .code = 0x900,
                                 .unit = "key_value",
                                 .log = {"ERR lnx_ipv6_flush_addr:N Failed to get key [IPV6INIT] in "
                                         "[/etc/sysconfig/network-scripts/ifcfg-eth0]",
                                         "ERR net_flush_ip:N Failed to flush ipv6 address on [eth0]"}});
}

TEST_F(net_flush_ip, KOVANetFlushIP_unknown_family_is_told) {
    for (const std::string &family : texts{"", "4", "-46", "inet", long_text(4096)}) {
        EXPECT_OUTCOME(flush(family.c_str()),
                       {.result = -1, .log = {"ERR net_flush_ip:N ip type is wrong, only -4 or -6"}});
    }
}
