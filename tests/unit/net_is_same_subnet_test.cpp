#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class net_is_same_subnet : public unit_test {
protected:
    void expect(long result, const std::string &ip1, const std::string &ip2, const std::string &mask) {
        SCOPED_TRACE(ip1 + " " + ip2 + " " + mask);
        const auto ask = [&](const std::string &first, const std::string &second) {
            return rig.observe([&] { return KOVANetIsSameSubnet(first.c_str(), second.c_str(), mask.c_str()); });
        };
        EXPECT_OUTCOME(ask(ip1, ip2), {.result = result});
        EXPECT_OUTCOME(ask(ip2, ip1), {.result = result});
    }
};

TEST_F(net_is_same_subnet, KOVANetIsSameSubnet_ipv4_comparesUnderTheMask) {
    expect(1, "192.168.1.1", "192.168.1.254", "255.255.255.0");
    expect(0, "192.168.1.1", "192.168.2.1", "255.255.255.0");
    expect(1, "192.168.1.1", "192.168.2.1", "255.255.0.0");
    expect(1, "1.2.3.4", "200.1.1.1", "0.0.0.0");
    expect(1, "1.2.3.4", "1.2.3.4", "255.255.255.255");
    expect(0, "1.2.3.4", "1.2.3.5", "255.255.255.255");
    expect(1, "127.0.0.1", "127.9.9.9", "255.0.0.0");
}

TEST_F(net_is_same_subnet, KOVANetIsSameSubnet_ipv6_comparesUnderTheMask) {
    expect(1, "fe80::1", "fe80::ffff:1", "ffff:ffff:ffff:ffff::");
    expect(0, "fe80::1", "fe80:0:0:1::1", "ffff:ffff:ffff:ffff::");
    expect(0, "fe80::1", "fe80::2", "ffff:ffff:ffff:ffff:ffff:ffff:ffff:ffff");
    expect(1, "::1", "ffff::", "::");
    expect(1, "2001:db8::1", "2001:db8::2", "::fffc");
}

TEST_F(net_is_same_subnet, KOVANetIsSameSubnet_mixedFamilies_areNotTheSame) {
    expect(0, "10.0.0.1", "::1", "255.0.0.0");
    expect(0, "10.0.0.1", "10.0.0.1", "::");
    expect(0, "::1", "::1", "0.0.0.0");
    expect(0, "10.0.0.1", "::ffff:10.0.0.1", "0.0.0.0");
}

TEST_F(net_is_same_subnet, KOVANetIsSameSubnet_noAddress_isNotTheSame) {
    texts bad = bad_names();
    for (const char *text : {"", "10.0.0", "10.0.0.256", "010.0.0.1", "10.0.0.1 ", "fe80::1/64", "fe80::1%lo"}) {
        bad.emplace_back(text);
    }
    for (const std::string &text : bad) {
        expect(0, text, "10.0.0.1", "0.0.0.0");
        expect(0, text, "::1", "::");
        expect(0, "10.0.0.1", "10.0.0.1", text);
    }
}

TEST_F(net_is_same_subnet, KOVANetIsSameSubnet_null_isRefused) {
    const char *const ip = "10.0.0.1";
    const auto expect_refused = [&](const char *ip1, const char *ip2, const char *mask, const std::string &name) {
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetIsSameSubnet(ip1, ip2, mask); }),
                       refusal("net_is_same_subnet", "((void *)0) != " + name, 0));
    };
    expect_refused(nullptr, ip, ip, "szIP1");
    expect_refused(ip, nullptr, ip, "szIP2");
    expect_refused(ip, ip, nullptr, "szMask");
}

} // namespace
