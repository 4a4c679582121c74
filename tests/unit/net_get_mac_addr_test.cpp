#include "support/fake_kernel.h"

#include <cerrno>
#include <climits>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_get_mac_addr : public unit_test {
protected:
    outcome get(int index, int size = 18) {
        return rig.observe([&] { return KLIBNetGetMacAddr(index, mac, size); });
    }
    outcome get_of(const char *ifname, int size = 18) {
        return rig.observe([&] { return KLIBNetGetMacAddrByInterface(ifname, mac, size); });
    }

    fake_kernel kernel{rig};
    char mac[64] = "untouched";
};

TEST_F(net_get_mac_addr, KLIBNetGetMacAddr_index_countsCards) {
    kernel.add("eth0", {.last_mac_byte = 0xa0});
    kernel.add("eth1", {.last_mac_byte = 0x0b});
    EXPECT_EQ(0, get(0).result);
    EXPECT_STREQ("02:00:00:00:00:a0", mac);
    EXPECT_EQ(0, get(1).result);
    EXPECT_STREQ("02:00:00:00:00:0b", mac);
}

TEST_F(net_get_mac_addr, KLIBNetGetMacAddr_clusterAddress_comesFirst) {
    kernel.add("eth0");
    kernel.add("eth1");
    write_file("/etc/kova/platform.conf", "ha_mac_0=aa:bb:cc:dd:ee:ff\nha_mac_1=\n");
    EXPECT_OUTCOME(get(0), {.result = 0});
    EXPECT_STREQ("aa:bb:cc:dd:ee:ff", mac);
    EXPECT_EQ(0, get(1).result);
    EXPECT_STREQ("02:00:00:00:00:01", mac);
}

TEST_F(net_get_mac_addr, KLIBNetGetMacAddr_noSuchCard_isNotFound) {
    kernel.add("eth0");
    EXPECT_OUTCOME(get(1), {.result = -1,
                            .code = 0xBC00,
                            .unit = "net_get_mac_addr",
                            .log = {"ERR net_get_mac_addr:N No interface of index [1]"}});
    EXPECT_STREQ("", mac);
}

TEST_F(net_get_mac_addr, KLIBNetGetMacAddr_failedEnumeration_isAnError) {
    rig.hide("/proc/net/dev");
    EXPECT_OUTCOME(get(0), {.result = -1,
                            .code = 0x900,
                            .unit = "net_stat_init",
                            .log = {"ERR net_get_interface_info:N Failed to list interfaces, kovaerr=[0x0900]",
                                    "ERR net_get_mac_addr:N Get interface info fail."}});
}

TEST_F(net_get_mac_addr, KLIBNetGetMacAddr_badArguments_areRefused) {
    for (const int index : {-1, 32, INT_MAX, INT_MIN}) {
        EXPECT_OUTCOME(get(index), refusal("net_get_mac_addr", "0 <= index && index < 32"));
    }
    for (const int size : {17, 0, INT_MIN}) {
        EXPECT_OUTCOME(get(0, size), refusal("net_get_mac_addr", "18 <= cbMac"));
        EXPECT_OUTCOME(get_of("eth0", size), refusal("net_get_mac_addr", "18 <= cbMac"));
    }
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetGetMacAddr(0, nullptr, 18); }),
                   refusal("net_get_mac_addr", "((void *)0) != szMac"));
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetGetMacAddrByInterface("eth0", nullptr, 18); }),
                   refusal("net_get_mac_addr", "((void *)0) != szMac"));
    EXPECT_OUTCOME(get_of(nullptr), refusal("net_get_mac_addr", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(get_of(""), refusal("net_get_mac_addr", "'\\0' != *szIfname"));
    EXPECT_STREQ("untouched", mac);
}

TEST_F(net_get_mac_addr, KLIBNetGetMacAddrByInterface_name_isEnough) {
    kernel.add("eth0", {.flags = 0, .last_mac_byte = 0xff}); // down, too
    EXPECT_OUTCOME(get_of("eth0"), {.result = 0});
    EXPECT_STREQ("02:00:00:00:00:ff", mac);
}

TEST_F(net_get_mac_addr, KLIBNetGetMacAddrByInterface_unknownInterface_is3400) {
    EXPECT_OUTCOME(get_of("eth9"),
                   {.result = -1,
                    .code = 0x3400,
                    .unit = "net_get_mac_addr",
                    .log = {"ERR net_get_mac_addr:N Cannot get hardware address of eth9: No such device"}});
    EXPECT_STREQ("", mac);
    EXPECT_EQ(0x3400U, get_of(long_text(64).c_str()).code);
    kernel.add("eth0", {.failing = {{SIOCGIFHWADDR, EPERM}}});
    EXPECT_EQ(0x3600U, get_of("eth0").code);
}

TEST_F(net_get_mac_addr, KLIBNetGetMacAddrByInterface_noSocket_is3400) {
    rig.fail("socket");
    EXPECT_OUTCOME(get_of("eth0"), {.result = -1,
                                    .code = 0x3400,
                                    .unit = "net_get_mac_addr",
                                    .log = {"ERR net_get_mac_addr:N Cannot open control socket"}});
}
