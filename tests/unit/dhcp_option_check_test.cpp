#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

const std::string kUnit = "ERR dhcp_option_check:N ";

} // namespace

/** The check is reached through the writer of a subnet that has one option. */
class dhcp_option_check : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        shell("mkdir /etc/dhcpd");
        rig.answer("/bin/mkdir", 0); // many times
    }
    void TearDown() override {
        KLIBCSzListFree(option.items);
        unit_test::TearDown();
    }
    /** What the check logs about an option; nothing when it is valid. */
    texts complaints(int number, const std::string &name) {
        option.number = number;
        memset(option.name, '\0', sizeof option.name);
        memcpy(option.name, name.data(), std::min(name.size(), sizeof option.name));
        DHCP_TAG_CONF conf{};
        conf.options = &option;
        const outcome got = rig.observe([&] { return DHCPTagConfSetConfig("eth0", 0, 0, &conf); });
        texts log = got.log;
        EXPECT_EQ(got.result, log.empty() ? 0 : -1);
        if (!log.empty()) {
            EXPECT_EQ("ERR dhcp_conf:N interface [eth0] subnet [0] option [" + std::to_string(number) +
                          "] has wrong format",
                      log.back());
            log.pop_back();
        }
        return log;
    }
    texts complaints(int number, const std::string &name, const std::string &value) {
        memset(option.value, '\0', sizeof option.value);
        memcpy(option.value, value.data(), std::min(value.size(), sizeof option.value));
        return complaints(number, name);
    }
    texts complaints(int number, const std::string &name, const texts &items) {
        KLIBCSzListFree(option.items);
        option.items = KLIBCSzListAlloc(4);
        for (const std::string &item : items) {
            KLIBCSzListPush(&option.items, item.c_str());
        }
        return complaints(number, name);
    }
    static texts wrong_value(int number, const std::string &value) {
        return {kUnit + "wrong DHCP option number [" + std::to_string(number) + "]: wrong string value [" + value +
                "]"};
    }
    static texts wrong_list(int number, const std::string &reason) {
        return {kUnit + reason, kUnit + "wrong DHCP option number [" + std::to_string(number) + "]: wrong list value"};
    }
    void expect_number(int number, const std::string &name, const texts &good, const texts &bad) {
        for (const std::string &value : good) {
            EXPECT_EQ(texts{}, complaints(number, name, value));
        }
        texts refused = bad;
        for (const char *const other : {"", " ", "1 ", " 1", "+1", "-1", "1a", "0x1", "1,1", "99999999999999999999"}) {
            refused.push_back(other);
        }
        for (const std::string &value : refused) {
            EXPECT_EQ(wrong_value(number, value), complaints(number, name, value));
        }
    }

    DHCP_OPTION option{};
};

TEST_F(dhcp_option_check, number_outsideOneTo254_isRefused) {
    for (const int number : {0, -1, 255, 256, INT32_MIN, INT32_MAX}) {
        EXPECT_EQ((texts{kUnit + "wrong DHCP option number [" + std::to_string(number) + "]"}),
                  complaints(number, "mtu", "1500"));
    }
}

TEST_F(dhcp_option_check, name_hasToBeThatOfTheNumber) {
    struct {
        int number;
        std::string name;
    } const cases[] = {{43, "vendor"}, {43, ""},      {200, "x"},        {200, ""},    {1, ""},
                       {254, ""},      {26, ""},      {26, "MTU"},       {26, "mtu "}, {26, "mt"},
                       {26, "T1"},     {26, "mtu\n"}, {6, "dns-server"}, {3, "router"}};
    for (const auto &each : cases) {
        const texts got = complaints(each.number, each.name, "1500");
        ASSERT_EQ(1U, got.size());
        EXPECT_NE(std::string::npos, got[0].find("]: wrong name [" + each.name + "]"));
    }
    const texts unended = complaints(26, long_text(52, 'm'), "1500");
    EXPECT_EQ((texts{kUnit + "wrong DHCP option number [26]: wrong name [" + long_text(51, 'm') + "]"}), unended);
}

