#include "support/rig.h"

#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_internal_lan_num_get : public unit_test {
protected:
    long number(const std::string &kernel_file) {
        rig.replace_file("/proc/sys/kernel/kova_internal_netif_num", kernel_file);
        const outcome got = rig.observe([] { return KOVANetInternalLanNumGet(); });
        EXPECT_EQ(texts{}, got.log);
        return got.result;
    }
};

TEST_F(net_internal_lan_num_get, KOVANetInternalLanNumGet_kernelNumber_winsOverTheDefault) {
    write_file("/etc.defaults/kovainfo.conf", "maxlanport=\"2\"\n");
    EXPECT_EQ(4, number("4\n"));
    EXPECT_EQ(4, number("  4"));
    EXPECT_EQ(2147483647, number("2147483647\n"));
}

TEST_F(net_internal_lan_num_get, KOVANetInternalLanNumGet_unusableNumber_isTheDefault) {
    write_file("/etc.defaults/kovainfo.conf", "maxlanport=\"2\"\n");
    for (const std::string &text : texts{"", "\n", "0\n", "-3\n", "many\n", "99999999999999999999\n", "2147483648\n",
                                         "-4294967292\n", std::string("\0\x01\xff", 3), long_text(100000, 'x')}) {
        EXPECT_EQ(2, number(text)) << text.substr(0, 30);
    }
}

TEST_F(net_internal_lan_num_get, KOVANetInternalLanNumGet_noUsableDefault_isOne) {
    EXPECT_EQ(1, number("0\n"));
    for (const char *text : {"maxlanport=\"\"\n", "maxlanport=many\n", "maxlanport=0\n", "maxlanport=-2\n",
                             "maxlanport=99999999999999999999\n", "other=7\n"}) {
        write_file("/etc.defaults/kovainfo.conf", text);
        EXPECT_EQ(1, number("")) << text;
    }
}

TEST_F(net_internal_lan_num_get, KOVANetInternalLanNumGet_missingFile_is900) {
    rig.hide("/proc/sys/kernel/kova_internal_netif_num");
    EXPECT_OUTCOME(rig.observe([] { return KOVANetInternalLanNumGet(); }),
                   {.result = -1,
                    .code = 0x900,
                    .unit = "net_internal_lan_num_get",
                    .log = {"ERR net_internal_lan_num_get:N open file /proc/sys/kernel/kova_internal_netif_num "
                            "failed"}});
}
