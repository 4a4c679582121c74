#include "support/fake_kernel.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_is_dev_type_match : public unit_test {
protected:
    outcome matches(const char *ifname, int kind) {
        return rig.observe([&] { return KOVANetIsDevTypeMatch(ifname, kind); });
    }

    fake_kernel kernel{rig};
};

TEST_F(net_is_dev_type_match, KOVANetIsDevTypeMatch_nameOfTheKind_isOne) {
    kernel.add("eth0", {.flags = IFF_UP | IFF_SLAVE});
    EXPECT_OUTCOME(matches("eth0", 1), {.result = 1});
}

TEST_F(net_is_dev_type_match, KOVANetIsDevTypeMatch_nameOfAnotherKind_isZeroWithNotFound) {
    kernel.add("eth0", {.flags = IFF_UP | IFF_SLAVE});
    const outcome not_found{.result = 0, .code = 0xBC00, .unit = "net_is_dev_type_match"};
    EXPECT_OUTCOME(matches("eth0", 2), {not_found});
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(matches(name.c_str(), 1), {not_found});
    }
    EXPECT_OUTCOME(matches("", 1), {not_found});
    EXPECT_OUTCOME(matches("eth", 1), {not_found});
    EXPECT_OUTCOME(matches("eth00", 1), {not_found});
}

TEST_F(net_is_dev_type_match, KOVANetIsDevTypeMatch_noName_isRefused) {
    EXPECT_OUTCOME(matches(nullptr, 1),
                   {.result = 0,
                    .code = 0xD00,
                    .unit = "net_is_dev_type_match",
                    .log = {"ERR net_is_dev_type_match:N Invaild Argument (((void *)0) != szIfname)=[0]"}});
}

TEST_F(net_is_dev_type_match, KOVANetIsDevTypeMatch_failedEnumeration_isLoggedWithKindAndCode) {
    EXPECT_OUTCOME(matches("eth0", 0x14),
                   {.result = 0,
                    .code = 0xD00,
                    .unit = "net_get_interface_info",
                    .log = {"ERR net_get_interface_info:N Invaild Argument (0 != selector)=[0]",
                            "ERR net_is_dev_type_match:N Failed to KLIBNetGetInterfaceInfo(0x14)=[-1], "
                            "kovaerr=[0x0D00]"}});
}
