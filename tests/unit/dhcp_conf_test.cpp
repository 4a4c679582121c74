#include "support/memory.h"
#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/dhcp.h>

using namespace kova_test;
using namespace std::string_literals;

namespace {

const std::string kErr = "ERR dhcp_conf:N ";
const std::string kConf = "/etc/dhcpd/dhcpd-eth0-subnet0.conf";
const std::string kInfo = "/etc/dhcpd/dhcpd-eth0-subnet0.info";
const std::string kConfV6 = "/etc/dhcpd/dhcpd6-eth0-subnet0.conf";
const std::string kInfoV6 = "/etc/dhcpd/dhcpd6-eth0-subnet0.info";
const std::string kMkdir = "/bin/mkdir -p /etc/dhcpd";
const std::string kRestart = "/etc/rc.network nat-restart-dhcp";

const std::string kFragment = "interface=eth0\n"
                              "dhcp-range=set:eth00,10.1.0.10,10.1.0.99,255.255.255.0,86400\n"
                              "dhcp-option=tag:eth00,option:router,10.1.0.1\n"
                              "dhcp-option=tag:eth00,option:domain-search,lab.example\n"
                              "dhcp-option=tag:eth00,option:domain-name,lab.example\n"
                              "dhcp-option=tag:eth00,option:dns-server,10.1.0.2,10.1.0.3\n";
const std::string kRange = "interface=eth0\ndhcp-range=set:eth00,10.1.0.10,10.1.0.99,255.255.255.0,86400\n";
const std::string kRouter = "dhcp-option=tag:eth00,option:router,10.1.0.1\n";
const std::string kDns = "dhcp-option=tag:eth00,option:dns-server,10.1.0.2\n";
const std::string kDnsV6 = "dhcp-option=tag:eth0v60,option6:dns-server,[2001:db8::53],[2001:db8::54]\n";

const outcome kDone{.result = 0, .commands = {kMkdir}};
const outcome kBadParameters{.result = -1, .log = {kErr + "Bad parameters."}};
const outcome kBadRecord{.result = -1, .log = {kErr + "parameter error"}};
const outcome kRead{.result = 1};

outcome failure(const texts &messages, const texts &commands = {}) {
    outcome failed{.result = -1, .commands = commands};
    for (const std::string &message : messages) {
        failed.log.push_back(kErr + message);
    }
    return failed;
}

template<size_t Size> void set_field(char (&field)[Size], const std::string &text) {
    memset(field, '\0', Size);
    memcpy(field, text.data(), std::min(text.size(), Size));
}

/** Names in /etc/dhcpd, "" when there is no directory. */
std::string files() {
    std::string names;
    for (const std::string &name : read_file("/etc/dhcpd") == "<absent>" ? texts{} : list_dir("/etc/dhcpd")) {
        names += name + " ";
    }
    return names;
}

} // namespace

class dhcp_conf : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        conf.enabled = 1;
        conf.lease_time = 86400;
        set_field(conf.start_ip, "10.1.0.10");
        set_field(conf.end_ip, "10.1.0.99");
        set_field(conf.netmask, "255.255.255.0");
        set_field(conf.router, "10.1.0.1");
        set_field(conf.domain, "lab.example");
        set_field(conf.dns1, "10.1.0.2");
        set_field(conf.dns2, "10.1.0.3");
    }
    void TearDown() override {
        for (DHCP_OPTION &option : options) {
            KLIBCSzListFree(option.items);
        }
        unit_test::TearDown();
    }
    void be_v6(const std::string &mode) {
        set_field(conf.v6_mode, mode);
        set_field(conf.start_ip, "2001:db8::10");
        set_field(conf.end_ip, "2001:db8::99");
        set_field(conf.dns1, "2001:db8::53");
        set_field(conf.dns2, "2001:db8::54");
    }
    /** Appends an option with one value to the record. */
    void add_option(int number, const std::string &name, const std::string &value) {
        DHCP_OPTION &option = options.emplace_back();
        option.number = number;
        set_field(option.name, name);
        set_field(option.value, value);
        chain();
    }
    /** The same with a list. */
    void add_option(int number, const std::string &name, const texts &items) {
        add_option(number, name, "");
        KLIBSZLIST *list = KLIBCSzListAlloc(16);
        for (const std::string &item : items) {
            KLIBCSzListPush(&list, item.c_str());
        }
        options.back().items = list;
    }
    outcome set_config(int type = 0, const char *ifname = "eth0", unsigned subnet = 0) {
        return rig.observe([&] { return DHCPTagConfSetConfig(ifname, subnet, type, &conf); });
    }
    outcome set(int type = 0, const char *ifname = "eth0", unsigned subnet = 0) {
        return rig.observe([&] { return DHCPTagConfSet(ifname, subnet, type, &conf); });
    }
    outcome set_enable(int enable, int type = 0, const char *ifname = "eth0", unsigned subnet = 0) {
        return rig.observe([=] { return DHCPTagConfSetEnable(ifname, subnet, type, enable); });
    }
    outcome get_enable(int type = 0, const char *ifname = "eth0", unsigned subnet = 0) {
        enabled = 77;
        return rig.observe([&] { return DHCPTagConfGetEnable(ifname, subnet, type, &enabled); });
    }
    /** Reads into a record full of rubbish; the options go into texts "number name value item ...". */
    outcome get(int type = 0, const char *ifname = "eth0", unsigned subnet = 0) {
        memset(&conf, 'x', sizeof conf);
        return rig.observe([&] {
            const int result = DHCPTagConfGet(ifname, subnet, type, &conf);
            take_options();
            return result;
        });
    }
    outcome get_v4(const std::string &content) {
        write_file(kConf, content);
        return get();
    }
    outcome get_v6(const std::string &content) {
        write_file(kConfV6, content);
        return get(1);
    }
    outcome aggregate(int op, const char *bond, const texts &slaves) {
        KLIBSZLIST *list = KLIBCSzListAlloc(16);
        for (const std::string &slave : slaves) {
            KLIBCSzListPush(&list, slave.c_str());
        }
        const outcome got = rig.observe([=] { return DHCPDLinkAggrSet(op, bond, list); });
        KLIBCSzListFree(list);
        return got;
    }

    DHCP_TAG_CONF conf{};
    std::vector<DHCP_OPTION> options;
    texts found;
    int enabled = 77;

