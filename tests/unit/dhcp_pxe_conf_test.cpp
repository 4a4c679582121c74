#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

const std::string kSettings = "/etc/dhcpd/dhcpd-pxe-setting";
const std::string kSwitch = "/etc/dhcpd/dhcpd-pxe.info";
const std::string kFragment = "/etc/dhcpd/dhcpd-pxe.conf";
const texts kMkdir{"/bin/mkdir -p /etc/dhcpd"};
const texts kMkdirTwice{"/bin/mkdir -p /etc/dhcpd", "/bin/mkdir -p /etc/dhcpd"};
const std::string kNotSet = "ERR dhcp_pxe_conf:N Failed to set config file of dhcp pxe server.";

} // namespace

class dhcp_pxe_conf : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        shell("rm -rf /etc/dhcpd");
        strcpy(conf.local_bootloader, "pxelinux.0");
        strcpy(conf.remote_bootloader, "far/grub.efi");
        strcpy(conf.remote_tftp_server_ip, "10.0.0.5");
    }
    void TearDown() override {
        shell("rm -rf /etc/dhcpd");
        unit_test::TearDown();
    }
    outcome get() {
        memset(&conf, 'x', sizeof conf);
        return rig.observe([&] { return DHCPPXEConfGet(&conf); });
    }
    outcome set() {
        return rig.observe([&] { return DHCPPXEConfSet(&conf); });
    }
    outcome switch_to(int enable) {
        return rig.observe([=] { return DHCPPXEConfSetEnable(enable); });
    }

    DHCP_PXE_CONF conf = {.enabled = 1, .is_remote_tftp = 0};
};

