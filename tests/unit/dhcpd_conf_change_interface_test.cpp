#include "support/rig.h"

#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

const std::string kUnit = "ERR dhcpd_conf_change_interface:N ";
const std::string kDir = "/etc/dhcpd/";

const std::string kSubnet = "interface=eth0\ndhcp-range=set:eth00,192.168.1.10,192.168.1.20,255.255.255.0,600\n"
                            "dhcp-option=tag:eth00,option:router,192.168.1.1\n";
const std::string kMovedSubnet =
    "interface=ovs_eth0\ndhcp-range=set:ovs_eth00,192.168.1.10,192.168.1.20,255.255.255.0,600\n"
    "dhcp-option=tag:ovs_eth00,option:router,192.168.1.1\n";

/** What sed is told about a file of the new name. */
std::string sed(const std::string &file, const std::string &from = "eth0", const std::string &to = "ovs_eth0") {
    return "/bin/sed -i s/" + from + "/" + to + "/g " + kDir + file;
}

std::string move_failure(const std::string &what) {
    return kUnit + "Failed to move " + what + " from [eth0] to [ovs_eth0]";
}

std::string rename_failure(const std::string &from, const std::string &to) {
    return kUnit + "Failed to rename [" + kDir + from + "][" + kDir + to + "]";
}

std::string sed_failure(const std::string &file) {
    return kUnit + "Failed to sed [/bin/sed -i s/eth0/ovs_eth0/g " + kDir + file + "]";
}

/** A directory that holds something, in the way of a rename. */
void block(const std::string &name) {
    write_file(kDir + name + "/in the way", "");
}

} // namespace

