#include "vlan_change.h"

#include <cstring>
#include <kovanetsdk/link.h>

using namespace kova_test;

namespace {

const std::string kRowFile = "# the office\n"
                             "DEVICE=eth0\n"
                             "BOOTPROTO=static\n"
                             "IPADDR=10.0.0.1\n"
                             "NETMASK=255.0.0.0\n"
                             "IPV6INIT=static\n"
                             "IPV6ADDR=2001:db8::1\n"
                             "IPV6PREFIXLENG=64\n"
                             "IPV6_DEFAULTGW=\n"
                             "IPV6DNS=\"2001:db8::53\"\n"
                             "BOOTPROTO2=kept\n"
                             "IPADDR2=kept\n"
                             "NETMASK2=kept\n"
                             "IPV6INIT2=kept\n"
                             "IPV6_DEFAULTGW2=kept\n"
                             " BOOTPROTO=kept\n"
                             "IPV6DNS2=kept\n"
                             "ONBOOT=yes\n"
                             "LOCAL_LAN=yes"; // no final newline
const std::string kNewRowFile = "# the office\n"
                                "DEVICE=eth0\n"
                                "IPV6ADDR=2001:db8::1\n"
                                "IPV6PREFIXLENG=64\n"
                                "BOOTPROTO2=kept\n"
                                "IPADDR2=kept\n"
                                "NETMASK2=kept\n"
                                "IPV6INIT2=kept\n"
                                "IPV6_DEFAULTGW2=kept\n"
                                " BOOTPROTO=kept\n"
                                "IPV6DNS2=kept\n"
                                "ONBOOT=yes\n"
                                "LOCAL_LAN=yes\n"
                                "BOOTPROTO=none\n"
                                "IPV6INIT=off\n";
const std::string kVlanFile = "DEVICE=eth0.10\n"
                              "VLAN_ROW_DEVICE=eth0\n"
                              "VLAN_ID=10\n"
                              "ONBOOT=yes\n"
                              "BOOTPROTO=static\n"
                              "IPADDR=192.168.1.10\n"
                              "NETMASK=255.255.255.0\n"
                              "IPV6INIT=static\n"
                              "IPV6ADDR=2001:db8::1\n"
                              "IPV6PREFIXLENG=64\n"
                              "IPV6DNS=2001:db8::53\n";

const texts kPppoeLock{"+0x806", "-0x800"};

} // namespace

class net_vlan_create : public vlan_change {
protected:
    net_vlan_create()
        : vlan_change{"net_vlan_create",
                      "eth0",
                      "eth0.10",
                      {"/etc/rc.network stop eth0", "/etc/rc.network start eth0 eth0.10"},
                      {"+0x806", "-0x800", "+0x806", "-0x800"}} {}

    /** An appliance with eth0, whose MTU is set, and no VLAN. */
    void begin() override {
        unit_test::SetUp();
        rig = {};
        kernel.emplace(rig);
        kernel->add("eth0", {.ip = "10.0.0.1", .mask = "255.0.0.0"});
        write_file("/etc/kovainfo.conf", "eth0_mtu=\"9000\"\n");
        write_file(ifcfg("eth0"), kRowFile);
    }
    void list_vlans(const std::string &lines) {
        write_file("/tmp/proc-vlan/config",
                   "VLAN Dev name    | VLAN ID\nName-Type: VLAN_NAME_TYPE_RAW_PLUS_VID_NO_PAD\n" + lines);
        rig.redirect("/proc/net/vlan", "/tmp/proc-vlan");
    }
    outcome create(const char *row = "eth0", int id = 10) {
        return rig.observe([&] { return KLIBNetVlanCreate(row, id, &ip); });
    }
    outcome change() override { return create(); }
    void expect_files(progress reached) override {
        EXPECT_EQ(reached >= kRow ? kNewRowFile : kRowFile, read_file(ifcfg("eth0")));
        EXPECT_EQ(reached == kAll ? kVlanFile : "<absent>", read_file(ifcfg("eth0.10")));
        EXPECT_EQ(reached == kNothing ? "eth0_mtu=\"9000\"\n" : "eth0_mtu=\"9000\"\neth0.10_mtu=\"9000\"\n",
                  read_file("/etc/kovainfo.conf"));
        EXPECT_EQ(reached == kAll ? (texts{"ifcfg-eth0", "ifcfg-eth0.10"}) : texts{"ifcfg-eth0"},
                  list_dir("/etc/sysconfig/network-scripts"))
            << "no temporary stays";
        if (reached == kAll) {
            EXPECT_EQ(0644U, mode_of(ifcfg("eth0")));
        }
    }
    void expect_untouched() { expect_files(kNothing); }
    /** What a call did that made the VLAN. */
    void expect_moved() {
        expect_files(kAll);
        EXPECT_EQ(0644U, mode_of(ifcfg("eth0.10")));
    }

