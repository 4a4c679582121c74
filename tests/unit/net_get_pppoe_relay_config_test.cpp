#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/pppoe.h>
#include <sys/stat.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_get_pppoe_relay_config";
const std::string kDirectory = "/etc/sysconfig/pppoe-relay";
const std::string kFile = kDirectory + "/lbr0";
const outcome kWrongParameter{
    .result = -1, .code = 0xD00, .unit = kUnit, .log = {"ERR net_get_pppoe_relay_config:N Wrong Parameter."}};
const std::string kNoDirectory =
    "ERR net_get_pppoe_relay_config:N Failed to create [/etc/sysconfig/pppoe-relay/]: Not a directory";
const std::string kNoFile = "ERR net_get_pppoe_relay_config:N Failed to create [/etc/sysconfig/pppoe-relay/lbr0] "
                            "[0x0900 platform:N]";

PPPOE_RELAY_CONF settings(uint32_t enabled, const std::string &server) {
    PPPOE_RELAY_CONF conf = {};
    conf.blEnabled = enabled;
    memcpy(conf.szServer, server.data(), std::min(server.size(), sizeof conf.szServer));
    return conf;
}

} // namespace

class net_get_pppoe_relay_config : public unit_test {
protected:
    outcome get(const char *ifname = "lbr0") {
        memset(&read, 'u', sizeof read);
        return rig.observe([=, this] { return KOVANetGetPPPoERelayConfig(ifname, &read); });
    }
    outcome set(const PPPOE_RELAY_CONF &conf, const char *ifname = "lbr0") {
        return rig.observe([&] { return KOVANetSetPPPoERelayConfig(ifname, &conf); });
    }
    void expect_read(uint32_t enabled, const std::string &server) const {
        EXPECT_EQ(enabled, read.blEnabled);
        EXPECT_EQ(server, std::string(read.szServer, strnlen(read.szServer, sizeof read.szServer)));
    }

    PPPOE_RELAY_CONF read;
};

// ---- reading

TEST_F(net_get_pppoe_relay_config, KOVANetGetPPPoERelayConfig_noFile_isMadeEmptyAndReadAsOff) {
    const mode_t old = umask(0);
    EXPECT_OUTCOME(get(), {.result = 0});
    umask(old);
    expect_read(0, "");
    EXPECT_EQ("", read_file(kFile));
    EXPECT_EQ(0755U, mode_of(kDirectory));
    EXPECT_EQ((texts{"lbr0"}), list_dir(kDirectory));
}

TEST_F(net_get_pppoe_relay_config, KOVANetGetPPPoERelayConfig_settings_areReadFromTheirKeys) {
    const struct {
        const char *content;
        uint32_t enabled;
        const char *server;
    } cases[] = {
        {"enable=yes\nserver=eth1\n", 1, "eth1"},
        {"enable=\"yes\"\nserver=\"eth1\"\n", 1, "eth1"},
        {"server=ovs_eth1\n", 0, "ovs_eth1"},
        {"enable=no\nserver=eth1", 0, "eth1"},
        {"enable=YES\nserver=\n", 0, ""},
        {"enable=yes \n", 0, ""},
        {"enable=1\nserver=012345678901234\n", 0, "012345678901234"},
        {"enable=yes\nserver=0123456789012345\n", 1, "012345678901234"},
        {"# mine\nserver=eth1\nenable=yes\nserver=eth2\n", 1, "eth1"},
    };
    for (const auto &one : cases) {
        write_file(kFile, one.content);
        EXPECT_OUTCOME(get(), {.result = 0});
        expect_read(one.enabled, one.server);
        EXPECT_EQ(one.content, read_file(kFile));
    }
}

TEST_F(net_get_pppoe_relay_config, KOVANetGetPPPoERelayConfig_longName_isCutToSixteen) {
    write_file(kDirectory + "/0123456789abcdef", "enable=yes\nserver=eth1\n");
    for (const char *name : {"0123456789abcdef", "0123456789abcdefg", "0123456789abcdefghijklmnop"}) {
        EXPECT_OUTCOME(get(name), {.result = 0});
        expect_read(1, "eth1");
    }
    EXPECT_EQ((texts{"0123456789abcdef"}), list_dir(kDirectory));
}

