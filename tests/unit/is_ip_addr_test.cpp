#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class is_ip_addr : public unit_test {
protected:
    outcome ask(const std::string &text) {
        return rig.observe([&] { return BlKLIBIsIpAddr(text.c_str()); });
    }
};

TEST_F(is_ip_addr, BlKLIBIsIpAddr_hostAddress_isAccepted) {
    for (const char *text : {"10.0.0.1", "223.255.255.255", "1.0.0.0", "126.1.1.1", "128.0.0.0", "192.168.1.255",
                             "012.1.1.1", "0xa.0.0.1", "9.8.7.6"}) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = 1});
    }
}

TEST_F(is_ip_addr, BlKLIBIsIpAddr_addressOfNoHost_isRefused) {
    for (const char *text : {"127.0.0.1", "0.1.2.3", "0.0.0.0", "224.0.0.1", "239.1.1.1", "240.0.0.1",
                             "255.255.255.255", "10.256.0.1", "10.0.256.1", "10.0.0.256", "256.1.1.1", "10.0.0.-1",
                             "-10.0.0.1", ".1.2.3", "4294967306.0.0.1", "99999999999999999999.0.0.1"}) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = 0, .code = 0x1000, .unit = "is_ip_addr"});
    }
}

TEST_F(is_ip_addr, BlKLIBIsIpAddr_noAddress_keepsCodeOfTheParser) {
    texts bad = bad_names();
    for (const char *text : {"", "abc", "1.2.3", "1.2.3.4.5", "1..2.3", "1.2.3.4 ", "1.2.3.4\n", "::1"}) {
        bad.emplace_back(text);
    }
    for (const size_t length : {15, 16, 17, 63, 64}) {
        bad.push_back(long_text(length, '1'));
    }
    for (const std::string &text : bad) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = 0, .code = 0x1000, .unit = "net_sep_ip"});
    }
}

TEST_F(is_ip_addr, BlKLIBIsIpAddr_endsAfterThirdDot_isRefusedWithoutCode) {
    EXPECT_OUTCOME(ask("10.0.0."), {.result = 0});
}

TEST_F(is_ip_addr, BlKLIBIsIpAddr_success_keepsEarlierCode) {
    const outcome got = rig.observe([] {
        BlKLIBIsIpAddr("");
        return BlKLIBIsIpAddr("10.0.0.1");
    });
    EXPECT_OUTCOME(got, {.result = 1, .code = 0x1000, .unit = "net_sep_ip"});
}

TEST_F(is_ip_addr, BlKLIBIsIpAddr_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return BlKLIBIsIpAddr(nullptr); }),
                   refusal("is_ip_addr", "((void *)0) != szIP", 0));
}

} // namespace
