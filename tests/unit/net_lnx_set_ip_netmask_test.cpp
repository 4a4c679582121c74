#include "support/fake_kernel.h"

#include <cerrno>
#include <kovanetsdk/iface.h>
#include <sys/stat.h>
#include <unistd.h>

using namespace kova_test;

namespace {

const std::string kDirectory = "/etc/sysconfig/network-scripts";
const std::string kBefore = "# by hand\n"
                            "DEVICE=eth0\n"
                            "BOOTPROTO=\"dhcp\"\n"
                            "MASTER=bond0\n"
                            "SLAVE=yes\n"
                            "LOCAL_LAN=\"yes\"\n";
const std::string kAfter = "# by hand\n"
                           "DEVICE=eth0\n"
                           "BOOTPROTO=static\n"
                           "LOCAL_LAN=\"yes\"\n"
                           "ONBOOT=yes\n"
                           "IPADDR=10.1.2.3\n"
                           "NETMASK=255.255.255.0\n";
const std::string kCopy = "/bin/cp -f /etc/sysconfig/network-scripts/ifcfg-eth0 "
                          "/etc/sysconfig/network-scripts/ifcfg-eth0.tmp1700000000";
const std::string kStop = "/sbin/stop dhcp-client IFACE=eth0";
const std::string kTakeDown = "/sbin/ifconfig eth0 0.0.0.0";
const std::string kSetNew = "/sbin/ifconfig eth0 10.1.2.3 netmask 255.255.255.0";
const std::string kEvent = "net/ipv4_change 4 IFNAME=eth0 ORIGIN_ADDRESS=192.168.1.10 NEW_ADDRESS=10.1.2.3 "
                           "PREFIX_LENGTH=-1 IS_LINK=true";
const std::string kNotSet = "ERR net_lnx_set_ip_netmask:N excute command /usr/kova/sbin/kovanet--set_ip failed";

} // namespace