TEST_F(net_get_pppoe_relay_config, KOVANetGetPPPoERelayConfig_failures_areMinusOne) {
    write_file(kDirectory, "in the way\n");
    EXPECT_OUTCOME(get(), {.result = -1, .code = 0x900, .unit = kUnit, .log = {kNoDirectory}});
    shell("rm " + kDirectory);
    rig.fail("KLIBCFileTouch");
    EXPECT_OUTCOME(get(), {.result = -1, .code = 0x900, .unit = "platform", .log = {kNoFile}});
    rig.fail("KLIBCFileGetKeyValue");
    EXPECT_OUTCOME(get(),
                   {.result = -1,
                    .code = 0x900,
                    .unit = "platform",
                    .log = {"ERR net_get_pppoe_relay_config:N Failed to get key[server] in file[" + kFile + "]."}});
    rig.fail("KLIBCFileCheckKeyValue");
    write_file(kFile, "enable=yes\nserver=eth1\n");
    EXPECT_EQ(0, get().result);
    expect_read(0, "eth1");
}

TEST_F(net_get_pppoe_relay_config, KOVANetGetPPPoERelayConfig_directoryMadeBySomebodyElse_isUsed) {
    shell("mkdir " + kDirectory);
    rig.fail("KLIBCFileCheckDir");
    EXPECT_OUTCOME(get(), {.result = 0});
    EXPECT_EQ("", read_file(kFile));
}

TEST_F(net_get_pppoe_relay_config, KOVANetGetPPPoERelayConfig_badArguments_areRefusedBeforeAnythingIsMade) {
    EXPECT_OUTCOME(get(nullptr), kWrongParameter);
    EXPECT_OUTCOME(rig.observe([] { return KOVANetGetPPPoERelayConfig("lbr0", nullptr); }), kWrongParameter);
    EXPECT_OUTCOME(get(""), refusal(kUnit, "'\\0' != *szIfname"));
    for (const char *name : {"../lbr0", "a/b", "/", ".", "..", "a b", "a\nb"}) {
        EXPECT_OUTCOME(get(name), refusal(kUnit, "is_interface_name(szIfname)"));
    }
    EXPECT_EQ((texts{"network-scripts"}), list_dir("/etc/sysconfig"));
}

// ---- storing

TEST_F(net_get_pppoe_relay_config, KOVANetSetPPPoERelayConfig_settings_areWrittenAndReadBack) {
    const mode_t old = umask(0);
    EXPECT_OUTCOME(set(settings(1, "eth1")), {.result = 0});
    umask(old);
    EXPECT_EQ("enable=yes\nserver=eth1\n", read_file(kFile));
    EXPECT_EQ(0755U, mode_of(kDirectory));
    EXPECT_EQ(0644U, mode_of(kFile));
    EXPECT_EQ(0, get().result);
    expect_read(1, "eth1");
    EXPECT_OUTCOME(set(settings(0, "")), {.result = 0});
    EXPECT_EQ("enable=no\nserver=\n", read_file(kFile));
    EXPECT_EQ(0, get().result);
    expect_read(0, "");
    EXPECT_OUTCOME(set(settings(2, "012345678901234"), "br9"), {.result = 0});
    EXPECT_EQ("enable=no\nserver=012345678901234\n", read_file(kDirectory + "/br9"));
    EXPECT_EQ((texts{"br9", "lbr0"}), list_dir(kDirectory));
}

TEST_F(net_get_pppoe_relay_config, KOVANetSetPPPoERelayConfig_otherLines_stay) {
    write_file(kFile, "# mine\nenable=\"no\"\nmtu=1400");
    EXPECT_OUTCOME(set(settings(1, "eth1")), {.result = 0});
    EXPECT_EQ("# mine\nenable=yes\nmtu=1400\nserver=eth1\n", read_file(kFile));
}

TEST_F(net_get_pppoe_relay_config, KOVANetSetPPPoERelayConfig_longName_isCutToSixteen) {
    EXPECT_OUTCOME(set(settings(1, "eth1"), "0123456789abcdefghij"), {.result = 0});
    EXPECT_EQ((texts{"0123456789abcdef"}), list_dir(kDirectory));
}

