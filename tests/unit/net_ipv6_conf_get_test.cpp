#include "support/fake_kernel.h"

#include <cstring>
#include <kovanetsdk/ipv6.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_ipv6_conf_get";
const std::string kPath = "/etc/sysconfig/network-scripts/ifcfg-eth0";
constexpr int kRoom = 46;

} // namespace

class net_ipv6_conf_get : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        kernel.add("eth0");
    }
    outcome get(const char *szIfname = "eth0") {
        mode = prefix = 77;
        memset(address, 'x', sizeof address);
        memset(gateway, 'x', sizeof gateway);
        return rig.observe([=, this] {
            return KOVANetIPv6ConfGet(szIfname, &mode, address, sizeof address, &prefix, gateway, sizeof gateway);
        });
    }
    outcome get_of(const std::string &content) {
        write_file(ifcfg("eth0"), content);
        return get();
    }
    static outcome failed(const std::string &line, unsigned code, const std::string &unit = kUnit) {
        return {.result = -1, .code = code, .unit = unit, .log = {"ERR net_ipv6_conf_get:N " + line}};
    }

    fake_kernel kernel{rig};
    int mode;
    int prefix;
    char address[kRoom];
    char gateway[kRoom];
};

TEST_F(net_ipv6_conf_get, KOVANetIPv6ConfGet_bad_arguments_are_refused) {
    const auto call = [&](const char *szIfname, int *pMode, char *szIP, int cbIP, int *pPrefix, char *szGateway,
                          int cbGateway) {
        return rig.observe(
            [=] { return KOVANetIPv6ConfGet(szIfname, pMode, szIP, cbIP, pPrefix, szGateway, cbGateway); });
    };
    EXPECT_OUTCOME(get(nullptr), refusal(kUnit, "((void *)0) != szIfname"));
    EXPECT_OUTCOME(get(""), refusal(kUnit, "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str()), refusal(kUnit, "is_interface_name(szIfname)"));
    }
    EXPECT_OUTCOME(call("eth0", nullptr, address, kRoom, &prefix, gateway, kRoom), refusal(kUnit, "NULL != pMode"));
    EXPECT_OUTCOME(call("eth0", &mode, nullptr, kRoom, &prefix, gateway, kRoom),
                   refusal(kUnit, "((void *)0) != szV6IPAddr"));
    EXPECT_OUTCOME(call("eth0", &mode, address, kRoom, nullptr, gateway, kRoom),
                   refusal(kUnit, "NULL != pPrefixLength"));
    EXPECT_OUTCOME(call("eth0", &mode, address, kRoom, &prefix, nullptr, kRoom),
                   refusal(kUnit, "((void *)0) != szGateway"));
    for (const int small : {45, 0, -1}) {
        EXPECT_OUTCOME(call("eth0", &mode, address, small, &prefix, gateway, kRoom),
                       refusal(kUnit, "46 <= cbV6IPAddr"));
        EXPECT_OUTCOME(call("eth0", &mode, address, kRoom, &prefix, gateway, small), refusal(kUnit, "46 <= cbGateway"));
    }
}

TEST_F(net_ipv6_conf_get, KOVANetIPv6ConfGet_interface_that_does_not_count_has_none) {
    kernel.add("eth1", {.flags = IFF_UP | IFF_SLAVE});
    for (const char *szIfname : {"eth1", "eth9", "lo"}) {
        write_file(ifcfg(szIfname), "IPV6INIT=auto\n");
        EXPECT_OUTCOME(get(szIfname), {.result = 0, .code = 0xBC00, .unit = "net_is_dev_type_match"});
        EXPECT_EQ(77, mode);
        EXPECT_EQ('x', *address);
    }
}

TEST_F(net_ipv6_conf_get, KOVANetIPv6ConfGet_without_mode_is_never_configured) {
    for (const std::string &content : {std::string(), std::string("DEVICE=eth0\nIPV6ADDR=2001:db8::5\n")}) {
        EXPECT_OUTCOME(get_of(content),
                       {.result = 0, .log = {"INFO net_ipv6_conf_get:N no ipv6 configtype, first time set IPv6"}});
        EXPECT_EQ(0, mode);
        EXPECT_EQ(-1, prefix);
        EXPECT_EQ(std::string(kRoom, '\0'), std::string(address, kRoom));
        EXPECT_EQ(std::string(kRoom, '\0'), std::string(gateway, kRoom));
    }
}

TEST_F(net_ipv6_conf_get, KOVANetIPv6ConfGet_modes_are_read_in_any_case) {
    const std::vector<std::pair<std::string, int>> modes{{"auto", 0},   {"off", 1},       {"dhcp", 2},
                                                         {"static", 3}, {"auto_dhcp", 4}, {"\"OFF\"", 1},
                                                         {"Auto", 0},   {"AUTO_dhcp", 4}, {"sTaTiC", 3}};
    for (const auto &[text, code] : modes) {
        EXPECT_OUTCOME(get_of("IPV6INIT=" + text + "\n"), {.result = 1});
        EXPECT_EQ(code, mode) << text;
        EXPECT_EQ(-1, prefix);
        EXPECT_STREQ("", address);
        EXPECT_STREQ("", gateway);
    }
}

TEST_F(net_ipv6_conf_get, KOVANetIPv6ConfGet_fixed_settings_are_filled_whatever_the_mode) {
    for (const std::string &text : {std::string("static"), std::string("auto")}) {
        const std::string longest = "2001:0db8:0000:0000:0000:ffff:192.168.100.200";
        EXPECT_OUTCOME(
            get_of("IPV6INIT=" + text + "\nIPV6ADDR=\"" + longest + "\"\nIPV6PREFIXLENG=64\nIPV6_DEFAULTGW=fe80::1\n"),
            {.result = 1});
        EXPECT_EQ(longest, address);
        EXPECT_EQ(64, prefix);
        EXPECT_STREQ("fe80::1", gateway);
    }
}

TEST_F(net_ipv6_conf_get, KOVANetIPv6ConfGet_text_that_is_no_mode_is_told) {
    for (const std::string &text : texts{"", "autos", "none", "3", "auto "}) {
        EXPECT_OUTCOME(get_of("IPV6INIT=" + text + "\nIPV6PREFIXLENG=64\n"),
                       failed("ipv6 init type undefined " + kPath + ", " + text + ",", 0x4000));
        EXPECT_EQ(0, mode);
        EXPECT_EQ(-1, prefix);
    }
}

TEST_F(net_ipv6_conf_get, KOVANetIPv6ConfGet_text_that_is_no_address_is_told) {
    const std::string mode_line = "IPV6INIT=static\n";
    for (const std::string &text : texts{"", "2001:db8::5/64", "192.168.1.1", "fe80::1%eth0", long_text(45)}) {
        const outcome expected = failed("not valid ipv6 address " + kPath + ", " + text + ",", 0x1000);
        EXPECT_OUTCOME(get_of(mode_line + "IPV6ADDR=" + text + "\nIPV6PREFIXLENG=64\n"), expected);
        EXPECT_EQ(3, mode);
        EXPECT_STREQ("", address);
        EXPECT_EQ(-1, prefix);
        EXPECT_OUTCOME(get_of(mode_line + "IPV6ADDR=2001:db8::5\nIPV6PREFIXLENG=64\nIPV6_DEFAULTGW=" + text + "\n"),
                       expected);
        EXPECT_STREQ("2001:db8::5", address);
        EXPECT_EQ(64, prefix);
        EXPECT_STREQ("", gateway);
    }
}

TEST_F(net_ipv6_conf_get, KOVANetIPv6ConfGet_over_long_values_are_none) {
    EXPECT_EQ(-1,
              get_of("IPV6INIT=static\nIPV6ADDR=" + std::string(60, ':') + "1" + long_text(3000, '0') + "\n").result);
    EXPECT_STREQ("", address);
    EXPECT_EQ(-1, get_of("IPV6INIT=auto" + long_text(3000, ' ') + "x\n").result);
}

TEST_F(net_ipv6_conf_get, KOVANetIPv6ConfGet_prefix_length_is_the_number_at_the_beginning) {
    for (const auto &[text, number] : std::vector<std::pair<std::string, int>>{{"0", 0}, {" 128", 128}, {"64x", 64}}) {
        EXPECT_OUTCOME(get_of("IPV6INIT=static\nIPV6PREFIXLENG=" + text + "\n"), {.result = 1});
        EXPECT_EQ(number, prefix);
    }
    for (const std::string &text : texts{"", "x64", "99999999999999999999"}) {
        EXPECT_OUTCOME(get_of("IPV6INIT=static\nIPV6PREFIXLENG=" + text + "\nIPV6_DEFAULTGW=fe80::1\n"),
                       failed("not valid prefix length " + kPath + ", " + text + ",", 0x4000));
        EXPECT_EQ(-1, prefix);
        EXPECT_STREQ("", gateway);
    }
}

TEST_F(net_ipv6_conf_get, KOVANetIPv6ConfGet_file_that_cannot_be_read_is_told_at_every_key) {
    EXPECT_OUTCOME(get(), failed("can not get ipv6 key value " + kPath + ", IPV6INIT,", 0x900, "key_value"));
    EXPECT_EQ(0, mode);
    EXPECT_EQ(-1, prefix);
    const std::vector<std::pair<int, std::string>> reads{
        {2, "can not get ipv6 key value " + kPath + ", IPV6INIT,"}, // the first read tells whether this is a cluster
        {3, "error when get ipv6 key value " + kPath + ", IPV6ADDR,"},
        {4, "error when get ipv6 key value " + kPath + ", IPV6PREFIXLENG,"},
        {5, "can not get ipv6 key value " + kPath + ", IPV6_DEFAULTGW,"}};
    for (const auto &[nth, line] : reads) {
        rig.fail("KLIBCFileGetKeyValue", nth);
        const outcome got =
            get_of("IPV6INIT=static\nIPV6ADDR=2001:db8::5\nIPV6PREFIXLENG=64\nIPV6_DEFAULTGW=fe80::1\n");
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ(texts{"ERR net_ipv6_conf_get:N " + line}, got.log);
        EXPECT_NE(kUnit, got.unit);
    }
}
