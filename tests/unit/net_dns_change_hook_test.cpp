#include "support/rig.h"

#include <kova/core.h>
#include <kovanetsdk/events.h>
#include <memory>

using namespace kova_test;

namespace {

struct free_list {
    void operator()(KLIBSZLIST *list) const { KLIBCSzListFree(list); }
};

class net_dns_change_hook : public unit_test {
protected:
    outcome raise(int phase, const texts &servers) {
        KLIBSZLIST *list = KLIBCSzListAlloc(1024);
        const std::unique_ptr<KLIBSZLIST, free_list> owner{list};
        for (const std::string &server : servers) {
            EXPECT_EQ(0, KLIBCSzListPush(&list, server.c_str()));
        }
        return rig.observe([&] { return KOVANetDNSChangeHook(phase, list); });
    }

    const texts two{"10.0.0.1", "fe80::1"};
};

TEST_F(net_dns_change_hook, KOVANetDNSChangeHook_servers_areNumberedFrom1) {
    EXPECT_OUTCOME(raise(4, two), {.result = 0, .events = {"net/dns_change 4 NITEMS=2 DNS_1=10.0.0.1 DNS_2=fe80::1"}});
}

TEST_F(net_dns_change_hook, KOVANetDNSChangeHook_phase_isTheCallers) {
    for (const int phase : {4, 5, 0, -1, 99}) {
        EXPECT_OUTCOME(
            raise(phase, {"1.1.1.1"}),
            {.result = 0, .events = {"net/dns_change " + std::to_string(phase) + " NITEMS=1 DNS_1=1.1.1.1"}});
    }
}

TEST_F(net_dns_change_hook, KOVANetDNSChangeHook_noServers_isStillRaised) {
    EXPECT_OUTCOME(raise(5, {}), {.result = 0, .events = {"net/dns_change 5 NITEMS=0"}});
}

TEST_F(net_dns_change_hook, KOVANetDNSChangeHook_manyAndLongItems_passUnchanged) {
    std::string expected = "net/dns_change 4 NITEMS=1200";
    texts servers;
    for (int i = 1; i <= 1200; ++i) {
        servers.push_back(i == 7 ? long_text(4096) : "10.0.0." + std::to_string(i));
        expected += " DNS_" + std::to_string(i) + "=" + servers.back();
    }
    EXPECT_OUTCOME(raise(4, servers), {.result = 0, .events = {expected}});
}

TEST_F(net_dns_change_hook, KOVANetDNSChangeHook_noEvent_failsSilently) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(raise(4, two), {.result = -1, .code = 0x200, .unit = "platform"});
}

TEST_F(net_dns_change_hook, KOVANetDNSChangeHook_anySetterFails_namesIt) {
    const texts messages{"dns_number = 2", "dns[1] = 10.0.0.1", "dns[2] = fe80::1"};
    for (size_t i = 0; i < messages.size(); ++i) {
        rig.fail("KLIBPluginSetArg", static_cast<int>(i) + 1);
        EXPECT_OUTCOME(raise(4, two), {.result = -1,
                                       .code = 0x200,
                                       .unit = "platform",
                                       .log = {"ERR net_dns_change_hook:N KLIBPluginSetArg failed, " + messages[i]}});
    }
}

TEST_F(net_dns_change_hook, KOVANetDNSChangeHook_actionFails_fails) {
    rig.fail("KLIBPluginAction");
    EXPECT_OUTCOME(raise(5, {}), {.result = -1,
                                  .code = 0x2A00,
                                  .unit = "platform",
                                  .log = {"ERR net_dns_change_hook:N KLIBPluginAction failed"},
                                  .events = {"net/dns_change 5 NITEMS=0"}});
}

TEST_F(net_dns_change_hook, KOVANetDNSChangeHook_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetDNSChangeHook(4, nullptr); }),
                   refusal("net_dns_change_hook", "NULL != pDnsList"));
}

} // namespace