private:
    void chain() {
        for (size_t i = 0; i + 1 < options.size(); ++i) {
            options[i].next = &options[i + 1];
        }
        conf.options = options.data();
    }
    void take_options() {
        found.clear();
        DHCP_OPTION unread;
        memset(&unread, 'x', sizeof unread);
        if (conf.options == unread.next) {
            return; // the record was not touched
        }
        for (const DHCP_OPTION *option = conf.options; option != nullptr; option = option->next) {
            std::string text = std::to_string(option->number) + " " + option->name + " " + option->value;
            for (uint32_t i = 0; option->items != nullptr && i < option->items->nItem; ++i) {
                text += (i > 0 ? "," : "") + std::string(KLIBCSzListGet(option->items, static_cast<int>(i)));
            }
            found.push_back(text);
        }
        DHCPOptionFree(conf.options);
        conf.options = nullptr;
    }
};

// ---- the switch

TEST_F(dhcp_conf, DHCPTagConfSetEnable_switch_isTheWholeFile) {
    const std::string info = "/etc/dhcpd/dhcpd-ovs_eth0.10-subnet4294967295.info";
    write_file(info, "enable=\"no\"\nbonding_backup_enable=\"yes\"\n" + long_text(5000));
    for (const auto &[enable, content] : std::vector<std::pair<int, std::string>>{
             {1, "enable=\"yes\"\n"}, {0, "enable=\"no\"\n"}, {2, "enable=\"no\"\n"}, {-1, "enable=\"no\"\n"}}) {
        EXPECT_OUTCOME(set_enable(enable, 0, "ovs_eth0.10", UINT32_MAX), kDone);
        EXPECT_EQ(content, read_file(info));
        EXPECT_OUTCOME(set_enable(enable, 1), kDone);
        EXPECT_EQ(content, read_file(kInfoV6));
    }
    EXPECT_EQ("dhcpd-ovs_eth0.10-subnet4294967295.info dhcpd6-eth0-subnet0.info ", files());
}

TEST_F(dhcp_conf, DHCPTagConfSetEnable_badArguments_areRefused) {
    EXPECT_OUTCOME(set_enable(1, 0, nullptr), kBadParameters);
    EXPECT_OUTCOME(set_enable(1, 0, ""), refusal("dhcp_conf", "'\\0' != *ifname"));
    for (const int type : {-1, 2, INT32_MAX}) {
        EXPECT_OUTCOME(set_enable(1, type), failure({"Wrong DHCP ip type"}));
    }
    EXPECT_EQ("", files());
}

TEST_F(dhcp_conf, everyCall_nameThatLeavesThePlace_isRefused) {
    texts names{".", "..", "../etc/passwd", "a/b", "/etc/x", "a b", "a\nb", "a\x7f", long_text(236)};
    for (const std::string &name : names) {
        const outcome refused = refusal("dhcp_conf", "is_interface_name(ifname)");
        for (const int type : {0, 1}) {
            EXPECT_OUTCOME(set_enable(1, type, name.c_str()), refused);
            EXPECT_OUTCOME(set_config(type, name.c_str()), refused);
            EXPECT_OUTCOME(set(type, name.c_str()), refused);
            EXPECT_OUTCOME(get_enable(type, name.c_str()), refused);
            EXPECT_OUTCOME(rig.observe([&] { return DHCPTagConfGet(name.c_str(), 0, type, &conf); }), refused);
        }
        EXPECT_OUTCOME(aggregate(1, name.c_str(), {}), refusal("dhcp_conf", "is_interface_name(bond)"));
        EXPECT_OUTCOME(aggregate(1, "bond0", {"eth0", name}), refusal("dhcp_conf", "is_interface_name(slaves)"));
    }
    EXPECT_EQ("", files());
}

TEST_F(dhcp_conf, everyCall_strangeName_staysInItsPlace) {
    for (const std::string &name :
         texts{"eth0.10", "a-b", "%s%n", "-rf", "...", "a\"b", "$(x)", "`x`", "a;b", "*", long_text(235)}) {
        for (const int type : {0, 1}) {
            set_field(conf.v6_mode, "stateful");
            EXPECT_OUTCOME(set(type, name.c_str(), 7), {.result = 0, .commands = {kMkdir, kMkdir}});
            const std::string path = (type == 0 ? "dhcpd-" : "dhcpd6-") + name + "-subnet7.";
            EXPECT_EQ(path + "conf " + path + "info ", files());
            EXPECT_EQ(0U, read_file("/etc/dhcpd/" + path + "conf").find("interface=" + name + "\n"));
            const std::string tag = name + (type == 0 ? "7" : "v67");
            EXPECT_NE(std::string::npos, read_file("/etc/dhcpd/" + path + "conf").find("=set:" + tag + ",")) << name;
            EXPECT_OUTCOME(get(type, name.c_str(), 7), kRead);
            EXPECT_EQ(1, conf.enabled);
            SetUp();
        }
    }
    for (const int type : {0, 1}) {
        set_field(conf.v6_mode, "ra-only");
        EXPECT_OUTCOME(set_config(type, "a,b"), kBadParameters); // two fields in the tag
        EXPECT_OUTCOME(set(type, "a,b"), kBadRecord);
    }
    EXPECT_EQ("", files());
}

TEST_F(dhcp_conf, DHCPTagConfSetEnable_whatCannotBeWritten_isTold) {
    for (const int status : {1, 127, -1}) {
        rig.answer("/bin/mkdir", status);
        EXPECT_OUTCOME(set_enable(1), failure({"Failed to mkdir [/etc/dhcpd]"}, {kMkdir}));
    }
    rig.answer("/bin/mkdir", 0);
    EXPECT_OUTCOME(set_enable(1), failure({"Failed to open file [" + kInfo + "]."}, {kMkdir}));
    shell("mkdir -p " + kInfo);
    EXPECT_OUTCOME(set_enable(1), failure({"Failed to open file [" + kInfo + "]."}, {kMkdir}));
    shell("rmdir " + kInfo + " && ln -s /dev/full " + kInfo);
    EXPECT_OUTCOME(set_enable(1), failure({"Failed to write file [" + kInfo + "]."}, {kMkdir}));
}

TEST_F(dhcp_conf, DHCPTagConfGetEnable_switch_isYesAlone) {
    for (const int type : {0, 1}) {
        const std::string info = type == 0 ? kInfo : kInfoV6;
        EXPECT_OUTCOME(get_enable(type), {.result = 0});
        EXPECT_EQ(0, enabled);
        for (const auto &[content, expected] : std::vector<std::pair<std::string, int>>{
                 {"enable=\"yes\"\n", 1},
                 {"# note\nenable=yes\n", 1},
                 {"enable=\"no\"\n", 0},
                 {"enable=\"Yes\"\n", 0},
                 {"enable=\"yes \"\n", 0},
                 {"xenable=\"yes\"\n", 0},
                 {"", 0},
                 {"enable", 0},
                 {"enable=", 0},
                 {std::string("\0\xff\0enable=\"yes\"\n", 16), 0},
                 {"enable=\"" + long_text(10000, 'y') + "\"\n", 0},
                 {long_text(100000) + "\nenable=\"yes\"\n", 1},
             }) {
            write_file(info, content);
            EXPECT_OUTCOME(get_enable(type), kRead);
            EXPECT_EQ(expected, enabled) << content.substr(0, 100);
        }
    }
}

