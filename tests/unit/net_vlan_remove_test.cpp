#include "support/fake_kernel.h"

#include <kovanetsdk/link.h>
#include <optional>
#include <sys/stat.h>

using namespace kova_test;

namespace {

const std::string kRowFile = "# the office\n"
                             "DEVICE=eth0\n"
                             "IPV6ADDR=2001:db8::1\n"
                             "IPV6PREFIXLENG=64\n"
                             "BOOTPROTO2=kept\n"
                             "IPV6INIT2=kept\n"
                             "IPV6ADDR2=kept\n"
                             "IPV6PREFIXLENG2=kept\n"
                             "ONBOOT=yes\n"
                             "LOCAL_LAN=yes\n"
                             "BOOTPROTO=none\n"
                             "IPV6INIT=off"; // no final newline
const std::string kVlanFile = "DEVICE=eth0.10\n"
                              "VLAN_ROW_DEVICE=eth0\n"
                              "VLAN_ID=10\n"
                              "ONBOOT=yes\n"
                              "BOOTPROTO=static\n"
                              "IPADDR=192.168.1.10\n"
                              "NETMASK=255.255.255.0\n"
                              "IPV6INIT=static\n"
                              "IPV6ADDR=2001:db8::2\n"
                              "IPV6PREFIXLENG=48\n"
                              "IPV6_DEFAULTGW=2001:db8::ff\n"
                              "IPV6DNS=2001:db8::53\n"
                              "IPV6DNS2=2001:db8::54\n"
                              "IPADDR2=not this\n"
                              "BOOTPROTO2=not this\n"
                              "NETMASK2=not this\n"
                              "IPV6INIT2=not this\n"
                              "IPV6ADDR2=not this\n"
                              "IPV6PREFIXLENG2=not this\n"
                              "IPV6_DEFAULTGW2=not this\n";
const std::string kNewRowFile = "# the office\n"
                                "DEVICE=eth0\n"
                                "BOOTPROTO2=kept\n"
                                "IPV6INIT2=kept\n"
                                "IPV6ADDR2=kept\n"
                                "IPV6PREFIXLENG2=kept\n"
                                "ONBOOT=yes\n"
                                "LOCAL_LAN=yes\n"
                                "BOOTPROTO=static\n"
                                "IPADDR=192.168.1.10\n"
                                "NETMASK=255.255.255.0\n"
                                "IPV6INIT=static\n"
                                "IPV6ADDR=2001:db8::2\n"
                                "IPV6PREFIXLENG=48\n"
                                "IPV6_DEFAULTGW=2001:db8::ff\n"
                                "IPV6DNS=2001:db8::53\n"
                                "IPV6DNS2=2001:db8::54\n";
const std::string kInfo = "eth0_mtu=\"9000\"\neth0.10_mtu=\"9000\"\n";
const std::string kNewInfo = "eth0_mtu=\"9000\"\n";

const texts kCommands{"/etc/rc.network stop eth0 eth0.10",
                      "/etc/rc.network start eth0",
                      "/usr/kova/bin/kovafirewall --change-adapter eth0.10 eth0",
                      "/usr/kova/bin/kovafirewall --change-security-adapter eth0.10 eth0",
                      "/usr/kova/bin/tctool -change_interface eth0.10 eth0",
                      "/etc/rc.network nat-restart-dhcp"};
const texts kLocks{"+0x806", "-0x800"};

std::string arguments(int result) {
    return " ORIGIN_IFNAME=[eth0.10] IFNAME=[eth0] RESULT=" + std::to_string(result);
}

texts events(int result) {
    return {"net/ifname_change 4" + arguments(0), "net/ifname_change 5" + arguments(0) + arguments(result)};
}

texts first(const texts &all, size_t number) {
    return {all.begin(), all.begin() + static_cast<long>(number)};
}

} // namespace

class net_vlan_remove : public unit_test {
protected:
    void SetUp() override { begin(); }