    NETINFO ip{.nIPSource = 1, .szIP = "192.168.1.10", .szMask = "255.255.255.0"};
};

TEST_F(net_vlan_create, KLIBNetVlanCreate_staticAddress_movesTheConfigurationToTheVlan) {
    EXPECT_OUTCOME(create(), done());
    expect_moved();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_signal_doesNotShortenTheWait) {
    rig.fail("nanosleep");
    EXPECT_OUTCOME(create(), {.commands = commands_, .events = events(0), .locks = locks_, .sleeps = {1000, 1000}});
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_dhcp_looksAtNoAddress) {
    ip = {.szIP = "no address", .szMask = "no mask"};
    write_file(ifcfg("eth0"), "DEVICE=eth0\n");
    EXPECT_OUTCOME(create(), done());
    EXPECT_EQ("DEVICE=eth0.10\nVLAN_ROW_DEVICE=eth0\nVLAN_ID=10\nONBOOT=yes\nBOOTPROTO=dhcp\n",
              read_file(ifcfg("eth0.10")));
    EXPECT_EQ("DEVICE=eth0\nBOOTPROTO=none\nIPV6INIT=off\n", read_file(ifcfg("eth0")));
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_settings_areThereBetweenStopAndStart) {
    std::string at_stop;
    std::string at_start;
    texts names;
    rig.answer(commands_[0], 1, "", [&] {
        at_stop = read_file(ifcfg("eth0")) + read_file(ifcfg("eth0.10"));
        names = list_dir("/etc/sysconfig/network-scripts");
    });
    rig.answer(commands_[1], 127, "", [&] { at_start = read_file(ifcfg("eth0")) + read_file(ifcfg("eth0.10")); });
    EXPECT_EQ(0, create().result) << "what the script answers is not looked at";
    EXPECT_EQ(kRowFile + "<absent>", at_stop);
    ASSERT_EQ(3U, names.size()) << "the new files are written, and wait for their places";
    EXPECT_EQ("DEVICE_", names[0].substr(0, 7));
    EXPECT_EQ("VLAN_", names[1].substr(0, 5));
    EXPECT_EQ(kNewRowFile + kVlanFile, at_start);
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_filesForTheirOwnerAlone_areReadableByAll) {
    write_file(ifcfg("eth0.10"), "DEVICE=old\n");
    shell("chmod 0400 " + ifcfg("eth0") + " " + ifcfg("eth0.10"));
    EXPECT_EQ(0, create().result);
    expect_moved();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_noMtuSetting_isTheOrdinaryOne) {
    write_file("/etc/kovainfo.conf", "");
    EXPECT_EQ(0, create().result);
    EXPECT_EQ("eth0.10_mtu=\"1500\"\n", read_file("/etc/kovainfo.conf"));
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_smallestAndLargestId_areTaken) {
    for (const int id : {1, 4094}) {
        begin();
        EXPECT_EQ(0, create("eth0", id).result);
        EXPECT_NE(std::string::npos,
                  read_file(ifcfg("eth0." + std::to_string(id))).find("VLAN_ID=" + std::to_string(id) + "\n"));
    }
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_longRowDevice_hasAVlanWithACutName) {
    kernel->add("abcdefghijklm");
    write_file(ifcfg("abcdefghijklm"), "");
    EXPECT_EQ(0, create("abcdefghijklm", 4094).result);
    EXPECT_EQ("DEVICE=abcdefghijklm.4\nVLAN_ROW_DEVICE=abcdefghijklm\nVLAN_ID=4094\n",
              read_file(ifcfg("abcdefghijklm.4")).substr(0, 66));
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_pppoeOnTheRowDevice_isStopped) {
    write_file("/etc/kovainfo.conf", "eth0_mtu=\"9000\"\npppoe_enable=\"yes\"\n");
    EXPECT_EQ(0, create().result) << "nothing runs: the switch is put right";
    EXPECT_EQ("eth0_mtu=\"9000\"\npppoe_enable=\"no\"\neth0.10_mtu=\"9000\"\n", read_file("/etc/kovainfo.conf"));
}