TEST_F(dhcp_conf, DHCPTagConfGetEnable_badArguments_areRefused) {
    EXPECT_OUTCOME(get_enable(0, nullptr), failure({"Wrong parameters"}));
    EXPECT_OUTCOME(get_enable(0, ""), refusal("dhcp_conf", "'\\0' != *ifname"));
    EXPECT_OUTCOME(rig.observe([] { return DHCPTagConfGetEnable("eth0", 0, 0, nullptr); }),
                   failure({"Wrong parameters"}));
    for (const int type : {-1, 2}) {
        EXPECT_OUTCOME(get_enable(type), failure({"Wrong DHCPD ip type"}));
        EXPECT_EQ(77, enabled);
    }
}

// ---- writing IPv4

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v4_isTheFragment) {
    EXPECT_OUTCOME(set_config(), kDone);
    EXPECT_EQ(kFragment, read_file(kConf));
    EXPECT_EQ("dhcpd-eth0-subnet0.conf ", files());
    EXPECT_OUTCOME(set_config(0, "eth1", 3), kDone);
    EXPECT_EQ(0U, read_file("/etc/dhcpd/dhcpd-eth1-subnet3.conf").find("interface=eth1\ndhcp-range=set:eth13,10.1."));
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v4FragmentThatIsThere_isWrittenAnew) {
    write_file(kConf, long_text(100000));
    EXPECT_OUTCOME(set_config(), kDone);
    EXPECT_EQ(kFragment, read_file(kConf));
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v4WithoutDomain_hasNoSuchLines) {
    set_field(conf.domain, "");
    conf.lease_time = INT32_MIN;
    EXPECT_OUTCOME(set_config(), kDone);
    EXPECT_EQ("interface=eth0\ndhcp-range=set:eth00,10.1.0.10,10.1.0.99,255.255.255.0,-2147483648\n" + kRouter +
                  "dhcp-option=tag:eth00,option:dns-server,10.1.0.2,10.1.0.3\n",
              read_file(kConf));
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v4NameServers_areJoined) {
    set_field(conf.domain, "");
    struct {
        std::string dns1, dns2, more, line;
    } const cases[] = {
        {"", "", "", ""},
        {"1.1.1.1", "", "", "1.1.1.1"},
        {"", "2.2.2.2", "", "2.2.2.2"},
        {"1.1.1.1", "2.2.2.2", "3.3.3.3,4.4.4.4", "1.1.1.1,2.2.2.2,3.3.3.3,4.4.4.4"},
        {"", "", "3.3.3.3", "3.3.3.3"},
        {"1.1.1.1", "", "3.3.3.3,", "1.1.1.1,3.3.3.3"},
        {"1.1.1.1", "", ",", "1.1.1.1,"},
        {"", "", ",", ""},
        {long_text(45, '1'), long_text(45, '2'), "", long_text(45, '1') + "," + long_text(45, '2')},
    };
    for (const auto &each : cases) {
        set_field(conf.dns1, each.dns1);
        set_field(conf.dns2, each.dns2);
        set_field(conf.dns_more, each.more);
        EXPECT_OUTCOME(set_config(), kDone);
        EXPECT_EQ(kRange + kRouter + "dhcp-option=tag:eth00,option:dns-server," + each.line + "\n", read_file(kConf));
    }
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v4Options_followInTheirOrder) {
    add_option(26, "mtu", "1500");
    add_option(42, "ntp-server", texts{"10.1.0.4", "10.1.0.5"});
    add_option(17, "root-path", "/srv/\"a b\" 100%s%n");
    add_option(21, "policy-filter", texts{"10.0.0.1", "255.255.255.000", "10.0.0.2", "255.255.0.0"});
    add_option(121, "classless-static-route", texts{"10.1.0.0/16", "192.168.1.1"});
    add_option(44, "netbios-ns", texts{"10.1.0.6"});
    EXPECT_OUTCOME(set_config(), kDone);
    EXPECT_EQ(kFragment + "dhcp-option=tag:eth00,option:mtu,1500\n"
                          "dhcp-option=tag:eth00,option:ntp-server,10.1.0.4,10.1.0.5\n"
                          "dhcp-option=tag:eth00,option:root-path,/srv/\"a b\" 100%s%n\n"
                          "dhcp-option=tag:eth00,option:policy-filter,10.0.0.1,255.255.255.0,10.0.0.2,255.255.0.0\n"
                          "dhcp-option=tag:eth00,option:classless-static-route,10.1.0.0/16,192.168.1.1\n"
                          "dhcp-option=tag:eth00,option:netbios-ns,10.1.0.6\n",
              read_file(kConf));
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v4InvalidOption_leavesTheLinesBeforeIt) {
    write_file(kConf, long_text(9999));
    add_option(26, "mtu", "1500");
    add_option(26, "mtu", "67");
    add_option(23, "default-ttl", "64");
    outcome expected = failure({"interface [eth0] subnet [0] option [26] has wrong format"}, {kMkdir});
    expected.log.insert(expected.log.begin(),
                        "ERR dhcp_option_check:N wrong DHCP option number [26]: wrong string value [67]");
    EXPECT_OUTCOME(set_config(), expected);
    EXPECT_EQ(kFragment + "dhcp-option=tag:eth00,option:mtu,1500\n", read_file(kConf));
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v4OptionThatIsMoreThanALine_isRefused) {
    const std::string before = "dhcp-option=tag:eth00,option:root-path,";
    const std::string longest = long_text(1023 - before.size(), 'p');
    add_option(17, "root-path", longest);
    EXPECT_OUTCOME(set_config(), kDone);
    EXPECT_EQ(kFragment + before + longest + "\n", read_file(kConf));
    for (const size_t length : {longest.size() + 1, size_t{1023}}) {
        set_field(options[0].value, long_text(length, 'p'));
        EXPECT_OUTCOME(set_config(), failure({"interface [eth0] subnet [0] option [17] has wrong format"}, {kMkdir}));
        EXPECT_EQ(kFragment, read_file(kConf));
    }
    // without its end
    set_field(options[0].value, long_text(1024, 'p'));
    const outcome got = set_config();
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(kErr + "interface [eth0] subnet [0] option [17] has wrong format", got.log.back());
    // a list whose items alone are short enough
    options[0] = {};
    add_option(42, "ntp-server", texts(64, "100.100.100.100"));
    conf.options = &options[1];
    EXPECT_OUTCOME(set_config(), failure({"interface [eth0] subnet [0] option [42] has wrong format"}, {kMkdir}));
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_textThatIsMoreThanItsLine_writesNothing) {
    write_file(kConf, "kept\n");
    write_file(kConfV6, "kept\n");
    const DHCP_TAG_CONF good = conf;
    const auto refuses = [&](int type, auto &field, const texts &values) {
        for (const std::string &value : values) {
            set_field(field, value);
            EXPECT_OUTCOME(set_config(type), kBadParameters);
            EXPECT_OUTCOME(set(type), kBadRecord);
        }
        set_field(field, "");
        EXPECT_EQ("kept\n", read_file(type == 0 ? kConf : kConfV6));
    };
    const texts lines{"a\ndhcp-script=/bin/x", "a\rb", "a\tb", "\x1b", "a\x7f"};
    const auto with = [](texts values, const std::string &more) {
        values.push_back(more);
        return values;
    };
    refuses(0, conf.start_ip, with(with(lines, long_text(46)), "1.1.1.1,2.2.2.2"));
    refuses(0, conf.end_ip, with(with(lines, long_text(46)), "1.1.1.1,2.2.2.2"));
    refuses(0, conf.netmask, with(with(lines, long_text(46)), ","));
    refuses(0, conf.router, with(lines, long_text(46)));
    refuses(0, conf.dns1, with(lines, long_text(46)));
    refuses(0, conf.dns2, with(lines, long_text(46)));
    refuses(0, conf.dns_more, with(with(lines, long_text(4096)), long_text(4095)));
    refuses(0, conf.domain, with(with(lines, long_text(4096)), long_text(4095)));
    // the longest that is a line, and one byte more
    const size_t room = 1023 - strlen("dhcp-option=tag:eth00,option:domain-search,");
    refuses(0, conf.domain, {long_text(room + 1)});
    const size_t dns_room = 1023 - strlen("dhcp-option=tag:eth00,option:dns-server,");
    refuses(0, conf.dns_more, {long_text(dns_room + 1)});
    set_field(conf.domain, long_text(room));
    set_field(conf.dns_more, long_text(dns_room));
    EXPECT_OUTCOME(set_config(), kDone);
    EXPECT_EQ("dhcpd-eth0-subnet0.conf dhcpd6-eth0-subnet0.conf ", files());

    conf = good;
    be_v6("stateful");
    refuses(1, conf.start_ip, with(with(lines, long_text(46)), "::1,::2"));
    refuses(1, conf.end_ip, with(with(lines, long_text(46)), "::1,::2"));
    refuses(1, conf.dns1, with(lines, long_text(46)));
    refuses(1, conf.dns2, with(lines, long_text(46)));
    refuses(1, conf.dns_more, with(with(lines, long_text(4096)), long_text(4095)));
    refuses(1, conf.v6_mode, with(lines, long_text(20)));
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_badArguments_areRefused) {
    for (const int type : {0, 1}) {
        EXPECT_OUTCOME(set_config(type, nullptr), kBadParameters);
        EXPECT_OUTCOME(rig.observe([=] { return DHCPTagConfSetConfig("eth0", 0, type, nullptr); }), kBadParameters);
        EXPECT_OUTCOME(set_config(type, ""), refusal("dhcp_conf", "'\\0' != *ifname"));
    }
    for (const int type : {-1, 2}) {
        EXPECT_OUTCOME(set_config(type), failure({"Wrong DHCP ip type"}));
    }
    EXPECT_EQ("", files());
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_whatCannotBeWritten_isTold) {
    for (const int type : {0, 1}) {
        be_v6("stateful");
        const std::string path = type == 0 ? kConf : kConfV6;
        rig.answer("/bin/mkdir", 1);
        EXPECT_OUTCOME(set_config(type), failure({"Failed to mkdir [/etc/dhcpd]"}, {kMkdir}));
        rig.answer("/bin/mkdir", 0);
        shell("mkdir -p " + path);
        EXPECT_OUTCOME(set_config(type), failure({"Failed to open file [" + path + "]."}, {kMkdir}));
        shell("rmdir " + path + " && ln -s /dev/full " + path);
        EXPECT_OUTCOME(set_config(type), failure({"Failed to write file [" + path + "]."}, {kMkdir}));
    }
    shell("rm -rf /etc/dhcpd && touch /etc/dhcpd");
    rig.let_run("/bin/mkdir");
    EXPECT_OUTCOME(set_config(), failure({"Failed to mkdir [/etc/dhcpd]"}, {kMkdir}));
    EXPECT_EQ("", read_file("/etc/dhcpd"));
}

