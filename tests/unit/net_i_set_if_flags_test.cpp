#include "support/fake_kernel.h"

#include <cerrno>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_i_set_if_flags : public unit_test {
protected:
    outcome set(unsigned flags, int on, const char *szIfname = "eth0") {
        return rig.observe([=] { return KLIBNetISetIfFlags(szIfname, flags, on); });
    }
    static outcome failure(unsigned code, const std::string &line) {
        return {.result = -1, .code = code, .unit = "net_i_set_if_flags", .log = {"ERR net_i_set_if_flags:N " + line}};
    }

    fake_kernel kernel{rig};
    fake_interface &eth0 = kernel.add("eth0", {.flags = IFF_UP | IFF_BROADCAST});
};

TEST_F(net_i_set_if_flags, KLIBNetISetIfFlags_bad_argument_is_refused) {
    EXPECT_OUTCOME(set(IFF_UP, 1, nullptr), refusal("net_i_set_if_flags", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(set(IFF_UP, 1, ""), refusal("net_i_set_if_flags", "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(set(IFF_UP, 1, name.c_str()), refusal("net_i_set_if_flags", "is_interface_name(szIfname)"));
    }
    for (const unsigned flags : {0x10000U, 0xffffffffU}) {
        EXPECT_OUTCOME(set(flags, 1), refusal("net_i_set_if_flags", "flags <= 0xFFFF"));
    }
    EXPECT_EQ(unsigned{IFF_UP | IFF_BROADCAST}, eth0.flags);
}

TEST_F(net_i_set_if_flags, KLIBNetISetIfFlags_changes_the_asked_flags_alone) {
    EXPECT_OUTCOME(set(IFF_PROMISC | IFF_ALLMULTI, 1), {.result = 0});
    EXPECT_EQ(unsigned{IFF_UP | IFF_BROADCAST | IFF_PROMISC | IFF_ALLMULTI}, eth0.flags);
    EXPECT_OUTCOME(set(IFF_PROMISC, 0), {.result = 0});
    EXPECT_EQ(unsigned{IFF_UP | IFF_BROADCAST | IFF_ALLMULTI}, eth0.flags);
    EXPECT_OUTCOME(set(0x8000, -7), {.result = 0}); // the highest bit, and any value but 0 sets
    EXPECT_EQ(0x8000U | IFF_UP | IFF_BROADCAST | IFF_ALLMULTI, eth0.flags);
    EXPECT_OUTCOME(set(0, 1), {.result = 0});
    EXPECT_EQ(0x8000U | IFF_UP | IFF_BROADCAST | IFF_ALLMULTI, eth0.flags);
}

TEST_F(net_i_set_if_flags, KLIBNetISetIfFlags_failing_step_is_told) {
    rig.fail("socket");
    EXPECT_OUTCOME(set(IFF_UP, 0), failure(0x3400, "Cannot open control socket"));
    eth0.failing = {{SIOCGIFFLAGS, EPERM}};
    EXPECT_OUTCOME(set(IFF_UP, 0), failure(0x3600, "Cannot get flags of eth0: Operation not permitted"));
    eth0.failing = {{SIOCSIFFLAGS, EBUSY}};
    EXPECT_OUTCOME(set(IFF_UP, 0), failure(0x3600, "Cannot set flags of eth0: Device or resource busy"));
    eth0.failing = {{SIOCSIFFLAGS, ENODEV}};
    EXPECT_OUTCOME(set(IFF_UP, 0), failure(0x3400, "Cannot set flags of eth0: No such device"));
    EXPECT_EQ(unsigned{IFF_UP | IFF_BROADCAST}, eth0.flags);
}

TEST_F(net_i_set_if_flags, KLIBNetISetIfFlags_name_the_kernel_does_not_know_is_told) {
    for (const std::string &name :
         texts{"eth9", long_text(15), long_text(16), long_text(17), long_text(63), long_text(64)}) {
        EXPECT_OUTCOME(set(IFF_UP, 1, name.c_str()),
                       failure(0x3400, "Cannot get flags of " + name + ": No such device"));
    }
}

TEST_F(net_i_set_if_flags, KLIBNetISetIfFlags_long_name_does_not_reach_its_beginning) {
    fake_interface &other = kernel.add("abcdefghijklmno", {.flags = 0});
    EXPECT_EQ(-1, set(IFF_UP, 1, "abcdefghijklmnop").result);
    EXPECT_EQ(0U, other.flags);
}

TEST_F(net_i_set_if_flags, KLIBNetIfUp_and_KLIBNetIfDown_change_the_up_flag) {
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetIfDown("eth0"); }), {.result = 0});
    EXPECT_EQ(unsigned{IFF_BROADCAST}, eth0.flags);
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetIfDown("eth0"); }), {.result = 0});
    EXPECT_EQ(unsigned{IFF_BROADCAST}, eth0.flags);
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetIfUp("eth0"); }), {.result = 0});
    EXPECT_EQ(unsigned{IFF_UP | IFF_BROADCAST}, eth0.flags);
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetIfUp(nullptr); }),
                   refusal("net_i_set_if_flags", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetIfDown(nullptr); }),
                   refusal("net_i_set_if_flags", "((void *)0) != szIfname"));
}

TEST_F(net_i_set_if_flags, KLIBNetReInitIf_goes_down_and_up) {
    std::vector<unsigned> written;
    rig.answer_ioctl([&](unsigned long request, void *argument) -> std::optional<int> {
        auto &record = *static_cast<ifreq *>(argument);
        if (request == SIOCSIFFLAGS) {
            written.push_back(static_cast<unsigned short>(record.ifr_flags));
        }
        record.ifr_flags = IFF_UP | IFF_BROADCAST;
        return 0;
    });
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetReInitIf("eth0"); }), {.result = 0});
    EXPECT_EQ((std::vector<unsigned>{IFF_BROADCAST, IFF_UP | IFF_BROADCAST}), written);
}

TEST_F(net_i_set_if_flags, KLIBNetReInitIf_failing_step_is_told) {
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetReInitIf(nullptr); }),
                   refusal("net_i_set_if_flags", "((void *)0) != szIfname"));
    for (const int nth : {1, 2}) {
        rig.fail("socket", nth);
        EXPECT_OUTCOME(rig.observe([] { return KLIBNetReInitIf("eth0"); }),
                       failure(0x3400, "Cannot open control socket"));
        EXPECT_EQ(nth == 1 ? unsigned{IFF_UP | IFF_BROADCAST} : unsigned{IFF_BROADCAST}, eth0.flags);
        eth0.flags = IFF_UP | IFF_BROADCAST;
    }
}

TEST_F(net_i_set_if_flags, KLIBNetIfUp_moves_a_real_interface) {
    rig.answer_ioctl({});
    shell("ip link add kovat0 type veth peer name kovat1");
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetIfUp("kovat0"); }), {.result = 0});
    EXPECT_EQ(1, KOVANetIsIFUp("kovat0"));
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetReInitIf("kovat0"); }), {.result = 0});
    EXPECT_EQ(1, KOVANetIsIFUp("kovat0"));
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetIfDown("kovat0"); }), {.result = 0});
    EXPECT_EQ(0, KOVANetIsIFUp("kovat0"));
    shell("ip link del kovat0");
}
