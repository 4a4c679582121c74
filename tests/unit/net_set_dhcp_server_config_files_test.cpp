#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

const std::string kUnit = "ERR net_set_dhcp_server_config_files:N ";
const std::string kInfo = "/etc/dhcpd/dhcpd-eth0-lan.info";
const std::string kConf = "/etc/dhcpd/dhcpd-eth0-lan.conf";
const std::string kMkdir = "/bin/mkdir -p /etc/dhcpd";

const std::string kFragment = "interface=eth0\n"
                              "dhcp-range=set:lan,192.168.50.10,192.168.50.20,255.255.255.0,3600\n"
                              "dhcp-option=tag:lan,option:router,192.168.50.1\n"
                              "dhcp-option=tag:lan,option:domain-search,lab.example\n"
                              "dhcp-option=tag:lan,option:dns-server,192.168.50.53,192.168.50.54\n";

/** A fragment whose lines are given. */
std::string fragment(const std::string &range, const std::string &router, const std::string &dns) {
    return "interface=eth0\n" + range + router + dns;
}

const std::string kRange = "dhcp-range=set:lan,192.168.50.10,192.168.50.20,255.255.255.0,3600\n";
const std::string kRouter = "dhcp-option=tag:lan,option:router,192.168.50.1\n";
const std::string kDns = "dhcp-option=tag:lan,option:dns-server,192.168.50.53\n";

template<size_t Size> void set_field(char (&field)[Size], const std::string &text) {
    memset(field, '\0', Size);
    memcpy(field, text.data(), std::min(text.size(), Size));
}

} // namespace

class net_set_dhcp_server_config_files : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        memset(&conf, 0, sizeof conf);
        set_field(conf.ifname, "eth0");
        set_field(conf.tag, "lan");
        set_field(conf.start_ip, "192.168.50.10");
        set_field(conf.end_ip, "192.168.50.20");
        set_field(conf.netmask, "255.255.255.0");
        set_field(conf.router, "192.168.50.1");
        set_field(conf.domain, "lab.example");
        set_field(conf.dns1, "192.168.50.53");
        set_field(conf.dns2, "192.168.50.54");
        conf.lease_time = 3600;
    }
    outcome set(int enable = 1) {
        return rig.observe([&] { return KOVANetSetDhcpServerConfigFiles(&conf, enable); });
    }
    outcome get(const char *tag = "lan", const char *ifname = "eth0") {
        memset(&conf, 'x', sizeof conf);
        return rig.observe([&] { return KOVANetGetDhcpServerConf(tag, ifname, &conf); });
    }
    outcome get(const std::string &content) {
        write_file(kConf, content);
        return get();
    }

    DHCP_TAG_CONF conf{};
};

TEST_F(net_set_dhcp_server_config_files, KOVANetSetDhcpServerConfigFiles_on_writesSwitchAndFragment) {
    for (const int enable : {1, 2, -1}) {
        EXPECT_OUTCOME(set(enable), {.result = 1, .commands = {kMkdir}});
        EXPECT_EQ("enable=\"yes\"\n", read_file(kInfo));
        EXPECT_EQ(kFragment, read_file(kConf));
        EXPECT_EQ((texts{"dhcpd-eth0-lan.conf", "dhcpd-eth0-lan.info"}), list_dir("/etc/dhcpd"));
    }
}

TEST_F(net_set_dhcp_server_config_files, KOVANetSetDhcpServerConfigFiles_off_leavesTheFragmentAlone) {
    EXPECT_OUTCOME(set(0), {.result = 1, .commands = {kMkdir}});
    EXPECT_EQ("enable=\"no\"\n", read_file(kInfo));
    EXPECT_EQ("<absent>", read_file(kConf));
    write_file(kConf, "interface=eth0\n");
    set_field(conf.domain, "a\nb"); // what is not written is not looked at
    EXPECT_OUTCOME(set(0), {.result = 1, .commands = {kMkdir}});
    EXPECT_EQ("interface=eth0\n", read_file(kConf));
}