// ---- what is refused

TEST_F(net_vlan_create, KLIBNetVlanCreate_badArguments_areRefused) {
    const std::string unit = "net_vlan_create";
    EXPECT_OUTCOME(create(nullptr), refusal(unit, "((void *)0) != szRowDevice"));
    EXPECT_OUTCOME(create(""), refusal(unit, "'\\0' != *szRowDevice"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(create(name.c_str()), refusal(unit, "is_interface_name(szRowDevice)"));
    }
    for (const int id : {0, -1, 4095, 4096, 2147483647, -2147483647 - 1}) {
        EXPECT_OUTCOME(create("eth0", id), refusal(unit, "0 == KLIBNetVlanValidId(nId)"));
    }
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetVlanCreate("eth0", 10, nullptr); }),
                   refusal(unit, "NULL != pNetInfo"));
    for (const size_t length : {14, 15, 16, 17}) { // the VLAN would have no id in its name, or the same name
        EXPECT_OUTCOME(create(long_text(length).c_str(), 1), refusal(unit, "strlen(szRowDevice) <= kLongestRowDevice"));
    }
    expect_untouched();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_badStaticAddress_isRefused) {
    for (const auto &[address, mask] : std::map<std::string, std::string>{{"", "255.255.255.0"},
                                                                          {"192.168.1.10", ""},
                                                                          {"192.168.1.255", "255.255.255.0"},
                                                                          {"192.168.1", "255.255.255.0"},
                                                                          {"192.168.1.11", "255.0.255.0"},
                                                                          {"1.1.1.1\nBOOTPROTO=", "255.0.0.0"},
                                                                          {"11111111111111111111", "255.0.0.0"},
                                                                          {"10.0.0.2", "22222222222222222222"}}) {
        memcpy(ip.szIP, address.c_str(), std::min(address.size() + 1, sizeof ip.szIP));
        memcpy(ip.szMask, mask.c_str(), std::min(mask.size() + 1, sizeof ip.szMask));
        const outcome got = create();
        EXPECT_EQ(-1, got.result) << address << " " << mask;
        EXPECT_EQ(0xD00U, got.code);
        EXPECT_EQ("net_vlan_create", got.unit);
        ASSERT_FALSE(got.log.empty());
        EXPECT_EQ("ERR net_vlan_create:N Invaild Argument (BlKLIBIsValidIpMask(szIP, szMask))=[0]", got.log.back());
        EXPECT_EQ(texts{}, got.commands);
        EXPECT_EQ(texts{}, got.events);
    }
    expect_untouched();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_unknownRowDevice_isBC00) {
    const outcome got = create("eth9");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0xBC00U, got.code);
    EXPECT_EQ("net_vlan_create", got.unit);
    EXPECT_EQ("ERR net_vlan_create:N No interface eth9", got.log.back());
    EXPECT_EQ(texts{}, got.commands);
    expect_untouched();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_onAVlan_isD00) {
    kernel->add("eth0.10", {.row_device = "eth0", .vlan_id = 10});
    EXPECT_OUTCOME(create("eth0.10", 20), {.result = -1,
                                           .code = 0xD00,
                                           .unit = "net_vlan_create",
                                           .log = {"ERR net_vlan_create:N eth0.10 is a VLAN itself"}});
    expect_untouched();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_vlanThatExists_isBB00) {
    kernel->add("eth0.10", {.row_device = "eth0", .vlan_id = 10});
    EXPECT_OUTCOME(create(), {.result = -1,
                              .code = 0xBB00,
                              .unit = "net_vlan_create",
                              .log = {"ERR net_vlan_create:N VLAN eth0.10 exists"}});
    expect_untouched();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_secondVlan_isBB00) {
    list_vlans("eth1.20        | 20  | eth1\neth0.10\t| 10  | eth0\n");
    EXPECT_OUTCOME(create("eth0", 20), {.result = -1,
                                        .code = 0xBB00,
                                        .unit = "net_vlan_create",
                                        .log = {"ERR net_vlan_create:N eth0 has a VLAN already"}});
    expect_untouched();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_vlansOfOthers_areNoHindrance) {
    list_vlans("eth1.20        | 20  | eth1\neth00.10       | 10  | eth00\n");
    EXPECT_EQ(0, create().result);
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_listThatIsNone_changesNothing) {
    list_vlans("eth1.20 twenty eth1\n");
    EXPECT_OUTCOME(create(), {.result = -1,
                              .code = 0x4000,
                              .unit = "net_vlan_enum",
                              .log = {"ERR net_vlan_enum:N Get wrong format from /proc/net/vlan/config: eth1.20 "
                                      "twenty eth1"}});
    expect_untouched();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_noSocket_changesNothing) {
    for (int nth = 1; nth <= 3; ++nth) {
        begin();
        rig.fail("socket", nth);
        const outcome got = create();
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ(nth == 1 ? 0xBC00U : 0x3400U, got.code);
        EXPECT_EQ(nth == 1 ? "net_vlan_create" : "net_vlan_get", got.unit);
        EXPECT_EQ(texts{}, got.events);
        expect_untouched();
    }
}

