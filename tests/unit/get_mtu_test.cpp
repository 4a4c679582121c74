#include "support/fake_kernel.h"

#include <cerrno>
#include <kovanetsdk/link.h>

using namespace kova_test;

class get_mtu : public unit_test {
protected:
    outcome get(const char *ifname) {
        return rig.observe([&] { return KOVAGetMTU(ifname); });
    }
    fake_kernel kernel{rig};
};

TEST_F(get_mtu, KOVAGetMTU_interface_hasTheKernelsValue) {
    kernel.add("eth0", {.mtu = 9000});
    EXPECT_OUTCOME(get("eth0"), {.result = 9000});
}

TEST_F(get_mtu, KOVAGetMTU_failedRequest_isZero) {
    kernel.add("eth0", {.failing = {{SIOCGIFMTU, EPERM}}});
    EXPECT_OUTCOME(get("eth0"), {.result = 0,
                                 .code = 0x3600,
                                 .unit = "get_mtu",
                                 .log = {"ERR get_mtu:N Cannot get MTU of eth0: Operation not permitted"}});
    EXPECT_OUTCOME(get("eth9"), {.result = 0,
                                 .code = 0x3400,
                                 .unit = "get_mtu",
                                 .log = {"ERR get_mtu:N Cannot get MTU of eth9: No such device"}});
}

TEST_F(get_mtu, KOVAGetMTU_sixteenCharacters_areAskedSeventeenRefused) {
    kernel.add("abcdefghijklmno", {.mtu = 1280});
    EXPECT_OUTCOME(get("abcdefghijklmno"), {.result = 1280});
    EXPECT_EQ(0, get("abcdefghijklmnop").result); // and not the one with the shorter name
    for (const size_t length : {17U, 63U, 64U, 4096U}) {
        EXPECT_OUTCOME(
            get(long_text(length).c_str()),
            {.result = -1, .code = 0xD00, .unit = "get_mtu", .log = {"ERR get_mtu:N interface name is too long"}});
    }
}

TEST_F(get_mtu, KOVAGetMTU_noSocket_isMinusOne) {
    rig.fail("socket");
    EXPECT_OUTCOME(
        get("eth0"),
        {.result = -1, .code = 0x3400, .unit = "get_mtu", .log = {"ERR get_mtu:N Cannot open control socket"}});
}

TEST_F(get_mtu, KOVAGetMTU_noName_isRefused) {
    EXPECT_OUTCOME(get(nullptr), refusal("get_mtu", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(get(""), refusal("get_mtu", "'\\0' != *szIfname"));
}