// ---- writing IPv6

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v6_isTheFragmentOfItsMode) {
    for (const std::string &mode : texts{"ra-only", "ra-stateless"}) {
        be_v6(mode);
        EXPECT_OUTCOME(set_config(1), kDone);
        EXPECT_EQ("interface=eth0\ndhcp-range=set:eth0v60,::,constructor:eth0," + mode + ",64,86400\n" + kDnsV6,
                  read_file(kConfV6));
    }
    be_v6("stateful");
    EXPECT_OUTCOME(set_config(1), kDone);
    EXPECT_EQ("interface=eth0\ndhcp-range=set:eth0v60,2001:db8::10,2001:db8::99,64,86400\n" + kDnsV6 + "enable-ra\n",
              read_file(kConfV6));
    EXPECT_OUTCOME(set_config(1, "eth1", 3), kDone);
    EXPECT_EQ(0U, read_file("/etc/dhcpd/dhcpd6-eth1-subnet3.conf").find("interface=eth1\ndhcp-range=set:eth1v63,"));
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v6NameServers_haveALineWhenThereAreSome) {
    struct {
        std::string dns1, dns2, more, line;
    } const cases[] = {
        {"", "", "", ""},
        {"", "", ",", ""},
        {"::1", "", "", "[::1]"},
        {"", "::2", "", "[::2]"},
        {"::1", "::2", "[::3],[::4],", "[::1],[::2],[::3],[::4]"},
        {"", "", "[::3]", "[::3]"},
    };
    for (const auto &each : cases) {
        be_v6("ra-only");
        set_field(conf.dns1, each.dns1);
        set_field(conf.dns2, each.dns2);
        set_field(conf.dns_more, each.more);
        EXPECT_OUTCOME(set_config(1), kDone);
        const std::string dns = "dhcp-option=tag:eth0v60,option6:dns-server," + each.line + "\n";
        EXPECT_EQ("interface=eth0\ndhcp-range=set:eth0v60,::,constructor:eth0,ra-only,64,86400\n" +
                      (each.line.empty() ? "" : dns),
                  read_file(kConfV6));
    }
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v6Off_leavesTheFragmentAlone) {
    be_v6("off");
    set_field(conf.dns1, "a\nb"); // what is not written is not looked at
    EXPECT_OUTCOME(set_config(1), {.result = 0});
    EXPECT_EQ("", files());
    write_file(kConfV6, "kept\n");
    EXPECT_OUTCOME(set_config(1), {.result = 0});
    EXPECT_OUTCOME(set(1), kDone);
    EXPECT_EQ("kept\n", read_file(kConfV6));
    EXPECT_EQ("enable=\"yes\"\n", read_file(kInfoV6));
}

