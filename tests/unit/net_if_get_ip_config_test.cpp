#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/iface.h>

using namespace kova_test;

namespace {

const char *const kLease = "/etc/dhclient/ipv4/dhcpcd-eth0.info";

} // namespace

class net_if_get_ip_config : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        memset(&card, 'u', sizeof card);
    }
    outcome get(const char *ifname) {
        return rig.observe([&] { return KOVANetIFGetIPConfig(ifname, &card); });
    }
    static outcome refused(const std::string &condition) { return refusal("net_if_get_ip_config", condition); }

    NETINFO card;
    const texts locks{"+0x105", "+0x105", "-0x100", "-0x100"};
};

TEST_F(net_if_get_ip_config, KOVANetIFGetIPConfig_static_comesFromTheInterfaceFile) {
    write_file(ifcfg("eth0"), "BOOTPROTO=static\nIPADDR=\"10.0.0.1\"\nNETMASK=\"255.0.0.0\"\n");
    EXPECT_OUTCOME(get("eth0"), {.result = 0, .locks = locks});
    EXPECT_EQ(1U, card.nIPSource);
    EXPECT_STREQ("10.0.0.1", card.szIP);
    EXPECT_STREQ("255.0.0.0", card.szMask);
    EXPECT_EQ('u', card.szIfname[0]);
}

TEST_F(net_if_get_ip_config, KOVANetIFGetIPConfig_dhcp_comesFromTheLease) {
    write_file(ifcfg("eth0"), "BOOTPROTO=dhcp\nIPADDR=9.9.9.9\n");
    write_file(kLease, "IPADDR=10.0.0.7\nNETMASK=255.255.0.0\n");
    EXPECT_OUTCOME(get("eth0"), {.result = 0, .locks = locks});
    EXPECT_EQ(0U, card.nIPSource);
    EXPECT_STREQ("10.0.0.7", card.szIP);
    EXPECT_STREQ("255.255.0.0", card.szMask);
}

TEST_F(net_if_get_ip_config, KOVANetIFGetIPConfig_dhcpWithoutLease_isSuccessWithoutAddress) {
    write_file(ifcfg("eth0"), "BOOTPROTO=dhcp\n");
    EXPECT_OUTCOME(get("eth0"),
                   {.result = 0,
                    .log = {"INFO net_if_get_ip_config:N /etc/dhclient/ipv4/dhcpcd-eth0.info is not exist"},
                    .locks = locks});
    EXPECT_EQ(0U, card.nIPSource);
    EXPECT_STREQ("", card.szIP);
    EXPECT_STREQ("", card.szMask);
}

TEST_F(net_if_get_ip_config, KOVANetIFGetIPConfig_leaseWithoutMask_isAnErrorWithoutCode) {
    write_file(ifcfg("eth0"), "BOOTPROTO=dhcp\n");
    write_file(kLease, "IPADDR=10.0.0.7\n");
    EXPECT_OUTCOME(get("eth0"), {.result = -1,
                                 .log = {"ERR net_if_get_ip_config:N Failed to get [NETMASK] from "
                                         "[/etc/dhclient/ipv4/dhcpcd-eth0.info]"},
                                 .locks = locks});
    EXPECT_STREQ("10.0.0.7", card.szIP);
    EXPECT_STREQ("", card.szMask);
}

TEST_F(net_if_get_ip_config, KOVANetIFGetIPConfig_noAddress_readsNoMask) {
    write_file(ifcfg("eth0"), "BOOTPROTO=static\nNETMASK=255.0.0.0\n");
    EXPECT_OUTCOME(get("eth0"), {.result = -1,
                                 .log = {"ERR net_if_get_ip_config:N Failed to get [IPADDR] from "
                                         "[/etc/sysconfig/network-scripts/ifcfg-eth0]"},
                                 .locks = locks});
    EXPECT_STREQ("", card.szIP);
    EXPECT_STREQ("", card.szMask);
}

TEST_F(net_if_get_ip_config, KOVANetIFGetIPConfig_overlongValues_areCut) {
    write_file(ifcfg("eth0"), "BOOTPROTO=none\nIPADDR=" + long_text(64, '1') + "\nNETMASK=" + long_text(4096, '2'));
    EXPECT_OUTCOME(get("eth0"), {.result = 0, .locks = locks});
    EXPECT_EQ(long_text(19, '1'), card.szIP);
    EXPECT_EQ(long_text(19, '2'), card.szMask);
}

TEST_F(net_if_get_ip_config, KOVANetIFGetIPConfig_noFile_isRepairedAndAnError) {
    const outcome got = get("eth0");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(locks, got.locks);
    EXPECT_EQ(1U, card.nIPSource);
    EXPECT_EQ("BOOTPROTO=static\n", read_file(ifcfg("eth0")));
}

TEST_F(net_if_get_ip_config, KOVANetIFGetIPConfig_lockElsewhere_is400) {
    const lock_elsewhere holder{0x106};
    const outcome got = get("eth0");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x400U, got.code);
    EXPECT_EQ(texts{"ERR net_if_get_ip_config:N KLIBCFileLock() failed.(400)"}, got.log);
    EXPECT_EQ(texts{}, got.locks);
    EXPECT_EQ('u', card.szIP[0]);
}

TEST_F(net_if_get_ip_config, KOVANetIFGetIPConfig_badArguments_areRefused) {
    EXPECT_OUTCOME(get(nullptr), refused("((void *)0) != szIfname"));
    EXPECT_OUTCOME(get(""), refused("'\\0' != *szIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetIFGetIPConfig("eth0", nullptr); }), refused("NULL != pNetInfo"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str()), refused("is_interface_name(szIfname)"));
    }
    EXPECT_EQ('u', card.szIP[0]);
}
