#include "support/fake_kernel.h"

#include <cstring>
#include <kovanetsdk/pppoe.h>

using namespace kova_test;

namespace {

const std::string kCache = "/tmp/kovapppoe.intf";
const std::string kTool = "/usr/sbin/pppoe-status";
const std::string kUnit = "pppoe_intf_get";
const std::string kAnswer = "pppoe-status: Link is up and running on interface ppp0\n"
                            "6: ppp0: <POINTOPOINT,MULTICAST> mtu 1492\n"
                            "  ppp0      Link encap:Point-to-Point Protocol\n"
                            "  ppp9      Link encap:Point-to-Point Protocol\n";

} // namespace

class pppoe_intf_get : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        shell("rm -rf " + kCache);
        kernel.add("eth0");
        kernel.add("ppp0", {.ip = "10.64.0.7", .mask = "255.255.255.255"});
        rig.answer(kTool, 0, kAnswer);
    }
    void TearDown() override {
        shell("rm -rf " + kCache);
        unit_test::TearDown();
    }
    outcome get(int size = 16) {
        memset(name, 'u', sizeof name);
        return rig.observe([=, this] { return KOVAPPPoeIntfGet(name, size); });
    }
    outcome info(char *szIP, int cbIP, char *szMask, int cbMask) {
        memset(ip, 0, sizeof ip);
        memset(mask, 0, sizeof mask);
        return rig.observe([=] { return KOVAPPPoeNetInfoGet(szIP, cbIP, szMask, cbMask); });
    }

    fake_kernel kernel{rig};
    char name[32];
    char ip[32];
    char mask[32];
};

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_statusTool_isAskedOnce) {
    EXPECT_OUTCOME(get(), {.result = 0, .commands = {kTool}});
    EXPECT_STREQ("ppp0", name);
    EXPECT_EQ("ppp0", read_file(kCache));
    EXPECT_OUTCOME(get(), {.result = 0});
    EXPECT_STREQ("ppp0", name);
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_cache_isItsFirstLine) {
    for (const char *content : {"ppp7\n", "ppp7", "ppp7\nppp8\n"}) {
        write_file(kCache, content);
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_STREQ("ppp7", name);
        EXPECT_EQ(content, read_file(kCache));
    }
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_foreignCache_isCutAndThenForgotten) {
    for (const std::string &content : {long_text(100000), std::string("p\xff\x01/..\n"), std::string("ppp7\r\n")}) {
        write_file(kCache, content);
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_EQ(content.substr(0, content.find('\n')).substr(0, 15), name);
        EXPECT_EQ(-1, info(ip, 16, nullptr, 0).result);
        EXPECT_EQ("<absent>", read_file(kCache));
    }
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_emptyCache_isToldAsDetail) {
    for (const std::string &content :
         {std::string(), std::string("\n"), std::string("\nppp0\n"), std::string("\0ppp0", 5)}) {
        write_file(kCache, content);
        EXPECT_OUTCOME(get(), {.result = -1, .log = {"DEBUG pppoe_intf_get:N Failed to get real pppoe interface"}});
    }
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_cacheOfSomebodyElse_isNotBelieved) {
    write_file(kCache, "ppp7\n");
    shell("chown 4242 " + kCache);
    EXPECT_OUTCOME(get(), {.result = 0, .commands = {kTool}});
    EXPECT_STREQ("ppp0", name);
    EXPECT_EQ("ppp0", read_file(kCache));
    write_file("/tmp/bait", "ppp7\n");
    shell("rm " + kCache + " && ln -s /tmp/bait " + kCache);
    EXPECT_OUTCOME(get(), {.result = 0, .commands = {kTool}});
    EXPECT_STREQ("ppp0", name);
    EXPECT_EQ("ppp7\n", read_file("/tmp/bait"));
    shell("rm " + kCache + " /tmp/bait && mkfifo " + kCache);
    EXPECT_OUTCOME(get(), {.result = 0, .commands = {kTool}});
    shell("rm -f " + kCache + " && mkdir " + kCache);
    EXPECT_OUTCOME(get(), {.result = 0, .commands = {kTool}});
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_toolAnswers_areCutToTheirFirstWord) {
    for (const auto &[answer, expected] : std::map<std::string, std::string>{
             {"ppp1 Point-to-Point", "ppp1"},
             {"\t ppp1\tLink Point-to-Point\n", "ppp1"},
             {"x\nPoint-to-Point\n", "Point-to-Point"},
             {long_text(5000) + "\nppp1 Point-to-Point\n", "ppp1"},
             {"ppp1 " + long_text(5000) + " Point-to-Point\nppp2 Point-to-Point", "ppp1"},
             {"ppp1\r Point-to-Point\r\n", "ppp1"},
             {"\x01\xff\nppp1\t\xff Point-to-Point", "ppp1"},
             {"../../etc Point-to-Point", "../../etc"}}) {
        shell("rm -f " + kCache);
        rig.answer(kTool, 0, answer);
        EXPECT_OUTCOME(get(), {.result = 0, .commands = {kTool}});
        EXPECT_EQ(expected, name);
    }
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_toolWithoutAnAnswer_isToldAsDetail) {
    for (const char *answer : {"", "\n", "ppp0 point-to-point\n", "Link is down\n"}) {
        rig.answer(kTool, 1, answer);
        EXPECT_OUTCOME(
            get(),
            {.result = -1, .log = {"DEBUG pppoe_intf_get:N Failed to get real pppoe interface"}, .commands = {kTool}});
        EXPECT_EQ("<absent>", read_file(kCache));
    }
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_toolThatCannotBeRun_isLogged) {
    rig.fail("KLIBCPopen");
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x2A00,
                           .unit = "platform",
                           .log = {"ERR pppoe_intf_get:N failed to excute cmd/usr/sbin/pppoe-status"},
                           .commands = {kTool}});
    EXPECT_EQ("<absent>", read_file(kCache));
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_noInterface_isMinusOneEvenWithACache) {
    write_file(kCache, "ppp0\n");
    kernel.remove("ppp0");
    kernel.add("mon.ppp0");
    kernel.add("pp0");
    kernel.add("xppp0");
    EXPECT_OUTCOME(get(), {.result = -1});
    kernel.add("ppp_any");
    EXPECT_EQ(0, get().result);
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_listThatIsNone_fails) {
    rig.replace_file("/proc/net/dev", "Inter-|\n face |\n eth0: 1\nno colon here\nppp0: 1\n");
    EXPECT_OUTCOME(
        get(), {.result = -1, .log = {"ERR pppoe_intf_get:N input string: no colon here don't contain charactor :"}});
    for (const char *content : {"", "ppp0: 1\n", "ppp0: 1\nppp1: 2\n"}) { // the first two lines are no interfaces
        rig.replace_file("/proc/net/dev", content);
        EXPECT_OUTCOME(get(), {.result = -1});
    }
    rig.replace_file("/proc/net/dev", "\n\n \t ppp0:1");
    EXPECT_EQ(0, get().result);
    rig.hide("/proc/net/dev");
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x900,
                           .unit = kUnit,
                           .log = {"ERR pppoe_intf_get:N Failed to open /proc/net/dev: No such file or directory"}});
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_buffer_cutsTheName) {
    for (const int size : {1, 2, 4, 5}) {
        EXPECT_EQ(0, get(size).result);
        EXPECT_EQ(std::string("ppp0").substr(0, static_cast<size_t>(size) - 1), name);
        EXPECT_EQ('u', name[size]);
    }
    EXPECT_EQ("ppp0", read_file(kCache));
}

