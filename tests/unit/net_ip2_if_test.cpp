#include "support/fake_kernel.h"

#include <climits>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_ip2_if : public unit_test {
protected:
    outcome find(const char *ip, int size = 16) {
        return rig.observe([&] { return KOVANetIP2If(ip, name, size); });
    }

    fake_kernel kernel{rig};
    char name[16] = "untouched";
};

TEST_F(net_ip2_if, KOVANetIP2If_address_givesItsInterface) {
    kernel.add("eth0", {.ip = "10.0.0.1"});
    kernel.add("ppp0", {.flags = IFF_UP | IFF_POINTOPOINT, .ip = "10.0.0.2"});
    EXPECT_OUTCOME(find("10.0.0.2"), {.result = 1});
    EXPECT_STREQ("ppp0", name);
}

TEST_F(net_ip2_if, KOVANetIP2If_unknownAddress_isZeroAndEmpty) {
    kernel.add("eth0");
    kernel.add("down0", {.flags = 0, .ip = "10.0.0.9"});
    EXPECT_OUTCOME(find("10.0.0.9"), {.result = 0});
    EXPECT_STREQ("", name);
}

TEST_F(net_ip2_if, KOVANetIP2If_noAddress_is1000) {
    kernel.add("eth0");
    for (const std::string &text : texts{"eth0", "10.0.0", "10.0.0.1\n", "300.1.1.1", long_text(4096, '1')}) {
        const outcome got = find(text.c_str());
        EXPECT_EQ(-1, got.result) << text;
        EXPECT_EQ(0x1000U, got.code);
        EXPECT_EQ("net_ip2_if", got.unit);
        EXPECT_STREQ("", name);
    }
}

TEST_F(net_ip2_if, KOVANetIP2If_nameThatDoesNotFit_isRefusedWhole) {
    kernel.add("eth0", {.ip = "10.0.0.1"});
    EXPECT_OUTCOME(find("10.0.0.1", 5), {.result = 1});
    EXPECT_OUTCOME(find("10.0.0.1", 4), refusal("net_ip2_if", "strlen(szFound) < cbIfname"));
    EXPECT_STREQ("", name);
}

TEST_F(net_ip2_if, KOVANetIP2If_badArguments_areRefused) {
    EXPECT_OUTCOME(find(nullptr), refusal("net_ip2_if", "((void *)0) != szIP"));
    EXPECT_OUTCOME(find(""), refusal("net_ip2_if", "'\\0' != *szIP"));
    EXPECT_OUTCOME(find("10.0.0.1", 0), refusal("net_ip2_if", "0 < cbIfname"));
    EXPECT_OUTCOME(find("10.0.0.1", INT_MIN), refusal("net_ip2_if", "0 < cbIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetIP2If("10.0.0.1", nullptr, 16); }),
                   refusal("net_ip2_if", "((void *)0) != szIfname"));
    EXPECT_STREQ("untouched", name);
}

TEST_F(net_ip2_if, KOVANetIP2If_failedEnumeration_isAnError) {
    rig.hide("/proc/net/dev");
    EXPECT_OUTCOME(find("10.0.0.1"), {.result = -1,
                                      .code = 0x900,
                                      .unit = "net_stat_init",
                                      .log = {"ERR net_interface_enum:N Failed to list interfaces, kovaerr=[0x0900]",
                                              "ERR net_ip2_if:N Get interface info fail."}});
}