TEST_F(dhcp_option_check, numbers_haveTheirBounds) {
    expect_number(13, "boot-file-size", {"0", "1", "65536"}, {"65537"});
    expect_number(22, "max-datagram-reassembly", {"576", "65536"}, {"575", "65537"});
    expect_number(23, "default-ttl", {"1", "255", "0064"}, {"0", "256"});
    expect_number(26, "mtu", {"68", "65536"}, {"67", "65537"});
    expect_number(37, "tcp-ttl", {"1", "255"}, {"0", "256"});
    for (const auto &[number, name] :
         std::vector<std::pair<int, std::string>>{{35, "arp-timeout"}, {38, "tcp-keepalive"}, {58, "T1"}, {59, "T2"}}) {
        expect_number(number, name, {"0", "4294967296", "18446744073709551615"}, {"18446744073709551616"});
    }
    for (const auto &[number, name] : std::vector<std::pair<int, std::string>>{{19, "ip-forward-enable"},
                                                                               {20, "non-local-source-routing"},
                                                                               {27, "all-subnets-local"},
                                                                               {31, "router-discovery"},
                                                                               {34, "trailer-encapsulation"},
                                                                               {36, "ethernet-encap"}}) {
        expect_number(number, name, {"0", "1"}, {"2", "yes"});
    }
    expect_number(46, "netbios-nodetype", {"1", "2", "4", "8"}, {"0", "3", "5", "6", "7", "9", "16", "12"});
}

TEST_F(dhcp_option_check, addresses_areAddresses) {
    for (const auto &[number, name] :
         std::vector<std::pair<int, std::string>>{{16, "swap-server"}, {32, "router-solicitation"}}) {
        EXPECT_EQ(texts{}, complaints(number, name, "10.0.0.1"));
        for (const std::string &value : texts{"", "10.0.0", "10.0.0.256", "host", "10.0.0.1,10.0.0.2", "fe80::a"}) {
            EXPECT_EQ(wrong_value(number, value), complaints(number, name, value));
        }
    }
}

TEST_F(dhcp_option_check, texts_areOneFieldOfALine) {
    for (const auto &[number, name] : std::vector<std::pair<int, std::string>>{{17, "root-path"},
                                                                               {18, "extension-path"},
                                                                               {40, "nis-domain"},
                                                                               {47, "netbios-scope"},
                                                                               {64, "nis+-domain"}}) {
        for (const std::string &value : texts{"x", " ", "\"", "a b\\#%s", "\xc3\xa4", long_text(900)}) {
            EXPECT_EQ(texts{}, complaints(number, name, value));
        }
        for (const std::string &value : texts{"", "a,b"}) {
            EXPECT_EQ(wrong_value(number, value), complaints(number, name, value));
        }
        for (const std::string &value : texts{"a\ndhcp-script=/x", "a\r", "\t", "\x7f", long_text(1024)}) {
            EXPECT_EQ(1U, complaints(number, name, value).size());
        }
    }
    EXPECT_EQ("<absent>", read_file("/etc/dhcpd/dhcpd-eth0-subnet0.info"));
}

TEST_F(dhcp_option_check, lists_areAddresses) {
    for (const auto &[number, name] : std::vector<std::pair<int, std::string>>{{7, "log-server"},
                                                                               {9, "lpr-server"},
                                                                               {41, "nis-server"},
                                                                               {42, "ntp-server"},
                                                                               {44, "netbios-ns"},
                                                                               {45, "netbios-dd"},
                                                                               {48, "x-windows-fs"},
                                                                               {49, "x-windows-dm"},
                                                                               {65, "nis+-server"},
                                                                               {68, "mobile-ip-home"},
                                                                               {69, "smtp-server"},
                                                                               {70, "pop3-server"},
                                                                               {71, "nntp-server"},
                                                                               {74, "irc-server"},
                                                                               {120, "sip-server"}}) {
        KLIBCSzListFree(option.items);
        option.items = nullptr;
        EXPECT_EQ(wrong_list(number, "option list value is empty"), complaints(number, name));
        EXPECT_EQ(texts{}, complaints(number, name, texts{"10.0.0.1"}));
        EXPECT_EQ(texts{}, complaints(number, name, texts{"10.0.0.1", "10.0.0.2", "10.0.0.3"}));
        EXPECT_EQ(wrong_list(number, "wrong list 1-th value [ntp.local], not IP"),
                  complaints(number, name, texts{"10.0.0.1", "ntp.local"}));
        EXPECT_EQ(wrong_list(number, "wrong list 0-th value [], not IP"), complaints(number, name, texts{""}));
    }
}

