#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class is_valid_ip_mask : public unit_test {
protected:
    outcome ask(const std::string &ip, const std::string &mask) {
        SCOPED_TRACE(ip);
        return rig.observe([&] { return BlKLIBIsValidIpMask(ip.c_str(), mask.c_str()); });
    }
};

TEST_F(is_valid_ip_mask, BlKLIBIsValidIpMask_hostInItsSubnet_isAccepted) {
    EXPECT_OUTCOME(ask("192.168.1.1", "255.255.255.0"), {.result = 1});
    EXPECT_OUTCOME(ask("192.168.1.254", "255.255.255.0"), {.result = 1});
    EXPECT_OUTCOME(ask("192.168.1.255", "255.255.254.0"), {.result = 0, .code = 0x1000, .unit = "is_valid_ip_mask"});
    EXPECT_OUTCOME(ask("192.168.0.255", "255.255.254.0"), {.result = 1});
    EXPECT_OUTCOME(ask("012.0.0.1", "0xff.0.0.0"), {.result = 1});
}

TEST_F(is_valid_ip_mask, BlKLIBIsValidIpMask_networkAddress_isAccepted) {
    EXPECT_OUTCOME(ask("192.168.1.0", "255.255.255.0"), {.result = 1});
    EXPECT_OUTCOME(ask("10.0.0.2", "255.255.255.254"), {.result = 1});
}

TEST_F(is_valid_ip_mask, BlKLIBIsValidIpMask_broadcastAddress_isRefused) {
    EXPECT_OUTCOME(ask("192.168.1.255", "255.255.255.0"), {.result = 0, .code = 0x1000, .unit = "is_valid_ip_mask"});
    EXPECT_OUTCOME(ask("10.255.255.255", "255.0.0.0"), {.result = 0, .code = 0x1000, .unit = "is_valid_ip_mask"});
    EXPECT_OUTCOME(ask("10.0.0.3", "255.255.255.254"), {.result = 0, .code = 0x1000, .unit = "is_valid_ip_mask"});
}

TEST_F(is_valid_ip_mask, BlKLIBIsValidIpMask_allOnesMask_isAccepted) {
    EXPECT_OUTCOME(ask("192.168.1.255", "255.255.255.255"), {.result = 1});
    EXPECT_OUTCOME(ask("10.0.0.1", "255.255.255.255"), {.result = 1});
}

TEST_F(is_valid_ip_mask, BlKLIBIsValidIpMask_badAddress_isRefused) {
    EXPECT_OUTCOME(ask("127.0.0.1", "255.0.0.0"), {.result = 0, .code = 0x1000, .unit = "is_ip_addr"});
    EXPECT_OUTCOME(ask("", "255.0.0.0"), {.result = 0, .code = 0x1000, .unit = "net_sep_ip"});
    EXPECT_OUTCOME(ask(long_text(4096, '9'), "255.0.0.0"), {.result = 0, .code = 0x1000, .unit = "net_sep_ip"});
}

TEST_F(is_valid_ip_mask, BlKLIBIsValidIpMask_addressOnlyOurParserReads_isRefused) {
    for (const char *ip : {" 10.0.0.1", "+10.0.0.1", "10. 0.0.1"}) {
        EXPECT_OUTCOME(ask(ip, "255.0.0.0"), {.result = 0, .code = 0x1000, .unit = "is_valid_ip_mask"});
    }
}

TEST_F(is_valid_ip_mask, BlKLIBIsValidIpMask_badMask_isRefused) {
    for (const char *mask : {"", "0.0.0.0", "255.0.255.0", "255.255.255", "255.255.255.0.0", "24", "255.255.255.0\n"}) {
        EXPECT_OUTCOME(ask("10.0.0.1", mask), {.result = 0, .code = 0x1000, .unit = "is_ip_mask"});
    }
    EXPECT_OUTCOME(ask("10.0.0.1", long_text(4096, '1')), {.result = 0, .code = 0x1000, .unit = "is_ip_mask"});
}

TEST_F(is_valid_ip_mask, BlKLIBIsValidIpMask_longMask_isCutTo19Characters) {
    EXPECT_OUTCOME(ask("10.0.0.1", "000000377.255.255.0"), {.result = 1});
    EXPECT_OUTCOME(ask("10.0.0.1", "000000377.255.255.0.and more"), {.result = 1});
    EXPECT_OUTCOME(ask("10.0.0.1", "0000000377.255.255.0"), {.result = 0, .code = 0x1000, .unit = "is_ip_mask"});
}

TEST_F(is_valid_ip_mask, BlKLIBIsValidIpMask_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return BlKLIBIsValidIpMask(nullptr, "255.0.0.0"); }),
                   refusal("is_valid_ip_mask", "((void *)0) != szIP", 0));
    EXPECT_OUTCOME(rig.observe([] { return BlKLIBIsValidIpMask("10.0.0.1", nullptr); }),
                   refusal("is_valid_ip_mask", "NULL != szMask", 0));
}

} // namespace
