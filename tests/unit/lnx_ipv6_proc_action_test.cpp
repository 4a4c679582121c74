#include "support/fake_kernel.h"

#include <filesystem>
#include <kovanetsdk/ipv6.h>

using namespace kova_test;

namespace {

const std::string kSwitch = "/proc/sys/net/ipv6/conf/eth0/disable_ipv6";
const std::string kShown = "/tmp/disable_ipv6"; ///< stands for it
const std::string kSettled = "fe80000000000000000000000000000a 02 40 20 80     eth0\n";
const std::string kTentative = "fe80000000000000000000000000000a 02 40 20 c0     eth0\n";
const std::string kGlobal = "20010db8000000000000000000000001 02 40 00 80     eth0\n";
const std::string kTentativeGlobal = "20010db8000000000000000000000001 02 40 00 c0     eth0\n";
const std::vector<long> kWhole(10, 500);

bool is_open(const std::string &path) {
    for (const auto &entry : std::filesystem::directory_iterator("/proc/self/fd")) {
        std::error_code gone;
        if (std::filesystem::read_symlink(entry.path(), gone) == path) {
            return true;
        }
    }
    return false;
}

} // namespace

class lnx_ipv6_proc_action : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        kernel.add("eth0");
        write_file(kShown, "before");
        rig.redirect(kSwitch, kShown);
        give("");
    }
    void TearDown() override {
        unlink(kShown.c_str());
        unit_test::TearDown();
    }
    void give(const std::string &list) { rig.replace_file("/proc/net/if_inet6", list); }
    outcome act(int nSwitch, const char *szIfname = "eth0") {
        return rig.observe([=] { return KOVALnxIPv6ProcAction(szIfname, nSwitch); });
    }

    fake_kernel kernel{rig};
};

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_bad_name_is_refused) {
    EXPECT_OUTCOME(act(1, nullptr), refusal("lnx_ipv6_proc_action", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(act(1, ""), refusal("lnx_ipv6_proc_action", "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(act(1, name.c_str()), refusal("lnx_ipv6_proc_action", "is_interface_name(szIfname)"));
    }
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_interface_that_does_not_count_fails_silently) {
    kernel.add("lo", {.flags = IFF_UP | IFF_LOOPBACK});
    kernel.add("eth1", {.flags = 0});
    kernel.add("eth2", {.flags = IFF_UP | IFF_SLAVE});
    for (const std::string &name :
         texts{"lo", "eth1", "eth2", "eth9", "all", long_text(15), long_text(16), long_text(235)}) {
        for (const int nSwitch : {0, 1}) {
            EXPECT_OUTCOME(act(nSwitch, name.c_str()), {.result = -1, .code = 0xBC00, .unit = "net_is_dev_type_match"});
        }
    }
    EXPECT_EQ("before", read_file(kShown));
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_one_switches_off_at_once) {
    give(kTentative);
    EXPECT_OUTCOME(act(1), {.result = 0});
    EXPECT_EQ("1\n", read_file(kShown));
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_signal_does_not_shorten_the_wait) {
    std::vector<long> sleeps(11, 500);
    sleeps[0] = sleeps[1] = 250;
    rig.fail("nanosleep");
    EXPECT_OUTCOME(act(0), {.sleeps = sleeps});
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_other_values_switch_on_at_once) {
    for (const int nSwitch : {2, -1}) {
        write_file(kShown, "before");
        EXPECT_OUTCOME(act(nSwitch), {.result = 0});
        EXPECT_EQ("0\n", read_file(kShown));
    }
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_settled_addresses_are_not_waited_for) {
    for (const std::string &list : {kSettled, kGlobal, kTentativeGlobal, kGlobal + kSettled + kTentativeGlobal}) {
        give(list);
        EXPECT_OUTCOME(act(0), {.result = 0});
        EXPECT_EQ("0\n", read_file(kShown));
    }
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_unsettled_addresses_are_waited_for_and_given_up) {
    for (const std::string &list : {std::string(), kTentative, kGlobal + kTentative + kSettled}) {
        give(list);
        EXPECT_OUTCOME(act(0), {.sleeps = kWhole});
    }
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_waits_until_the_address_settles) {
    for (const size_t sleeps : {1U, 3U, 9U, 10U}) {
        give("");
        rig.on_sleep([&](long) {
            const size_t slept = rig.now.sleeps.size();
            give(slept >= sleeps ? kSettled : kTentative);
            EXPECT_TRUE(is_open(kShown));
            EXPECT_EQ("0\n", read_file(kShown)); // flushed before the wait
        });
        EXPECT_OUTCOME(act(0), {.sleeps = std::vector<long>(sleeps, 500)});
    }
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_more_than_sixteen_addresses_end_the_wait) {
    std::string list = kTentative;
    for (int i = 0; i < 15; ++i) {
        list += kGlobal;
    }
    give(list);
    EXPECT_OUTCOME(act(0), {.sleeps = kWhole});
    give(list + kGlobal);
    EXPECT_OUTCOME(act(0), {.result = 0});
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_list_that_cannot_be_read_ends_the_wait) {
    rig.hide("/proc/net/if_inet6");
    EXPECT_OUTCOME(act(0), {.result = 0,
                            .code = 0x900,
                            .unit = "lnx_v6_ip_get",
                            .log = {"ERR lnx_v6_ip_get:N Fail to open [/proc/net/if_inet6], errno=[2/No such file or "
                                    "directory]"}});
    EXPECT_EQ("0\n", read_file(kShown));
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_switch_that_cannot_be_opened_is_told) {
    rig.redirect(kSwitch, "/tmp/no/such/directory");
    EXPECT_OUTCOME(act(1), {.result = -1,
                            .log = {"ERR lnx_ipv6_proc_action:N open file /proc/sys/net/ipv6/conf/eth0/disable_ipv6 "
                                    "failed"}});
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_switch_that_does_not_take_the_value_is_told_without_wait) {
    rig.redirect(kSwitch, "/dev/full");
    for (const int nSwitch : {0, 1}) {
        EXPECT_OUTCOME(act(nSwitch), {.result = -1,
                                      .code = 0xB00,
                                      .unit = "lnx_ipv6_proc_action",
                                      .log = {"ERR lnx_ipv6_proc_action:N write file "
                                              "/proc/sys/net/ipv6/conf/eth0/disable_ipv6 failed"}});
    }
}

TEST_F(lnx_ipv6_proc_action, KOVALnxIPv6ProcAction_switches_a_real_interface) {
    test_rig real;
    current_rig = &real;
    shell("ip link add kovat0 type veth peer name kovat1");
    shell("ip link set kovat0 up && ip link set kovat1 up");
    // an interface without carrier gets no address, and the kernel hands the carrier on a little later
    shell("timeout 10 sh -c 'until ip link show kovat0 | grep -q \"state UP\"; do sleep 0.02; done'");
    const std::string path = "/proc/sys/net/ipv6/conf/kovat0/disable_ipv6";
    EXPECT_OUTCOME(real.observe([] { return KOVALnxIPv6ProcAction("kovat0", 1); }), {.result = 0});
    EXPECT_EQ("1\n", read_file(path));
    KOVAV6IP address;
    EXPECT_EQ(0, KOVALnxV6IPGet("kovat0", &address, 1));
    EXPECT_EQ(0, real.observe([] { return KOVALnxIPv6ProcAction("kovat0", 0); }).result);
    EXPECT_EQ("0\n", read_file(path));
    EXPECT_EQ(1, KOVALnxV6IPGet("kovat0", &address, 1));
    EXPECT_EQ(0x20U, address.nScope);
    shell("ip link del kovat0");
    current_rig = &rig;
}