TEST_F(dhcp_option_check, listLongerThanALine_isRefused) {
    EXPECT_EQ(texts{}, complaints(42, "ntp-server", texts(60, "100.100.100.100")));
    EXPECT_EQ((texts{kUnit + "wrong DHCP option number [42]: wrong list value"}),
              complaints(42, "ntp-server", texts(65, "100.100.100.100")));
}

TEST_F(dhcp_option_check, policyFilter_isAddressesAndMasks) {
    const std::string name = "policy-filter";
    EXPECT_EQ(texts{}, complaints(21, name, texts{"10.0.0.1", "255.255.255.0", "10.0.0.2", "255.0.0.0"}));
    EXPECT_EQ(texts{}, complaints(21, name, texts{"10.0.0.1"}));
    EXPECT_EQ(wrong_list(21, "wrong list 1-th value [255.0.255.0], not mask"),
              complaints(21, name, texts{"10.0.0.1", "255.0.255.0"}));
    EXPECT_EQ(wrong_list(21, "wrong list 2-th value [x], not IP"),
              complaints(21, name, texts{"10.0.0.1", "255.255.255.0", "x", "255.255.255.0"}));
    complaints(21, name, texts{"10.0.0.1", "255.255.000.0"});
    EXPECT_STREQ("255.255.0.0", KLIBCSzListGet(option.items, 1)); // in plain decimal from now on
}

TEST_F(dhcp_option_check, classlessStaticRoute_isDestinationsAndGateways) {
    const std::string name = "classless-static-route";
    EXPECT_EQ(texts{}, complaints(121, name, texts{}));
    EXPECT_EQ(texts{}, complaints(121, name, texts{"10.1.0.0/16", "192.168.1.1", "10.2.0.0/0", "192.168.1.2"}));
    for (const auto &[items, reason] : std::vector<std::pair<texts, std::string>>{
             {{"10.1.0.0"}, "wrong list 0-th value [10.1.0.0]"},
             {{"10.1.0.0/16/3"}, "wrong list 0-th value [10.1.0.0/16/3]"},
             {{"x/16"}, "wrong list 0-th value [x/16], wrong IP"},
             {{"0.0.0.0/0"}, "wrong list 0-th value [0.0.0.0/0], wrong IP"},
             {{"/16"}, "wrong list 0-th value [/16], wrong IP"},
             {{"10.1.0.0/33"}, "wrong list 0-th value [10.1.0.0/33], wrong netmask number"},
             {{"10.1.0.0/"}, "wrong list 0-th value [10.1.0.0/], wrong netmask number"},
             {{"10.1.0.0/+1"}, "wrong list 0-th value [10.1.0.0/+1], wrong netmask number"},
             {{"10.1.0.0/16", "gw"}, "wrong list 1-th value [gw], wrong IP"},
             {{"10.1.0.0/16", "1.1.1.1", "1.1.1.1"}, "wrong list 2-th value [1.1.1.1]"}}) {
        EXPECT_EQ(wrong_list(121, reason), complaints(121, name, items));
    }
    EXPECT_EQ((texts{kUnit + "wrong DHCP option number [121]: wrong list value"}), complaints(121, name, texts{""}));
    EXPECT_EQ((texts{kUnit + "wrong DHCP option number [121]: wrong list value"}),
              complaints(121, name, texts{"10.1.0.0/16", ""}));
}
