#include "support/fake_kernel.h"
#include "support/memory.h"

#include <cerrno>
#include <climits>
#include <cstring>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_get_card1 : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        memset(&card, 'u', sizeof card);
        untouched = card;
    }
    outcome get(int index, const char *ip = nullptr) {
        return rig.observe([&] { return KOVANetGetCard1(index, ip, &card); });
    }
    outcome get_kind(int index, const char *ip, int kind) {
        return rig.observe([&] { return KOVANetGetCard1Ex(index, ip, kind, &card); });
    }
    void add_static(const std::string &name, const std::string &address, unsigned char mac = 1) {
        kernel.add(name, {.ip = address, .mask = "255.0.0.0", .last_mac_byte = mac});
        write_file(ifcfg(name), "BOOTPROTO=static\nIPADDR=" + address + "\nNETMASK=255.255.255.0\n");
    }
    bool is_untouched() const { return memcmp(&card, &untouched, sizeof card) == 0; }
    static outcome refused(const std::string &condition) { return refusal("net_get_card1", condition); }

    fake_kernel kernel{rig};
    NETINFO card;
    NETINFO untouched;
    /** Of the card, of its address, of its boot protocol. */
    const texts nested{"+0x105", "+0x105", "+0x105", "-0x100", "-0x100", "-0x100"};
    const texts outer{"+0x105", "-0x100"};
};

TEST_F(net_get_card1, KOVANetGetCard1_index_givesTheWholeRecord) {
    add_static("eth0", "10.0.0.1");
    add_static("eth1", "10.0.0.2", 7);
    EXPECT_OUTCOME(get(1), {.result = 1, .locks = nested});
    EXPECT_EQ(1U, card.nIPSource);
    EXPECT_EQ(1U, card.blLinkUp);
    EXPECT_STREQ("eth1", card.szIfname);
    EXPECT_EQ(0, memcmp("\x02\0\0\0\0\x07", card.abMac, 6));
    EXPECT_STREQ("10.0.0.2", card.szIP);
    EXPECT_STREQ("255.255.255.0", card.szMask);
}

TEST_F(net_get_card1, KOVANetGetCard1_noCarrier_isNoLink) {
    kernel.add("eth0", {.flags = IFF_UP});
    write_file(ifcfg("eth0"), "BOOTPROTO=static\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n");
    EXPECT_OUTCOME(get(0), {.result = 1, .locks = nested});
    EXPECT_EQ(0U, card.blLinkUp);
}

TEST_F(net_get_card1, KOVANetGetCard1_address_findsItsCard) {
    add_static("eth0", "10.0.0.1");
    add_static("eth1", "10.0.0.2");
    for (const int index : {0, 1, -1, INT_MIN}) {
        EXPECT_OUTCOME(get(index, "10.0.0.2"), {.result = 1, .locks = nested});
        EXPECT_STREQ("eth1", card.szIfname);
    }
}

TEST_F(net_get_card1, KOVANetGetCard1_sameAddressTwice_isTheFirstCard) {
    add_static("eth0", "10.0.0.1");
    add_static("eth1", "10.0.0.1");
    EXPECT_OUTCOME(get(0, "10.0.0.1"), {.result = 1, .locks = nested});
    EXPECT_STREQ("eth0", card.szIfname);
}

TEST_F(net_get_card1, KOVANetGetCard1_unknownAddress_isNotFoundAndUntouched) {
    add_static("eth0", "10.0.0.1");
    for (const char *ip : {"10.0.0.9", "10.0.0.", "10.0.0.1 ", "010.0.0.1", "eth0", "\n"}) {
        EXPECT_OUTCOME(get(0, ip), {.result = 0, .locks = outer});
        EXPECT_TRUE(is_untouched());
    }
    EXPECT_OUTCOME(get(0, long_text(4096).c_str()), {.result = 0, .locks = outer});
}