TEST_F(net_set_dhcp_server_config_files, KOVANetSetDhcpServerConfigFiles_filesThatAreThere_areWrittenAnew) {
    write_file(kInfo, "enable=\"no\"\nbonding_backup_enable=\"yes\"\n" + long_text(4096));
    write_file(kConf, long_text(100000));
    EXPECT_OUTCOME(set(), {.result = 1, .commands = {kMkdir}});
    EXPECT_EQ("enable=\"yes\"\n", read_file(kInfo));
    EXPECT_EQ(kFragment, read_file(kConf));
}

TEST_F(net_set_dhcp_server_config_files, KOVANetSetDhcpServerConfigFiles_emptyFields_haveTheirForms) {
    set_field(conf.domain, "");
    set_field(conf.dns2, "");
    EXPECT_OUTCOME(set(), {.result = 1, .commands = {kMkdir}});
    EXPECT_EQ(fragment(kRange, kRouter, kDns), read_file(kConf));
    set_field(conf.dns1, "");
    set_field(conf.router, "");
    conf.lease_time = INT32_MIN;
    EXPECT_OUTCOME(set(), {.result = 1, .commands = {kMkdir}});
    EXPECT_EQ("interface=eth0\ndhcp-range=set:lan,192.168.50.10,192.168.50.20,255.255.255.0,-2147483648\n"
              "dhcp-option=tag:lan,option:router,\ndhcp-option=tag:lan,option:dns-server,\n",
              read_file(kConf));
    set_field(conf.dns2, "192.168.50.54");
    EXPECT_OUTCOME(set(), {.result = 1, .commands = {kMkdir}});
    EXPECT_NE(std::string::npos, read_file(kConf).find("option:dns-server,,192.168.50.54\n"));
}

TEST_F(net_set_dhcp_server_config_files, KOVANetSetDhcpServerConfigFiles_longestFields_areWrittenWhole) {
    const std::string tag = long_text(19, 't');
    const size_t room = 1023 - ("dhcp-option=tag:" + tag + ",option:domain-search,").size();
    set_field(conf.domain, long_text(room, 'd'));
    set_field(conf.start_ip, long_text(45, 's'));
    set_field(conf.ifname, long_text(15, 'i'));
    set_field(conf.tag, tag);
    EXPECT_OUTCOME(set(), {.result = 1, .commands = {kMkdir}});
    EXPECT_EQ("interface=" + long_text(15, 'i') + "\ndhcp-range=set:" + tag + "," + long_text(45, 's') +
                  ",192.168.50.20,255.255.255.0,3600\ndhcp-option=tag:" + tag +
                  ",option:router,192.168.50.1\ndhcp-option=tag:" + tag + ",option:domain-search," +
                  long_text(room, 'd') + "\ndhcp-option=tag:" + tag +
                  ",option:dns-server,192.168.50.53,192.168.50.54\n",
              read_file("/etc/dhcpd/dhcpd-" + long_text(15, 'i') + "-" + tag + ".conf"));
}

