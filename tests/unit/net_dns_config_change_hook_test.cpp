#include "support/rig.h"

#include <kova/core.h>
#include <kovanetsdk/events.h>
#include <memory>

using namespace kova_test;

namespace {

struct free_list {
    void operator()(KLIBSZLIST *list) const { KLIBCSzListFree(list); }
};

class net_dns_config_change_hook : public unit_test {
protected:
    outcome raise(int phase, const char *interface, const texts &servers) {
        KLIBSZLIST *list = KLIBCSzListAlloc(1024);
        const std::unique_ptr<KLIBSZLIST, free_list> owner{list};
        for (const std::string &server : servers) {
            EXPECT_EQ(0, KLIBCSzListPush(&list, server.c_str()));
        }
        return rig.observe([&] { return KOVANetDnsConfigChangeHook(phase, interface, list); });
    }

    const texts two{"10.0.0.1", "fe80::1"};
};

TEST_F(net_dns_config_change_hook, KOVANetDnsConfigChangeHook_servers_areNumberedFrom1) {
    EXPECT_OUTCOME(
        raise(4, "eth0", two),
        {.result = 0, .events = {"net/dns_config_change 4 INTERFACE=eth0 NITEMS=2 DNS_1=10.0.0.1 DNS_2=fe80::1"}});
}

TEST_F(net_dns_config_change_hook, KOVANetDnsConfigChangeHook_phase_isTheCallers) {
    for (const int phase : {4, 5, 0, -1, 99}) {
        EXPECT_OUTCOME(raise(phase, "", {"1.1.1.1"}), {.result = 0,
                                                       .events = {"net/dns_config_change " + std::to_string(phase) +
                                                                  " INTERFACE= NITEMS=1 DNS_1=1.1.1.1"}});
    }
}

TEST_F(net_dns_config_change_hook, KOVANetDnsConfigChangeHook_noServers_isStillRaised) {
    EXPECT_OUTCOME(raise(5, "", {}), {.result = 0, .events = {"net/dns_config_change 5 INTERFACE= NITEMS=0"}});
}

TEST_F(net_dns_config_change_hook, KOVANetDnsConfigChangeHook_manyAndLongItems_passUnchanged) {
    std::string expected = "net/dns_config_change 4 INTERFACE=" + long_text(4096) + " NITEMS=1200";
    texts servers;
    for (int i = 1; i <= 1200; ++i) {
        servers.push_back(i == 7 ? long_text(4096) : "10.0.0." + std::to_string(i));
        expected += " DNS_" + std::to_string(i) + "=" + servers.back();
    }
    EXPECT_OUTCOME(raise(4, long_text(4096).c_str(), servers), {.result = 0, .events = {expected}});
}

TEST_F(net_dns_config_change_hook, KOVANetDnsConfigChangeHook_noEvent_fails) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(raise(4, "eth0", two), {.result = -1,
                                           .code = 0x200,
                                           .unit = "platform",
                                           .log = {"ERR net_dns_config_change_hook:N KLIBPluginSDKInit failed"}});
}

TEST_F(net_dns_config_change_hook, KOVANetDnsConfigChangeHook_anySetterFails_namesIt) {
    const texts messages{"interface = eth0", "dns_number = 2", "dns[1] = 10.0.0.1", "dns[2] = fe80::1"};
    for (size_t i = 0; i < messages.size(); ++i) {
        rig.fail("KLIBPluginSetArg", static_cast<int>(i) + 1);
        EXPECT_OUTCOME(raise(4, "eth0", two),
                       {.result = -1,
                        .code = 0x200,
                        .unit = "platform",
                        .log = {"ERR net_dns_config_change_hook:N KLIBPluginSetArg failed, " + messages[i]}});
    }
}

TEST_F(net_dns_config_change_hook, KOVANetDnsConfigChangeHook_actionFails_fails) {
    rig.fail("KLIBPluginAction");
    EXPECT_OUTCOME(raise(5, "eth0", {}), {.result = -1,
                                          .code = 0x2A00,
                                          .unit = "platform",
                                          .log = {"ERR net_dns_config_change_hook:N KLIBPluginAction failed"},
                                          .events = {"net/dns_config_change 5 INTERFACE=eth0 NITEMS=0"}});
}

TEST_F(net_dns_config_change_hook, KOVANetDnsConfigChangeHook_null_isRefused) {
    EXPECT_OUTCOME(raise(4, nullptr, two), refusal("net_dns_config_change_hook", "((void *)0) != szInterface"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetDnsConfigChangeHook(4, "", nullptr); }),
                   refusal("net_dns_config_change_hook", "NULL != pDnsList"));
}

} // namespace