TEST_F(dhcp_conf, DHCPTagConfSetConfig_v6UnknownMode_isTold) {
    write_file(kConfV6, "kept\n");
    for (const std::string &mode : texts{"", "Off", "slaac", "ra-only ", "stateful2", long_text(19)}) {
        be_v6(mode);
        EXPECT_OUTCOME(set_config(1), failure({"Wrong dhcpv6 type [" + mode + "]"}));
    }
    EXPECT_EQ("kept\n", read_file(kConfV6));
}

// ---- writing both files

TEST_F(dhcp_conf, DHCPTagConfSet_subnet_isSwitchAndFragment) {
    EXPECT_OUTCOME(set(), {.result = 0, .commands = {kMkdir, kMkdir}});
    EXPECT_EQ("enable=\"yes\"\n", read_file(kInfo));
    EXPECT_EQ(kFragment, read_file(kConf));
    conf.enabled = 0;
    EXPECT_OUTCOME(set(), {.result = 0, .commands = {kMkdir, kMkdir}});
    EXPECT_EQ("enable=\"no\"\n", read_file(kInfo));
    EXPECT_EQ(kFragment, read_file(kConf));
}

TEST_F(dhcp_conf, DHCPTagConfSet_failures_areTold) {
    EXPECT_OUTCOME(set(0, nullptr), kBadRecord);
    EXPECT_OUTCOME(rig.observe([] { return DHCPTagConfSet("eth0", 0, 0, nullptr); }), kBadRecord);
    EXPECT_OUTCOME(set(0, ""), refusal("dhcp_conf", "'\\0' != *ifname"));
    EXPECT_OUTCOME(set(2), failure({"Wrong DHCP ip type", "Failed to set to dhcp server info file [eth0]."}));
    rig.answer("/bin/mkdir", 1);
    EXPECT_OUTCOME(
        set(), failure({"Failed to mkdir [/etc/dhcpd]", "Failed to set to dhcp server info file [eth0]."}, {kMkdir}));
    rig.let_run("/bin/mkdir");
    be_v6("slaac");
    EXPECT_OUTCOME(
        set(1), failure({"Wrong dhcpv6 type [slaac]", "Failed to set config file of dhcp server [eth0]."}, {kMkdir}));
    EXPECT_EQ("enable=\"yes\"\n", read_file(kInfoV6));
    shell("mkdir -p " + kConf);
    EXPECT_OUTCOME(set(),
                   failure({"Failed to open file [" + kConf + "].", "Failed to set config file of dhcp server [eth0]."},
                           {kMkdir, kMkdir}));
}

// ---- reading IPv4

TEST_F(dhcp_conf, DHCPTagConfGet_v4_isReadBack) {
    add_option(26, "mtu", "1500");
    add_option(42, "ntp-server", texts{"10.1.0.4", "10.1.0.5"});
    EXPECT_OUTCOME(set(), {.result = 0, .commands = {kMkdir, kMkdir}});
    EXPECT_OUTCOME(get(), kRead);
    EXPECT_EQ(1, conf.enabled);
    EXPECT_EQ(0, conf.reserved);
    EXPECT_EQ(86400, conf.lease_time);
    EXPECT_STREQ("10.1.0.10", conf.start_ip);
    EXPECT_STREQ("10.1.0.99", conf.end_ip);
    EXPECT_STREQ("eth0", conf.ifname);
    EXPECT_STREQ("lab.example", conf.domain);
    EXPECT_STREQ("10.1.0.2", conf.dns1);
    EXPECT_STREQ("10.1.0.3", conf.dns2);
    EXPECT_STREQ("", conf.dns_more);
    EXPECT_STREQ("255.255.255.0", conf.netmask);
    EXPECT_STREQ("10.1.0.1", conf.router);
    EXPECT_STREQ("", conf.reserved_text);
    EXPECT_STREQ("", conf.tag);
    EXPECT_STREQ("", conf.v6_mode);
    EXPECT_EQ((texts{"26 mtu 1500", "42 ntp-server 10.1.0.4,10.1.0.5"}), found);
}

TEST_F(dhcp_conf, DHCPTagConfGet_v4NameInTheRecord_mayBeItsOwn) {
    write_file(kConf, kFragment);
    set_field(conf.ifname, "eth0");
    EXPECT_OUTCOME(rig.observe([&] { return DHCPTagConfGet(conf.ifname, 0, 0, &conf); }), kRead);
    EXPECT_STREQ("10.1.0.10", conf.start_ip);
    write_file(kConf, "");
    EXPECT_OUTCOME(
        rig.observe([&] { return DHCPTagConfGet(conf.ifname, 0, 0, &conf); }),
        failure({"Failed to get key interface in " + kConf, "Failed to get DHCP Server config from [eth0, 0]"}));
}

TEST_F(dhcp_conf, DHCPTagConfGet_withoutFragment_isAnEmptyRecord) {
    write_file(kInfo, "enable=\"yes\"\n");
    write_file(kInfoV6, "enable=\"yes\"\n");
    const DHCP_TAG_CONF empty{};
    for (const int type : {0, 1}) {
        EXPECT_OUTCOME(get(type), {.result = 0});
        EXPECT_EQ(0, memcmp(&empty, &conf, sizeof conf));
    }
}

TEST_F(dhcp_conf, DHCPTagConfGet_badArguments_leaveTheRecordAlone) {
    EXPECT_OUTCOME(get(0, nullptr), failure({"Wrong parameters"}));
    EXPECT_OUTCOME(get(0, ""), failure({"Wrong parameters"}));
    EXPECT_OUTCOME(rig.observe([] { return DHCPTagConfGet("eth0", 0, 0, nullptr); }), failure({"Wrong parameters"}));
    for (const int type : {-1, 2}) {
        EXPECT_OUTCOME(get(type), failure({"Wrong or unsupported DHCPD ip type"}));
        EXPECT_EQ('x', conf.start_ip[0]);
    }
}