    /** An appliance with the VLAN eth0.10. */
    void begin() {
        unit_test::SetUp();
        rig = {};
        kernel.emplace(rig);
        kernel->add("eth0");
        kernel->add("eth0.10", {.row_device = "eth0", .vlan_id = 10});
        write_file("/etc/kovainfo.conf", kInfo);
        write_file(ifcfg("eth0"), kRowFile);
        write_file(ifcfg("eth0.10"), kVlanFile);
    }
    outcome remove(const char *vlan = "eth0.10") {
        return rig.observe([=] { return KLIBNetVlanRemove(vlan); });
    }
    static void expect_untouched() {
        EXPECT_EQ(kRowFile, read_file(ifcfg("eth0")));
        EXPECT_EQ(kVlanFile, read_file(ifcfg("eth0.10")));
        EXPECT_EQ(kInfo, read_file("/etc/kovainfo.conf"));
    }

    /** What a call did that removed the VLAN. */
    static void expect_given_back() {
        EXPECT_EQ(kNewRowFile, read_file(ifcfg("eth0")));
        EXPECT_EQ(texts{"ifcfg-eth0"}, list_dir("/etc/sysconfig/network-scripts"));
        EXPECT_EQ(kNewInfo, read_file("/etc/kovainfo.conf"));
        struct stat status = {};
        EXPECT_EQ(0, stat(ifcfg("eth0").c_str(), &status));
        EXPECT_EQ(0644U, status.st_mode & 07777U);
    }

    std::optional<fake_kernel> kernel;
};

TEST_F(net_vlan_remove, KLIBNetVlanRemove_vlan_givesItsConfigurationBack) {
    EXPECT_OUTCOME(remove(), {.commands = kCommands, .events = events(0), .locks = kLocks, .sleeps = {2000}});
    expect_given_back();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_signal_doesNotShortenTheWait) {
    rig.fail("nanosleep");
    EXPECT_OUTCOME(remove(), {.commands = kCommands, .events = events(0), .locks = kLocks, .sleeps = {1000, 1000}});
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_filesForTheirOwnerAlone_areReadableByAll) {
    shell("chmod 0400 " + ifcfg("eth0") + " " + ifcfg("eth0.10"));
    EXPECT_EQ(0, remove().result);
    expect_given_back();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_lastLinesWithoutNewline_areKept) {
    write_file(ifcfg("eth0"), "BOOTPROTO=none\nLOCAL_LAN=yes");
    write_file(ifcfg("eth0.10"), "VLAN_ID=10\nBOOTPROTO=dhcp");
    EXPECT_EQ(0, remove().result);
    EXPECT_EQ("LOCAL_LAN=yes\nBOOTPROTO=dhcp\n", read_file(ifcfg("eth0")));
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_emptyFiles_leaveAnEmptyOne) {
    write_file(ifcfg("eth0"), "");
    write_file(ifcfg("eth0.10"), "");
    EXPECT_EQ(0, remove().result);
    EXPECT_EQ("", read_file(ifcfg("eth0")));
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_files_changeBetweenStopAndStart) {
    std::string at_stop;
    std::string at_start;
    texts names;
    rig.answer(kCommands[0], 1, "", [&] {
        at_stop = read_file(ifcfg("eth0")) + read_file(ifcfg("eth0.10"));
        names = list_dir("/etc/sysconfig/network-scripts");
    });
    rig.answer(kCommands[1], 127, "", [&] { at_start = read_file(ifcfg("eth0")) + read_file(ifcfg("eth0.10")); });
    EXPECT_EQ(0, remove().result) << "what the script answers is not looked at";
    EXPECT_EQ(kRowFile + kVlanFile, at_stop);
    ASSERT_EQ(3U, names.size()) << "the new file is written, and waits for its place";
    EXPECT_EQ("DEV_", names[0].substr(0, 4));
    EXPECT_EQ(kNewRowFile + "<absent>", at_start);
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_mtuKeyThatStays_doesNoHarm) {
    shell("rm /etc/kovainfo.conf");
    write_file("/etc/kovainfo.conf", "pppoe_enable=\"no\"\n");
    EXPECT_EQ(0, remove().result);
    EXPECT_EQ("pppoe_enable=\"no\"\n", read_file("/etc/kovainfo.conf"));
    begin();
    rig.fail("fsync", 1);
    EXPECT_EQ(0, remove().result);
    EXPECT_EQ(kInfo, read_file("/etc/kovainfo.conf"));
    EXPECT_EQ(kNewRowFile, read_file(ifcfg("eth0")));
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_createdVlan_leavesTheRowDeviceAsItWas) {
    kernel->remove("eth0.10");
    shell("rm " + ifcfg("eth0.10"));
    write_file(ifcfg("eth0"), "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n"
                              "IPV6INIT=auto\n");
    const NETINFO ip{.nIPSource = 1, .szIP = "10.0.0.1", .szMask = "255.0.0.0"};
    ASSERT_EQ(0, rig.observe([&] { return KLIBNetVlanCreate("eth0", 10, &ip); }).result);
    kernel->add("eth0.10", {.row_device = "eth0", .vlan_id = 10});
    EXPECT_EQ(0, remove().result);
    EXPECT_EQ("DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\nIPV6INIT=auto\n",
              read_file(ifcfg("eth0")));
}

