#include "support/fake_kernel.h"

#include <cerrno>
#include <kovanetsdk/iface.h>

using namespace kova_test;

class net_lnx_get_ip : public unit_test {
protected:
    outcome get_ip(const char *ifname, int size = 20) {
        return rig.observe([&] { return KOVAILnxGetIP(ifname, szIP, size); });
    }
    outcome get_configured(const std::string &ifname, int size = 20) {
        return rig.observe([&] { return KOVAILnxGetIPFromCfg(ifname.c_str(), szIP, size); });
    }

    fake_kernel kernel{rig};
    char szIP[64] = "untouched";
};

TEST_F(net_lnx_get_ip, KOVAILnxGetIP_address_isDottedText) {
    kernel.add("eth0", {.ip = "192.168.100.200"});
    EXPECT_OUTCOME(get_ip("eth0"), {.result = 0});
    EXPECT_STREQ("192.168.100.200", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIP_noAddress_isEmptyAndSuccess) {
    kernel.add("eth0");
    EXPECT_OUTCOME(get_ip("eth0"), {.result = 0});
    EXPECT_STREQ("", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIP_unknownInterface_is3400) {
    EXPECT_OUTCOME(get_ip("eth0"), {.result = -1,
                                    .code = 0x3400,
                                    .unit = "net_lnx_get_ip",
                                    .log = {"ERR net_lnx_get_ip:N Cannot get IP of eth0: No such device"}});
    EXPECT_STREQ("", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIP_namesTheKernelCannotHave_areUnknown) {
    kernel.add("abcdefghijklmno", {.ip = "10.0.0.1"});
    EXPECT_OUTCOME(get_ip("abcdefghijklmno"), {.result = 0});
    for (const size_t length : {16U, 17U, 63U, 64U, 4096U}) {
        const std::string name = "abcdefghijklmno" + long_text(length - 15);
        const outcome got = get_ip(name.c_str());
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ(0x3400U, got.code);
        EXPECT_STREQ("", szIP);
    }
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIP_failedRequest_is3600) {
    kernel.add("eth0", {.failing = {{SIOCGIFADDR, EPERM}}});
    EXPECT_OUTCOME(get_ip("eth0"), {.result = -1,
                                    .code = 0x3600,
                                    .unit = "net_lnx_get_ip",
                                    .log = {"ERR net_lnx_get_ip:N Cannot get IP of eth0: Operation not permitted"}});
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIP_noSocket_is3400) {
    rig.fail("socket");
    EXPECT_OUTCOME(get_ip("eth0"), {.result = -1,
                                    .code = 0x3400,
                                    .unit = "net_lnx_get_ip",
                                    .log = {"ERR net_lnx_get_ip:N Cannot open control socket"}});
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIP_bufferOfExactSize_holdsTheAddress) {
    kernel.add("eth0", {.ip = "192.168.100.200"});
    EXPECT_OUTCOME(get_ip("eth0", 16), {.result = 0});
    EXPECT_STREQ("192.168.100.200", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIP_bufferTooSmall_givesNoPartOfTheAddress) {
    kernel.add("eth0", {.ip = "192.168.100.200"});
    EXPECT_OUTCOME(get_ip("eth0", 15),
                   {.result = -1,
                    .code = 0xD00,
                    .unit = "net_lnx_get_ip",
                    .log = {"ERR net_lnx_get_ip:N Invaild Argument (strlen(szAddress) < cbIP)=[0]"}});
    EXPECT_STREQ("", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIP_badArguments_areRefused) {
    const auto refused = [](const std::string &condition) {
        return outcome{.result = -1,
                       .code = 0xD00,
                       .unit = "net_lnx_get_ip",
                       .log = {"ERR net_lnx_get_ip:N Invaild Argument (" + condition + ")=[0]"}};
    };
    EXPECT_OUTCOME(get_ip(nullptr), {refused("((void *)0) != szIfname")});
    EXPECT_OUTCOME(get_ip(""), {refused("'\\0' != *szIfname")});
    EXPECT_OUTCOME(get_ip("eth0", 0), {refused("0 < cbIP")});
    EXPECT_OUTCOME(get_ip("eth0", -1), {refused("0 < cbIP")});
    EXPECT_OUTCOME(rig.observe([] { return KOVAILnxGetIP("eth0", nullptr, 20); }), {refused("((void *)0) != szIP")});
    EXPECT_STREQ("untouched", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIP_realInterface_hasTheAddressSetByTheTool) {
    rig.answer_ioctl({});
    shell("ip link add kv0 type veth peer name kv1 && ip addr add 10.99.1.7/24 dev kv0");
    EXPECT_OUTCOME(get_ip("kv0"), {.result = 0});
    EXPECT_STREQ("10.99.1.7", szIP);
    EXPECT_OUTCOME(get_ip("kv1"), {.result = 0});
    EXPECT_STREQ("", szIP);
    shell("ip link del kv0");
    EXPECT_EQ(0x3400U, get_ip("kv0").code);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIPFromCfg_key_isRead) {
    write_file(ifcfg("eth0"), "DEVICE=eth0\nIPADDR=\"10.1.2.3\"\n");
    EXPECT_OUTCOME(get_configured("eth0"), {.result = 0, .locks = {"+0x105", "-0x100"}});
    EXPECT_STREQ("10.1.2.3", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIPFromCfg_noKey_isEmptyAndSuccess) {
    write_file(ifcfg("eth0"), "DEVICE=eth0\n");
    EXPECT_OUTCOME(get_configured("eth0"), {.result = 0, .locks = {"+0x105", "-0x100"}});
    EXPECT_STREQ("", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIPFromCfg_valueOfAnyLength_isCutToTheBuffer) {
    write_file(ifcfg("eth0"), "IPADDR=" + long_text(5000, '1') + "\n");
    EXPECT_OUTCOME(get_configured("eth0", 5), {.result = 0, .locks = {"+0x105", "-0x100"}});
    EXPECT_STREQ("1111", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIPFromCfg_noFile_keepsTheCodeOfTheRead) {
    EXPECT_OUTCOME(get_configured("eth0"), {.result = -1,
                                            .code = 0x900,
                                            .unit = "key_value",
                                            .log = {"ERR net_lnx_get_ip:N Failed to get [IPADDR] from "
                                                    "[/etc/sysconfig/network-scripts/ifcfg-eth0], kovaerr=[0x0900]"},
                                            .locks = {"+0x105", "-0x100"}});
    EXPECT_STREQ("", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIPFromCfg_lockElsewhere_is400AndNothingIsRead) {
    write_file(ifcfg("eth0"), "IPADDR=10.1.2.3\n");
    const lock_elsewhere holder{0x106};
    const outcome got = get_configured("eth0");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x400U, got.code);
    EXPECT_EQ("net_lnx_get_ip", got.unit);
    EXPECT_EQ(texts{"ERR net_lnx_get_ip:N KLIBCFileLock() failed.(400)"}, got.log);
    EXPECT_EQ(texts{}, got.locks);
    EXPECT_STREQ("", szIP);
}

TEST_F(net_lnx_get_ip, KOVAILnxGetIPFromCfg_badNames_areRefused) {
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get_configured(name),
                       {.result = -1,
                        .code = 0xD00,
                        .unit = "net_lnx_get_ip",
                        .log = {"ERR net_lnx_get_ip:N Invaild Argument (is_interface_name(szIfname))=[0]"}});
    }
    EXPECT_EQ(texts{}, list_dir("/etc/sysconfig/network-scripts"));
}
