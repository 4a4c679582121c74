#include "support/resolver.h"

#include <sys/stat.h>

using namespace kova_test;

namespace {

const std::string kOld = "nameserver\t1.1.1.1\n";
const std::string kBoth = "NITEMS=2 DNS_1=10.0.0.1 DNS_2=fe80::1";

class net_dns_file_set : public resolver_test {
protected:
    void SetUp() override {
        resolver_test::SetUp();
        write_file(kResolvConf, kOld);
    }
    outcome set(const texts &servers, const texts &extra = {}) {
        const text_list list{servers};
        const text_list more{extra};
        return rig.observe([&] { return KOVANetDNSFileSet(list.get(), more.get()); });
    }
    void expect_untouched() {
        EXPECT_EQ(kOld, read_file(kResolvConf));
        expect_files({"resolv.conf"});
    }
    static outcome failure(unsigned code, const texts &events = {}) {
        return {.result = -1, .code = code, .unit = "net_dns_file_set", .events = events};
    }

    const texts two{"10.0.0.1", "fe80::1"};
};

TEST_F(net_dns_file_set, KOVANetDNSFileSet_servers_areWrittenAndAnnounced) {
    shell("chmod 600 " + kResolvConf);
    EXPECT_OUTCOME(set(two), {.events = change_of(kBoth)});
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\tfe80::1\n", read_file(kResolvConf));
    EXPECT_EQ(0644, mode_of(kResolvConf));
    expect_files({"resolv.conf"});
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_mode_doesNotDependOnTheCallersMask) {
    const mode_t before = umask(0777);
    EXPECT_OUTCOME(set(two), {.events = change_of(kBoth)});
    umask(before);
    EXPECT_EQ(0644, mode_of(kResolvConf));
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_extraLines_comeBehindTheServers) {
    EXPECT_OUTCOME(set({"10.0.0.1"}, {"domain\texample", "", "options rotate"}),
                   {.events = change_of("NITEMS=1 DNS_1=10.0.0.1")});
    EXPECT_EQ("nameserver\t10.0.0.1\ndomain\texample\n\noptions rotate\n", read_file(kResolvConf));
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_noExtraLines_maybeNull) {
    const text_list list{two};
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetDNSFileSet(list.get(), nullptr); }), {.events = change_of(kBoth)});
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_serversThatAreNone_areWrittenAsTheyAre) {
    EXPECT_OUTCOME(set({"", "not an address"}), {.events = change_of("NITEMS=2 DNS_1= DNS_2=not an address")});
    EXPECT_EQ("nameserver\t\nnameserver\tnot an address\n", read_file(kResolvConf));
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_modeThatCannotBeSet_isOnlyLogged) {
    rig.fail("chmod");
    EXPECT_OUTCOME(set(two), {.log = {"INFO net_dns_file_set:N chmod /etc/resolv.conf failed: Operation not permitted"},
                              .events = change_of(kBoth)});
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\tfe80::1\n", read_file(kResolvConf));
    EXPECT_EQ(0644, mode_of(kResolvConf));
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_noServers_failsWithoutACode) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetDNSFileSet(nullptr, nullptr); }), {.result = -1});
    EXPECT_OUTCOME(set({}, {"domain\texample"}), {.result = -1});
    expect_untouched();
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_entryThatIsNoLine_isRefused) {
    EXPECT_OUTCOME(set({"10.0.0.1", "10.0.0.2\nsearch evil.example"}),
                   refusal("net_dns_file_set", "are_lines(pServers)"));
    EXPECT_OUTCOME(set(two, {"domain\texample\nnameserver\t6.6.6.6"}),
                   refusal("net_dns_file_set", "are_lines(pExtraLines)"));
    text_list list{two};
    list.make_null(0);
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetDNSFileSet(list.get(), nullptr); }),
                   refusal("net_dns_file_set", "are_lines(pServers)"));
    const text_list servers{two};
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetDNSFileSet(servers.get(), list.get()); }),
                   refusal("net_dns_file_set", "are_lines(pExtraLines)"));
    expect_untouched();
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_eventThatFails_changesNothingElse) {
    rig.fail_from("KLIBPluginAction");
    const outcome got = set(two);
    EXPECT_EQ(0, got.result);
    const std::string told = "ERR net_dns_change_hook:N KLIBPluginAction failed";
    EXPECT_EQ((texts{told, told}), got.log); // before the change and after it
    EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\tfe80::1\n", read_file(kResolvConf));
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_overlongServer_isWrittenWhole) {
    EXPECT_EQ(0, set({long_text(100000)}).result);
    EXPECT_EQ("nameserver\t" + long_text(100000) + "\n", read_file(kResolvConf));
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_noTemporaryFile_fails) {
    rig.fail("KLIBCFileTempFileOpen");
    EXPECT_OUTCOME(set(two), failure(0x900));
    expect_untouched();
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_fileThatIsNotOnTheDisk_fails) {
    rig.fail("fsync");
    EXPECT_OUTCOME(set(two), failure(0xB00));
    expect_untouched();
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_directoryThatCannotBeSynced_hasTheNewFileAllTheSame) {
    for (const char *operation : {"fsync", "open"}) {
        write_file(kResolvConf, kOld);
        rig.fail(operation, operation == std::string("fsync") ? 2 : 1);
        EXPECT_OUTCOME(set(two), {.events = change_of(kBoth)});
        EXPECT_EQ("nameserver\t10.0.0.1\nnameserver\tfe80::1\n", read_file(kResolvConf));
        expect_files({"resolv.conf"});
    }
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_directoryInTheFilesPlace_raisesOneEventAndFails) {
    std::filesystem::remove(kResolvConf);
    write_file(kResolvConf + "/inside", "kept");
    EXPECT_OUTCOME(set(two), failure(0x2800, {"net/dns_change 4 " + kBoth}));
    EXPECT_EQ("kept", read_file(kResolvConf + "/inside"));
    expect_files({"resolv.conf"});
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_link_isReplacedAndNotFollowed) {
    write_file("/tmp/elsewhere", "untouched");
    std::filesystem::remove(kResolvConf);
    std::filesystem::create_symlink("/tmp/elsewhere", kResolvConf);
    EXPECT_OUTCOME(set(two), {.events = change_of(kBoth)});
    EXPECT_EQ("untouched", read_file("/tmp/elsewhere"));
    EXPECT_FALSE(std::filesystem::is_symlink(kResolvConf));
}

TEST_F(net_dns_file_set, KOVANetDNSFileSet_fileSystemThatTakesNothing_keepsTheOldFile) {
    {
        const etc_mount readonly{"ro"};
        EXPECT_OUTCOME(set(two), failure(0x900));
    }
    const etc_mount small{"size=16k"};
    write_file(kResolvConf, kOld);
    shell("cat /dev/zero >/etc/filler 2>/dev/null; test -s /etc/filler");
    EXPECT_OUTCOME(set(two), failure(0xB00));
    expect_untouched();
}

} // namespace