TEST_F(pppoe_intf_get, KOVAPPPoeIntfGet_badArguments_areRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVAPPPoeIntfGet(nullptr, 16); }),
                   refusal(kUnit, "((void *)0) != szIfname"));
    for (const int size : {0, -1}) {
        EXPECT_OUTCOME(get(size), refusal(kUnit, "0 < cbIfname"));
    }
}

// ---- addresses

TEST_F(pppoe_intf_get, KOVAPPPoeNetInfoGet_addressAndMask_areDottedTexts) {
    EXPECT_OUTCOME(info(ip, 16, mask, 16), {.result = 0, .commands = {kTool}});
    EXPECT_STREQ("10.64.0.7", ip);
    EXPECT_STREQ("255.255.255.255", mask);
    EXPECT_OUTCOME(info(ip, 10, nullptr, 0), {.result = 0});
    EXPECT_STREQ("10.64.0.7", ip);
}

TEST_F(pppoe_intf_get, KOVAPPPoeNetInfoGet_nothingAskedFor_isDone) {
    EXPECT_OUTCOME(info(nullptr, 16, nullptr, 16), {.result = 0});
    EXPECT_OUTCOME(info(ip, 0, mask, -1), {.result = 0});
}

TEST_F(pppoe_intf_get, KOVAPPPoeNetInfoGet_maskAlone_failsAndForgetsTheName) {
    write_file(kCache, "ppp0");
    EXPECT_OUTCOME(info(nullptr, 0, mask, 16), {.result = -1});
    EXPECT_EQ("<absent>", read_file(kCache));
    EXPECT_STREQ("", mask);
}

TEST_F(pppoe_intf_get, KOVAPPPoeNetInfoGet_failures_forgetTheName) {
    const auto fails = [&](const outcome &expected) {
        write_file(kCache, "ppp0");
        EXPECT_OUTCOME(info(ip, 16, mask, 16), expected);
        EXPECT_EQ("<absent>", read_file(kCache));
    };
    kernel.add("ppp0");
    fails({.result = -1,
           .code = 0x3600,
           .unit = kUnit,
           .log = {"ERR pppoe_intf_get:N Cannot get address of ppp0: Cannot assign requested address"}});
    kernel.add("ppp0", {.ip = "10.64.0.7"});
    fails({.result = -1,
           .code = 0x3600,
           .unit = kUnit,
           .log = {"ERR pppoe_intf_get:N Cannot get netmask of ppp0: Cannot assign requested address"}});
    rig.fail("socket");
    fails({.result = -1, .code = 0x3400, .unit = kUnit, .log = {"ERR pppoe_intf_get:N Cannot open control socket"}});
    kernel.remove("ppp0");
    fails({.result = -1});
    kernel.add("ppp1");
    fails({.result = -1,
           .code = 0x3400,
           .unit = kUnit,
           .log = {"ERR pppoe_intf_get:N Cannot get address of ppp0: No such device"}});
}

TEST_F(pppoe_intf_get, KOVAPPPoeNetInfoGet_noRoom_fails) {
    EXPECT_OUTCOME(info(ip, 9, mask, 16), {.result = -1,
                                           .code = 0xD00,
                                           .unit = kUnit,
                                           .log = {"ERR pppoe_intf_get:N No room for 10.64.0.7"},
                                           .commands = {kTool}});
    EXPECT_STREQ("", ip);
    EXPECT_OUTCOME(info(ip, 16, mask, 15), {.result = -1,
                                            .code = 0xD00,
                                            .unit = kUnit,
                                            .log = {"ERR pppoe_intf_get:N No room for 255.255.255.255"},
                                            .commands = {kTool}});
    EXPECT_EQ("<absent>", read_file(kCache));
}
