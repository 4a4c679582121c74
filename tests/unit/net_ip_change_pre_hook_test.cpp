#include "support/rig.h"

#include <cerrno>
#include <climits>
#include <kovanetsdk/events.h>
#include <net/if.h>
#include <sys/ioctl.h>

using namespace kova_test;

namespace {

class net_ip_change_pre_hook : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        answer_flags(IFF_UP | IFF_RUNNING);
    }

    /** Lets the kernel tell these flags of every interface. */
    void answer_flags(short flags) {
        rig.answer_ioctl([flags](unsigned long request, void *argument) -> std::optional<int> {
            if (request != SIOCGIFFLAGS) {
                return {};
            }
            static_cast<ifreq *>(argument)->ifr_flags = flags;
            return 0;
        });
    }

    outcome raise(int family, const char *ifname, const char *origin, const char *changed, int prefix) {
        return rig.observe([&] { return KOVANetIPChangePreHook(family, ifname, origin, changed, prefix); });
    }

    void expect_refused(const outcome &got, const std::string &condition) {
        EXPECT_OUTCOME(got, refusal("net_ip_change_pre_hook", condition));
    }
};

TEST_F(net_ip_change_pre_hook, KOVANetIPChangePreHook_ipv4_neverTellsThePrefix) {
    for (const int prefix : {0, 24, 32}) {
        EXPECT_OUTCOME(raise(0, "eth0", "10.0.0.1", "10.0.0.2", prefix),
                       {.result = 0,
                        .events = {"net/ipv4_change 4 IFNAME=eth0 ORIGIN_ADDRESS=10.0.0.1 NEW_ADDRESS=10.0.0.2 "
                                   "PREFIX_LENGTH=-1 IS_LINK=true"}});
    }
}

TEST_F(net_ip_change_pre_hook, KOVANetIPChangePreHook_ipv6_tellsThePrefix) {
    for (const int prefix : {0, 64, 128}) {
        EXPECT_OUTCOME(raise(1, "eth0", "fe80::1,fe80::2", "fe80::3", prefix),
                       {.result = 0,
                        .events = {"net/ipv6_change 4 IFNAME=eth0 ORIGIN_ADDRESS=fe80::1,fe80::2 NEW_ADDRESS=fe80::3 "
                                   "PREFIX_LENGTH=" +
                                   std::to_string(prefix) + " IS_LINK=true"}});
    }
}

TEST_F(net_ip_change_pre_hook, KOVANetIPChangePreHook_noLink_isTold) {
    answer_flags(IFF_UP);
    EXPECT_OUTCOME(raise(0, "eth0", "", "10.0.0.2", 24),
                   {.result = 0,
                    .events = {"net/ipv4_change 4 IFNAME=eth0 ORIGIN_ADDRESS= NEW_ADDRESS=10.0.0.2 PREFIX_LENGTH=-1 "
                               "IS_LINK=false"}});
}

TEST_F(net_ip_change_pre_hook, KOVANetIPChangePreHook_linkNotKnown_failsBeforeTheEvent) {
    rig.answer_ioctl([](unsigned long, void *) -> std::optional<int> {
        errno = ENODEV;
        return -1;
    });
    EXPECT_OUTCOME(raise(0, "eth0", "10.0.0.1", "10.0.0.2", 24),
                   {.result = -1,
                    .code = 0x3400,
                    .unit = "net_if_is_link",
                    .log = {"INFO net_if_is_link:N Cannot get link status of the eth0: No such device",
                            "INFO net_if_is_link:N get link status failed on eth0",
                            "ERR net_ip_change_pre_hook:N error on link detect"}});
}

TEST_F(net_ip_change_pre_hook, KOVANetIPChangePreHook_prefixOutOfRange_isRefused) {
    for (const int prefix : {33, 128, INT_MAX, -1, INT_MIN}) {
        expect_refused(raise(0, "eth0", "10.0.0.1", "10.0.0.2", prefix), "(0 <= nPrefixLength && nPrefixLength <= 32)");
    }
    for (const int prefix : {129, INT_MAX, -1, INT_MIN}) {
        expect_refused(raise(1, "eth0", "::1", "::2", prefix), "(0 <= nPrefixLength && nPrefixLength <= 128)");
    }
}

TEST_F(net_ip_change_pre_hook, KOVANetIPChangePreHook_otherFamily_isRefused) {
    for (const int family : {2, 4, 6, 10, -1, INT_MIN, INT_MAX}) {
        expect_refused(raise(family, "eth0", "10.0.0.1", "10.0.0.2", 24), "(0 == nFamily || 1 == nFamily)");
    }
}

TEST_F(net_ip_change_pre_hook, KOVANetIPChangePreHook_null_isRefused) {
    expect_refused(raise(0, nullptr, "", "", 24), "((void *)0) != szIfname");
    expect_refused(raise(0, "eth0", nullptr, "", 24), "((void *)0) != szOriginAddress");
    expect_refused(raise(1, "eth0", "", nullptr, 24), "((void *)0) != szNewAddress");
}

TEST_F(net_ip_change_pre_hook, KOVANetIPChangePreHook_noEvent_fails) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(raise(1, "eth0", "::1", "::2", 64),
                   {.result = -1, .code = 0x200, .unit = "platform", .log = {"ERR KLIBPluginSDKInit failed"}});
}

TEST_F(net_ip_change_pre_hook, KOVANetIPChangePreHook_anySetterFails_failsSilently) {
    for (int nth = 1; nth <= 5; ++nth) {
        rig.fail("KLIBPluginSetArg", nth);
        EXPECT_OUTCOME(raise(0, "eth0", "10.0.0.1", "10.0.0.2", 24), {.result = -1, .code = 0x200, .unit = "platform"});
    }
}

TEST_F(net_ip_change_pre_hook, KOVANetIPChangePreHook_actionFails_failsSilently) {
    rig.fail("KLIBPluginAction");
    EXPECT_OUTCOME(raise(1, "eth0", "::1", "::2", 64),
                   {.result = -1,
                    .code = 0x2A00,
                    .unit = "platform",
                    .events = {"net/ipv6_change 4 IFNAME=eth0 ORIGIN_ADDRESS=::1 NEW_ADDRESS=::2 PREFIX_LENGTH=64 "
                               "IS_LINK=true"}});
}

} // namespace
