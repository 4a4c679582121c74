#include "support/resolver.h"

using namespace kova_test;

namespace {

class net_dns_set : public resolver_test {
protected:
    outcome set(const char *server) {
        return rig.observe([=] { return KOVANetDNSSet(server); });
    }
};

TEST_F(net_dns_set, KOVANetDNSSet_address_becomesTheOnlyServer) {
    for (const std::string server : {"10.0.0.1", "2001:db8::53"}) {
        write_file(kStaticConf, "nameserver\t1.1.1.1\nnameserver\t2.2.2.2\n");
        const std::string arguments = "NITEMS=1 DNS_1=" + server;
        EXPECT_OUTCOME(set(server.c_str()),
                       {.code = 0xBC00, // of the service "ddns", which is not there
                        .unit = "service",
                        .events = {"net/dns_config_change 4 INTERFACE= " + arguments, "net/dns_change 4 " + arguments,
                                   "net/dns_change 5 " + arguments, "net/dns_config_change 5 INTERFACE= " + arguments},
                        .locks = {"+0x106", "-0x100"}});
        EXPECT_EQ("nameserver\t" + server + "\n", read_file(kStaticConf));
        EXPECT_EQ("nameserver\t" + server + "\n", read_file(kResolvConf));
    }
}

TEST_F(net_dns_set, KOVANetDNSSet_badAddress_touchesNothing) {
    write_file(kResolvConf, "nameserver\t1.1.1.1\n");
    EXPECT_OUTCOME(set(nullptr), refusal("net_dns_set", "((void *)0) != szServer"));
    EXPECT_OUTCOME(set(""), refusal("net_dns_set", "'\\0' != *szServer"));
    for (const std::string &server : {std::string("1.2.3"), std::string("1.2.3.256"), std::string("10.0.0.1 "),
                                      std::string("10.0.0.1\n"), std::string("fe80::1%eth0"), long_text(100000)}) {
        EXPECT_OUTCOME(set(server.c_str()), refusal("net_dns_set", "0 != KOVANetGetAddrType(szServer)"));
    }
    EXPECT_EQ("nameserver\t1.1.1.1\n", read_file(kResolvConf));
    EXPECT_EQ("<absent>", read_file(kKovaInfoConf));
    expect_files({"resolv.conf"});
}

TEST_F(net_dns_set, KOVANetDNSSet_noMemoryForTheList_fails) {
    for (const char *operation : {"KLIBCSzListAlloc", "KLIBCSzListPush"}) {
        rig.fail(operation);
        EXPECT_OUTCOME(
            set("10.0.0.1"),
            {.result = -1, .code = 0x200, .unit = "net_dns_set", .log = {"ERR net_dns_set:N Failed to alloc memory."}});
    }
    expect_files({});
}

TEST_F(net_dns_set, KOVANetDNSSet_listThatCannotBeSet_fails) {
    std::filesystem::create_directory(kStaticConf);
    EXPECT_OUTCOME(set("10.0.0.1"), {.result = -1,
                                     .code = 0x2800,
                                     .unit = "net_dns_list_set",
                                     .events = {"net/dns_config_change 4 INTERFACE= NITEMS=1 DNS_1=10.0.0.1"}});
}

} // namespace