// ---- what is refused

TEST_F(net_vlan_remove, KLIBNetVlanRemove_badNames_areRefused) {
    EXPECT_OUTCOME(remove(nullptr), refusal("net_vlan_remove", "((void *)0) != szVlan"));
    EXPECT_OUTCOME(remove(""), refusal("net_vlan_remove", "'\\0' != *szVlan"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(remove(name.c_str()), refusal("net_vlan_remove", "is_interface_name(szVlan)"));
    }
    expect_untouched();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_whatIsNoVlan_isMinusOneWithoutACode) {
    for (const std::string &name : texts{"eth0", "eth9.10", "eth0.100", long_text(15), long_text(16), long_text(17)}) {
        EXPECT_OUTCOME(remove(name.c_str()), {.result = -1});
    }
    expect_untouched();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_noSocket_is3400) {
    rig.fail("socket");
    EXPECT_OUTCOME(remove(), {.result = -1,
                              .code = 0x3400,
                              .unit = "net_vlan_get",
                              .log = {"ERR net_vlan_get:N Cannot open control socket"}});
    expect_untouched();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_eventThatCannotBeOpened_changesNothing) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(remove(), {.result = -1,
                              .code = 0x200,
                              .unit = "platform",
                              .log = {"ERR net_vlan_remove:N Fail to init plugin) [0x0200 platform:N]"}});
    expect_untouched();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_eventThatFails_isLoggedAlone) {
    for (const int nth : {1, 2}) {
        begin();
        rig.fail("KLIBPluginAction", nth);
        EXPECT_OUTCOME(remove(), {.code = 0x2A00,
                                  .unit = "platform",
                                  .log = {std::string("ERR net_vlan_remove:N Fail to execute net plugin (") +
                                          (nth == 1 ? "PRE" : "POST") + ") [0x2A00 platform:N]"},
                                  .commands = kCommands,
                                  .events = events(0),
                                  .locks = kLocks,
                                  .sleeps = {2000}});
        expect_given_back();
    }
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_eventThatIsNotOpen_isNotRaised) {
    for (const int nth : {1, 2}) {
        begin();
        rig.fail("KLIBPluginHasInit", nth);
        const outcome got = remove();
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{}, got.log);
        EXPECT_EQ(nth == 1 ? texts{"net/ifname_change 5" + arguments(0)} : first(events(0), 1), got.events);
        expect_given_back();
    }
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_eventArgumentsThatCannotBeSet_areLoggedAlone) {
    for (const int nth : {1, 2}) {
        begin();
        rig.fail("KLIBPluginSetArgByInt", nth);
        const outcome got = remove();
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{std::string("ERR net_vlan_remove:N Fail to execute net plugin (") +
                        (nth == 1 ? "PRE" : "POST") + ") [0x0200 platform:N]"},
                  got.log);
        EXPECT_EQ(1U, got.events.size());
        expect_given_back();
    }
}

