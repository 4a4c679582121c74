#include "support/resolver.h"

using namespace kova_test;

namespace {

const texts kLocked{"+0x105", "-0x100"};

class net_dns_get : public resolver_test {
protected:
    outcome get(int size) {
        memset(buffer, 'x', sizeof buffer);
        return rig.observe([=, this] { return KOVANetDNSGet(buffer, size); });
    }

    char buffer[64] = "";
};

TEST_F(net_dns_get, KOVANetDNSGet_firstServer_isCopied) {
    write_file(kResolvConf, "# made\nnameserver\t10.0.0.1\nnameserver\t10.0.0.2\n");
    EXPECT_OUTCOME(get(32), {.locks = kLocked});
    EXPECT_STREQ("10.0.0.1", buffer);
    EXPECT_EQ(std::string(24, '\0'), std::string(buffer + 8, 24)); // all of it is cleared
    EXPECT_EQ('x', buffer[32]);
}

TEST_F(net_dns_get, KOVANetDNSGet_smallBuffer_cutsTheServer) {
    write_file(kResolvConf, "nameserver\t10.0.0.1\n");
    const std::map<int, std::string> cut{{1, ""}, {4, "10."}, {8, "10.0.0."}, {9, "10.0.0.1"}};
    for (const auto &[size, text] : cut) {
        EXPECT_OUTCOME(get(size), {.locks = kLocked});
        EXPECT_EQ(text, buffer);
        EXPECT_EQ('x', buffer[size]);
    }
}

TEST_F(net_dns_get, KOVANetDNSGet_noServer_isEmpty) {
    EXPECT_OUTCOME(get(16), {.log = {"INFO net_dns_list_get:N Failed to open /etc/resolv.conf. (No such file or "
                                     "directory)"},
                             .locks = kLocked});
    EXPECT_STREQ("", buffer);
    write_file(kResolvConf, "domain\texample\n");
    EXPECT_OUTCOME(get(16), {.locks = kLocked});
    EXPECT_STREQ("", buffer);
}

TEST_F(net_dns_get, KOVANetDNSGet_badBuffer_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetDNSGet(nullptr, 16); }),
                   refusal("net_dns_get", "((void *)0) != szBuf"));
    for (const int size : {0, -1, INT_MIN}) {
        EXPECT_OUTCOME(get(size), refusal("net_dns_get", "0 < size"));
        EXPECT_EQ('x', buffer[0]);
    }
}

TEST_F(net_dns_get, KOVANetDNSGet_noMemory_failsWithAnEmptyText) {
    rig.fail("KLIBCSzListAlloc");
    EXPECT_OUTCOME(
        get(16),
        {.result = -1, .code = 0x200, .unit = "net_dns_get", .log = {"ERR net_dns_get:N Failed to alloc memory."}});
    EXPECT_STREQ("", buffer);
    write_file(kResolvConf, "nameserver\t10.0.0.1\n");
    rig.fail("KLIBCSzListPush");
    EXPECT_OUTCOME(get(16), {.result = -1,
                             .code = 0x200,
                             .unit = "platform",
                             .log = {"ERR net_dns_list_get:N Cannot push the list"},
                             .locks = kLocked});
    EXPECT_STREQ("", buffer);
}

TEST_F(net_dns_get, KOVANetDNSGet_lockNotHad_fails) {
    const lock_elsewhere other{0x106};
    outcome got = get(16);
    got.sleeps.clear();
    rig.held["named locks"] = 0; // given back without having been taken
    EXPECT_OUTCOME(got, {.result = -1,
                         .code = 0x400,
                         .unit = "net_dns_list_get",
                         .log = {"ERR net_dns_list_get:N KLIBCFileLock() failed.(400)"},
                         .locks = {"-0x100"}});
    EXPECT_STREQ("", buffer);
}

} // namespace
