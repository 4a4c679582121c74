#include "support/rig.h"

#include <climits>
#include <kovanetsdk/routing.h>

using namespace kova_test;

namespace {

const std::string kFile = "/etc/sysconfig/network";

} // namespace

class net_default_gateway_get_conf : public unit_test {
protected:
    outcome get(char *buffer, int size) {
        return rig.observe([=] { return KOVANetDefaultGatewayGetConf(buffer, size); });
    }
    /** What a file says. */
    std::string read(const std::string &content) {
        write_file(kFile, content);
        char gateway[32] = "before";
        EXPECT_OUTCOME(get(gateway, sizeof gateway), {.result = 0});
        return gateway;
    }
    outcome set(const char *szGateway) {
        return rig.observe([=] { return KOVANetDefaultGatewaySetConf(szGateway); });
    }
};

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewayGetConf_badArgument_isTold) {
    const outcome bad{.result = -1, .log = {"ERR net_default_gateway_get_conf (N) Bad parameter."}};
    write_file(kFile, "GATEWAY=10.0.0.1\n");
    char gateway[16] = "before";
    EXPECT_OUTCOME(get(nullptr, 16), bad);
    for (const int size : {0, -1, INT_MIN}) {
        EXPECT_OUTCOME(get(gateway, size), bad);
    }
    EXPECT_STREQ("before", gateway);
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewayGetConf_key_isRead) {
    EXPECT_EQ("10.0.0.1", read("GATEWAY=10.0.0.1\n"));
    EXPECT_EQ("10.0.0.1", read("# GATEWAY=1\nHOSTNAME=nas\nGATEWAY=\"10.0.0.1\"\r\nGATEWAY=10.0.0.2\n"));
    EXPECT_EQ("router", read("GATEWAY=router"));
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewayGetConf_absentOrEmptyKey_isAnEmptySuccess) {
    for (const std::string &content : texts{"", "GATEWAY=\n", "XGATEWAY=10.0.0.1\n", " GATEWAY=10.0.0.1\n",
                                            "GATEWAYDEV=eth0\n", "GATEWAY =10.0.0.1\n"}) {
        EXPECT_EQ("", read(content)) << content;
    }
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewayGetConf_wholeBuffer_isZeroedFirst) {
    write_file(kFile, "GATEWAY=10.0.0.1\n");
    char gateway[16];
    std::fill(std::begin(gateway), std::end(gateway), 'x');
    EXPECT_OUTCOME(get(gateway, 12), {.result = 0});
    EXPECT_EQ(std::string("10.0.0.1\0\0\0\0xxxx", 16), std::string(gateway, 16));
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewayGetConf_longValue_isCut) {
    write_file(kFile, "GATEWAY=" + long_text(5000) + "\n");
    char gateway[16] = "";
    EXPECT_OUTCOME(get(gateway, sizeof gateway), {.result = 0});
    EXPECT_EQ(long_text(15), gateway);
    EXPECT_OUTCOME(get(gateway, 1), {.result = 0});
    EXPECT_STREQ("", gateway);
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewayGetConf_fileThatCannotBeRead_isTold) {
    char gateway[16] = "before";
    const outcome expected{.result = -1,
                           .code = 0x900,
                           .unit = "key_value",
                           .log = {"ERR KOVANetDefaultGatewayGetConf(N) Failed to get default gateway."}};
    EXPECT_OUTCOME(get(gateway, sizeof gateway), expected);
    EXPECT_STREQ("", gateway);
    shell("mkdir " + kFile);
    EXPECT_OUTCOME(get(gateway, sizeof gateway), expected);
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewaySetConf_gateway_isWrittenPlain) {
    write_file(kFile, "# network\nHOSTNAME=nas\nGATEWAY=\"10.0.0.1\"\nNETWORKING=yes");
    EXPECT_OUTCOME(set("10.0.0.2"), {.result = 0});
    EXPECT_EQ("# network\nHOSTNAME=nas\nGATEWAY=10.0.0.2\nNETWORKING=yes\n", read_file(kFile));
    EXPECT_EQ("10.0.0.2", read(read_file(kFile)));
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewaySetConf_missingFile_isMade) {
    EXPECT_OUTCOME(set("10.0.0.2"), {.result = 0});
    EXPECT_EQ("GATEWAY=10.0.0.2\n", read_file(kFile));
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewaySetConf_text_isNotValidated) {
    for (const std::string &text : texts{"router", "999.1.1.1", "fe80::1", " ", "a=b", "\"", long_text(5000)}) {
        EXPECT_OUTCOME(set(text.c_str()), {.result = 0});
        EXPECT_EQ("GATEWAY=" + text + "\n", read_file(kFile));
    }
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewaySetConf_noGateway_removesTheKey) {
    for (const char *szGateway : {"", static_cast<const char *>(nullptr)}) {
        write_file(kFile, "GATEWAY=10.0.0.1\nHOSTNAME=nas\nGATEWAY=10.0.0.2\n");
        EXPECT_OUTCOME(set(szGateway), {.result = 0});
        EXPECT_EQ("HOSTNAME=nas\n", read_file(kFile));
        EXPECT_OUTCOME(set(szGateway), {.result = 0});
    }
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewaySetConf_noGatewayAndNoFile_makesNone) {
    EXPECT_OUTCOME(set(""), {.result = 0});
    EXPECT_EQ("<absent>", read_file(kFile));
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewaySetConf_newline_isRefused) {
    write_file(kFile, "GATEWAY=10.0.0.1\n");
    for (const char *szGateway : {"10.0.0.2\n", "10.0.0.2\nHOSTNAME=x", "\r"}) {
        EXPECT_OUTCOME(set(szGateway), {.result = -1, .code = 0xD00, .unit = "key_value"});
        EXPECT_EQ("GATEWAY=10.0.0.1\n", read_file(kFile));
    }
}

TEST_F(net_default_gateway_get_conf, KOVANetDefaultGatewaySetConf_failedWrite_leavesTheFile) {
    write_file(kFile, "GATEWAY=10.0.0.1\n");
    rig.fail("KLIBCFileSetKeyValue");
    EXPECT_OUTCOME(set("10.0.0.2"), {.result = -1, .code = 0xB00, .unit = "platform"});
    rig.fail("KLIBCFileRemoveKey");
    EXPECT_OUTCOME(set(""), {.result = -1, .code = 0xB00, .unit = "platform"});
    EXPECT_EQ("GATEWAY=10.0.0.1\n", read_file(kFile));
}
