#include "support/resolver.h"

using namespace kova_test;

namespace {

const std::string kOld = "nameserver\t1.1.1.1\n";

class net_dns_list_set : public resolver_test {
protected:
    void SetUp() override {
        resolver_test::SetUp();
        write_file("/usr/kova/service/ddns", "");
        write_file(kStaticConf, kOld);
        write_file(kKovaInfoConf, "dns_mode=\"auto\"\n");
    }
    outcome set(const texts &servers) {
        const text_list list{servers};
        return rig.observe([&] { return KOVANetDNSListSet(list.get()); });
    }
    void expect_untouched() {
        EXPECT_EQ(kOld, read_file(kStaticConf));
        EXPECT_EQ("dns_mode=\"auto\"\n", read_file(kKovaInfoConf));
        expect_files({"resolv.conf.static"});
    }

    const texts two{"10.0.0.1", "fe80::1"};
    const std::string before = "net/dns_config_change 4 INTERFACE= NITEMS=2 DNS_1=10.0.0.1 DNS_2=fe80::1";
};

TEST_F(net_dns_list_set, KOVANetDNSListSet_addresses_areWrittenInOrderAndUsed) {
    EXPECT_OUTCOME(set(two), {.commands = {"/usr/kova/service/ddns reload"},
                              .events = {before, "net/dns_change 4 NITEMS=2 DNS_1=10.0.0.1 DNS_2=fe80::1",
                                         "net/dns_change 5 NITEMS=2 DNS_1=10.0.0.1 DNS_2=fe80::1",
                                         "net/dns_config_change 5 INTERFACE= NITEMS=2 DNS_1=10.0.0.1 DNS_2=fe80::1"},
                              .locks = {"+0x106", "-0x100"}});
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\tfe80::1\n", read_file(kStaticConf));
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\tfe80::1\n", read_file(kResolvConf));
    EXPECT_EQ("dns_mode=\"static\"\n", read_file(kKovaInfoConf));
    EXPECT_EQ(0644, mode_of(kStaticConf));
    expect_files({"resolv.conf", "resolv.conf.static"});
}

TEST_F(net_dns_list_set, KOVANetDNSListSet_noList_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetDNSListSet(nullptr); }),
                   refusal("net_dns_list_set", "NULL != pServers"));
    EXPECT_OUTCOME(set({}), refusal("net_dns_list_set", "0 < pServers->nItem"));
    expect_untouched();
}

TEST_F(net_dns_list_set, KOVANetDNSListSet_oneBadEntry_refusesTheWholeList) {
    for (const std::string &bad : {std::string(), std::string("1.2.3"), std::string("10.0.0.1\nnameserver 6.6.6.6"),
                                   std::string("host.example"), std::string("::1%lo"), long_text(1000000)}) {
        for (const texts &servers : {texts{"10.0.0.1", bad}, texts{bad, "10.0.0.1"}, texts{bad}}) {
            EXPECT_OUTCOME(set(servers), refusal("net_dns_list_set", "are_addresses(pServers)"));
        }
    }
    expect_untouched();
}

TEST_F(net_dns_list_set, KOVANetDNSListSet_entryThatIsNull_refusesTheWholeList) {
    text_list list{two};
    list.make_null(1);
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetDNSListSet(list.get()); }),
                   refusal("net_dns_list_set", "are_addresses(pServers)"));
    expect_untouched();
}

TEST_F(net_dns_list_set, KOVANetDNSListSet_tenThousandServers_areAllWritten) {
    texts servers;
    std::string file;
    for (int i = 0; i < 10000; ++i) {
        servers.push_back("10.1." + std::to_string(i / 250) + "." + std::to_string(i % 250));
        file += "nameserver\t" + servers.back() + "\n";
    }
    EXPECT_EQ(0, set(servers).result);
    EXPECT_EQ(file, read_file(kStaticConf));
    EXPECT_EQ(file, read_file(kResolvConf));
}

TEST_F(net_dns_list_set, KOVANetDNSListSet_eventThatFails_changesNothingElse) {
    rig.fail_from("KLIBPluginSDKInit");
    const outcome got = set(two);
    EXPECT_EQ(0, got.result);
    EXPECT_EQ((texts{"ERR net_dns_config_change_hook:N KLIBPluginSDKInit failed",
                     "ERR net_dns_config_change_hook:N KLIBPluginSDKInit failed"}),
              got.log);
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\tfe80::1\n", read_file(kResolvConf));
}

TEST_F(net_dns_list_set, KOVANetDNSListSet_noTemporaryFile_fails) {
    rig.fail("KLIBCFileTempFileOpen");
    EXPECT_OUTCOME(set(two), {.result = -1, .code = 0x900, .unit = "net_dns_list_set", .events = {before}});
    expect_untouched();
}

TEST_F(net_dns_list_set, KOVANetDNSListSet_fileThatIsNotOnTheDisk_fails) {
    rig.fail("fsync");
    EXPECT_OUTCOME(set(two), {.result = -1, .code = 0xB00, .unit = "net_dns_list_set", .events = {before}});
    expect_untouched();
}

TEST_F(net_dns_list_set, KOVANetDNSListSet_directoryInTheFilesPlace_staysAndFails) {
    std::filesystem::remove(kStaticConf);
    write_file(kStaticConf + "/inside", "kept");
    EXPECT_OUTCOME(set(two), {.result = -1, .code = 0x2800, .unit = "net_dns_list_set", .events = {before}});
    EXPECT_EQ("kept", read_file(kStaticConf + "/inside"));
    expect_files({"resolv.conf.static"});
    EXPECT_EQ("dns_mode=\"auto\"\n", read_file(kKovaInfoConf));
}

TEST_F(net_dns_list_set, KOVANetDNSListSet_modeThatCannotBeStored_failsWithTheListWritten) {
    rig.fail("KLIBCINFOSetKeyValue");
    EXPECT_OUTCOME(set(two), {.result = -1, .code = 0xB00, .unit = "platform", .events = {before}});
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\tfe80::1\n", read_file(kStaticConf));
    expect_files({"resolv.conf.static"});
}

TEST_F(net_dns_list_set, KOVANetDNSListSet_fileSystemThatTakesNothing_keepsTheOldFile) {
    {
        const etc_mount readonly{"ro"};
        EXPECT_OUTCOME(set(two), {.result = -1, .code = 0x900, .unit = "net_dns_list_set", .events = {before}});
    }
    {
        const etc_mount small{"size=16k"};
        write_file(kStaticConf, kOld);
        shell("cat /dev/zero >/etc/filler 2>/dev/null; test -s /etc/filler");
        EXPECT_OUTCOME(set(two), {.result = -1, .code = 0xB00, .unit = "net_dns_list_set", .events = {before}});
        EXPECT_EQ(kOld, read_file(kStaticConf));
        expect_files({"resolv.conf.static"});
    }
    expect_untouched();
}

} // namespace