TEST_F(dhcp_pxe_conf, DHCPPXEConfGetEnable_switch_isThePlatformsAnswer) {
    const auto enabled_with = [&](const std::string &content) {
        write_file(kSettings, content);
        conf.enabled = 77;
        EXPECT_OUTCOME(rig.observe([&] { return DHCPPXEConfGetEnable(&conf); }), {.result = 0});
        return conf.enabled;
    };
    shell("mkdir /etc/dhcpd");
    EXPECT_EQ(1, enabled_with("enable=\"yes\"\n"));
    EXPECT_EQ(1, enabled_with("a=b\nenable=yes\n"));
    EXPECT_EQ(0, enabled_with("enable=\"no\"\n"));
    EXPECT_EQ(0, enabled_with("enable=\"Yes\"\n"));
    EXPECT_EQ(0, enabled_with("enable=\"yes \"\n"));
    EXPECT_EQ(0, enabled_with(""));
    EXPECT_STREQ("pxelinux.0", conf.local_bootloader);
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfGetEnable_missingSettings_areTheirErrorValue) {
    EXPECT_OUTCOME(rig.observe([&] { return DHCPPXEConfGetEnable(&conf); }),
                   {.result = 0, .code = 0x900, .unit = "key_value"});
    EXPECT_LT(conf.enabled, 0);
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfGetEnable_null_isRefused) {
    EXPECT_OUTCOME(
        rig.observe([] { return DHCPPXEConfGetEnable(nullptr); }),
        {.result = -1, .log = {"ERR dhcp_pxe_conf:N DHCPPXEConfGetEnable() cannot store to NULL structure"}});
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfGet_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return DHCPPXEConfGet(nullptr); }),
                   {.result = -1, .log = {"ERR dhcp_pxe_conf:N DHCPPXEConfGet() cannot store to NULL structure"}});
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfGet_missingSettings_leaveEverythingEmpty) {
    EXPECT_OUTCOME(get(), {.result = 0, .code = 0x900, .unit = "key_value"});
    EXPECT_LT(conf.enabled, 0);
    EXPECT_EQ(0, conf.is_remote_tftp);
    EXPECT_STREQ("", conf.local_bootloader);
    EXPECT_STREQ("", conf.remote_bootloader);
    EXPECT_STREQ("", conf.remote_tftp_server_ip);
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfGet_settings_areRead) {
    shell("mkdir /etc/dhcpd");
    write_file(kSettings, "enable=\"yes\"\nis_remote_tftp=\"yes\"\nlocal_bootloader=\"pxelinux.0\"\n"
                          "remote_bootloader=\"far/grub.efi\"\nremote_tftp_server_ip=\"10.0.0.5\"\n");
    EXPECT_OUTCOME(get(), {.result = 0});
    EXPECT_EQ(1, conf.enabled);
    EXPECT_EQ(1, conf.is_remote_tftp);
    EXPECT_STREQ("pxelinux.0", conf.local_bootloader);
    EXPECT_STREQ("far/grub.efi", conf.remote_bootloader);
    EXPECT_STREQ("10.0.0.5", conf.remote_tftp_server_ip);
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfGet_missingKeys_areEmpty) {
    shell("mkdir /etc/dhcpd");
    write_file(kSettings, "enable=\"no\"\nis_remote_tftp=\"1\"\n");
    EXPECT_OUTCOME(get(), {.result = 0});
    EXPECT_EQ(0, conf.enabled);
    EXPECT_EQ(0, conf.is_remote_tftp);
    EXPECT_STREQ("", conf.local_bootloader);
    EXPECT_STREQ("", conf.remote_tftp_server_ip);
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfGet_longValues_areCutToTheirFields) {
    shell("mkdir /etc/dhcpd");
    write_file(kSettings,
               "local_bootloader=\"" + long_text(5000) + "\"\nremote_tftp_server_ip=\"" + long_text(50, '1') + "\"\n");
    EXPECT_OUTCOME(get(), {.result = 0});
    EXPECT_EQ(long_text(4095), conf.local_bootloader);
    EXPECT_EQ(long_text(19, '1'), conf.remote_tftp_server_ip);
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfGet_keyThatCannotBeRead_isNamed) {
    shell("mkdir /etc/dhcpd");
    write_file(kSettings, "enable=\"yes\"\n");
    const std::string not_read = "ERR dhcp_pxe_conf:N Failed to get pxe config";
    const texts reasons{"ERR dhcp_pxe_conf:N Failed to get [local_bootloader] key",
                        "ERR dhcp_pxe_conf:N Failed to get [remote_bootloader] key",
                        "ERR dhcp_pxe_conf:N Failed to get remote tftp server IP"};
    for (int key = 0; key < 3; ++key) {
        rig.fail("KLIBCFileGetKeyValue", key + 1);
        outcome got = get();
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ((texts{reasons[static_cast<size_t>(key)], not_read}), got.log);
    }
    rig.fail("KLIBCFileCheckKeyValue", 2); // the first is the switch
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x900,
                           .unit = "platform",
                           .log = {"ERR dhcp_pxe_conf:N Failed to get [is_remote_tftp] key", not_read}});
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSetEnable_switch_goesToBothFiles) {
    EXPECT_OUTCOME(switch_to(1), {.result = 0, .commands = kMkdir});
    EXPECT_EQ("enable=\"yes\"\n", read_file(kSettings));
    EXPECT_EQ("enable=\"yes\"\n", read_file(kSwitch));
    for (const int off : {0, 2, -1}) {
        EXPECT_OUTCOME(switch_to(off), {.result = 0, .commands = kMkdir});
        EXPECT_EQ("enable=\"no\"\n", read_file(kSettings));
        EXPECT_EQ("enable=\"no\"\n", read_file(kSwitch));
    }
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSetEnable_directoryThatCannotBeMade_isTold) {
    write_file("/etc/dhcpd", "in the way");
    EXPECT_OUTCOME(switch_to(1),
                   {.result = -1, .log = {"ERR dhcp_pxe_conf:N Failed to mkdir [/etc/dhcpd]"}, .commands = kMkdir});
    EXPECT_EQ("in the way", read_file("/etc/dhcpd"));
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSetEnable_firstFileFails_leavesTheSecond) {
    shell("mkdir -p " + kSettings);
    write_file(kSwitch, "enable=\"no\"\n");
    outcome got = switch_to(1);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(texts{}, got.log);
    EXPECT_NE(0U, got.code);
    EXPECT_EQ("enable=\"no\"\n", read_file(kSwitch));
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return DHCPPXEConfSet(nullptr); }),
                   {.result = -1, .log = {"ERR dhcp_pxe_conf:N no interface parameter"}});
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_local_writesLoader) {
    EXPECT_OUTCOME(set(), {.result = 0, .commands = kMkdirTwice});
    EXPECT_EQ("enable=\"yes\"\nis_remote_tftp=\"no\"\nlocal_bootloader=\"pxelinux.0\"\n", read_file(kSettings));
    EXPECT_EQ("enable=\"yes\"\n", read_file(kSwitch));
    EXPECT_EQ("dhcp-boot=tag:pxe,pxelinux.0\ndhcp-vendorclass=set:pxe,PXEClient\n", read_file(kFragment));
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_remote_writesLoaderAndServer) {
    EXPECT_OUTCOME(set(), {.result = 0, .commands = kMkdirTwice});
    conf.is_remote_tftp = 1;
    EXPECT_OUTCOME(set(), {.result = 0, .commands = kMkdirTwice});
    EXPECT_EQ("enable=\"yes\"\nis_remote_tftp=\"yes\"\nlocal_bootloader=\"pxelinux.0\"\n"
              "remote_bootloader=\"far/grub.efi\"\nremote_tftp_server_ip=\"10.0.0.5\"\n",
              read_file(kSettings));
    EXPECT_EQ("dhcp-boot=tag:pxe,far/grub.efi,bootserver,10.0.0.5\ndhcp-vendorclass=set:pxe,PXEClient\n",
              read_file(kFragment));
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_remoteFlagOtherThanOne_isLocal) {
    conf.is_remote_tftp = 2;
    EXPECT_OUTCOME(set(), {.result = 0, .commands = kMkdirTwice});
    EXPECT_EQ("dhcp-boot=tag:pxe,pxelinux.0\ndhcp-vendorclass=set:pxe,PXEClient\n", read_file(kFragment));
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_off_keepsSettingsAndLines) {
    EXPECT_OUTCOME(set(), {.result = 0, .commands = kMkdirTwice});
    const std::string lines = read_file(kFragment);
    for (const int off : {0, 2}) {
        conf = {.enabled = off, .is_remote_tftp = 1};
        EXPECT_OUTCOME(set(), {.result = 0, .commands = kMkdir});
        EXPECT_EQ("enable=\"no\"\nis_remote_tftp=\"no\"\nlocal_bootloader=\"pxelinux.0\"\n", read_file(kSettings));
        EXPECT_EQ("enable=\"no\"\n", read_file(kSwitch));
        EXPECT_EQ(lines, read_file(kFragment));
    }
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_emptyField_isRefusedForTheChosenModeOnly) {
    const auto refused = [&](const std::string &reason) {
        EXPECT_OUTCOME(set(), {.result = -1,
                               .log = {"ERR dhcp_pxe_conf:N input error when set PXE config: " + reason, kNotSet},
                               .commands = kMkdir});
        EXPECT_EQ("enable=\"yes\"\n", read_file(kSettings));
        EXPECT_EQ("<absent>", read_file(kFragment));
    };
    conf.local_bootloader[0] = '\0';
    refused("empty local bootloader");
    conf.is_remote_tftp = 1;
    conf.remote_tftp_server_ip[0] = '\0';
    refused("empty remote tftp ip");
    conf.remote_bootloader[0] = '\0';
    refused("empty remote bootloader");

    strcpy(conf.remote_bootloader, "far/grub.efi");
    strcpy(conf.remote_tftp_server_ip, "10.0.0.5");
    EXPECT_OUTCOME(set(), {.result = 0, .commands = kMkdirTwice});
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_fieldThatWouldChangeTheLine_isRefused) {
    const outcome refused{
        .result = -1,
        .log =
            {"ERR dhcp_pxe_conf:N input error when set PXE config: comma, double quote, control character, no end or too long",
             kNotSet},
        .commands = kMkdir};
    for (const std::string &loader : texts{"a,b", "a\ninterface=eth9", "\"", "a\rb", "a\tb", "a\x7f"}) {
        strcpy(conf.local_bootloader, loader.c_str());
        EXPECT_OUTCOME(set(), refused);
    }
    memset(conf.local_bootloader, 'a', sizeof conf.local_bootloader);
    EXPECT_OUTCOME(set(), refused);
    // what is beyond 1023 bytes would be a line of its own to the daemon
    strcpy(conf.local_bootloader, long_text(1023 - strlen("dhcp-boot=tag:pxe,") + 1).c_str());
    EXPECT_OUTCOME(set(), refused);
    conf.is_remote_tftp = 1;
    memset(conf.remote_tftp_server_ip, '1', sizeof conf.remote_tftp_server_ip);
    EXPECT_OUTCOME(set(), refused);
    EXPECT_EQ("enable=\"yes\"\n", read_file(kSettings));
    EXPECT_EQ("<absent>", read_file(kFragment));
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_longestLoader_isReadBack) {
    const std::string loader = long_text(1023 - strlen("dhcp-boot=tag:pxe,"), 'b');
    strcpy(conf.local_bootloader, loader.c_str());
    EXPECT_OUTCOME(set(), {.result = 0, .commands = kMkdirTwice});
    EXPECT_OUTCOME(get(), {.result = 0});
    EXPECT_EQ(loader, conf.local_bootloader);
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_switchThatCannotBeWritten_isTold) {
    rig.fail("KLIBCFileSetKeyValue");
    outcome got = set();
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(texts{"ERR dhcp_pxe_conf:N Failed to set info file of dhcp pxe server."}, got.log);
    EXPECT_EQ("<absent>", read_file(kSettings));
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_keyThatCannotBeWritten_isNamed) {
    conf.is_remote_tftp = 1;
    const texts keys{"is_remote_tftp", "remote_bootloader", "remote_tftp_server_ip"};
    for (size_t i = 0; i < keys.size(); ++i) {
        rig.fail("KLIBCFileSetKeyValue", static_cast<int>(i) + 3); // behind the two switches
        outcome got = set();
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ((texts{"ERR dhcp_pxe_conf:N Failed to set [" + keys[i] + "] key", kNotSet}), got.log);
        EXPECT_EQ("<absent>", read_file(kFragment));
    }
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_fragmentThatCannotBeOpened_isTold) {
    shell("mkdir -p " + kFragment);
    EXPECT_OUTCOME(set(), {.result = -1,
                           .log = {"ERR dhcp_pxe_conf:N Failed to open file [/etc/dhcpd/dhcpd-pxe.conf].", kNotSet},
                           .commands = kMkdirTwice});
}

TEST_F(dhcp_pxe_conf, DHCPPXEConfSet_fullDisk_isTold) {
    shell("mkdir -p /etc/dhcpd && ln -s /dev/full " + kFragment);
    EXPECT_OUTCOME(set(), {.result = -1,
                           .log = {"ERR dhcp_pxe_conf:N Failed to write file [/etc/dhcpd/dhcpd-pxe.conf].", kNotSet},
                           .commands = kMkdirTwice});
}
