#include "support/fake_kernel.h"

#include <cerrno>
#include <cstring>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_get_if_info : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        kernel.add("eth0", {.ip = "10.0.0.1", .mask = "255.0.0.0", .last_mac_byte = 5});
        write_file(ifcfg("eth0"), "BOOTPROTO=static\nIPADDR=10.0.0.2\nNETMASK=255.255.0.0\n");
    }
    outcome get(const char *ifname, IFINFO *pInfo, NETINFO *pCard) {
        return rig.observe([&] { return KOVANetIFGetInfo(ifname, pInfo, pCard); });
    }
    outcome get_kind(const char *ifname, int kind) {
        return rig.observe([&] { return KOVANetIFGetInfoEx(ifname, kind, &info, &card); });
    }

    fake_kernel kernel{rig};
    IFINFO info = {};
    NETINFO card = {};
    const texts locks{"+0x105", "+0x105", "-0x100", "-0x100"};
};

TEST_F(net_get_if_info, KOVANetIFGetInfo_bothRecords_areFilled) {
    EXPECT_OUTCOME(get("eth0", &info, &card), {.result = 0, .locks = locks});
    EXPECT_STREQ("eth0", info.szIfname);
    EXPECT_STREQ("10.0.0.1", info.szIP);
    EXPECT_STREQ("255.0.0.0", info.szMask);
    EXPECT_EQ(2U, info.nLink);
    EXPECT_EQ(unsigned{IFF_UP | IFF_RUNNING}, info.nFlags);
    EXPECT_STREQ("eth0", card.szIfname);
    EXPECT_EQ(5, card.abMac[5]);
    EXPECT_EQ(1U, card.blLinkUp);
    EXPECT_EQ(1U, card.nIPSource);
    EXPECT_STREQ("10.0.0.2", card.szIP); // as configured
    EXPECT_STREQ("255.255.0.0", card.szMask);
}

TEST_F(net_get_if_info, KOVANetIFGetInfo_withoutRecords_asksWhetherTheInterfaceIsThere) {
    EXPECT_OUTCOME(get("eth0", nullptr, nullptr), {.result = 0});
    EXPECT_OUTCOME(get("eth9", nullptr, nullptr),
                   {.result = -1,
                    .code = 0x3600,
                    .unit = "net_get_if_info",
                    .log = {"ERR net_get_if_info:N Cannot get interface info of eth9: No such device"}});
}

TEST_F(net_get_if_info, KOVANetIFGetInfo_oneRecord_readsNoFileForTheOther) {
    EXPECT_OUTCOME(get("eth0", &info, nullptr), {.result = 0});
    EXPECT_STREQ("eth0", info.szIfname);
    EXPECT_OUTCOME(get("eth0", nullptr, &card), {.result = 0, .locks = locks});
    EXPECT_STREQ("eth0", card.szIfname);
}

TEST_F(net_get_if_info, KOVANetIFGetInfo_downInterface_isRead) {
    kernel.add("eth0", {.flags = 0});
    EXPECT_OUTCOME(get("eth0", &info, nullptr), {.result = 0});
    EXPECT_EQ(0U, info.nLink);
    EXPECT_STREQ("", info.szIP);
}

TEST_F(net_get_if_info, KOVANetIFGetInfo_switchName_hasTheLinkBehindIt) {
    rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    kernel.add("eth0", {.flags = IFF_UP});
    kernel.add("ovs_eth0");
    EXPECT_OUTCOME(get("ovs_eth0", &info, nullptr), {.result = 0});
    EXPECT_EQ(0U, info.nLink);
}

TEST_F(net_get_if_info, KOVANetIFGetInfo_interfaceThatVanishes_is3600AndRecordsStay) {
    for (const unsigned long request : {SIOCGIFFLAGS, SIOCGIFHWADDR, SIOCGIFADDR, SIOCGIFNETMASK}) {
        kernel.add("eth0", {.ip = "10.0.0.1", .mask = "255.0.0.0", .failing = {{request, ENODEV}}});
        const outcome got = get("eth0", &info, &card);
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ(0x3600U, got.code);
        EXPECT_STREQ("", info.szIfname);
        EXPECT_STREQ("", card.szIfname);
    }
}

TEST_F(net_get_if_info, KOVANetIFGetInfo_noSocket_is3400) {
    rig.fail("socket");
    EXPECT_OUTCOME(get("eth0", &info, &card), {.result = -1,
                                               .code = 0x3400,
                                               .unit = "net_get_if_info",
                                               .log = {"ERR net_get_if_info:N Cannot open control socket"}});
}

TEST_F(net_get_if_info, KOVANetIFGetInfo_noConfiguredAddress_isAnErrorOfTheCard) {
    write_file(ifcfg("eth0"), "BOOTPROTO=static\n");
    EXPECT_OUTCOME(get("eth0", &info, &card), {.result = -1,
                                               .log = {"ERR net_if_get_ip_config:N Failed to get [IPADDR] from "
                                                       "[/etc/sysconfig/network-scripts/ifcfg-eth0]"},
                                               .locks = locks});
}

TEST_F(net_get_if_info, KOVANetIFGetInfo_badNames_areRefused) {
    EXPECT_OUTCOME(get(nullptr, &info, &card), refusal("net_get_if_info", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(get("", &info, &card), refusal("net_get_if_info", "'\\0' != *szIfname"));
    EXPECT_OUTCOME(get_kind(nullptr, 0), refusal("net_get_if_info", "((void *)0) != szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str(), &info, &card), refusal("net_get_if_info", "is_interface_name(szIfname)"));
    }
}

TEST_F(net_get_if_info, KOVANetIFGetInfoEx_clusterBit_showsTheClusterAddressInBothRecords) {
    write_file("/etc/kova/platform.conf", "ha_running=yes\nha_ip_eth0=172.16.0.9\nha_mask_eth0=255.255.255.0\n");
    EXPECT_OUTCOME(get_kind("eth0", 0x10), {.result = 0, .locks = locks});
    EXPECT_STREQ("172.16.0.9", info.szIP);
    EXPECT_STREQ("255.255.255.0", info.szMask);
    EXPECT_STREQ("172.16.0.9", card.szIP);
    EXPECT_STREQ("255.255.255.0", card.szMask);
    EXPECT_OUTCOME(get_kind("eth0", 2), {.result = 0, .locks = locks});
    EXPECT_STREQ("10.0.0.1", info.szIP);
    EXPECT_STREQ("10.0.0.2", card.szIP);
}

TEST_F(net_get_if_info, KOVANetIFGetInfoEx_clusterAddressNotReady_is200) {
    write_file("/etc/kova/platform.conf", "ha_running=yes\n");
    EXPECT_OUTCOME(get_kind("eth0", 0x12), {.result = -1,
                                            .code = 0x200,
                                            .unit = "net_get_if_info",
                                            .log = {"ERR net_get_if_info:N HA is running but HA IP not ready (2)"}});
    EXPECT_STREQ("", info.szIfname);
    write_file("/etc/kova/platform.conf", "ha_running=no\n");
    EXPECT_OUTCOME(get_kind("eth0", 0x12), {.result = 0, .locks = locks});
}