TEST_F(dhcp_conf, DHCPTagConfGet_v4WithoutALine_isTold) {
    const std::string failed = "Failed to get DHCP Server config from [eth0, 0]";
    const std::string interface = "Failed to get key interface in " + kConf;
    const std::string binary = "\0\1\2\xff\xfe\n\0\n=\n,,,\n"s;
    for (const std::string &content :
         texts{"", "interface", "\n\n\n", binary, long_text(100000), long_text(5000) + "\n"}) {
        EXPECT_OUTCOME(get_v4(content), failure({interface, failed}));
        EXPECT_EQ(nullptr, conf.options);
    }
    EXPECT_OUTCOME(get_v4("interface=eth0\n"), failure({"Failed to get key dhcp-range", failed}));
    EXPECT_OUTCOME(get_v4(kRange), failure({"Failed to get key dhcp-option", failed}));
    EXPECT_OUTCOME(get_v4(kRange + kDns), failure({"Failed to get key option:router", failed}));
    EXPECT_OUTCOME(get_v4(kRange + kRouter), failure({"Failed to get key dhcp-option", failed}));
    EXPECT_OUTCOME(get_v4(kRange + kDns + kRouter), kRead);
    // a truncated file
    for (size_t length = 0; length < kRange.size() + kRouter.size(); ++length) {
        EXPECT_EQ(-1, get_v4(kFragment.substr(0, length)).result) << length;
    }
    shell("rm " + kConf + " && mkdir " + kConf);
    outcome unreadable = get();
    EXPECT_EQ(-1, unreadable.result);
    EXPECT_EQ((texts{kErr + interface, kErr + failed}), unreadable.log);
}

TEST_F(dhcp_conf, DHCPTagConfGet_v4Range_isTakenAsItIs) {
    struct {
        std::string range, start, end, mask;
        int lease;
    } const cases[] = {
        {"set:eth00,1.1.1.1,2.2.2.2,255.0.0.0,60,more", "1.1.1.1", "2.2.2.2", "255.0.0.0", 60},
        {"set:eth00,1.1.1.1,2.2.2.2,255.0.0.0", "1.1.1.1", "2.2.2.2", "255.0.0.0", 0},
        {"", "", "", "", 0},
        {"set:eth00", "", "", "", 0},
        {",,,,", "", "", "", 0},
        {"a,b,c,d,12h", "b", "c", "d", 12},
        {"a,b,c,d,infinite", "b", "c", "d", 0},
        {"a,b,c,d,-5", "b", "c", "d", -5},
        {"a,b,c,d,99999999999999999999", "b", "c", "d", 0},
        {"a," + long_text(300, '1') + "," + long_text(300, '2') + "," + long_text(300, '3') + ",7", long_text(19, '1'),
         long_text(19, '2'), long_text(19, '3'), 7},
    };
    for (const auto &each : cases) {
        EXPECT_OUTCOME(get_v4("interface=eth0\ndhcp-range=" + each.range + "\n" + kRouter + kDns), kRead);
        EXPECT_EQ(each.start, conf.start_ip);
        EXPECT_EQ(each.end, conf.end_ip);
        EXPECT_EQ(each.mask, conf.netmask);
        EXPECT_EQ(each.lease, conf.lease_time) << each.range;
    }
}

TEST_F(dhcp_conf, DHCPTagConfGet_v4NameServers_areTheFirstTwo) {
    struct {
        std::string rest, dns1, dns2;
    } const cases[] = {
        {"", "", ""},
        {",", "", ""},
        {",1.1.1.1", "1.1.1.1", ""},
        {",1.1.1.1,2.2.2.2", "1.1.1.1", "2.2.2.2"},
        {",1.1.1.1,2.2.2.2,3.3.3.3", "1.1.1.1", "2.2.2.2"},
        {"," + long_text(2000, '1') + "," + long_text(2000, '2'), long_text(45, '1'), long_text(45, '2')},
        {",1.1.1.1\r", "1.1.1.1", ""},
    };
    for (const auto &each : cases) {
        outcome got = get_v4(kRange + kRouter + "dhcp-option=tag:eth00,option:dns-server" + each.rest + "\n");
        EXPECT_OUTCOME(got, kRead);
        EXPECT_EQ(each.dns1, conf.dns1) << each.rest.substr(0, 50);
        EXPECT_EQ(each.dns2, conf.dns2);
    }
}

TEST_F(dhcp_conf, DHCPTagConfGet_v4Texts_areCutToTheirLimits) {
    const std::string domain = "dhcp-option=tag:eth00,option:domain-search,";
    EXPECT_OUTCOME(get_v4("interface=" + long_text(30, 'i') + "\n" + kRange + "dhcp-option=tag:eth00,option:router," +
                          long_text(45, '4') + "\n" + kDns + domain + long_text(300, 'd') + "\n"),
                   kRead);
    EXPECT_EQ(long_text(15, 'i'), conf.ifname);
    EXPECT_EQ(long_text(19, '4'), conf.router);
    EXPECT_EQ(long_text(254, 'd'), conf.domain);
    EXPECT_OUTCOME(get_v4(kRange + kRouter + kDns + domain + "a.example,b.example\n"), kRead);
    EXPECT_STREQ("b.example", conf.domain); // the last field
    EXPECT_OUTCOME(get_v4(kRange + kRouter + kDns), kRead);
    EXPECT_STREQ("", conf.domain);
}

TEST_F(dhcp_conf, DHCPTagConfGet_v4LinesOfNoOption_areLeftOut) {
    const std::string begin = "dhcp-option=tag:eth00,";
    const std::string warning = "WARNING dhcp_conf:N Wrong user-defined dhcp option format [";
    EXPECT_OUTCOME(
        get_v4(kFragment + "# note\n\ndhcp-option=42,1.1.1.1\n" + begin + "option:mtu,67\n" + begin +
               "option:mtu,1500\n" + begin + "option:none,1\n" + begin + "26,1500\n"),
        {.result = 1,
         .log = {"ERR dhcp_option_check:N wrong DHCP option number [26]: wrong string value [67]",
                 warning + begin + "option:mtu,67]", "ERR dhcp_option_read:N Unsupported dhcp option name [none]",
                 warning + begin + "option:none,1]",
                 "ERR dhcp_option_read:N List get failed or wrong user-defined dhcp option format [" + begin +
                     "26,1500]",
                 warning + begin + "26,1500]"}});
    EXPECT_EQ((texts{"26 mtu 1500"}), found);
}

TEST_F(dhcp_conf, DHCPTagConfGet_v4_whateverMemoryFails_leavesNothing) {
    NEEDS_OWN_ALLOCATOR();
    write_file(kConf, kFragment + "dhcp-option=tag:eth00,option:ntp-server,1.1.1.1\n");
    for (const char *const operation : {"malloc", "calloc", "realloc", "KLIBCSzListAlloc", "KLIBCSzListPush"}) {
        for (int nth = 1; nth < 40; ++nth) {
            rig.fail(operation, nth);
            const outcome got = get();
            EXPECT_TRUE(got.result == 1 || (got.result == -1 && !got.log.empty() && found.empty())) << got.str();
        }
    }
}