// ---- each step fails in turn

TEST_F(net_vlan_create, KLIBNetVlanCreate_eachStepFails_stopsThereAndTellsTheResult) {
    const std::string row_path = ifcfg("eth0");
    const std::string vlan_path = ifcfg("eth0.10");
    const std::string mine = "net_vlan_create";
    const std::string begins = "ERR net_vlan_create:N ";
    const std::string no_mtu = begins + "Set mtu config eth0.10 mtu=";
    std::vector<step> steps{
        {"lock of PPPoE",
         [&] { rig.fail("KLIBCFileLock"); },
         0x400,
         "pppoe_check_status",
         {"ERR pppoe_check_status:N KLIBCFileLock() failed.(400)",
          begins + "Disable PPPoE interface eth0 Failed.[0x0400 pppoe_check_status:N]"},
         kNothing,
         0,
         0},
        {"switch of PPPoE",
         [&] { rig.fail("KLIBCFileGetKeyValue", 1); },
         0x900,
         "platform",
         {begins + "Disable PPPoE interface eth0 Failed.[0x0900 platform:N]"},
         kNothing,
         0,
         2},
        {"lock of PPPoE is given back",
         [&] { rig.fail("KLIBCFileUnlock", 1); },
         0xD00,
         "platform",
         {begins + "Disable PPPoE interface eth0 Failed.[0x0D00 platform:N]"},
         kNothing,
         0,
         2},
        {"MTU is read",
         [&] { rig.fail("KLIBCFileGetKeyValue", 2); },
         0x900,
         "platform",
         {"ERR conf_get_mtu_value (N) Failed to get eth0_mtu (900)", no_mtu + " Failed.[0x0900 platform:N]"},
         kNothing,
         0,
         2},
        {"lock of the MTU",
         [&] { rig.fail("KLIBCFileLock", 2); },
         0x400,
         "platform",
         {"ERR conf_get_mtu_value:N Failed to lock kovainfo [0x0400 platform:N]",
          no_mtu + "9000 Failed.[0x0400 platform:N]"},
         kNothing,
         0,
         2},
        {"MTU is stored",
         [&] { rig.fail("KLIBCFileSetKeyValue"); },
         0xB00,
         "platform",
         {"ERR conf_get_mtu_value:N Failed to set eth0.10 MTU config value[0x0B00 platform:N]",
          no_mtu + "9000 Failed.[0x0B00 platform:N]"},
         kNothing,
         0},
        {"lock of the MTU is given back",
         [&] { rig.fail("KLIBCFileUnlock", 2); },
         0xD00,
         "platform",
         {"ERR conf_get_mtu_value:N Failed to unlock kovainfo[0x0D00 platform:N]",
          no_mtu + "9000 Failed.[0x0D00 platform:N]"},
         kMtu,
         0},
        {"VLAN file is made", [&] { rig.fail("KLIBCFileTempFileOpen", 1); }, 0x900, "platform", {}, kMtu, 0},
        {"row file is there",
         [&] { rig.hide(row_path); },
         0x900,
         "key_value",
         {begins + "Failed to get key[IPV6INIT] in file[" + row_path + "]."},
         kMtu,
         0},
        {"row file is a file",
         [&] { rig.redirect(row_path, "/etc"); },
         0x900,
         "key_value",
         {begins + "Failed to get key[IPV6INIT] in file[" + row_path + "]."},
         kMtu,
         0},
        {"last IPv6 setting is read",
         [&] { rig.fail("KLIBCFileGetKeyValue", 7); },
         0x900,
         "platform",
         {begins + "Failed to get key[IPV6DNS] in file[" + row_path + "]."},
         kMtu,
         0},
        {"VLAN file reaches the disk",
         [&] { rig.fail("fsync", 3); },
         0xB00,
         mine,
         {begins + "Failed to write " + vlan_path + ": Input/output error"},
         kMtu,
         0},
        {"row file is made", [&] { rig.fail("KLIBCFileTempFileOpen", 2); }, 0x900, "platform", {}, kMtu, 0},
        {"row file is opened",
         [&] { rig.fail("fopen"); },
         0x900,
         mine,
         {begins + "Failed to open " + row_path + ": Too many open files"},
         kMtu,
         0},
        {"row file reaches the disk",
         [&] { rig.fail("fsync", 4); },
         0xB00,
         mine,
         {begins + "Failed to write " + row_path + ": Input/output error"},
         kMtu,
         0},
        {"row file takes its place", [&] { rig.fail("rename", 1); }, 0, "", {}, kMtu, 1},
        {"row file's mode",
         [&] { rig.fail("chmod"); },
         0,
         "",
         {begins + "change " + row_path + "'s mode failed"},
         kRow,
         1},
        {"VLAN file takes its place", [&] { rig.fail("rename", 2); }, 0, "", {}, kRow, 1},
        {"VLAN file's mode",
         [&] { rig.fail("chmod", 2); },
         0,
         "",
         {begins + "change " + vlan_path + "'s mode failed"},
         kAll,
         1},
    };
    for (step &one : steps_after_files(3)) {
        steps.push_back(std::move(one));
    }
    fail_each(steps);
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_diskThatTakesNothing_leavesTheInterfaceFiles) {
    disk_that_takes_nothing();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_rowFileThatCannotBeReplaced_failsSilently) {
    rig.answer(commands_[0], 0, "", [&] { shell("rm " + ifcfg("eth0") + " && mkdir " + ifcfg("eth0")); });
    EXPECT_OUTCOME(create(), {.result = -1, .commands = {commands_[0]}, .events = events(-1), .locks = locks_});
    EXPECT_EQ(texts{"ifcfg-eth0"}, list_dir("/etc/sysconfig/network-scripts"));
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_vlanFileThatCannotBeReplaced_failsSilently) {
    shell("mkdir " + ifcfg("eth0.10"));
    EXPECT_OUTCOME(create(), {.result = -1, .commands = {commands_[0]}, .events = events(-1), .locks = locks_});
    EXPECT_EQ(kNewRowFile, read_file(ifcfg("eth0")));
    EXPECT_EQ((texts{"ifcfg-eth0", "ifcfg-eth0.10"}), list_dir("/etc/sysconfig/network-scripts"));
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_eventThatCannotBeOpened_changesNothing) {
    event_that_cannot_be_opened();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_eventThatFails_isLoggedAlone) {
    events_that_fail();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_eventThatIsNotOpen_isNotRaised) {
    events_that_are_not_open();
}

TEST_F(net_vlan_create, KLIBNetVlanCreate_eventArgumentsThatCannotBeSet_areLoggedAlone) {
    event_arguments_that_cannot_be_set_before("KLIBPluginSetArgByArray", 1, "");
    event_arguments_that_cannot_be_set_after("KLIBPluginSetArgByInt", 2);
}
