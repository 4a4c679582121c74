#include "support/resolver.h"

using namespace kova_test;

namespace {

const texts kLocked{"+0x106", "-0x100"};

class net_dns_mode_set : public resolver_test {
protected:
    void SetUp() override {
        resolver_test::SetUp();
        write_file("/usr/kova/service/ddns", "");
        write_file(kKovaInfoConf, "# the machine\nmaxlanport=\"1\"\n");
        write_file(kStaticConf, "nameserver\t10.0.0.1\n");
        write_file(kAutoIpv4, "nameserver\t10.0.0.2\n");
    }
    outcome set(const char *mode) {
        return rig.observe([=] { return KOVANetDNSModeSet(mode); });
    }
};

TEST_F(net_dns_mode_set, KOVANetDNSModeSet_mode_isStoredAndItsSourceUsed) {
    const std::map<std::string, std::string> servers{{"static", "10.0.0.1"}, {"auto", "10.0.0.2"}};
    for (const auto &[mode, server] : servers) {
        EXPECT_OUTCOME(set(mode.c_str()), {.commands = {"/usr/kova/service/ddns reload"},
                                           .events = change_of("NITEMS=1 DNS_1=" + server),
                                           .locks = kLocked});
        EXPECT_EQ("# the machine\nmaxlanport=\"1\"\ndns_mode=\"" + mode + "\"\n", read_file(kKovaInfoConf));
        EXPECT_EQ("nameserver\t" + server + "\n", read_file(kResolvConf));
    }
}

TEST_F(net_dns_mode_set, KOVANetDNSModeSet_otherWord_isRefused) {
    EXPECT_OUTCOME(set(nullptr), refusal("net_dns_mode_set", "((void *)0) != szMode"));
    for (const std::string &mode :
         {std::string(), std::string("Static"), std::string("AUTO"), std::string("static "), std::string("auto\n"),
          std::string("dhcp"), std::string("stati"), long_text(100000)}) {
        EXPECT_OUTCOME(set(mode.c_str()), refusal("net_dns_mode_set", "is_mode(szMode)"));
    }
    EXPECT_EQ("# the machine\nmaxlanport=\"1\"\n", read_file(kKovaInfoConf));
    expect_files({"resolv.conf.static"});
}

TEST_F(net_dns_mode_set, KOVANetDNSModeSet_modeThatCannotBeStored_failsWithThePlatformsCode) {
    rig.fail("KLIBCINFOSetKeyValue");
    EXPECT_OUTCOME(set("auto"), {.result = -1, .code = 0xB00, .unit = "platform"});
    expect_files({"resolv.conf.static"});
}

TEST_F(net_dns_mode_set, KOVANetDNSModeSet_updateThatFails_failsWithTheModeStored) {
    std::filesystem::create_directory(kResolvConf);
    EXPECT_OUTCOME(set("static"), {.result = -1,
                                   .code = 0x2800,
                                   .unit = "net_dns_file_set",
                                   .events = {"net/dns_change 4 NITEMS=1 DNS_1=10.0.0.1"},
                                   .locks = kLocked});
    EXPECT_EQ("# the machine\nmaxlanport=\"1\"\ndns_mode=\"static\"\n", read_file(kKovaInfoConf));
}

} // namespace
