#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class net_is_private_ip : public unit_test {
protected:
    outcome ask(const std::string &text) {
        return rig.observe([&] { return KOVANetIsPrivateIP(text.c_str()); });
    }
};

TEST_F(net_is_private_ip, KOVANetIsPrivateIP_privateAddress_gives1) {
    for (const char *text :
         {"10.0.0.0", "10.255.255.255", "127.0.0.1", "127.255.0.1", "172.16.0.0", "172.31.255.255", "192.168.0.1",
          "169.254.1.1", "012.1.1.1", "10.999.999.999", "192.168.300.1", "172.20.-1.1"}) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = 1});
    }
}

TEST_F(net_is_private_ip, KOVANetIsPrivateIP_otherAddress_gives0) {
    for (const char *text :
         {"9.0.0.1", "11.0.0.1", "126.0.0.1", "128.0.0.1", "172.15.0.1", "172.32.0.1", "192.167.0.1", "192.169.0.1",
          "169.253.0.1", "169.255.0.1", "8.8.8.8", "0.0.0.0", "-10.0.0.1", "4294967306.0.0.1", "192.4294967464.0.1"}) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = 0});
    }
}

TEST_F(net_is_private_ip, KOVANetIsPrivateIP_noAddress_keepsCodeOfTheParser) {
    texts bad = bad_names();
    for (const char *text : {"", "10.0.0", "10.0.0.0.0", "10", "10.0.0.0 "}) {
        bad.emplace_back(text);
    }
    for (const std::string &text : bad) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = 0, .code = 0x1000, .unit = "net_sep_ip"});
    }
    EXPECT_OUTCOME(ask("10.0.0."), {.result = 0});
}

TEST_F(net_is_private_ip, KOVANetIsPrivateIP_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetIsPrivateIP(nullptr); }),
                   refusal("net_is_private_ip", "((void *)0) != szIP", 0));
}

} // namespace
