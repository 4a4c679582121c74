#include "support/memory.h"
#include "support/rig.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

namespace {

const std::string kResult = "/run/ddns/externalIP.result";
const std::string kAsk = "/usr/kova/sbin/ddnsd -e";
const char kNoValue[] = "ERR KOVAExternalIPGet(N) Failed to get external IP from /run/ddns/externalIP.result, "
                        "kova_errno=[0]";

} // namespace

class net_external_ip_get : public unit_test {
protected:
    outcome get(int size = 16) {
        return rig.observe([&] { return KOVAExternalIPGet(szIP, size); });
    }

    char szIP[64] = "untouched";
};

TEST_F(net_external_ip_get, KOVAExternalIPGet_bad_buffer_is_refused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVAExternalIPGet(nullptr, 16); }),
                   refusal("net_external_ip_get", "((void *)0) != szIP"));
    for (const int size : {-1, 0, 1, 15}) {
        EXPECT_OUTCOME(get(size), refusal("net_external_ip_get", "16 <= cbIP"));
    }
    EXPECT_STREQ("untouched", szIP);
}

TEST_F(net_external_ip_get, KOVAExternalIPGet_address_is_read_after_asking) {
    write_file(kResult, "externalIP=1.1.1.1\n");
    rig.answer(kAsk, 0, "", [] { write_file(kResult, "status=good\nexternalIP=\"203.100.113.250\"\n"); });
    EXPECT_OUTCOME(get(), {.commands = {kAsk}});
    EXPECT_STREQ("203.100.113.250", szIP); // 15 characters, the longest
    EXPECT_OUTCOME(get(64), {.commands = {kAsk}});
    EXPECT_STREQ("203.100.113.250", szIP);
}

TEST_F(net_external_ip_get, KOVAExternalIPGet_longer_value_is_cut) {
    for (const size_t length : {16U, 17U, 64U, 100000U}) {
        write_file(kResult, "externalIP=" + long_text(length) + "\n");
        szIP[16] = 'x';
        EXPECT_OUTCOME(get(), {.commands = {kAsk}});
        EXPECT_EQ(long_text(15), szIP);
        EXPECT_EQ('x', szIP[16]);
    }
}

TEST_F(net_external_ip_get, KOVAExternalIPGet_daemon_that_fails_is_told) {
    write_file(kResult, "externalIP=1.1.1.1\n");
    for (const int status : {1, 127, -1, 137}) {
        rig.answer(kAsk, status);
        EXPECT_OUTCOME(get(), {.result = -1,
                               .log = {"ERR net_external_ip_get:N Failed to get external IP by "
                                       "/usr/kova/sbin/ddnsd, err=" +
                                       std::to_string(status)},
                               .commands = {kAsk}});
    }
    EXPECT_STREQ("untouched", szIP);
}

TEST_F(net_external_ip_get, KOVAExternalIPGet_without_memory_fails) {
    NEEDS_OWN_ALLOCATOR();
    write_file(kResult, "externalIP=1.1.1.1\n");
    rig.fail("malloc");
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x200,
                           .unit = "net_external_ip_get",
                           .log = {"ERR (net_external_ip_get:N:KOVAExternalIPGet)failed to allocate space for parsing "
                                   "IP, errno=Cannot allocate memory"},
                           .commands = {kAsk}});
    EXPECT_STREQ("untouched", szIP);
}

TEST_F(net_external_ip_get, KOVAExternalIPGet_no_value_is_told) {
    for (const char *content :
         {"", "externalip=1.1.1.1\n", "externalIP=\n", "externalIP=\"\"\n", "#externalIP=1.1.1.1\n"}) {
        write_file(kResult, content);
        EXPECT_OUTCOME(get(), {.result = -1, .log = {kNoValue}, .commands = {kAsk}});
    }
    EXPECT_STREQ("untouched", szIP);
}

TEST_F(net_external_ip_get, KOVAExternalIPGet_no_result_file_is_told_with_the_platforms_code) {
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x900,
                           .unit = "key_value",
                           .log = {"ERR KOVAExternalIPGet(N) Failed to get external IP from "
                                   "/run/ddns/externalIP.result, kova_errno=[900]"},
                           .commands = {kAsk}});
    EXPECT_STREQ("untouched", szIP);
}
