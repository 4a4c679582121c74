#include "support/resolver.h"

using namespace kova_test;

namespace {

const texts kLocked{"+0x106", "-0x100"};
const std::string kReloadDdns = "/usr/kova/service/ddns reload";

class net_dns_update : public resolver_test {
protected:
    void SetUp() override {
        resolver_test::SetUp();
        write_file(kKovaInfoConf, "dns_mode=\"auto\"\n");
        for (const char *service : {"ddns", "kovarelayd"}) {
            write_file(std::string("/usr/kova/service/") + service, "");
        }
        rig.answer("/usr/kova/service/kovarelayd status", 3);
    }
    outcome update() {
        return rig.observe([] { return KOVANetDNSUpdate(); });
    }
    /** What /etc/resolv.conf becomes of the automatic sources. */
    std::string made_of(const std::string &ipv4, const std::string &ipv6 = "") {
        write_file(kResolvConf, "untouched\n");
        write_file(kAutoIpv4, ipv4);
        write_file(kAutoIpv6, ipv6);
        const outcome got = update();
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(kLocked, got.locks);
        EXPECT_EQ((texts{}), got.log);
        return read_file(kResolvConf);
    }
    static outcome done(const std::string &servers) {
        return {.commands = {kReloadDdns, "/usr/kova/service/kovarelayd status"},
                .events = change_of(servers),
                .locks = kLocked};
    }
};

TEST_F(net_dns_update, KOVANetDNSUpdate_auto_hasIpv4ServersBeforeIpv6) {
    write_file(kStaticConf, "nameserver\t9.9.9.9\n");
    write_file(kAutoIpv6, "nameserver\tfe80::1\n");
    write_file(kAutoIpv4, "nameserver\t10.0.0.1\n");
    EXPECT_OUTCOME(update(), done("NITEMS=2 DNS_1=10.0.0.1 DNS_2=fe80::1"));
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\tfe80::1\n", read_file(kResolvConf));
    EXPECT_EQ(0644U, mode_of(kResolvConf));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_static_hasTheConfiguredServersAlone) {
    write_file(kKovaInfoConf, "dns_mode=static\n");
    write_file(kStaticConf, "nameserver\t9.9.9.9\nnameserver\t8.8.8.8\n");
    write_file(kAutoIpv4, "nameserver\t10.0.0.1\n");
    EXPECT_OUTCOME(update(), done("NITEMS=2 DNS_1=9.9.9.9 DNS_2=8.8.8.8"));
    EXPECT_EQ("nameserver\t9.9.9.9\nnameserver\t8.8.8.8\n", read_file(kResolvConf));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_anyOtherMode_isAutomatic) {
    write_file(kStaticConf, "nameserver\t9.9.9.9\n");
    write_file(kAutoIpv4, "nameserver\t10.0.0.1\n");
    for (const char *mode : {"", "dns_mode=\n", "dns_mode=\"Static\"\n", "dns_mode=static \n", "dns_mode=manual\n",
                             "#dns_mode=static\n"}) {
        write_file(kKovaInfoConf, mode);
        write_file(kResolvConf, "untouched\n");
        EXPECT_OUTCOME(update(), done("NITEMS=1 DNS_1=10.0.0.1"));
    }
    std::filesystem::remove(kKovaInfoConf);
    const outcome got = update();
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(change_of("NITEMS=1 DNS_1=10.0.0.1"), got.events);
}

TEST_F(net_dns_update, KOVANetDNSUpdate_noServer_leavesTheFileAsItIs) {
    write_file(kResolvConf, "untouched\n");
    EXPECT_OUTCOME(update(), {.locks = kLocked});
    write_file(kAutoIpv4, "");
    write_file(kAutoIpv6, "");
    EXPECT_OUTCOME(update(), {.locks = kLocked});
    write_file(kKovaInfoConf, "dns_mode=\"static\"\n");
    EXPECT_OUTCOME(update(), {.locks = kLocked});
    EXPECT_EQ("untouched\n", read_file(kResolvConf));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_lineOfAnotherKind_repeatsTheServerBefore) {
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\t10.0.0.1\nnameserver\t10.0.0.2\n",
              made_of("nameserver\t10.0.0.1\n# comment\nnameserver\t10.0.0.2\n"));
    EXPECT_EQ("nameserver\t\nnameserver\t10.0.0.1\n", made_of("# comment\nnameserver\t10.0.0.1\n"));
    EXPECT_EQ("nameserver\t\n", made_of("\n"));
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\t10.0.0.1\n", made_of("nameserver\t10.0.0.1\n\n"));
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\t10.0.0.1\nnameserver\tfe80::1\n",
              made_of("nameserver\t10.0.0.1\n", "# comment\nnameserver\tfe80::1\n"));
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\t10.0.0.1\n", made_of("nameserver\t10.0.0.1\nnameserver\t\n"));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_lines_areTrimmedAndReadUpToABlank) {
    EXPECT_EQ("nameserver\t10.0.0.1\n", made_of(" \t nameserver\t10.0.0.1 \t\r\n"));
    EXPECT_EQ("nameserver\t10.0.0.1\n", made_of("nameserver   10.0.0.1 # comment"));
    EXPECT_EQ("nameserver\t10.0.0.1\n", made_of("nameserver10.0.0.1\n"));
    EXPECT_EQ("nameserver\t\n", made_of("Nameserver\t10.0.0.1\n"));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_longLine_isCut) {
    EXPECT_EQ("nameserver\t" + long_text(1012) + "\nnameserver\t10.0.0.1\n",
              made_of("nameserver\t" + long_text(1000000) + "\nnameserver\t10.0.0.1\n"));
    EXPECT_EQ("nameserver\t\n", made_of(std::string(2000, ' ') + "nameserver\t10.0.0.1\n"));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_binaryData_isHarmless) {
    using namespace std::string_literals;
    EXPECT_EQ("nameserver\t10\nnameserver\t10\nnameserver\t10.0.0.2\n",
              made_of("nameserver\t10\0.0.0.1\n\xff\xfe\x01\0\n"s + "nameserver\t10.0.0.2\n"));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_tenThousandServers_areAllWritten) {
    std::string servers;
    for (int i = 0; i < 10000; ++i) {
        servers += "nameserver\t10.1." + std::to_string(i / 250) + "." + std::to_string(i % 250) + "\n";
    }
    EXPECT_EQ(servers, made_of(servers));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_configuredServers_areReadLikeTheOthers) {
    using namespace std::string_literals;
    write_file(kKovaInfoConf, "dns_mode=\"static\"\n");
    std::string many;
    for (int i = 0; i < 10000; ++i) {
        many += "nameserver\t10.2." + std::to_string(i / 250) + "." + std::to_string(i % 250) + "\n";
    }
    const std::map<std::string, std::string> made{
        {many, many},
        {"nameserver\t10\0.0.0.1\n\xff\xfe\x01\0\n"s, "nameserver\t10\nnameserver\t10\n"},
        {"nameserver\t" + long_text(1000000), "nameserver\t" + long_text(1012) + "\n"}};
    for (const auto &[source, expected] : made) {
        write_file(kStaticConf, source);
        EXPECT_EQ(0, update().result);
        EXPECT_EQ(expected, read_file(kResolvConf));
    }
}

