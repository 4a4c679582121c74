#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

constexpr int kIPv4 = 2;
constexpr int kIPv6 = 10;

class is_ip_in_range : public unit_test {
protected:
    outcome ask(const std::string &ip, const std::string &bound1, const std::string &bound2, int family) {
        return rig.observe([&] { return KLIBIsIpInRange(ip.c_str(), bound1.c_str(), bound2.c_str(), family); });
    }

    /** Asks with the bounds in both orders. */
    void expect(long result, const std::string &ip, const std::string &bound1, const std::string &bound2, int family) {
        SCOPED_TRACE(ip + " " + bound1 + " " + bound2);
        EXPECT_OUTCOME(ask(ip, bound1, bound2, family), {.result = result});
        EXPECT_OUTCOME(ask(ip, bound2, bound1, family), {.result = result});
    }
};

TEST_F(is_ip_in_range, KLIBIsIpInRange_ipv4_boundsInEitherOrder) {
    expect(1, "10.0.0.5", "10.0.0.9", "10.0.0.1", kIPv4);
    expect(1, "10.0.0.1", "10.0.0.1", "10.0.0.9", kIPv4);
    expect(1, "10.0.0.9", "10.0.0.1", "10.0.0.9", kIPv4);
    expect(0, "10.0.0.0", "10.0.0.1", "10.0.0.9", kIPv4);
    expect(0, "10.0.0.10", "10.0.0.1", "10.0.0.9", kIPv4);
    expect(1, "10.0.0.1", "10.0.0.1", "10.0.0.1", kIPv4);
    expect(1, "128.0.0.1", "1.255.255.255", "200.0.0.0", kIPv4);
    expect(0, "1.0.0.200", "2.0.0.1", "3.0.0.255", kIPv4);
    expect(1, "255.255.255.255", "0.0.0.0", "255.255.255.255", kIPv4);
}

TEST_F(is_ip_in_range, KLIBIsIpInRange_ipv6_boundsInEitherOrder) {
    expect(1, "fe80::5", "fe80::9", "fe80::1", kIPv6);
    expect(1, "fe80::1", "fe80::1", "fe80::9", kIPv6);
    expect(1, "fe80::9", "fe80::1", "fe80::9", kIPv6);
    expect(0, "fe80::a", "fe80::1", "fe80::9", kIPv6);
    expect(0, "fe80::", "fe80::1", "fe80::9", kIPv6);
    expect(0, "::200", "1::1", "2::ff", kIPv6);
    expect(1, "8000::", "::", "ffff::", kIPv6);
}

TEST_F(is_ip_in_range, KLIBIsIpInRange_noAddressOfTheFamily_failsWithoutCode) {
    texts bad = bad_names();
    for (const char *text : {"", "10.0.0", "10.0.0.256", "010.0.0.1", "10.0.0.1\n", "fe80::1/64"}) {
        bad.emplace_back(text);
    }
    for (const std::string &text : bad) {
        expect(-1, text, "10.0.0.1", "10.0.0.9", kIPv4);
        expect(-1, "10.0.0.1", text, "10.0.0.9", kIPv4);
        expect(-1, text, "::1", "::9", kIPv6);
        expect(-1, "::1", text, "::9", kIPv6);
    }
    expect(-1, "::1", "10.0.0.1", "10.0.0.9", kIPv4);
    expect(-1, "10.0.0.1", "::1", "::9", kIPv6);
}

TEST_F(is_ip_in_range, KLIBIsIpInRange_otherFamily_failsAndIsLogged) {
    for (const int family : {0, 1, -1, 3, 2147483647}) {
        EXPECT_OUTCOME(
            ask("10.0.0.1", "10.0.0.1", "10.0.0.9", family),
            {.result = -1, .log = {"ERR is_ip_in_range:N Unknown address family, " + std::to_string(family) + "."}});
    }
}

TEST_F(is_ip_in_range, KLIBIsIpInRange_null_failsSilently) {
    const char *const ip = "10.0.0.1";
    EXPECT_OUTCOME(rig.observe([&] { return KLIBIsIpInRange(nullptr, ip, ip, kIPv4); }), {.result = -1});
    EXPECT_OUTCOME(rig.observe([&] { return KLIBIsIpInRange(ip, nullptr, ip, kIPv4); }), {.result = -1});
    EXPECT_OUTCOME(rig.observe([&] { return KLIBIsIpInRange(ip, ip, nullptr, kIPv6); }), {.result = -1});
    EXPECT_OUTCOME(rig.observe([&] { return KLIBIsIpInRange(nullptr, nullptr, nullptr, 99); }), {.result = -1});
}

} // namespace