TEST_F(net_get_card1, KOVANetGetCard1_indexPastTheEnd_isNotFoundAndUntouched) {
    for (const char *name : {"eth0", "eth1", "eth2"}) {
        kernel.add(name);
    }
    EXPECT_OUTCOME(get(5), {.result = 0, .locks = outer});
    EXPECT_TRUE(is_untouched());
    EXPECT_OUTCOME(get(3), {.result = 0, .locks = outer});
    EXPECT_OUTCOME(get(31), {.result = 0, .locks = outer});
}

TEST_F(net_get_card1, KOVANetGetCard1_indexPastTheEndWithAddress_isNotSearched) {
    add_static("eth0", "10.0.0.1");
    EXPECT_OUTCOME(get(40, "10.0.0.1"), {.result = 0, .locks = outer});
    EXPECT_OUTCOME(get(1, "10.0.0.1"), {.result = 0, .locks = outer});
    EXPECT_TRUE(is_untouched());
    EXPECT_OUTCOME(get(0, "10.0.0.1"), {.result = 1, .locks = nested});
}

TEST_F(net_get_card1, KOVANetGetCard1_badArguments_areRefused) {
    kernel.add("eth0");
    const std::string condition = "((void *)0) != szIP || (0 <= index && index < 32)";
    EXPECT_OUTCOME(get(32), refused(condition));
    EXPECT_OUTCOME(get(-1), refused(condition));
    EXPECT_OUTCOME(get(INT_MAX), refused(condition));
    EXPECT_OUTCOME(get(0, ""), refused("'\\0' != *szIP")); // would be the first card without an address
    EXPECT_OUTCOME(rig.observe([] { return KOVANetGetCard1(0, nullptr, nullptr); }), refused("NULL != pNetInfo"));
    EXPECT_OUTCOME(get_kind(32, nullptr, 2), refused(condition));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetGetCard1Ex(0, nullptr, 2, nullptr); }), refused("NULL != pNetInfo"));
    EXPECT_TRUE(is_untouched());
}

TEST_F(net_get_card1, KOVANetGetCard1_dhcpWithoutLease_isFoundWithoutAddress) {
    kernel.add("eth0", {.ip = "10.0.0.1"});
    write_file(ifcfg("eth0"), "BOOTPROTO=dhcp\nIPADDR=9.9.9.9\nNETMASK=9.9.9.0\n");
    EXPECT_OUTCOME(get(0), {.result = 1,
                            .log = {"INFO net_if_get_ip_config:N /etc/dhclient/ipv4/dhcpcd-eth0.info is not exist"},
                            .locks = nested});
    EXPECT_EQ(0U, card.nIPSource);
    EXPECT_STREQ("", card.szIP);
    EXPECT_STREQ("", card.szMask);
}

TEST_F(net_get_card1, KOVANetGetCard1_noConfiguredAddress_isAnErrorAndTheFileIsRepaired) {
    kernel.add("eth0");
    const outcome got = get(0);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(nested, got.locks);
    EXPECT_EQ("BOOTPROTO=static\n", read_file(ifcfg("eth0")));
}

TEST_F(net_get_card1, KOVANetGetCard1_lockElsewhere_is400) {
    add_static("eth0", "10.0.0.1");
    const lock_elsewhere holder{0x106};
    const outcome got = get(0);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x400U, got.code);
    EXPECT_EQ("net_get_card1", got.unit);
    EXPECT_EQ(texts{"ERR net_get_card1:N KLIBCFileLock() failed.(400)"}, got.log);
    EXPECT_EQ(texts{}, got.locks);
    EXPECT_TRUE(is_untouched());
}

TEST_F(net_get_card1, KOVANetGetCard1_noInterface_isZero) {
    kernel.add("lo", {.flags = IFF_UP | IFF_LOOPBACK});
    EXPECT_OUTCOME(get(0), {.result = 0, .log = {"ERR KOVANetGetCard1(N): No interface."}, .locks = outer});
    EXPECT_OUTCOME(get_kind(0, nullptr, 1),
                   {.result = 0, .log = {"ERR KOVANetGetCard1Ex(N): No interface."}, .locks = outer});
    EXPECT_TRUE(is_untouched());
}