TEST_F(net_set_dhcp_server_config_files, KOVANetSetDhcpServerConfigFiles_badRecords_writeNothing) {
    const outcome refused{.result = 0, .log = {kUnit + "Bad parameters."}};
    EXPECT_OUTCOME(rig.observe([] { return KOVANetSetDhcpServerConfigFiles(nullptr, 1); }), refused);
    const DHCP_TAG_CONF good = conf;
    const auto refuses = [&](auto &field) {
        for (const std::string &text : texts{"a\nb", "a\rb", long_text(sizeof field, 'a')}) {
            set_field(field, text);
            EXPECT_OUTCOME(set(), refused);
        }
        conf = good;
    };
    refuses(conf.ifname);
    refuses(conf.tag);
    refuses(conf.start_ip);
    refuses(conf.end_ip);
    refuses(conf.netmask);
    refuses(conf.router);
    refuses(conf.domain);
    refuses(conf.dns1);
    refuses(conf.dns2);
    // what is beyond 1023 bytes would be a line of its own to the daemon
    set_field(conf.domain, long_text(1023 - strlen("dhcp-option=tag:lan,option:domain-search,") + 1));
    EXPECT_OUTCOME(set(), refused);
    conf = good;
    for (char *const field : {conf.start_ip, conf.end_ip, conf.netmask}) {
        strcpy(field, "1.1.1.1,2.2.2.2");
        EXPECT_OUTCOME(set(), refused);
        conf = good;
    }
    for (const std::string &name : texts{"", ".", "..", "a/b", "../x", "a b", "a,b"}) {
        set_field(conf.ifname, name);
        EXPECT_OUTCOME(set(0), refused);
        conf = good;
        set_field(conf.tag, name);
        EXPECT_OUTCOME(set(0), refused);
        conf = good;
    }
    EXPECT_EQ("<absent>", read_file("/etc/dhcpd"));
}

TEST_F(net_set_dhcp_server_config_files, KOVANetSetDhcpServerConfigFiles_noDirectory_fails) {
    for (const int status : {1, 127, -1}) {
        rig.answer("/bin/mkdir", status);
        EXPECT_OUTCOME(set(), {.result = 0, .log = {kUnit + "Failed to mkdir [/etc/dhcpd]"}, .commands = {kMkdir}});
    }
    EXPECT_EQ("<absent>", read_file("/etc/dhcpd"));
}

TEST_F(net_set_dhcp_server_config_files, KOVANetSetDhcpServerConfigFiles_infoThatCannotBeOpened_fails) {
    shell("mkdir -p " + kInfo);
    EXPECT_OUTCOME(set(), {.result = 0, .log = {kUnit + "Failed to open file [" + kInfo + "]."}, .commands = {kMkdir}});
    EXPECT_EQ("<absent>", read_file(kConf));
}

TEST_F(net_set_dhcp_server_config_files, KOVANetSetDhcpServerConfigFiles_fragmentThatCannotBeOpened_leavesTheInfo) {
    shell("mkdir -p " + kConf);
    EXPECT_OUTCOME(set(), {.result = 0,
                           .log = {kUnit + "Failed to open file [" + kConf + "].",
                                   kUnit + "Failed to set config file of dhcp server [eth0]."},
                           .commands = {kMkdir}});
    EXPECT_EQ("enable=\"yes\"\n", read_file(kInfo));
}