TEST_F(net_dns_update, KOVANetDNSUpdate_configuredServersThatCannotBeRead_leaveTheFileAsItIs) {
    write_file(kKovaInfoConf, "dns_mode=\"static\"\n");
    write_file(kResolvConf, "untouched\n");
    std::filesystem::create_directory(kStaticConf);
    EXPECT_OUTCOME(update(), {.result = -1,
                              .code = 0x900,
                              .unit = "plain_file",
                              .log = {"ERR net_dns_update:N Failed to read [" + kStaticConf + "], kovaerr=[0x0900]"},
                              .locks = kLocked});
    EXPECT_EQ("untouched\n", read_file(kResolvConf));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_oddOptions_areHarmless) {
    using namespace std::string_literals;
    const std::string server = "nameserver\t10.0.0.1\n";
    std::string many;
    for (int i = 0; i < 10000; ++i) {
        many += "options timeout:" + std::to_string(i) + "\n";
    }
    const std::map<std::string, std::string> added{{"\xff\xfe\x01\ndomain\tex\0ample\n"s, "domain\tex\n"},
                                                   {long_text(1000000) + "\ndomain\tone\n", "domain\tone\n"},
                                                   {many + "domain\tlast\n", "domain\tlast\n"}};
    for (const auto &[option, line] : added) {
        write_file(kOptionConf, option);
        EXPECT_EQ(server + line, made_of(server));
    }
    std::filesystem::remove(kOptionConf);
    std::filesystem::create_directory(kOptionConf);
    EXPECT_EQ(server, made_of(server));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_domainLine_isAddedBehindTheServers) {
    const std::string server = "nameserver\t10.0.0.1\n";
    const std::map<std::string, std::string> added{
        {"domain\texample\n", "domain\texample\n"},
        {"# comment\ndomain\tone.example more\r\ndomain\ttwo.example\n", "domain\tone.example more\n"},
        {"domain example\n", ""},
        {" domain\texample\n", ""},
        {"", ""},
        {"domain\t" + long_text(5000) + "\n", "domain\t" + long_text(1016) + "\n"}};
    for (const auto &[option, line] : added) {
        write_file(kOptionConf, option);
        EXPECT_EQ(server + line, made_of(server));
    }
}

