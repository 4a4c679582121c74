#include "platform_test.h"

#include <unistd.h>

#include "kova/dhmx.h"
#include "kova/ha.h"

using namespace kova_test;

namespace {

constexpr const char *kFile = "/etc/kova/platform.conf";

class ha : public testing::Test {
protected:
    ha() { unlink(kFile); }
    static void node(const char *text) { write_file(kFile, text); }

    char first_[32] = "before";
    char second_[32] = "before";

private:
    const kept_file keep_{kFile};
};

} // namespace

TEST_F(ha, KOVAHAIsRunning_noFile_isNoCluster) {
    EXPECT_WORKS(KOVAHAIsRunning(), 0);
    EXPECT_WORKS(KOVAHAIsActive(), 0);
    EXPECT_WORKS(KOVAHAGetRelatedIFInfo("eth0", first_, second_), 0);
    EXPECT_STREQ(first_, "");
    EXPECT_STREQ(second_, "");
    EXPECT_FAILS(KOVAHAGetHeartbeatIF(first_, 16), -1, 0xBC00);
    EXPECT_FAILS(KOVAHAGetMac(0, first_, 18), -1, 0xBC00);
}

TEST_F(ha, KOVAHAIsRunning_node_answers) {
    node("ha_running=\"yes\"\nha_active=\"no\"\n");
    EXPECT_WORKS(KOVAHAIsRunning(), 1);
    EXPECT_WORKS(KOVAHAIsActive(), 0);
    node("ha_active=yes\n");
    EXPECT_WORKS(KOVAHAIsRunning(), 0);
    EXPECT_WORKS(KOVAHAIsActive(), 1);
}

TEST_F(ha, KOVAHAGetHeartbeatIF_name_isCopied) {
    node("ha_heartbeat_if=\"eth3\"\n");
    EXPECT_WORKS(KOVAHAGetHeartbeatIF(first_, 16), 0);
    EXPECT_STREQ(first_, "eth3");
    EXPECT_FAILS(KOVAHAGetHeartbeatIF(first_, 15), -1, 0xD00);
    EXPECT_FAILS(KOVAHAGetHeartbeatIF(nullptr, 16), -1, 0xD00);
}

TEST_F(ha, KOVAHAGetRelatedIFInfo_addressAndMask_areBothNeeded) {
    node("ha_ip_eth0=\"10.0.0.9\"\nha_mask_eth0=\"255.255.255.0\"\nha_ip_eth1=\"10.0.1.9\"\n");
    EXPECT_WORKS(KOVAHAGetRelatedIFInfo("eth0", first_, second_), 1);
    EXPECT_STREQ(first_, "10.0.0.9");
    EXPECT_STREQ(second_, "255.255.255.0");
    EXPECT_WORKS(KOVAHAGetRelatedIFInfo("eth1", first_, second_), 0);
    EXPECT_STREQ(first_, "");
    EXPECT_WORKS(KOVAHAGetRelatedIFInfo(std::string(100, 'x').c_str(), first_, second_), 0);
    EXPECT_FAILS(KOVAHAGetRelatedIFInfo("", first_, second_), 0, 0xD00);
    EXPECT_FAILS(KOVAHAGetRelatedIFInfo(nullptr, first_, second_), 0, 0xD00);
    EXPECT_FAILS(KOVAHAGetRelatedIFInfo("eth0", nullptr, second_), 0, 0xD00);
    EXPECT_FAILS(KOVAHAGetRelatedIFInfo("eth0", first_, nullptr), 0, 0xD00);
}

TEST_F(ha, KOVAHAGetMac_card_isLookedUp) {
    node("ha_mac_1=\"02:00:00:00:00:01\"\nha_mac_2=\n");
    EXPECT_WORKS(KOVAHAGetMac(1, first_, 18), 0);
    EXPECT_STREQ(first_, "02:00:00:00:00:01");
    EXPECT_FAILS(KOVAHAGetMac(2, first_, 18), -1, 0xBC00);
    EXPECT_FAILS(KOVAHAGetMac(-1, first_, 18), -1, 0xD00);
    EXPECT_FAILS(KOVAHAGetMac(1, nullptr, 18), -1, 0xD00);
    EXPECT_FAILS(KOVAHAGetMac(1, first_, 0), -1, 0xD00);
}

TEST_F(ha, KOVAIsDockerHMX_platformFile_says) {
    EXPECT_WORKS(KOVAIsDockerHMX(), 0);
    node("docker_hmx=\"yes\"\n");
    EXPECT_WORKS(KOVAIsDockerHMX(), 1);
    node("docker_hmx=\"no\"\n");
    EXPECT_WORKS(KOVAIsDockerHMX(), 0);
}