TEST_F(dhcp_conf, DHCPTagConfGet_v4DomainOrOptionsThatCannotBeRead_areTold) {
    write_file(kConf, kFragment);
    // the fragment is opened for name servers, router, domain, and then for the options
    rig.fail("fopen", 3);
    EXPECT_OUTCOME(
        get(), failure({"Failed to get key option:domain-search", "Failed to get DHCP Server config from [eth0, 0]"}));
    rig.fail("fopen", 4);
    EXPECT_OUTCOME(get(), failure({"Failed to open DHCP config [" + kConf + "] for reading",
                                   "Failed to get DHCP Server config from [eth0, 0]"}));
    EXPECT_EQ(nullptr, conf.options);
}

// ---- reading IPv6

TEST_F(dhcp_conf, DHCPTagConfGet_v6_isReadBack) {
    for (const std::string &mode : texts{"ra-only", "ra-stateless", "stateful"}) {
        be_v6(mode);
        conf.enabled = 1;
        conf.lease_time = 4711;
        EXPECT_OUTCOME(set(1), {.result = 0, .commands = {kMkdir, kMkdir}});
        EXPECT_OUTCOME(get(1), kRead);
        EXPECT_EQ(1, conf.enabled);
        EXPECT_EQ(mode, conf.v6_mode);
        EXPECT_EQ(4711, conf.lease_time);
        EXPECT_STREQ(mode == "stateful" ? "2001:db8::10" : "", conf.start_ip);
        EXPECT_STREQ(mode == "stateful" ? "2001:db8::99" : "", conf.end_ip);
        EXPECT_STREQ("2001:db8::53", conf.dns1);
        EXPECT_STREQ("2001:db8::54", conf.dns2);
        EXPECT_STREQ("", conf.ifname);
        EXPECT_STREQ("", conf.router);
    }
}

TEST_F(dhcp_conf, DHCPTagConfGet_v6Range_isTakenByItsFields) {
    struct {
        std::string range, mode, start;
        int lease;
    } const cases[] = {
        {"set:t,::,constructor:eth0,ra-only,64,infinite", "ra-only", "", 3600},
        {"set:t,::,constructor:eth0,ra-only,64,", "ra-only", "", 3600},
        {"set:t,::,constructor:eth0,ra-only,64,12h", "ra-only", "", 12},
        {"set:t,::,constructor:eth0,ra-only,64,0", "ra-only", "", 0},
        {"set:t,::,constructor:eth0,ra-only,64,-1", "ra-only", "", -1},
        {",,,,,", "", "", 3600},
        {"a,b,c," + long_text(99, 'm') + ",e,5", long_text(15, 'm'), "", 5},
        {"set:t,::1,::2,64,infinite", "stateful", "::1", 0},
        {"set:t," + long_text(99, 's') + ",::2,64,7", "stateful", long_text(45, 's'), 7},
        {",,,,", "stateful", "", 0},
    };
    for (const auto &each : cases) {
        EXPECT_OUTCOME(get_v6("dhcp-range=" + each.range + "\n" + kDnsV6), kRead);
        EXPECT_EQ(each.mode, conf.v6_mode);
        EXPECT_EQ(each.start, conf.start_ip);
        EXPECT_EQ(each.lease, conf.lease_time) << each.range;
        EXPECT_EQ(0, conf.enabled);
    }
    for (const std::string &range : texts{"", "a", "a,b,c,d", "a,b,c,d,e,f,g", ",,,,,,,,,", long_text(2000, ',')}) {
        EXPECT_OUTCOME(get_v6("dhcp-range=" + range + "\n" + kDnsV6),
                       failure({"Failed to parse DHCP range of [" + kConfV6 + "]",
                                "Failed to get DHCPv6 Server config from [eth0, 0]"}));
    }
}

TEST_F(dhcp_conf, DHCPTagConfGet_v6WithoutALine_isTold) {
    const std::string failed = "Failed to get DHCPv6 Server config from [eth0, 0]";
    const std::string binary = "\0\1\2\xff\xfe\n\0\n=\n,,,\n"s;
    for (const std::string &content : texts{"", "dhcp-range", binary, long_text(100000), kDnsV6}) {
        EXPECT_OUTCOME(get_v6(content), failure({"Failed to get key dhcp-range", failed}));
    }
    be_v6("ra-only");
    set_field(conf.dns1, "");
    set_field(conf.dns2, "");
    EXPECT_OUTCOME(set_config(1), kDone);
    EXPECT_OUTCOME(get(1), failure({"Failed to get key dhcp-option", failed})); // what was written without servers
}

TEST_F(dhcp_conf, DHCPTagConfGet_v6NameServers_loseTheirBrackets) {
    struct {
        std::string rest, dns1, dns2;
    } const cases[] = {
        {"", "", ""},
        {",", "", ""},
        {",x,[", "", ""},
        {",[],[]", "", ""},
        {",[a],[b],[c]", "a", "b"},
        {",abc", "b", ""},
        {",[" + long_text(99, '1') + "],[" + long_text(99, '2') + "]", long_text(45, '1'), long_text(45, '2')},
    };
    for (const auto &each : cases) {
        EXPECT_OUTCOME(
            get_v6("dhcp-range=set:t,::1,::2,64,60\ndhcp-option=tag:t,option6:dns-server" + each.rest + "\n"), kRead);
        EXPECT_EQ(each.dns1, conf.dns1) << each.rest;
        EXPECT_EQ(each.dns2, conf.dns2) << each.rest;
    }
}

// ---- bonds

namespace {

const std::string kYes = "enable=\"yes\"\n";
const std::string kNo = "enable=\"no\"\n";

std::string info_of(const std::string &ifname, int type = 0) {
    return (type == 0 ? "/etc/dhcpd/dhcpd-" : "/etc/dhcpd/dhcpd6-") + ifname + ".info";
}
std::string kept(const std::string &value) {
    return "bonding_backup_enable=\"" + value + "\"\n";
}

} // namespace