TEST_F(net_dns_update, KOVANetDNSUpdate_unreadableOption_isPassedOver) {
    write_file(kOptionConf, "domain\texample\n");
    rig.fail("KLIBCFileGetLine");
    EXPECT_EQ("nameserver\t10.0.0.1\n", made_of("nameserver\t10.0.0.1\n"));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_relay_isReloadedWhenItRuns) {
    write_file(kAutoIpv4, "nameserver\t10.0.0.1\n");
    rig.answer("/usr/kova/service/kovarelayd status", 0);
    outcome expected = done("NITEMS=1 DNS_1=10.0.0.1");
    expected.commands.push_back("/usr/kova/service/kovarelayd reload");
    EXPECT_OUTCOME(update(), expected);
}

TEST_F(net_dns_update, KOVANetDNSUpdate_reloadThatFails_changesNoResult) {
    write_file(kAutoIpv4, "nameserver\t10.0.0.1\n");
    rig.answer(kReloadDdns, 1);
    outcome expected = done("NITEMS=1 DNS_1=10.0.0.1");
    expected.code = 0x2A00;
    expected.unit = "service";
    EXPECT_OUTCOME(update(), expected);
}

TEST_F(net_dns_update, KOVANetDNSUpdate_sourceThatCannotBeRead_leavesTheFileAsItIs) {
    for (const std::string &source : {kAutoIpv4, kAutoIpv6}) {
        write_file(kResolvConf, "untouched\n");
        std::filesystem::remove_all(kAutoIpv6);
        write_file(kAutoIpv4, "nameserver\t10.0.0.1\n");
        std::filesystem::remove_all(source);
        std::filesystem::create_directories(source);
        EXPECT_OUTCOME(update(), {.result = -1,
                                  .code = 0x900,
                                  .unit = "plain_file",
                                  .log = {"ERR net_dns_update:N Failed to read [" + source + "], kovaerr=[0x0900]"},
                                  .locks = kLocked});
        EXPECT_EQ("untouched\n", read_file(kResolvConf));
        std::filesystem::remove_all(source);
    }
}

TEST_F(net_dns_update, KOVANetDNSUpdate_lockHeldElsewhere_isWaitedForAndGivenUp) {
    write_file(kResolvConf, "untouched\n");
    write_file(kAutoIpv4, "nameserver\t10.0.0.1\n");
    const lock_elsewhere reader{0x105};
    outcome got = update();
    EXPECT_FALSE(got.sleeps.empty());
    got.sleeps.clear();
    EXPECT_OUTCOME(got, {.result = -1,
                         .code = 0x400,
                         .unit = "named_lock",
                         .log = {"ERR net_dns_update:N KLIBCFileLock failed.[0x0400 named_lock:N]"}});
    EXPECT_EQ("untouched\n", read_file(kResolvConf));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_noMemory_failsBeforeTheLock) {
    for (const int nth : {1, 2, 3}) {
        rig.fail("KLIBCSzListAlloc", nth);
        EXPECT_OUTCOME(update(), {.result = -1,
                                  .code = 0x200,
                                  .unit = "net_dns_update",
                                  .log = {"ERR net_dns_update:N Failed to alloc memory."}});
    }
}

TEST_F(net_dns_update, KOVANetDNSUpdate_noMemoryForALine_leavesTheFileAsItIs) {
    write_file(kResolvConf, "untouched\n");
    write_file(kAutoIpv4, "nameserver\t10.0.0.1\n");
    write_file(kAutoIpv6, "nameserver\tfe80::1\n");
    write_file(kOptionConf, "domain\texample\n");
    for (const int nth : {1, 2, 3}) { // of a server of either family, of the domain
        rig.fail("KLIBCSzListPush", nth);
        EXPECT_OUTCOME(update(), {.result = -1,
                                  .code = 0x200,
                                  .unit = "platform",
                                  .log = {"ERR net_dns_update:N Cannot push the list"},
                                  .locks = kLocked});
    }
    EXPECT_EQ("untouched\n", read_file(kResolvConf));
}

TEST_F(net_dns_update, KOVANetDNSUpdate_fileThatCannotBeWritten_reloadsNothing) {
    write_file(kAutoIpv4, "nameserver\t10.0.0.1\n");
    std::filesystem::create_directory(kResolvConf);
    EXPECT_OUTCOME(update(), {.result = -1,
                              .code = 0x2800,
                              .unit = "net_dns_file_set",
                              .events = {"net/dns_change 4 NITEMS=1 DNS_1=10.0.0.1"},
                              .locks = kLocked});
}

} // namespace