TEST_F(net_set_dhcp_server_config_files, KOVANetSetDhcpServerConfigFiles_fullDisk_fails) {
    const outcome failed{
        .result = 0, .log = {kUnit + "Failed to set config file of dhcp server [eth0]."}, .commands = {kMkdir}};
    shell("mkdir /etc/dhcpd && ln -s /dev/full " + kConf);
    EXPECT_OUTCOME(set(), failed);
    shell("rm " + kInfo + " && ln -s /dev/full " + kInfo);
    EXPECT_OUTCOME(set(0), failed);
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_whatWasWritten_isReadBack) {
    EXPECT_OUTCOME(set(), {.result = 1, .commands = {kMkdir}});
    DHCP_TAG_CONF expected = conf;
    expected.enabled = 1;
    EXPECT_OUTCOME(get(), {.result = 1});
    EXPECT_EQ(0, memcmp(&expected, &conf, sizeof conf));
    write_file(kInfo, "enable=\"no\"\n");
    expected.enabled = 0;
    EXPECT_OUTCOME(get(), {.result = 1});
    EXPECT_EQ(0, memcmp(&expected, &conf, sizeof conf));
    shell("rm " + kInfo);
    EXPECT_OUTCOME(get(), {.result = 1});
    EXPECT_EQ(0, memcmp(&expected, &conf, sizeof conf));
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_names_mayBeTheRecordsOwn) {
    write_file(kConf, kFragment);
    write_file(kInfo, "enable=\"yes\"\n");
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetGetDhcpServerConf(conf.tag, conf.ifname, &conf); }), {.result = 1});
    EXPECT_STREQ("lan", conf.tag);
    EXPECT_STREQ("eth0", conf.ifname);
    EXPECT_EQ(1, conf.enabled);
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_domain_comesCut) {
    set_field(conf.domain, "a-domain-of-thirty-letters.net");
    EXPECT_OUTCOME(set(), {.result = 1, .commands = {kMkdir}});
    EXPECT_NE(std::string::npos, read_file(kConf).find("domain-search,a-domain-of-thirty-letters.net\n"));
    EXPECT_OUTCOME(get(), {.result = 1});
    EXPECT_STREQ("a-domain-of-thirty-", conf.domain);
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_values_comeCutToNineteenCharacters) {
    const std::string range =
        "dhcp-range=set:lan," + long_text(45, '1') + "," + long_text(19, '2') + "," + long_text(20, '3') + ",600\n";
    EXPECT_OUTCOME(
        get(fragment(range, "dhcp-option=tag:lan,option:router," + long_text(45, '4') + "\n",
                     "dhcp-option=tag:lan,option:dns-server," + long_text(45, '5') + "," + long_text(45, '6') + "\n")),
        {.result = 1});
    EXPECT_EQ(long_text(19, '1'), conf.start_ip);
    EXPECT_EQ(long_text(19, '2'), conf.end_ip);
    EXPECT_EQ(long_text(19, '3'), conf.netmask);
    EXPECT_EQ(long_text(19, '4'), conf.router);
    EXPECT_EQ(long_text(19, '5'), conf.dns1);
    EXPECT_EQ(long_text(19, '6'), conf.dns2);
    EXPECT_OUTCOME(get(long_text(0) + "interface=" + long_text(40, 'i') + "\n" + kRange + kRouter + kDns),
                   {.result = 1});
    EXPECT_EQ(long_text(15, 'i'), conf.ifname);
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_leaseTime_isTheNumberItBeginsWith) {
    for (const auto &[text, expected] : std::map<std::string, int>{
             {"86400", 86400}, {"12h", 12}, {"-5", -5}, {"infinite", 0}, {"", 0}, {"600,more", 600}}) {
        EXPECT_OUTCOME(get(fragment("dhcp-range=set:lan,1.1.1.1,1.1.1.2,255.0.0.0," + text + "\n", kRouter, kDns)),
                       {.result = 1});
        EXPECT_EQ(expected, conf.lease_time) << text;
    }
    EXPECT_OUTCOME(get(fragment("dhcp-range=set:lan\n", kRouter, kDns)), {.result = 1});
    EXPECT_STREQ("", conf.start_ip);
    EXPECT_STREQ("", conf.netmask);
    EXPECT_EQ(0, conf.lease_time);
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_nameServers_areOneOrTwo) {
    struct row {
        std::string rest, first, second;
    };
    for (const row &each : std::vector<row>{{",1.1.1.1", "1.1.1.1", ""},
                                            {",1.1.1.1,2.2.2.2", "1.1.1.1", "2.2.2.2"},
                                            {",", "", ""},
                                            {",,2.2.2.2", "", "2.2.2.2"},
                                            {",1.1.1.1,", "1.1.1.1", ""},
                                            {",1.1.1.1\r", "1.1.1.1", ""},
                                            {"", "", ""},
                                            {",1.1.1.1,2.2.2.2,3.3.3.3", "", ""},
                                            {",1,2,3,4,5,6,7,8", "", ""}}) {
        EXPECT_OUTCOME(get(fragment(kRange, kRouter, "dhcp-option=tag:lan,option:dns-server" + each.rest + "\n")),
                       {.result = 1});
        EXPECT_EQ(each.first, conf.dns1) << each.rest;
        EXPECT_EQ(each.second, conf.dns2) << each.rest;
    }
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_missingLines_fail) {
    const auto misses = [](const std::string &key) {
        return outcome{.result = 0, .log = {kUnit + "Failed to get key " + key}};
    };
    EXPECT_OUTCOME(get(fragment("", kRouter, kDns)), misses("dhcp-range"));
    EXPECT_OUTCOME(get(fragment(kRange, kRouter, "")), misses("dhcp-option"));
    EXPECT_OUTCOME(get(fragment(kRange, "", kDns)), misses("option:router"));
    EXPECT_OUTCOME(get(kRange + kRouter + kDns), misses("interface in " + kConf));
    EXPECT_OUTCOME(get(std::string()), misses("dhcp-range"));
    EXPECT_OUTCOME(get(std::string("\0\xff\n\0", 4) + long_text(70000)), misses("dhcp-range"));
    EXPECT_STREQ("", conf.tag);                                          // nothing of the garbage that was there
    EXPECT_OUTCOME(get(fragment(kRange, kRouter, kDns)), {.result = 1}); // a domain need not be
    EXPECT_STREQ("", conf.domain);
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_failedReads_areMissingLines) {
    write_file(kConf, kFragment);
    write_file(kInfo, "enable=\"yes\"\n");
    rig.fail("KLIBCFileGetKeyValue");
    EXPECT_OUTCOME(get(),
                   {.result = 0, .code = 0x900, .unit = "platform", .log = {kUnit + "Failed to get key dhcp-range"}});
    rig.fail("KLIBCFileGetKeyValue", 2);
    EXPECT_OUTCOME(
        get(),
        {.result = 0, .code = 0x900, .unit = "platform", .log = {kUnit + "Failed to get key interface in " + kConf}});
    rig.fail("KLIBCSzListAlloc");
    EXPECT_OUTCOME(get(),
                   {.result = 0, .code = 0x200, .unit = "platform", .log = {kUnit + "Failed to get key dhcp-range"}});
    rig.fail("KLIBCSzListAlloc", 2);
    EXPECT_OUTCOME(get(),
                   {.result = 0, .code = 0x200, .unit = "platform", .log = {kUnit + "Failed to get key dhcp-option"}});
    rig.fail("fopen", 3); // behind name servers and router
    EXPECT_OUTCOME(get(), {.result = 0, .log = {kUnit + "Failed to get key option:domain-search"}});
    EXPECT_OUTCOME(get(), {.result = 1});
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_withoutFragment_fails) {
    write_file(kInfo, "enable=\"yes\"\n");
    EXPECT_OUTCOME(get(), {.result = 0, .log = {kUnit + "File [" + kConf + "] does not exist."}});
    EXPECT_EQ('x', conf.ifname[0]); // not touched yet
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_missingArguments_areRefusedSilently) {
    EXPECT_OUTCOME(get(nullptr, "eth0"), {.result = 0});
    EXPECT_OUTCOME(get("lan", nullptr), {.result = 0});
    EXPECT_OUTCOME(rig.observe([] { return KOVANetGetDhcpServerConf("lan", "eth0", nullptr); }), {.result = 0});
}

TEST_F(net_set_dhcp_server_config_files, KOVANetGetDhcpServerConf_badNames_areRefused) {
    const std::string unit = "net_set_dhcp_server_config_files";
    EXPECT_OUTCOME(get("", "eth0"), refusal(unit, "'\\0' != *tag", 0));
    EXPECT_OUTCOME(get("lan", ""), refusal(unit, "'\\0' != *ifname", 0));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str(), "eth0"), refusal(unit, "is_interface_name(tag)", 0));
        EXPECT_OUTCOME(get("lan", name.c_str()), refusal(unit, "is_interface_name(ifname)", 0));
    }
}