TEST_F(net_get_pppoe_relay_config, KOVANetSetPPPoERelayConfig_failures_areMinusOneAndLeaveTheOldSettings) {
    write_file(kDirectory, "in the way\n");
    EXPECT_OUTCOME(set(settings(1, "eth1")), {.result = -1, .code = 0x900, .unit = kUnit, .log = {kNoDirectory}});
    shell("rm " + kDirectory);
    rig.fail("KLIBCFileTouch");
    EXPECT_OUTCOME(set(settings(1, "eth1")), {.result = -1, .code = 0x900, .unit = "platform", .log = {kNoFile}});
    write_file(kFile, "enable=no\n");
    for (const int nth : {1, 2}) {
        rig.fail("KLIBCSzHashAlloc", nth);
        EXPECT_OUTCOME(set(settings(1, "eth1")), {.result = -1, .code = 0x200, .unit = kUnit});
        rig.fail("KLIBCSzHashSetValue", nth);
        EXPECT_OUTCOME(set(settings(1, "eth1")), {.result = -1, .code = 0x200, .unit = kUnit});
    }
    rig.fail("KLIBCFileSetKeys");
    EXPECT_OUTCOME(set(settings(1, "eth1")), {.result = -1, .code = 0xB00, .unit = "platform"});
    EXPECT_EQ("enable=no\n", read_file(kFile));
}

TEST_F(net_get_pppoe_relay_config, KOVANetSetPPPoERelayConfig_badArguments_areRefusedBeforeAnythingIsMade) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetSetPPPoERelayConfig("lbr0", nullptr); }), kWrongParameter);
    EXPECT_OUTCOME(set(settings(1, "eth1"), nullptr), refusal(kUnit, "((void *)0) != szIfname"));
    EXPECT_OUTCOME(set(settings(1, "eth1"), ""), refusal(kUnit, "'\\0' != *szIfname"));
    for (const char *name : {"../lbr0", "a/b", "/", ".", "..", "a b", "a\nb"}) {
        EXPECT_OUTCOME(set(settings(1, "eth1"), name), refusal(kUnit, "is_interface_name(szIfname)"));
    }
    for (const char *server : {"0123456789abcdef", "eth1\nx=y", "eth1 -F", "a/b", ".."}) {
        EXPECT_OUTCOME(set(settings(1, server)), refusal(kUnit, "is_server(pConf->szServer)"));
    }
    EXPECT_EQ((texts{"network-scripts"}), list_dir("/etc/sysconfig"));
}

// ---- comparing

TEST_F(net_get_pppoe_relay_config, KOVANetIsSamePPPoERelayConfig_flagAndServer_areCompared) {
    const struct {
        PPPOE_RELAY_CONF one, other;
        int is_same;
    } cases[] = {
        {settings(1, "eth1"), settings(1, "eth1"), 1},
        {settings(0, ""), settings(0, ""), 1},
        {settings(0, "eth1"), settings(1, "eth1"), 0},
        {settings(1, "eth1"), settings(1, "eth10"), 0},
        {settings(1, "eth1"), settings(1, "ETH1"), 0},
        {settings(1, "0123456789abcdef"), settings(1, "0123456789abcdef"), 1},
        {settings(1, "0123456789abcdef"), settings(1, "0123456789abcde"), 0},
    };
    for (const auto &pair : cases) {
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetIsSamePPPoERelayConfig(&pair.one, &pair.other); }),
                       {.result = pair.is_same});
    }
    PPPOE_RELAY_CONF with_rest = settings(1, "eth1");
    with_rest.szServer[10] = 'x';
    const PPPOE_RELAY_CONF without = settings(1, "eth1");
    EXPECT_EQ(1, KOVANetIsSamePPPoERelayConfig(&with_rest, &without)) << "what is behind the end counts";
}

TEST_F(net_get_pppoe_relay_config, KOVANetIsSamePPPoERelayConfig_missingRecord_isLogged) {
    const PPPOE_RELAY_CONF conf = settings(1, "eth1");
    const outcome logged{
        .result = 0, .code = 0xD00, .unit = kUnit, .log = {"ERR net_get_pppoe_relay_config:N Bad parameters"}};
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetIsSamePPPoERelayConfig(nullptr, &conf); }), logged);
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetIsSamePPPoERelayConfig(&conf, nullptr); }), logged);
    EXPECT_OUTCOME(rig.observe([] { return KOVANetIsSamePPPoERelayConfig(nullptr, nullptr); }), logged);
}
