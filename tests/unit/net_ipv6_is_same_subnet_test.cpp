#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/ipv6.h>

using namespace kova_test;

class net_ipv6_is_same_subnet : public unit_test {
protected:
    outcome compare(const char *szOne, const char *szOther, unsigned prefix) {
        return rig.observe([=] { return KOVANetIPv6IsSameSubnet(szOne, szOther, prefix); });
    }
};

TEST_F(net_ipv6_is_same_subnet, KOVANetIPv6IsSameSubnet_bad_parameter_is_told) {
    const outcome bad{.result = 0,
                      .code = 0xD00,
                      .unit = "net_ipv6_is_same_subnet",
                      .log = {"ERR net_ipv6_is_same_subnet:N Bad parameter."}};
    EXPECT_OUTCOME(compare(nullptr, "::1", 64), bad);
    EXPECT_OUTCOME(compare("::1", nullptr, 64), bad);
    EXPECT_OUTCOME(compare("2001:db8::1", "2001:db8::1", 129), bad);
    EXPECT_OUTCOME(compare("2001:db8::1", "2001:db8::1", 4294967295U), bad);
    EXPECT_OUTCOME(compare("no address", "2001:db8::1", 129), bad);
}

TEST_F(net_ipv6_is_same_subnet, KOVANetIPv6IsSameSubnet_text_that_is_no_address_is_told) {
    for (const std::string &text :
         texts{"", "10.0.0.1", "2001:db8::1/64", "fe80::1%eth0", "g::", "::1\nx", long_text(4096)}) {
        const outcome told{.result = -1, .log = {"ERR net_ipv6_is_same_subnet:N Invalid network address: " + text}};
        EXPECT_OUTCOME(compare(text.c_str(), "::1", 64), told);
        EXPECT_OUTCOME(compare("::1", text.c_str(), 0), told);
        EXPECT_OUTCOME(compare(text.c_str(), text.c_str(), 64), told);
    }
}

TEST_F(net_ipv6_is_same_subnet, KOVANetIPv6IsSameSubnet_first_bits_decide) {
    struct pair {
        const char *szOne, *szOther;
        unsigned prefix;
        int result;
    };
    const pair pairs[] = {
        {"2001:db8::1", "2001:db8::2", 64, 1},
        {"2001:db8::1", "2001:db8::2", 127, 0},
        {"2001:db8::2", "2001:db8::3", 127, 1},
        {"2001:db8::2", "2001:db8::3", 128, 0},
        {"2001:db8::3", "2001:DB8:0::3", 128, 1},
        {"::", "ffff:ffff:ffff:ffff:ffff:ffff:ffff:ffff", 0, 1},
        {"::", "8000::", 0, 1},
        {"::", "8000::", 1, 0},
        {"::", "4000::", 1, 1},
        {"::", "4000::", 2, 0},
        {"2001:db8:0:1::", "2001:db8:0:2::", 62, 1},
        {"2001:db8:0:1::", "2001:db8:0:2::", 63, 0},
        {"2001:db8:0:1::", "2001:db8:0:2::", 64, 0},
        {"fe80::1", "febf::1", 10, 1},
        {"fe80::1", "fec0::1", 10, 0},
        {"::ffff:10.0.0.1", "::ffff:10.0.0.2", 120, 1},
        {"1::", "2::", 16, 0},
        {"1::", "2::", 8, 1},
    };
    for (const pair &one : pairs) {
        SCOPED_TRACE(one.szOne + std::string(" ") + one.szOther + "/" + std::to_string(one.prefix));
        EXPECT_OUTCOME(compare(one.szOne, one.szOther, one.prefix), {.result = one.result});
        EXPECT_OUTCOME(compare(one.szOther, one.szOne, one.prefix), {.result = one.result});
    }
}

TEST_F(net_ipv6_is_same_subnet, KOVANetIPv6IsSameSubnet_every_bit_counts) {
    for (unsigned bit = 0; bit < 128; ++bit) {
        char other[48] = "";
        for (unsigned group = 0; group < 8; ++group) {
            char text[8];
            snprintf(text, sizeof text, "%s%x", group == 0 ? "" : ":", bit / 16 == group ? 0x8000U >> bit % 16 : 0);
            strcat(other, text);
        }
        EXPECT_EQ(1, KOVANetIPv6IsSameSubnet("::", other, bit)) << other;
        EXPECT_EQ(0, KOVANetIPv6IsSameSubnet("::", other, bit + 1)) << other;
    }
}
