#include "support/rig.h"

#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

constexpr int kV4 = 0;
constexpr int kV6 = 1;
const std::string kMkdir = "/bin/mkdir -p /etc/dhcpd";

/** Contents of an info file and whether they switch on. */
const std::map<std::string, int> kContents{
    {"enable=\"yes\"\n", 1},
    {"enable=yes\n", 1},
    {"enable=yes", 1},
    {"enable=\"yes\"\r\n", 1},
    {"# made by hand\n\nenable=\"yes\"\nenable=\"no\"\n", 1},
    {"enable=\"no\"\n", 0},
    {"enable=\"no\"\nenable=\"yes\"\n", 0},
    {"enable=\"YES\"\n", 0},
    {"enable=\"yes \"\n", 0},
    {"enable=\"ye", 0},
    {"enable=1\n", 0},
    {"enable=\n", 0},
    {"enable\n", 0},
    {"bonding_backup_enable=\"yes\"\n", 0},
    {" enable=\"yes\"\n", 0},
    {"", 0},
    {std::string("\0\x01\xff\n\0enable=\"yes\"\n", 17), 0},
    {"enable=" + long_text(100000, 'y') + "\n", 0},
    {long_text(100000) + "\nenable=\"yes\"\n", 1},
};

} // namespace

class dhcp_is_enabled : public unit_test {
protected:
    outcome is_enabled(const char *ifname, int type) {
        return rig.observe([&] { return DHCPInterfaceIsEnabled(ifname, type); });
    }
    outcome set_enabled(const char *ifname, int type, int enable) {
        return rig.observe([&] { return DHCPInterfaceSetEnabled(ifname, type, enable); });
    }
};

TEST_F(dhcp_is_enabled, DHCPIsEnabled_key_hasToBeYesExactly) {
    for (const auto &[content, expected] : kContents) {
        write_file("/etc/dhcpd/dhcpd.info", content);
        EXPECT_OUTCOME(rig.observe([] { return DHCPIsEnabled(); }), {.result = expected});
    }
}

TEST_F(dhcp_is_enabled, DHCPIsEnabled_withoutFileOrDirectory_isOff) {
    EXPECT_OUTCOME(rig.observe([] { return DHCPIsEnabled(); }), {.result = 0});
    write_file("/etc/dhcpd/dhcpd-eth0.info", "enable=\"yes\"\n");
    EXPECT_OUTCOME(rig.observe([] { return DHCPIsEnabled(); }), {.result = 0});
}

TEST_F(dhcp_is_enabled, DHCPIsEnabled_directoryInPlaceOfTheFile_isOff) {
    shell("mkdir -p /etc/dhcpd/dhcpd.info");
    EXPECT_OUTCOME(rig.observe([] { return DHCPIsEnabled(); }), {.result = 0, .code = 0x900, .unit = "key_value"});
}

TEST_F(dhcp_is_enabled, DHCPInterfaceIsEnabled_key_hasToBeYesExactly) {
    for (const auto &[content, expected] : kContents) {
        write_file("/etc/dhcpd/dhcpd-eth0.info", content);
        EXPECT_OUTCOME(is_enabled("eth0", kV4), {.result = expected});
    }
}

TEST_F(dhcp_is_enabled, DHCPInterfaceIsEnabled_families_haveTheirOwnFiles) {
    write_file("/etc/dhcpd/dhcpd-eth0.info", "enable=\"yes\"\n");
    EXPECT_OUTCOME(is_enabled("eth0", kV4), {.result = 1});
    EXPECT_OUTCOME(is_enabled("eth0", kV6), {.result = 0});
    EXPECT_OUTCOME(is_enabled("eth1", kV4), {.result = 0});
    write_file("/etc/dhcpd/dhcpd6-eth1.info", "enable=\"yes\"\n");
    EXPECT_OUTCOME(is_enabled("eth1", kV6), {.result = 1});
    EXPECT_OUTCOME(is_enabled("eth1", kV4), {.result = 0});
}

TEST_F(dhcp_is_enabled, DHCPInterfaceIsEnabled_unusualNames_areFilesLikeOthers) {
    for (const std::string &name : texts{"eth0.10", "ovs_eth0", "a-b", "-", "%s%n", "eth0'\"", long_text(235)}) {
        EXPECT_OUTCOME(is_enabled(name.c_str(), kV4), {.result = 0});
        write_file("/etc/dhcpd/dhcpd-" + name + ".info", "enable=\"yes\"\n");
        EXPECT_OUTCOME(is_enabled(name.c_str(), kV4), {.result = 1});
    }
}

TEST_F(dhcp_is_enabled, DHCPInterfaceIsEnabled_badArguments_areRefused) {
    for (const char *name : {static_cast<const char *>(nullptr), ""}) {
        EXPECT_OUTCOME(is_enabled(name, kV4), {.result = -1, .log = {"ERR dhcp_is_enabled:N no interface is given"}});
    }
    for (const int type : {-1, 2, 4, 6, INT32_MAX, INT32_MIN}) {
        EXPECT_OUTCOME(is_enabled("eth0", type), {.result = -1, .log = {"ERR dhcp_is_enabled:N Wrong DHCPD ip type"}});
    }
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(is_enabled(name.c_str(), kV4), refusal("dhcp_is_enabled", "is_interface_name(ifname)"));
    }
}