TEST_F(net_get_card1, KOVANetGetCard1_failedEnumeration_isAnError) {
    rig.hide("/proc/net/dev");
    EXPECT_OUTCOME(get(0), {.result = -1,
                            .code = 0x900,
                            .unit = "net_stat_init",
                            .log = {"ERR net_get_interface_info:N Failed to list interfaces, kovaerr=[0x0900]",
                                    "ERR KOVANetGetCard1(N): Get interface info fail."},
                            .locks = outer});
}

TEST_F(net_get_card1, KOVANetGetCard1_cardThatVanishes_isPassedOver) {
    add_static("eth0", "10.0.0.1");
    add_static("eth1", "10.0.0.2");
    int asked = 0;
    rig.answer_ioctl([&, next = rig.on_ioctl](unsigned long request, void *argument) -> std::optional<int> {
        if (request == SIOCGIFADDR && ++asked == 3) { // each was asked once for the list
            errno = ENODEV;
            return -1;
        }
        return next(request, argument);
    });
    const outcome got = get(0, "10.0.0.2");
    EXPECT_EQ(1, got.result);
    EXPECT_EQ(texts{"ERR net_lnx_get_ip:N Cannot get IP of eth0: No such device"}, got.log);
    EXPECT_STREQ("eth1", card.szIfname);
}

TEST_F(net_get_card1, KOVANetGetCard1_noMemory_is200) {
    NEEDS_OWN_ALLOCATOR();
    add_static("eth0", "10.0.0.1");
    rig.fail("calloc");
    EXPECT_OUTCOME(get(0), {.result = -1,
                            .code = 0x200,
                            .unit = "net_get_card1",
                            .log = {"ERR net_get_card1:N Failed to alloc memory."},
                            .locks = outer});
}

TEST_F(net_get_card1, KOVANetGetCard1Ex_kind_choosesAmongWhichCards) {
    add_static("eth0", "10.0.0.1");
    kernel.add("eth0", {.flags = IFF_UP | IFF_SLAVE, .ip = "10.0.0.1"});
    add_static("eth1", "10.0.0.2");
    EXPECT_OUTCOME(get_kind(0, nullptr, 1), {.result = 1, .locks = nested});
    EXPECT_STREQ("eth0", card.szIfname);
    EXPECT_OUTCOME(get_kind(0, nullptr, 2), {.result = 1, .locks = nested});
    EXPECT_STREQ("eth1", card.szIfname);
    EXPECT_OUTCOME(get_kind(0, "10.0.0.1", 2), {.result = 0, .locks = outer});
    EXPECT_OUTCOME(get_kind(0, nullptr, 0),
                   {.result = -1,
                    .code = 0xD00,
                    .unit = "net_get_interface_info",
                    .log = {"ERR net_get_interface_info:N Invaild Argument (0 != selector)=[0]",
                            "ERR KOVANetGetCard1Ex(N): Get interface info fail."},
                    .locks = outer});
}

TEST_F(net_get_card1, KOVANetGetCard1Ex_clusterBit_looksForAndShowsTheClusterAddress) {
    add_static("eth0", "10.0.0.1");
    add_static("eth1", "10.0.0.2");
    write_file("/etc/kova/platform.conf",
               "ha_running=yes\nha_heartbeat_if=eth9\nha_ip_eth1=172.16.0.9\nha_mask_eth1=255.255.0.0\n");
    EXPECT_OUTCOME(get_kind(0, "172.16.0.9", 0x12), {.result = 1, .locks = nested});
    EXPECT_STREQ("eth1", card.szIfname);
    EXPECT_STREQ("172.16.0.9", card.szIP);
    EXPECT_STREQ("255.255.0.0", card.szMask);
    EXPECT_OUTCOME(get_kind(0, "10.0.0.2", 0x12), {.result = 0, .locks = outer});
    write_file("/etc/kova/platform.conf", "ha_ip_eth1=172.16.0.9\nha_mask_eth1=255.255.0.0\n");
    EXPECT_OUTCOME(get_kind(1, nullptr, 0x12), {.result = 1, .locks = nested});
    EXPECT_STREQ("10.0.0.2", card.szIP);
    EXPECT_STREQ("255.255.255.0", card.szMask);
}
