#include "support/fake_kernel.h"

#include <kovanetsdk/ipv6.h>

using namespace kova_test;

namespace {

const std::string kSwitch = "/proc/sys/net/ipv6/conf/eth0/disable_ipv6";
const std::string kShown = "/tmp/disable_ipv6";
const std::string kSettled = "fe80000000000000000000000000000a 02 40 20 80     eth0\n";

} // namespace

class lnx_ipv6_flush_addr : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        kernel.add("eth0");
        write_file(kShown, "before");
        write_file(ifcfg("eth0"), "DEVICE=eth0\nIPV6INIT=auto\n");
        rig.redirect(kSwitch, kShown);
        rig.replace_file("/proc/net/if_inet6", kSettled);
    }
    void TearDown() override {
        unlink(kShown.c_str());
        unit_test::TearDown();
    }
    outcome flush(const char *szIfname = "eth0") {
        return rig.observe([=] { return KOVALnxIPv6FlushAddr(szIfname); });
    }

    fake_kernel kernel{rig};
};

TEST_F(lnx_ipv6_flush_addr, KOVALnxIPv6FlushAddr_bad_name_is_refused) {
    EXPECT_OUTCOME(flush(nullptr), refusal("lnx_ipv6_flush_addr", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(flush(""), refusal("lnx_ipv6_flush_addr", "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(flush(name.c_str()), refusal("lnx_ipv6_flush_addr", "is_interface_name(szIfname)"));
    }
}

TEST_F(lnx_ipv6_flush_addr, KOVALnxIPv6FlushAddr_switches_off_and_on_and_waits) {
    const texts files{"IPV6INIT=auto\n",
                      "IPV6INIT=\"static\"\n",
                      "IPV6INIT=\n",
                      "",
                      "IPV6INIT=offline\n",
                      "IPV6INIT=of\n",
                      "IPV6INIT=off" + long_text(100) + "\n"};
    rig.on_sleep([this](long) { rig.replace_file("/proc/net/if_inet6", kSettled); });
    for (const std::string &content : files) {
        write_file(ifcfg("eth0"), content);
        rig.replace_file("/proc/net/if_inet6", "");
        EXPECT_OUTCOME(flush(), {.sleeps = {500}});
        EXPECT_EQ("0\n", read_file(kShown));
        EXPECT_EQ(content, read_file(ifcfg("eth0")));
    }
}

TEST_F(lnx_ipv6_flush_addr, KOVALnxIPv6FlushAddr_mode_off_stays_off) {
    for (const char *mode : {"off", "OFF", "Off", "\"off\""}) {
        write_file(ifcfg("eth0"), std::string("IPV6INIT=") + mode + "\n");
        write_file(kShown, "before");
        EXPECT_OUTCOME(flush(), {.result = 0});
        EXPECT_EQ("1\n", read_file(kShown));
    }
}

TEST_F(lnx_ipv6_flush_addr, KOVALnxIPv6FlushAddr_without_interface_file_touches_nothing) {
    unlink(ifcfg("eth0").c_str());
    EXPECT_OUTCOME(flush(), {.result = -1,
                             .code = 0x900,
                             .unit = "key_value",
                             .log = {"ERR lnx_ipv6_flush_addr:N Failed to get key [IPV6INIT] in "
                                     "[/etc/sysconfig/network-scripts/ifcfg-eth0]"}});
    EXPECT_EQ("before", read_file(kShown));
}

TEST_F(lnx_ipv6_flush_addr, KOVALnxIPv6FlushAddr_not_switched_off_is_told) {
    kernel.add("eth0", {.flags = 0});
    EXPECT_OUTCOME(flush(), {.result = -1,
                             .code = 0xBC00,
                             .unit = "net_is_dev_type_match",
                             .log = {"ERR lnx_ipv6_flush_addr:N Failed to disable IPv6 on [eth0]"}});
    EXPECT_EQ("before", read_file(kShown));
}

TEST_F(lnx_ipv6_flush_addr, KOVALnxIPv6FlushAddr_not_switched_on_again_is_told) {
    // the second switch asks the kernel anew, and the interface is gone by then
    int lists = 0;
    rig.answer_ioctl([&](unsigned long request, void *argument) -> std::optional<int> {
        if (request == SIOCGIFFLAGS) {
            static_cast<ifreq *>(argument)->ifr_flags = static_cast<short>(lists++ == 0 ? IFF_UP : 0);
        }
        return 0;
    });
    EXPECT_OUTCOME(flush(), {.result = -1,
                             .code = 0xBC00,
                             .unit = "net_is_dev_type_match",
                             .log = {"ERR lnx_ipv6_flush_addr:N Failed to enable IPv6 on [eth0]"}});
    EXPECT_EQ("1\n", read_file(kShown));
}