TEST_F(dhcp_is_enabled, DHCPInterfaceSetEnabled_newFile_isMadeWithItsDirectory) {
    EXPECT_OUTCOME(set_enabled("eth0", kV4, 1), {.commands = {kMkdir}});
    EXPECT_OUTCOME(set_enabled("eth0", kV6, 0), {.commands = {kMkdir}});
    EXPECT_EQ("enable=\"yes\"\n", read_file("/etc/dhcpd/dhcpd-eth0.info"));
    EXPECT_EQ("enable=\"no\"\n", read_file("/etc/dhcpd/dhcpd6-eth0.info"));
    EXPECT_EQ((texts{"dhcpd-eth0.info", "dhcpd6-eth0.info"}), list_dir("/etc/dhcpd"));
}

TEST_F(dhcp_is_enabled, DHCPInterfaceSetEnabled_anythingButOne_isNo) {
    for (const int enable : {0, 2, -1, INT32_MAX}) {
        write_file("/etc/dhcpd/dhcpd-eth0.info", "enable=\"yes\"\n");
        EXPECT_OUTCOME(set_enabled("eth0", kV4, enable), {.commands = {kMkdir}});
        EXPECT_EQ("enable=\"no\"\n", read_file("/etc/dhcpd/dhcpd-eth0.info"));
    }
}

TEST_F(dhcp_is_enabled, DHCPInterfaceSetEnabled_otherLines_areKept) {
    const std::string binary = std::string("\0\xff", 2);
    write_file("/etc/dhcpd/dhcpd-eth0.info", "bonding_backup_enable=\"no\"\nenable=\"no\"\nenable=yes\n" + binary);
    EXPECT_OUTCOME(set_enabled("eth0", kV4, 1), {.commands = {kMkdir}});
    EXPECT_EQ("bonding_backup_enable=\"no\"\nenable=\"yes\"\n" + binary + "\n",
              read_file("/etc/dhcpd/dhcpd-eth0.info"));
}

TEST_F(dhcp_is_enabled, DHCPInterfaceSetEnabled_failedWrite_isLoggedAndStillZero) {
    write_file("/etc/dhcpd/dhcpd-eth0.info", "enable=\"no\"\n");
    rig.fail("KLIBCFileSetKeyValue");
    EXPECT_OUTCOME(set_enabled("eth0", kV4, 1), {.result = 0,
                                                 .code = 0xB00,
                                                 .unit = "platform",
                                                 .log = {"ERR dhcp_is_enabled:N Failed to set [eth0] Dhcp info file"},
                                                 .commands = {kMkdir}});
    EXPECT_EQ("enable=\"no\"\n", read_file("/etc/dhcpd/dhcpd-eth0.info"));
}

TEST_F(dhcp_is_enabled, DHCPInterfaceSetEnabled_noDirectory_fails) {
    for (const int status : {1, 127, -1, 137}) {
        rig.answer("/bin/mkdir", status);
        EXPECT_OUTCOME(
            set_enabled("eth0", kV4, 1),
            {.result = -1, .log = {"ERR dhcp_is_enabled:N Failed to mkdir [/etc/dhcpd]"}, .commands = {kMkdir}});
    }
    EXPECT_EQ("<absent>", read_file("/etc/dhcpd/dhcpd-eth0.info"));
}

TEST_F(dhcp_is_enabled, DHCPInterfaceSetEnabled_fileInPlaceOfTheDirectory_staysAsItIs) {
    write_file("/etc/dhcpd", "not a directory");
    EXPECT_OUTCOME(set_enabled("eth0", kV4, 1),
                   {.result = -1, .log = {"ERR dhcp_is_enabled:N Failed to mkdir [/etc/dhcpd]"}, .commands = {kMkdir}});
    EXPECT_EQ("not a directory", read_file("/etc/dhcpd"));
}

TEST_F(dhcp_is_enabled, DHCPInterfaceSetEnabled_badArguments_areRefusedAndNothingIsMade) {
    for (const char *name : {static_cast<const char *>(nullptr), ""}) {
        EXPECT_OUTCOME(set_enabled(name, kV4, 1),
                       {.result = -1, .log = {"ERR dhcp_is_enabled:N no interface is given"}});
    }
    for (const int type : {-1, 2}) {
        EXPECT_OUTCOME(set_enabled("eth0", type, 1),
                       {.result = -1, .log = {"ERR dhcp_is_enabled:N Wrong DHCPD ip type"}});
    }
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(set_enabled(name.c_str(), kV6, 1), refusal("dhcp_is_enabled", "is_interface_name(ifname)"));
    }
    EXPECT_EQ("<absent>", read_file("/etc/dhcpd"));
}