TEST_F(dhcp_conf, DHCPDLinkAggrSet_bonded_movesTheSwitches) {
    write_file(info_of("eth0"), kYes);
    write_file(info_of("eth0", 1), kNo);
    write_file(info_of("eth1", 1), "# note\nother=1\n" + kYes + kept("no"));
    write_file(info_of("bond0"), kNo + kept("yes"));
    write_file(info_of("bond0", 1), kYes);
    EXPECT_OUTCOME(aggregate(1, "bond0", {"eth0", "eth1", "eth2"}), {.result = 0, .commands = {kRestart}});
    EXPECT_EQ(kNo + kept("yes"), read_file(info_of("eth0")));
    EXPECT_EQ(kNo + kept("no"), read_file(info_of("eth0", 1)));
    EXPECT_EQ("# note\nother=1\n" + kNo + kept("yes"), read_file(info_of("eth1", 1)));
    EXPECT_EQ(kYes + kept("yes"), read_file(info_of("bond0"))); // what was kept stays
    EXPECT_EQ(kYes, read_file(info_of("bond0", 1)));
    EXPECT_EQ("dhcpd-bond0.info dhcpd-eth0.info dhcpd6-bond0.info dhcpd6-eth0.info dhcpd6-eth1.info ", files());
}

TEST_F(dhcp_conf, DHCPDLinkAggrSet_takenApart_bringsThemBack) {
    for (const int op : {0, 2, -1}) {
        write_file(info_of("bond0"), kYes);
        write_file(info_of("eth0"), kNo + kept("yes"));
        write_file(info_of("eth0", 1), kNo);
        write_file(info_of("eth1", 1), kNo + kept("maybe"));
        EXPECT_OUTCOME(aggregate(op, "bond0", {"eth0", "eth1"}), {.result = 0, .commands = {kRestart}});
        EXPECT_EQ(kNo + kept("yes"), read_file(info_of("bond0")));
        EXPECT_EQ(kYes + kept("yes"), read_file(info_of("eth0")));
        EXPECT_EQ(kNo, read_file(info_of("eth0", 1)));
        EXPECT_EQ("enable=\"maybe\"\n" + kept("maybe"), read_file(info_of("eth1", 1)));
    }
}

TEST_F(dhcp_conf, DHCPDLinkAggrSet_withoutFiles_onlyRestarts) {
    for (const int op : {0, 1}) {
        EXPECT_OUTCOME(aggregate(op, "bond0", {"eth0"}), {.result = 0, .commands = {kRestart}});
        EXPECT_OUTCOME(aggregate(op, "bond0", {}), {.result = 0, .commands = {kRestart}});
    }
    EXPECT_EQ("", files());
}

TEST_F(dhcp_conf, DHCPDLinkAggrSet_serverThatDoesNotRestart_isOnlyLogged) {
    rig.answer(kRestart, 1);
    EXPECT_OUTCOME(
        aggregate(1, "bond0", {}),
        {.result = 0, .log = {"ERR dhcp_server_start:N Failed to restart DHCP SERVER"}, .commands = {kRestart}});
}

TEST_F(dhcp_conf, DHCPDLinkAggrSet_badArguments_changeNothing) {
    write_file(info_of("eth0"), kYes);
    EXPECT_OUTCOME(aggregate(1, nullptr, {"eth0"}), failure({"Bond interface is null"}));
    EXPECT_OUTCOME(aggregate(1, "", {"eth0"}), refusal("dhcp_conf", "'\\0' != *bond"));
    EXPECT_OUTCOME(aggregate(1, "bond0", {"eth0", ""}), refusal("dhcp_conf", "'\\0' != *slaves"));
    EXPECT_OUTCOME(rig.observe([] { return DHCPDLinkAggrSet(1, "bond0", nullptr); }),
                   refusal("dhcp_conf", "NULL != slaves"));
    EXPECT_EQ(kYes, read_file(info_of("eth0")));
}

TEST_F(dhcp_conf, DHCPDLinkAggrSet_fileWithoutASwitch_isAFailure) {
    for (const std::string &content : texts{"", "enabled=\"yes\"\n", std::string("\0\xff\n", 3), long_text(9999)}) {
        for (const int type : {0, 1}) {
            shell("rm -rf /etc/dhcpd");
            write_file(info_of("eth0"), kYes);
            write_file(info_of("eth1", type), content);
            const std::string missing = "Failed to get enable key in [" + info_of("eth1", type) + "]";
            EXPECT_OUTCOME(aggregate(1, "bond0", {"eth0", "eth1", "eth2"}),
                           failure({missing, "Failed to save [eth1] interface's dhcp conf"}));
            EXPECT_EQ(kNo + kept("yes"), read_file(info_of("eth0")));
            EXPECT_EQ(content, read_file(info_of("eth1", type)));
            EXPECT_OUTCOME(aggregate(0, "eth1", {"eth0"}),
                           failure({missing, "Failed to restore [eth1] interface's dhcp conf"}));
            EXPECT_EQ(kNo + kept("yes"), read_file(info_of("eth0")));
        }
    }
}

TEST_F(dhcp_conf, DHCPDLinkAggrSet_writeThatFails_isTold) {
    const auto failing = [&](int op, const texts &slaves, int nth, const texts &messages) {
        write_file(info_of("eth0"), kYes + kept("no"));
        write_file(info_of("bond0"), kYes + kept("no"));
        rig.fail("KLIBCFileSetKeyValue", nth);
        outcome expected = failure(messages);
        expected.code = 0xB00;
        expected.unit = "platform";
        EXPECT_OUTCOME(aggregate(op, "bond0", slaves), expected);
    };
    const std::string keep = "Failed to set bonding_backup_enable key in [" + info_of("eth0") + "]";
    failing(1, {"eth0"}, 1, {keep, "Failed to save [eth0] interface's dhcp conf"});
    EXPECT_EQ(kYes + kept("no"), read_file(info_of("eth0")));
    failing(1, {"eth0"}, 2,
            {"Failed to set enable key to \"no\" in [" + info_of("eth0") + "]",
             "Failed to save [eth0] interface's dhcp conf"});
    EXPECT_EQ(kYes + kept("yes"), read_file(info_of("eth0")));
    failing(
        1, {"eth0"}, 3,
        {"Failed to set enable key in [" + info_of("bond0") + "]", "Failed to restore [bond0] interface's dhcp conf"});
    // taken apart, the two messages are in each other's place
    failing(0, {"eth0"}, 1,
            {"Failed to set bonding_backup_enable key in [" + info_of("bond0") + "]",
             "Failed to restore [bond0] interface's dhcp conf"});
    failing(0, {"eth0"}, 3,
            {"Failed to set enable key in [" + info_of("eth0") + "]", "Failed to save [eth0] interface's dhcp conf"});
}

TEST_F(dhcp_conf, DHCPDLinkAggrSet_fileThatCannotBeRead_isTold) {
    write_file(info_of("bond0"), kYes);
    rig.fail("KLIBCFileGetKeyValue");
    outcome expected = failure({"Failed to get bonding_backup_enable key in [" + info_of("bond0") + "]",
                                "Failed to restore [bond0] interface's dhcp conf"});
    expected.code = 0x900;
    expected.unit = "platform";
    EXPECT_OUTCOME(aggregate(1, "bond0", {}), expected);
}
