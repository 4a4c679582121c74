#include "support/fake_kernel.h"
#include "support/memory.h"

#include <cerrno>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_rename_eth : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        rig.replace_file("/sys/class/net/eth0/flags", "0x1002\n");
    }
    outcome rename(const char *szOld, const char *szNew) {
        return rig.observe([=] { return KOVANetRenameEth(szOld, szNew); });
    }
    static outcome failure(unsigned code, const std::string &line) {
        return {.result = -1, .code = code, .unit = "net_rename_eth", .log = {"ERR net_rename_eth:N " + line}};
    }

    fake_kernel kernel{rig};
    fake_interface &eth0 = kernel.add("eth0", {.flags = IFF_BROADCAST});
};

TEST_F(net_rename_eth, KOVANetRenameEth_missing_name_is_refused) {
    EXPECT_OUTCOME(rename(nullptr, "lan0"), refusal("net_rename_eth", "((void *)0) != szOld"));
    EXPECT_OUTCOME(rename("eth0", nullptr), refusal("net_rename_eth", "((void *)0) != szNew"));
    EXPECT_OUTCOME(rename("", "lan0"), refusal("net_rename_eth", "'\\0' != *szOld"));
    EXPECT_OUTCOME(rename("eth0", ""), refusal("net_rename_eth", "'\\0' != *szNew"));
}

TEST_F(net_rename_eth, KOVANetRenameEth_name_that_is_none_is_refused) {
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(rename(name.c_str(), "lan0"), refusal("net_rename_eth", "is_interface_name(szOld)"));
        EXPECT_OUTCOME(rename("eth0", name.c_str()), refusal("net_rename_eth", "is_interface_name(szNew)"));
    }
}

TEST_F(net_rename_eth, KOVANetRenameEth_name_of_seventeen_characters_is_refused) {
    for (const size_t length : {17U, 63U, 64U, 235U}) {
        EXPECT_OUTCOME(rename(long_text(length).c_str(), "lan0"), refusal("net_rename_eth", "strlen(szOld) < 17"));
        EXPECT_OUTCOME(rename("eth0", long_text(length).c_str()), refusal("net_rename_eth", "strlen(szNew) < 17"));
    }
}

TEST_F(net_rename_eth, KOVANetRenameEth_new_name_that_the_kernel_would_complete_is_refused) {
    for (const char *name : {"lan%d", "%", "lan%%d", "lan:1"}) {
        EXPECT_OUTCOME(rename("eth0", name), refusal("net_rename_eth", "is_new_name(szNew)"));
    }
    EXPECT_OUTCOME(rename("lan%d", "lan0"), failure(0xBC00, "No interface lan%d")); // of another program
}

TEST_F(net_rename_eth, KOVANetRenameEth_name_of_sixteen_characters_is_nothing_the_kernel_has) {
    EXPECT_OUTCOME(rename(long_text(16).c_str(), "lan0"), failure(0xBC00, "No interface " + long_text(16)));
    EXPECT_OUTCOME(rename("eth0", long_text(16).c_str()),
                   failure(0x3400, "Cannot rename eth0 to " + long_text(16) + ": No such device"));
}

TEST_F(net_rename_eth, KOVANetRenameEth_unknown_interface_is_told) {
    EXPECT_OUTCOME(rename("eth9", "lan0"), failure(0xBC00, "No interface eth9"));
    kernel.add("tap0"); // not in the statistics
    EXPECT_OUTCOME(rename("tap0", "lan0"), failure(0xBC00, "No interface tap0"));
}

TEST_F(net_rename_eth, KOVANetRenameEth_interface_that_is_up_is_told) {
    rig.replace_file("/sys/class/net/eth0/flags", "0x1003\n");
    EXPECT_OUTCOME(rename("eth0", "lan0"), failure(0xBC00, "Interface eth0 is up"));
}

TEST_F(net_rename_eth, KOVANetRenameEth_failing_step_is_told) {
    rig.fail("socket");
    EXPECT_OUTCOME(rename("eth0", "lan0"), failure(0x3400, "Cannot open control socket"));
    eth0.failing = {{SIOCGIFHWADDR, EPERM}};
    EXPECT_OUTCOME(rename("eth0", "lan0"),
                   failure(0x3600, "Cannot get hardware address of eth0: Operation not permitted"));
    eth0.failing = {{SIOCSIFNAME, EEXIST}};
    EXPECT_OUTCOME(rename("eth0", "lan0"), failure(0x3600, "Cannot rename eth0 to lan0: File exists"));
    eth0.failing = {{SIOCSIFNAME, EBUSY}};
    EXPECT_OUTCOME(rename("eth0", "lan0"), failure(0x3600, "Cannot rename eth0 to lan0: Device or resource busy"));
}

TEST_F(net_rename_eth, KOVANetRenameEth_without_memory_fails) {
    NEEDS_OWN_ALLOCATOR();
    rig.fail("calloc");
    EXPECT_OUTCOME(rename("eth0", "lan0"), {.result = -1,
                                            .code = 0x200,
                                            .unit = "net_stat_init",
                                            .log = {"ERR net_rename_eth:N Failed to alloc memory."}});
}

TEST_F(net_rename_eth, KOVANetRenameEth_renames_a_real_interface) {
    test_rig real;
    current_rig = &real;
    shell("ip link add kovat0 type veth peer name kovat1");
    EXPECT_OUTCOME(real.observe([] { return KOVANetRenameEth("kovat0", "kovarenamed0123"); }), {.result = 0});
    EXPECT_EQ("<absent>", read_file("/sys/class/net/kovat0/mtu"));
    EXPECT_EQ("1500\n", read_file("/sys/class/net/kovarenamed0123/mtu"));
    EXPECT_OUTCOME(real.observe([] { return KOVANetRenameEth("kovarenamed0123", "kovat1"); }),
                   failure(0x3600, "Cannot rename kovarenamed0123 to kovat1: File exists"));
    shell("ip link del kovat1");
    current_rig = &rig;
}