class dhcpd_conf_change_interface : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        rig.let_run("/bin/sed");
    }
    outcome change(const char *from = "eth0", const char *to = "ovs_eth0") {
        return rig.observe([=] { return DHCPDConfChangeInterface(from, to); });
    }
};

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_everyFile_followsTheName) {
    write_file(kDir + "dhcpd-eth0.info", "enable=\"yes\"\nbonding_backup_enable=\"eth0\"\n");
    write_file(kDir + "dhcpd-eth0-subnet0.conf", kSubnet);
    write_file(kDir + "dhcpd-eth0-subnet0.info", "enable=\"yes\"\n");
    write_file(kDir + "dhcpd-eth0-subnet12.conf", kSubnet);
    write_file(kDir + "dhcpd-eth0-static.conf", "dhcp-host=set:eth00,02:00:00:00:00:01,192.168.1.11\n");
    write_file(kDir + "wpad-eth0.conf", "dhcp-option=tag:eth00,252,http://eth0.example/wpad.dat\n");
    write_file(kDir + "wpad-eth0.info", "enable=\"no\" # eth0\n");
    EXPECT_OUTCOME(change(), {.commands = {sed("dhcpd-ovs_eth0-subnet0.conf"), sed("dhcpd-ovs_eth0-subnet0.info"),
                                           sed("dhcpd-ovs_eth0-subnet12.conf"), sed("wpad-ovs_eth0.conf")}});
    EXPECT_EQ(
        (texts{"dhcpd-ovs_eth0-static.conf", "dhcpd-ovs_eth0-subnet0.conf", "dhcpd-ovs_eth0-subnet0.info",
               "dhcpd-ovs_eth0-subnet12.conf", "dhcpd-ovs_eth0.info", "wpad-ovs_eth0.conf", "wpad-ovs_eth0.info"}),
        list_dir(kDir));
    EXPECT_EQ(kMovedSubnet, read_file(kDir + "dhcpd-ovs_eth0-subnet0.conf"));
    EXPECT_EQ(kMovedSubnet, read_file(kDir + "dhcpd-ovs_eth0-subnet12.conf"));
    EXPECT_EQ("dhcp-option=tag:ovs_eth00,252,http://ovs_eth0.example/wpad.dat\n",
              read_file(kDir + "wpad-ovs_eth0.conf"));
    // these are moved as they are
    EXPECT_EQ("enable=\"yes\"\nbonding_backup_enable=\"eth0\"\n", read_file(kDir + "dhcpd-ovs_eth0.info"));
    EXPECT_EQ("dhcp-host=set:eth00,02:00:00:00:00:01,192.168.1.11\n", read_file(kDir + "dhcpd-ovs_eth0-static.conf"));
    EXPECT_EQ("enable=\"no\" # eth0\n", read_file(kDir + "wpad-ovs_eth0.info"));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_otherFiles_stay) {
    const texts others{"dhcpd-eth0-lan.conf", "dhcpd-eth0-lan.info",      "dhcpd-eth01-subnet0.conf",
                       "dhcpd-eth01.info",    "dhcpd-pxe.info",           "dhcpd-vendor.conf",
                       "dhcpd.info",          "dhcpd6-eth0-subnet0.conf", "dhcpd6-eth0-subnet0.info",
                       "dhcpd6-eth0.info",    "wpad-eth01.conf",          "xdhcpd-eth0-subnet0.conf"};
    for (const std::string &name : others) {
        write_file(kDir + name, kSubnet);
    }
    EXPECT_OUTCOME(change(), {});
    EXPECT_EQ(others, list_dir(kDir));
    for (const std::string &name : others) {
        EXPECT_EQ(kSubnet, read_file(kDir + name)) << name;
    }
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_nothingToMove_isSuccess) {
    EXPECT_OUTCOME(change(), {}); // not even the directory
    EXPECT_EQ("<absent>", read_file(kDir + "dhcpd-ovs_eth0.info"));
    shell("mkdir /etc/dhcpd");
    EXPECT_OUTCOME(change(), {});
    EXPECT_EQ(texts{}, list_dir(kDir));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_fileInPlaceOfTheDirectory_isNothingToMove) {
    write_file("/etc/dhcpd", "a file");
    EXPECT_OUTCOME(change(), {});
    EXPECT_EQ("a file", read_file("/etc/dhcpd"));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_filesOfTheNewName_areReplaced) {
    write_file(kDir + "dhcpd-eth0.info", "enable=\"yes\"\n");
    write_file(kDir + "dhcpd-ovs_eth0.info", "enable=\"no\"\n");
    write_file(kDir + "dhcpd-eth0-subnet0.conf", kSubnet);
    write_file(kDir + "dhcpd-ovs_eth0-subnet0.conf", "interface=ovs_eth0\n");
    write_file(kDir + "dhcpd-ovs_eth0-subnet1.conf", "interface=ovs_eth0\n");
    EXPECT_OUTCOME(change(), {.commands = {sed("dhcpd-ovs_eth0-subnet0.conf")}});
    EXPECT_EQ("enable=\"yes\"\n", read_file(kDir + "dhcpd-ovs_eth0.info"));
    EXPECT_EQ(kMovedSubnet, read_file(kDir + "dhcpd-ovs_eth0-subnet0.conf"));
    EXPECT_EQ("interface=ovs_eth0\n", read_file(kDir + "dhcpd-ovs_eth0-subnet1.conf"));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_sameName_changesNothing) {
    write_file(kDir + "dhcpd-eth0.info", "enable=\"yes\"\n");
    write_file(kDir + "dhcpd-eth0-subnet0.conf", kSubnet);
    EXPECT_OUTCOME(change("eth0", "eth0"), {.commands = {sed("dhcpd-eth0-subnet0.conf", "eth0", "eth0")}});
    EXPECT_EQ((texts{"dhcpd-eth0-subnet0.conf", "dhcpd-eth0.info"}), list_dir(kDir));
    EXPECT_EQ(kSubnet, read_file(kDir + "dhcpd-eth0-subnet0.conf"));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_dotInTheName_matchesAnyCharacter) {
    write_file(kDir + "dhcpd-eth0.10-subnet0.conf", "interface=eth0.10\nset:eth0.100 eth0x10 neth0-10eth0.1\n");
    EXPECT_OUTCOME(change("eth0.10", "bond0.7"),
                   {.commands = {sed("dhcpd-bond0.7-subnet0.conf", "eth0.10", "bond0.7")}});
    EXPECT_EQ("interface=bond0.7\nset:bond0.70 bond0.7 nbond0.7eth0.1\n",
              read_file(kDir + "dhcpd-bond0.7-subnet0.conf"));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_unusualNames_areMovedLikeOthers) {
    for (const std::string &name : texts{"%s%n", "a-b", "-", "eth0'\"", long_text(230)}) {
        write_file(kDir + "dhcpd-" + name + "-subnet3.conf", "interface=" + name + "\n");
        EXPECT_OUTCOME(change(name.c_str(), "new0"), {.commands = {sed("dhcpd-new0-subnet3.conf", name, "new0")}});
        EXPECT_EQ("interface=new0\n", read_file(kDir + "dhcpd-new0-subnet3.conf"));
        EXPECT_OUTCOME(change("new0", name.c_str()),
                       {.commands = {sed("dhcpd-" + name + "-subnet3.conf", "new0", name)}});
        EXPECT_EQ(texts{"dhcpd-" + name + "-subnet3.conf"}, list_dir(kDir));
        shell("rm -r /etc/dhcpd");
    }
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_onlyRegularFiles_areSubnets) {
    write_file(kDir + "dhcpd-eth0-subnet0.conf", kSubnet);
    write_file(kDir + "dhcpd-eth0-subnet1.conf/file", kSubnet);
    write_file("/tmp/elsewhere", kSubnet);
    shell("ln -s /tmp/elsewhere /etc/dhcpd/dhcpd-eth0-subnet2.conf");
    EXPECT_OUTCOME(change(), {.commands = {sed("dhcpd-ovs_eth0-subnet0.conf")}});
    EXPECT_EQ((texts{"dhcpd-eth0-subnet1.conf", "dhcpd-eth0-subnet2.conf", "dhcpd-ovs_eth0-subnet0.conf"}),
              list_dir(kDir));
    EXPECT_EQ(kSubnet, read_file("/tmp/elsewhere"));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_badNames_changeNothing) {
    write_file(kDir + "dhcpd-eth0.info", "enable=\"yes\"\n");
    const outcome missing{
        .result = -1, .code = 0xD00, .unit = "dhcpd_conf_change_interface", .log = {kUnit + "Bad parameters"}};
    EXPECT_OUTCOME(change(nullptr, "eth1"), missing);
    EXPECT_OUTCOME(change("eth0", nullptr), missing);
    EXPECT_OUTCOME(change(nullptr, nullptr), missing);
    EXPECT_OUTCOME(change("", "eth1"), refusal("dhcpd_conf_change_interface", "'\\0' != *old_if"));
    EXPECT_OUTCOME(change("eth0", ""), refusal("dhcpd_conf_change_interface", "'\\0' != *new_if"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(change(name.c_str(), "eth1"),
                       refusal("dhcpd_conf_change_interface", "is_interface_name(old_if)"));
        EXPECT_OUTCOME(change("eth0", name.c_str()),
                       refusal("dhcpd_conf_change_interface", "is_interface_name(new_if)"));
    }
    EXPECT_OUTCOME(change("eth0\\n", "eth1"), refusal("dhcpd_conf_change_interface", "'\\\\' != *old_if"));
    EXPECT_OUTCOME(change("eth0", "\\ninterface=eth9"), refusal("dhcpd_conf_change_interface", "'\\\\' != *new_if"));
    EXPECT_EQ(texts{"dhcpd-eth0.info"}, list_dir(kDir));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_switchThatCannotBeMoved_endsIt) {
    write_file(kDir + "dhcpd-eth0.info", "enable=\"yes\"\n");
    write_file(kDir + "dhcpd-eth0-subnet0.conf", kSubnet);
    block("dhcpd-ovs_eth0.info");
    EXPECT_OUTCOME(change(), {.result = -1,
                              .log = {rename_failure("dhcpd-eth0.info", "dhcpd-ovs_eth0.info"),
                                      move_failure("interface global setting")}});
    EXPECT_EQ(kSubnet, read_file(kDir + "dhcpd-eth0-subnet0.conf"));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_directoryThatCannotBeListed_keepsWhatWasMoved) {
    write_file(kDir + "dhcpd-eth0.info", "enable=\"yes\"\n");
    write_file(kDir + "dhcpd-eth0-static.conf", "");
    const texts log{kUnit + "bad enum [dhcpd-eth0-subnet] in [/etc/dhcpd]", move_failure("DHCP tag conf")};
    rig.fail("KLIBCFileEnumDir");
    EXPECT_OUTCOME(change(), {.result = -1, .code = 0x900, .unit = "platform", .log = log});
    EXPECT_EQ((texts{"dhcpd-eth0-static.conf", "dhcpd-ovs_eth0.info"}), list_dir(kDir));
    rig.fail("KLIBCSzListAlloc");
    EXPECT_OUTCOME(change(), {.result = -1, .code = 0x200, .unit = "platform", .log = log});
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_filenameThatIsGone_fails) {
    write_file(kDir + "dhcpd-eth0-subnet0.conf", kSubnet);
    rig.fail("KLIBCSzListGet");
    EXPECT_OUTCOME(change(), {.result = -1, .log = {kUnit + "Filename is NULL", move_failure("DHCP tag conf")}});
    EXPECT_EQ(kSubnet, read_file(kDir + "dhcpd-eth0-subnet0.conf"));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_filenameOfAnotherForm_fails) {
    for (const std::string &name :
         texts{"dhcpd-eth0-subnet", "dhcpd-eth0-subnet0", "dhcpd-eth0-subnet0.", "dhcpd-eth0-subnet.conf"}) {
        write_file(kDir + name, kSubnet);
        EXPECT_OUTCOME(change(),
                       {.result = -1, .log = {kUnit + "Parsing filename error!", move_failure("DHCP tag conf")}});
        EXPECT_EQ(texts{name}, list_dir(kDir));
        shell("rm -r /etc/dhcpd");
    }
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_subnetThatCannotBeMoved_endsIt) {
    write_file(kDir + "dhcpd-eth0-subnet0.conf", kSubnet);
    write_file(kDir + "dhcpd-eth0-subnet1.conf", kSubnet);
    write_file(kDir + "dhcpd-eth0-static.conf", "");
    block("dhcpd-ovs_eth0-subnet1.conf");
    EXPECT_OUTCOME(change(), {.result = -1,
                              .log = {rename_failure("dhcpd-eth0-subnet1.conf", "dhcpd-ovs_eth0-subnet1.conf"),
                                      move_failure("DHCP tag conf")},
                              .commands = {sed("dhcpd-ovs_eth0-subnet0.conf")}});
    EXPECT_EQ(kMovedSubnet, read_file(kDir + "dhcpd-ovs_eth0-subnet0.conf")); // stays done
    EXPECT_EQ("", read_file(kDir + "dhcpd-eth0-static.conf"));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_failedReplacement_endsIt) {
    for (const int status : {1, 4, 127, -1, 137}) {
        write_file(kDir + "dhcpd-eth0-subnet0.conf", kSubnet);
        write_file(kDir + "dhcpd-eth0-subnet1.conf", kSubnet);
        rig.answer("/bin/sed", status);
        EXPECT_OUTCOME(change(), {.result = -1,
                                  .log = {sed_failure("dhcpd-ovs_eth0-subnet0.conf"),
                                          kUnit + "Failed to replace tag in [/etc/dhcpd/dhcpd-ovs_eth0-subnet0.conf]",
                                          move_failure("DHCP tag conf")},
                                  .commands = {sed("dhcpd-ovs_eth0-subnet0.conf")}});
        EXPECT_EQ((texts{"dhcpd-eth0-subnet1.conf", "dhcpd-ovs_eth0-subnet0.conf"}), list_dir(kDir));
    }
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_staticLeasesThatCannotBeMoved_endIt) {
    write_file(kDir + "dhcpd-eth0-subnet0.conf", kSubnet);
    write_file(kDir + "dhcpd-eth0-static.conf", "");
    write_file(kDir + "wpad-eth0.info", "");
    block("dhcpd-ovs_eth0-static.conf");
    EXPECT_OUTCOME(change(), {.result = -1,
                              .log = {rename_failure("dhcpd-eth0-static.conf", "dhcpd-ovs_eth0-static.conf"),
                                      move_failure("DHCP static conf")},
                              .commands = {sed("dhcpd-ovs_eth0-subnet0.conf")}});
    EXPECT_EQ("", read_file(kDir + "wpad-eth0.info"));
}

TEST_F(dhcpd_conf_change_interface, DHCPDConfChangeInterface_wpadThatCannotBeMoved_fails) {
    write_file(kDir + "wpad-eth0.conf", "eth0");
    write_file(kDir + "wpad-eth0.info", "");
    rig.answer("/bin/sed", 1);
    EXPECT_OUTCOME(change(), {.result = -1,
                              .log = {sed_failure("wpad-ovs_eth0.conf"), move_failure("DHCP WPAD conf")},
                              .commands = {sed("wpad-ovs_eth0.conf")}});
    EXPECT_EQ((texts{"wpad-eth0.info", "wpad-ovs_eth0.conf"}), list_dir(kDir));

    block("wpad-ovs_eth0.info");
    EXPECT_OUTCOME(change(),
                   {.result = -1,
                    .log = {rename_failure("wpad-eth0.info", "wpad-ovs_eth0.info"), move_failure("DHCP WPAD conf")}});
    write_file(kDir + "wpad-eth0.conf", "eth0");
    shell("rm /etc/dhcpd/wpad-ovs_eth0.conf");
    block("wpad-ovs_eth0.conf");
    EXPECT_OUTCOME(change(),
                   {.result = -1,
                    .log = {rename_failure("wpad-eth0.conf", "wpad-ovs_eth0.conf"), move_failure("DHCP WPAD conf")}});
}