class net_lnx_set_ip_netmask : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        write_file(ifcfg("eth0"), kBefore);
        kernel.add("eth0", {.ip = "192.168.1.10"});
    }
    outcome set(const char *szIP = "10.1.2.3", const char *szMask = "255.255.255.0", const char *szIfname = "eth0") {
        return rig.observe([=] { return KOVAILnxSetIPNetmask(szIfname, szIP, szMask); });
    }
    /** The file is as given, and alone. */
    void expect_file(const std::string &content) {
        EXPECT_EQ(content, read_file(ifcfg("eth0")));
        EXPECT_EQ(texts{"ifcfg-eth0"}, list_dir(kDirectory));
    }

    fake_kernel kernel{rig};
};

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_missing_argument_is_refused) {
    struct refused {
        const char *szIfname, *szIP, *szMask, *condition;
    };
    const refused cases[] = {
        {nullptr, "10.1.2.3", "255.0.0.0", "((void *)0) != szIfname"},
        {"", "10.1.2.3", "255.0.0.0", "'\\0' != *szIfname"},
        {"eth0", nullptr, "255.0.0.0", "((void *)0) != szIP"},
        {"eth0", "", "255.0.0.0", "'\\0' != *szIP"},
        {"eth0", "10.1.2.3", nullptr, "((void *)0) != szMask"},
        {"eth0", "10.1.2.3", "", "'\\0' != *szMask"},
    };
    for (const refused &one : cases) {
        EXPECT_OUTCOME(set(one.szIP, one.szMask, one.szIfname), refusal("net_lnx_set_ip_netmask", one.condition));
    }
    expect_file(kBefore);
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_name_that_is_none_is_refused) {
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(set("10.1.2.3", "255.0.0.0", name.c_str()),
                       refusal("net_lnx_set_ip_netmask", "is_interface_name(szIfname)"));
    }
    expect_file(kBefore);
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_longest_name_still_has_its_backup) {
    const std::string longest = long_text(235);
    EXPECT_OUTCOME(set("10.1.2.3", "255.0.0.0", (longest + "a").c_str()),
                   refusal("net_lnx_set_ip_netmask", "is_interface_name(szIfname)"));
    write_file(ifcfg(longest), kBefore);
    EXPECT_EQ(-1, set("10.1.2.3", "255.0.0.0", longest.c_str()).result); // the kernel does not know it
    EXPECT_EQ(kBefore, read_file(ifcfg(longest)));
    EXPECT_EQ((texts{"ifcfg-" + longest, "ifcfg-eth0"}), list_dir(kDirectory));
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_new_address_is_stored_and_set) {
    EXPECT_OUTCOME(set(), {.commands = {kCopy, kStop, kTakeDown, kSetNew}, .events = {kEvent}});
    expect_file(kAfter);
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_client_that_does_not_stop_is_only_warned_of) {
    rig.answer("/sbin/stop", 1);
    EXPECT_OUTCOME(set(), {.log = {"WARNING net_lnx_set_ip_netmask:N unable to stop dhcp-client instance on eth0"},
                           .commands = {kCopy, kStop, kTakeDown, kSetNew},
                           .events = {kEvent}});
    expect_file(kAfter);
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_without_file_one_is_made_without_backup) {
    shell("rm " + ifcfg("eth0"));
    EXPECT_OUTCOME(set(), {.log = {"INFO net_lnx_set_ip_netmask:N copy (/etc/sysconfig/network-scripts/ifcfg-eth0, "
                                   "/etc/sysconfig/network-scripts/ifcfg-eth0.tmp1700000000) "
                                   "failed.(strerror=Success)"},
                           .commands = {kCopy, kStop, kTakeDown, kSetNew},
                           .events = {kEvent}});
    expect_file("DEVICE=eth0\nONBOOT=yes\nIPADDR=10.1.2.3\nNETMASK=255.255.255.0\nBOOTPROTO=static\n");
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_without_backup_a_failure_moves_and_deletes_nothing) {
    rig.answer("/bin/cp", 1);
    rig.answer(kSetNew, 1);
    const std::string foreign = ifcfg("eth0.tmp1700000000");
    write_file(foreign, "somebody else's\n");
    EXPECT_OUTCOME(
        set(), {.result = -1,
                .log = {"INFO net_lnx_set_ip_netmask:N copy (/etc/sysconfig/network-scripts/ifcfg-eth0, "
                        "/etc/sysconfig/network-scripts/ifcfg-eth0.tmp1700000000) "
                        "failed.(strerror=Success)",
                        "ERR net_set_ip:N excute command ifconfig eth0 10.1.2.3 netmask 255.255.255.0 failed", kNotSet},
                .commands = {kCopy, kStop, kTakeDown, kSetNew},
                .events = {kEvent}});
    EXPECT_EQ(kAfter, read_file(ifcfg("eth0")));
    EXPECT_EQ("somebody else's\n", read_file(foreign));
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_copy_without_process_tells_why) {
    rig.answer("/bin/cp", -1, "", [] { errno = EAGAIN; });
    EXPECT_OUTCOME(set(), {.log = {"INFO net_lnx_set_ip_netmask:N copy (/etc/sysconfig/network-scripts/ifcfg-eth0, "
                                   "/etc/sysconfig/network-scripts/ifcfg-eth0.tmp1700000000) "
                                   "failed.(strerror=Resource temporarily unavailable)"},
                           .commands = {kCopy, kStop, kTakeDown, kSetNew},
                           .events = {kEvent}});
    expect_file(kAfter);
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_without_backup_a_success_deletes_nothing) {
    rig.answer("/bin/cp", 1);
    write_file(ifcfg("eth0.tmp1700000000"), "somebody else's\n");
    EXPECT_EQ(0, set().result);
    EXPECT_EQ(kAfter, read_file(ifcfg("eth0")));
    EXPECT_EQ("somebody else's\n", read_file(ifcfg("eth0.tmp1700000000")));
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_failing_step_puts_the_file_back) {
    struct step {
        const char *operation; ///< that fails, or a command
        outcome expected;
    };
    const std::string memory = "ERR net_lnx_set_ip_netmask:N Set /etc/sysconfig/network-scripts/ifcfg-eth0 error.";
    const step steps[] = {
        {"KLIBCSzHashAlloc",
         {.result = -1, .code = 0x200, .unit = "net_lnx_set_ip_netmask", .log = {memory}, .commands = {kCopy}}},
        {"KLIBCSzHashSetValue",
         {.result = -1, .code = 0x200, .unit = "net_lnx_set_ip_netmask", .log = {memory}, .commands = {kCopy}}},
        {"KLIBCFileSetKeys", {.result = -1, .code = 0xB00, .unit = "platform", .log = {memory}, .commands = {kCopy}}},
        {"socket",
         {.result = -1,
          .code = 0x3400,
          .unit = "net_lnx_get_ip",
          .log = {"ERR net_lnx_get_ip:N Cannot open control socket", "ERR net_set_ip:N get old v4 IP failed", kNotSet},
          .commands = {kCopy, kStop}}},
        {"/sbin/ifconfig eth0 0.0.0.0",
         {.result = -1,
          .log = {"ERR net_set_ip:N excute command ifconfig eth0 0.0.0.0 failed", kNotSet},
          .commands = {kCopy, kStop, kTakeDown},
          .events = {kEvent}}},
        {"/sbin/ifconfig eth0 10.1.2.3",
         {.result = -1,
          .log = {"ERR net_set_ip:N excute command ifconfig eth0 10.1.2.3 netmask 255.255.255.0 failed", kNotSet},
          .commands = {kCopy, kStop, kTakeDown, kSetNew},
          .events = {kEvent}}},
    };
    for (const step &failing : steps) {
        SCOPED_TRACE(failing.operation);
        if (failing.operation[0] == '/') {
            rig.answer(failing.operation, 1);
        } else {
            rig.fail(failing.operation);
        }
        EXPECT_OUTCOME(set(), failing.expected);
        expect_file(kBefore);
        if (failing.operation[0] == '/') {
            rig.answer(failing.operation, 0);
        }
    }
    EXPECT_EQ(0, set().result);
    expect_file(kAfter);
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_file_put_back_keeps_its_mode_and_owner) {
    const mode_t callers = umask(077);
    for (const mode_t mode : {0644U, 0664U, 0640U, 0600U}) {
        ASSERT_EQ(0, chown(ifcfg("eth0").c_str(), 0, 8));
        ASSERT_EQ(0, chmod(ifcfg("eth0").c_str(), mode));
        EXPECT_EQ(-1, set("10.1.2.3", "no mask").result);
        expect_file(kBefore);
        struct stat status = {};
        EXPECT_EQ(0, stat(ifcfg("eth0").c_str(), &status));
        EXPECT_EQ(mode, status.st_mode & 07777);
        EXPECT_EQ(8U, status.st_gid);
    }
    umask(callers);
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_every_map_operation_may_fail) {
    for (const auto &[operation, calls] :
         std::map<std::string, int>{{"KLIBCSzHashAlloc", 2}, {"KLIBCSzHashSetValue", 7}}) {
        for (int nth = 1; nth <= calls; ++nth) {
            rig.fail(operation, nth);
            const outcome got = set();
            EXPECT_EQ(-1, got.result) << operation << nth;
            EXPECT_EQ(0x200U, got.code) << operation << nth;
            expect_file(kBefore);
        }
    }
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_mask_that_is_none_puts_the_file_back) {
    for (const std::string &mask : texts{"no mask", "255.255.255.256", long_text(63), long_text(4096)}) {
        EXPECT_OUTCOME(set("10.1.2.3", mask.c_str()),
                       {.result = -1,
                        .log = {"ERR net_lnx_set_ip_netmask:N calculate prefix length failed"},
                        .commands = {kCopy, kStop}});
        expect_file(kBefore);
    }
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_text_that_would_forge_a_line_is_refused) {
    for (const char *text : {"10.1.2.3\nSLAVE=yes", "10.1.2.3\r", "\n"}) {
        const outcome by_address = set(text);
        EXPECT_EQ(-1, by_address.result);
        EXPECT_EQ(0xD00U, by_address.code);
        EXPECT_EQ(texts{kCopy}, by_address.commands);
        expect_file(kBefore);
        const outcome by_mask = set("10.1.2.3", text);
        EXPECT_EQ(-1, by_mask.result);
        EXPECT_EQ(0xD00U, by_mask.code);
        expect_file(kBefore);
    }
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_address_that_is_none_puts_the_file_back) {
    for (const std::string &address : texts{"127.0.0.1", "10.1.2", "nonsense", long_text(64), long_text(4096)}) {
        const outcome got = set(address.c_str());
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ((texts{"ERR net_set_ip:N your ip " + address + " is not valid", kNotSet}), got.log);
        EXPECT_EQ((texts{kCopy, kStop}), got.commands);
        expect_file(kBefore);
    }
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_mask_of_no_bits_passes) {
    const outcome got = set("10.1.2.3", "0.0.0.0");
    EXPECT_EQ(0, got.result);
    EXPECT_EQ((texts{kCopy, kStop, kTakeDown, "/sbin/ifconfig eth0 10.1.2.3 netmask 0"}), got.commands);
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_backup_that_cannot_be_moved_back_is_told_and_stays) {
    // meanwhile the file becomes a directory, over which nothing can be moved
    rig.answer("/sbin/stop", 0, "", [] { shell("rm " + ifcfg("eth0") + " && mkdir -p " + ifcfg("eth0") + "/x"); });
    const outcome got = set("10.1.2.3", "no mask");
    EXPECT_OUTCOME(got, {.result = -1,
                         .log = {"ERR net_lnx_set_ip_netmask:N calculate prefix length failed",
                                 "ERR KOVAILnxSetIPNetmask(N): rename fail."},
                         .commands = {kCopy, kStop}});
    EXPECT_EQ(kBefore, read_file(ifcfg("eth0.tmp1700000000")));
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_backup_that_cannot_be_deleted_is_only_noted) {
    rig.answer("/sbin/stop", 0, "", [] { shell("rm " + ifcfg("eth0.tmp1700000000")); });
    EXPECT_OUTCOME(set(), {.log = {"INFO KOVAILnxSetIPNetmask(N): unlink fail."},
                           .commands = {kCopy, kStop, kTakeDown, kSetNew},
                           .events = {kEvent}});
    expect_file(kAfter);
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_read_only_file_system_changes_nothing) {
    shell("mount -t tmpfs -o size=64k tmpfs " + kDirectory);
    write_file(ifcfg("eth0"), kBefore);
    shell("mount -o remount,ro " + kDirectory);
    const outcome got = set();
    EXPECT_EQ(-1, got.result);
    EXPECT_NE(0U, got.code);
    EXPECT_EQ(texts{kCopy}, got.commands);
    EXPECT_EQ("ERR net_lnx_set_ip_netmask:N Set /etc/sysconfig/network-scripts/ifcfg-eth0 error.",
              got.log.at(got.log.size() - 1));
    expect_file(kBefore);
    shell("umount " + kDirectory);
}

TEST_F(net_lnx_set_ip_netmask, KOVAILnxSetIPNetmask_full_file_system_puts_the_file_back) {
    shell("mount -t tmpfs -o size=16k tmpfs " + kDirectory);
    write_file(ifcfg("eth0"), kBefore);
    shell("dd if=/dev/zero of=" + kDirectory + "/ballast bs=4k count=2 2>/dev/null"); // room for the backup alone
    const outcome got = set();
    EXPECT_EQ(-1, got.result);
    EXPECT_NE(0U, got.code);
    EXPECT_EQ(texts{kCopy}, got.commands);
    EXPECT_EQ(kBefore, read_file(ifcfg("eth0")));
    EXPECT_EQ((texts{"ballast", "ifcfg-eth0"}), list_dir(kDirectory));
    shell("umount " + kDirectory);
}