// ---- each step fails in turn

TEST_F(net_vlan_remove, KLIBNetVlanRemove_eachStepFails_stopsThereAndTellsTheResult) {
    const std::string row_path = ifcfg("eth0");
    const std::string vlan_path = ifcfg("eth0.10");
    const std::string mine = "net_vlan_remove";
    const std::string begins = "ERR net_vlan_remove:N ";
    const std::string no_tool = " -change_interface eth0.10 eth0";
    const auto tool = [&](size_t number) { rig.answer(kCommands[number], 1); };

    enum files { kOld, kNoMtu, kRow, kGone };
    struct step {
        const char *name;
        std::function<void()> arrange;
        unsigned code;
        std::string unit;
        texts log;
        files state;
        size_t commands;
        std::string last_command{}; ///< beyond those of every call
    };
    const step steps[] = {
        {"lock of PPPoE",
         [&] { rig.fail("KLIBCFileLock"); },
         0x400,
         "pppoe_check_status",
         {"ERR pppoe_check_status:N KLIBCFileLock() failed.(400)",
          begins + "Disable PPPoE interface eth0.10 Failed.[0x0400 pppoe_check_status:N]"},
         kOld,
         0},
        {"switch of PPPoE",
         [&] { rig.fail("KLIBCFileGetKeyValue"); },
         0x900,
         "platform",
         {begins + "Disable PPPoE interface eth0.10 Failed.[0x0900 platform:N]"},
         kOld,
         0},
        {"lock of PPPoE is given back",
         [&] { rig.fail("KLIBCFileUnlock"); },
         0xD00,
         "platform",
         {begins + "Disable PPPoE interface eth0.10 Failed.[0x0D00 platform:N]"},
         kOld,
         0},
        {"file is made", [&] { rig.fail("KLIBCFileTempFileOpen"); }, 0x900, "platform", {}, kNoMtu, 0},
        {"row file is opened",
         [&] { rig.hide(row_path); },
         0x900,
         mine,
         {begins + "Failed to open " + row_path + ": No such file or directory"},
         kNoMtu,
         0},
        {"row file is read",
         [&] { rig.redirect(row_path, "/etc"); },
         0x900,
         mine,
         {begins + "Failed to read " + row_path + ": Is a directory"},
         kNoMtu,
         0},
        {"VLAN file is opened",
         [&] { rig.hide(vlan_path); },
         0x900,
         mine,
         {begins + "Failed to open " + vlan_path + ": No such file or directory"},
         kNoMtu,
         0},
        {"VLAN file is read",
         [&] { rig.redirect(vlan_path, "/etc"); },
         0x900,
         mine,
         {begins + "Failed to read " + vlan_path + ": Is a directory"},
         kNoMtu,
         0},
        {"file reaches the disk",
         [&] { rig.fail("fsync", 3); },
         0xB00,
         mine,
         {begins + "Failed to write " + row_path + ": Input/output error"},
         kNoMtu,
         0},
        {"file takes its place", [&] { rig.fail("rename", 1); }, 0, "", {}, kNoMtu, 1},
        {"file's mode", [&] { rig.fail("chmod"); }, 0, "", {begins + "change " + row_path + "'s mode failed"}, kRow, 1},
        {"firewall", [&] { tool(2); }, 0, "", {begins + "Failed to /usr/kova/bin/kovafirewall" + no_tool}, kGone, 3},
        {"firewall's rules",
         [&] { tool(3); },
         0,
         "",
         {begins + "Failed to /usr/kova/bin/kovafirewall" + no_tool},
         kGone,
         4},
        {"traffic control", [&] { tool(4); }, 0, "", {begins + "Failed to /usr/kova/bin/tctool" + no_tool}, kGone, 5},
        {"DHCP server's files",
         [&] {
             shell("mkdir /etc/dhcpd");
             rig.fail("KLIBCFileEnumDir");
         },
         0x900,
         "platform",
         {"ERR dhcpd_conf_change_interface:N bad enum [dhcpd-eth0.10-subnet] in [/etc/dhcpd]",
          "ERR dhcpd_conf_change_interface:N Failed to move DHCP tag conf from [eth0.10] to [eth0]"},
         kGone,
         5},
        {"DHCP server's switch",
         [&] {
             write_file("/etc/dhcpd/dhcpd-eth0.10.info", "enable=yes\n");
             rig.fail("rename", 2);
         },
         0,
         "",
         {"ERR dhcpd_conf_change_interface:N Failed to rename "
          "[/etc/dhcpd/dhcpd-eth0.10.info][/etc/dhcpd/dhcpd-eth0.info]",
          "ERR dhcpd_conf_change_interface:N Failed to move interface global setting from [eth0.10] to [eth0]"},
         kGone,
         5},
        {"DHCP server's subnets",
         [&] {
             write_file("/etc/dhcpd/dhcpd-eth0.10-subnet0.conf", "interface=eth0.10\n");
             rig.answer("/bin/sed", 1);
         },
         0,
         "",
         {"ERR dhcpd_conf_change_interface:N Failed to sed [/bin/sed -i s/eth0.10/eth0/g "
          "/etc/dhcpd/dhcpd-eth0-subnet0.conf]",
          "ERR dhcpd_conf_change_interface:N Failed to replace tag in [/etc/dhcpd/dhcpd-eth0-subnet0.conf]",
          "ERR dhcpd_conf_change_interface:N Failed to move DHCP tag conf from [eth0.10] to [eth0]"},
         kGone,
         5,
         "/bin/sed -i s/eth0.10/eth0/g /etc/dhcpd/dhcpd-eth0-subnet0.conf"},
        {"DHCP server", [&] { tool(5); }, 0, "", {}, kGone, 6},
    };
    for (const step &step : steps) {
        SCOPED_TRACE(step.name);
        begin();
        step.arrange();
        const outcome got = remove();
        outcome expected{.result = -1,
                         .code = step.code,
                         .unit = step.unit,
                         .log = step.log,
                         .commands = first(kCommands, step.commands),
                         .events = events(-1),
                         .locks = step.code == 0x400 ? texts{} : kLocks};
        if (!step.last_command.empty()) {
            expected.commands.push_back(step.last_command);
        }
        if (step.commands > 1) {
            expected.sleeps = {2000};
        }
        EXPECT_OUTCOME(got, expected);
        EXPECT_EQ(step.state >= kRow ? kNewRowFile : kRowFile, read_file(row_path));
        EXPECT_EQ(step.state == kGone ? "<absent>" : kVlanFile, read_file(vlan_path));
        EXPECT_EQ(step.state == kOld ? kInfo : kNewInfo, read_file("/etc/kovainfo.conf"));
        EXPECT_EQ(step.state == kGone ? texts{"ifcfg-eth0"} : (texts{"ifcfg-eth0", "ifcfg-eth0.10"}),
                  list_dir("/etc/sysconfig/network-scripts"))
            << "no temporary stays";
    }
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_rowFileThatCannotBeReplaced_failsSilently) {
    rig.answer(kCommands[0], 0, "", [&] { shell("rm " + ifcfg("eth0") + " && mkdir " + ifcfg("eth0")); });
    EXPECT_OUTCOME(remove(), {.result = -1, .commands = {kCommands[0]}, .events = events(-1), .locks = kLocks});
    EXPECT_EQ(kVlanFile, read_file(ifcfg("eth0.10")));
    EXPECT_EQ((texts{"ifcfg-eth0", "ifcfg-eth0.10"}), list_dir("/etc/sysconfig/network-scripts"));
}
