#include "vlan_change.h"

#include <kovanetsdk/link.h>

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

} // namespace

class net_vlan_remove : public vlan_change {
protected:
    net_vlan_remove()
        : vlan_change{"net_vlan_remove",
                      "eth0.10",
                      "eth0",
                      {"/etc/rc.network stop eth0 eth0.10", "/etc/rc.network start eth0"},
                      {"+0x806", "-0x800"}} {}

    /** An appliance with the VLAN eth0.10. */
    void begin() override {
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
    outcome change() override { return remove(); }
    void expect_files(progress reached) override {
        EXPECT_EQ(reached >= kRow ? kNewRowFile : kRowFile, read_file(ifcfg("eth0")));
        EXPECT_EQ(reached == kAll ? "<absent>" : kVlanFile, read_file(ifcfg("eth0.10")));
        EXPECT_EQ(reached == kNothing ? kInfo : kNewInfo, read_file("/etc/kovainfo.conf"));
        EXPECT_EQ(reached == kAll ? texts{"ifcfg-eth0"} : (texts{"ifcfg-eth0", "ifcfg-eth0.10"}),
                  list_dir("/etc/sysconfig/network-scripts"))
            << "no temporary stays";
        if (reached == kAll) {
            EXPECT_EQ(0644U, mode_of(ifcfg("eth0")));
        }
    }
    void expect_untouched() { expect_files(kNothing); }
    /** What a call did that removed the VLAN. */
    void expect_given_back() { expect_files(kAll); }
};

TEST_F(net_vlan_remove, KLIBNetVlanRemove_vlan_givesItsConfigurationBack) {
    EXPECT_OUTCOME(remove(), done());
    expect_given_back();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_signal_doesNotShortenTheWait) {
    rig.fail("nanosleep");
    EXPECT_OUTCOME(remove(), {.commands = commands_, .events = events(0), .locks = locks_, .sleeps = {1000, 1000}});
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
    rig.answer(commands_[0], 1, "", [&] {
        at_stop = read_file(ifcfg("eth0")) + read_file(ifcfg("eth0.10"));
        names = list_dir("/etc/sysconfig/network-scripts");
    });
    rig.answer(commands_[1], 127, "", [&] { at_start = read_file(ifcfg("eth0")) + read_file(ifcfg("eth0.10")); });
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
    event_that_cannot_be_opened();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_eventThatFails_isLoggedAlone) {
    events_that_fail();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_eventThatIsNotOpen_isNotRaised) {
    events_that_are_not_open();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_eventArgumentsThatCannotBeSet_areLoggedAlone) {
    event_arguments_that_cannot_be_set_before("KLIBPluginSetArgByInt", 1, " ORIGIN_IFNAME=[eth0.10] IFNAME=[eth0]");
    event_arguments_that_cannot_be_set_after("KLIBPluginSetArgByInt", 2);
}

// ---- each step fails in turn

TEST_F(net_vlan_remove, KLIBNetVlanRemove_eachStepFails_stopsThereAndTellsTheResult) {
    const std::string row_path = ifcfg("eth0");
    const std::string vlan_path = ifcfg("eth0.10");
    const std::string mine = "net_vlan_remove";
    const std::string begins = "ERR net_vlan_remove:N ";
    std::vector<step> steps{
        {"lock of PPPoE",
         [&] { rig.fail("KLIBCFileLock"); },
         0x400,
         "pppoe_check_status",
         {"ERR pppoe_check_status:N KLIBCFileLock() failed.(400)",
          begins + "Disable PPPoE interface eth0.10 Failed.[0x0400 pppoe_check_status:N]"},
         kNothing,
         0,
         0},
        {"switch of PPPoE",
         [&] { rig.fail("KLIBCFileGetKeyValue"); },
         0x900,
         "platform",
         {begins + "Disable PPPoE interface eth0.10 Failed.[0x0900 platform:N]"},
         kNothing,
         0},
        {"lock of PPPoE is given back",
         [&] { rig.fail("KLIBCFileUnlock"); },
         0xD00,
         "platform",
         {begins + "Disable PPPoE interface eth0.10 Failed.[0x0D00 platform:N]"},
         kNothing,
         0},
        {"file is made", [&] { rig.fail("KLIBCFileTempFileOpen"); }, 0x900, "platform", {}, kMtu, 0},
        {"row file is opened",
         [&] { rig.hide(row_path); },
         0x900,
         mine,
         {begins + "Failed to open " + row_path + ": No such file or directory"},
         kMtu,
         0},
        {"row file is read",
         [&] { rig.redirect(row_path, "/etc"); },
         0x900,
         mine,
         {begins + "Failed to read " + row_path + ": Is a directory"},
         kMtu,
         0},
        {"VLAN file is opened",
         [&] { rig.hide(vlan_path); },
         0x900,
         mine,
         {begins + "Failed to open " + vlan_path + ": No such file or directory"},
         kMtu,
         0},
        {"VLAN file is read",
         [&] { rig.redirect(vlan_path, "/etc"); },
         0x900,
         mine,
         {begins + "Failed to read " + vlan_path + ": Is a directory"},
         kMtu,
         0},
        {"file reaches the disk",
         [&] { rig.fail("fsync", 3); },
         0xB00,
         mine,
         {begins + "Failed to write " + row_path + ": Input/output error"},
         kMtu,
         0},
        {"file takes its place", [&] { rig.fail("rename", 1); }, 0, "", {}, kMtu, 1},
        {"file's mode", [&] { rig.fail("chmod"); }, 0, "", {begins + "change " + row_path + "'s mode failed"}, kRow, 1},
    };
    for (step &one : steps_after_files(2)) {
        steps.push_back(std::move(one));
    }
    fail_each(steps);
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_vlanFileThatStays_isNotLookedAt) {
    rig.answer(commands_[0], 0, "", [] { shell("rm " + ifcfg("eth0.10") + " && mkdir " + ifcfg("eth0.10")); });
    EXPECT_OUTCOME(remove(), done());
    EXPECT_EQ(kNewRowFile, read_file(ifcfg("eth0")));
    EXPECT_EQ((texts{"ifcfg-eth0", "ifcfg-eth0.10"}), list_dir("/etc/sysconfig/network-scripts"));
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_diskThatTakesNothing_leavesTheInterfaceFiles) {
    disk_that_takes_nothing();
}

TEST_F(net_vlan_remove, KLIBNetVlanRemove_rowFileThatCannotBeReplaced_failsSilently) {
    rig.answer(commands_[0], 0, "", [&] { shell("rm " + ifcfg("eth0") + " && mkdir " + ifcfg("eth0")); });
    EXPECT_OUTCOME(remove(), {.result = -1, .commands = {commands_[0]}, .events = events(-1), .locks = locks_});
    EXPECT_EQ(kVlanFile, read_file(ifcfg("eth0.10")));
    EXPECT_EQ((texts{"ifcfg-eth0", "ifcfg-eth0.10"}), list_dir("/etc/sysconfig/network-scripts"));
}
