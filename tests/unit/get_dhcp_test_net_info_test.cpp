#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

const std::string kUnit = "get_dhcp_test_net_info";
const std::string kScript = "/tmp/dhclient-script";
const std::string kCopy = "/bin/cp -f /etc/dhclient/dhclient-script /tmp/dhclient-script";
const std::string kInfo = "/etc/dhclient/ipv4/dhcpcd-eth0.info";

std::string client(const std::string &ifname = "eth0") {
    return "/usr/sbin/dhclient -q --kova_test -lf /tmp/dhcpv4.leases." + ifname + " -pf /etc/dhclient/ipv4/dhcpcd-" +
           ifname + ".pid -sf /tmp/dhclient-script " + ifname;
}

std::string client_failure(const std::string &reason) {
    return "ERR " + kUnit + ":N " + client() + " failed(" + reason + ").";
}

std::string missing_key(const std::string &key, const std::string &code) {
    return "ERR KOVAIGetDHCPTestNetInfo(N) KLIBCFileGetKeyValue(" + key + ") failed(" + code + ").";
}

} // namespace

class get_dhcp_test_net_info : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        shell("rm -rf " + kScript);
        write_file("/etc/dhclient/dhclient-script", "#!/bin/sh\n");
        write_file(kScript, "#!/bin/sh\n");
    }
    outcome ask(const char *ifname = "eth0") {
        info = {};
        snprintf(info.szIfname, sizeof info.szIfname, "%s", ifname);
        strcpy(info.szIP, "untouched");
        strcpy(info.szMask, "untouched");
        return rig.observe([this] { return KOVAIGetDHCPTestNetInfo(&info); });
    }
    /** The client's script writes this. */
    void lease(const std::string &content) {
        rig.answer("/usr/sbin/dhclient", 0, "", [content] { write_file(kInfo, content); });
    }

    NETINFO info{};
};

TEST_F(get_dhcp_test_net_info, KOVAIGetDHCPTestNetInfo_lease_fillsAddressAndMaskAlone) {
    lease("IPADDR=192.168.50.10\nNETMASK=255.255.255.0\nROUTER=192.168.50.1\n");
    EXPECT_OUTCOME(ask(), {.commands = {client()}});
    EXPECT_STREQ("192.168.50.10", info.szIP);
    EXPECT_STREQ("255.255.255.0", info.szMask);
    NETINFO expected{};
    strcpy(expected.szIfname, "eth0");
    strcpy(expected.szIP, "192.168.50.10");
    strcpy(expected.szMask, "255.255.255.0");
    EXPECT_EQ(0U, info.nIPSource);
    EXPECT_EQ(0U, info.blLinkUp);
    EXPECT_STREQ(expected.szIfname, info.szIfname);
    EXPECT_EQ(0, memcmp(expected.abMac, info.abMac, sizeof info.abMac));
}

TEST_F(get_dhcp_test_net_info, KOVAIGetDHCPTestNetInfo_longValues_areCut) {
    lease("IPADDR=\"" + long_text(100, '1') + "\"\r\nNETMASK=" + long_text(19, '2') + "\n");
    EXPECT_OUTCOME(ask(), {.commands = {client()}});
    EXPECT_EQ(long_text(19, '1'), info.szIP);
    EXPECT_EQ(long_text(19, '2'), info.szMask);
}

TEST_F(get_dhcp_test_net_info, KOVAIGetDHCPTestNetInfo_missingScript_isCopiedFirst) {
    shell("rm " + kScript);
    write_file("/etc/dhclient/dhclient-script", "#!/bin/sh\n# the appliance's\n");
    lease("IPADDR=192.168.50.10\nNETMASK=255.255.255.0\n");
    EXPECT_OUTCOME(ask(), {.commands = {kCopy, client()}});
    EXPECT_EQ("#!/bin/sh\n# the appliance's\n", read_file(kScript));
    EXPECT_OUTCOME(ask(), {.commands = {client()}});
}

TEST_F(get_dhcp_test_net_info, KOVAIGetDHCPTestNetInfo_scriptThatCannotBeCopied_fails) {
    shell("rm " + kScript);
    const texts log{"ERR " + kUnit + ":N copy /etc/dhclient/dhclient-script to /tmp/dhclient-script failed"};
    for (const int status : {1, 127, -1, 137}) {
        rig.answer("/bin/cp", status);
        EXPECT_OUTCOME(ask(), {.result = -1, .log = log, .commands = {kCopy}});
    }
    rig.let_run("/bin/cp");
    shell("rm /etc/dhclient/dhclient-script");
    EXPECT_OUTCOME(ask(), {.result = -1, .log = log, .commands = {kCopy}});
    EXPECT_STREQ("untouched", info.szIP);
}

TEST_F(get_dhcp_test_net_info, KOVAIGetDHCPTestNetInfo_clientThatFails_isAnExecFailure) {
    write_file(kInfo, "IPADDR=192.168.50.10\nNETMASK=255.255.255.0\n"); // of an earlier lease
    for (const int status : {1, 2, 143}) {
        rig.answer("/usr/sbin/dhclient", status, "", [] { errno = EIO; }); // what this process met is not its reason
        EXPECT_OUTCOME(
            ask(),
            {.result = -1, .code = 0x2A00, .unit = kUnit, .log = {client_failure("Success")}, .commands = {client()}});
        EXPECT_STREQ("untouched", info.szIP);
        EXPECT_STREQ("untouched", info.szMask);
    }
}

TEST_F(get_dhcp_test_net_info, KOVAIGetDHCPTestNetInfo_clientThatCannotBeRun_isAnExecFailure) {
    for (const auto &[status, error] : std::map<int, int>{{127, ENOENT}, {-1, EAGAIN}}) {
        rig.answer("/usr/sbin/dhclient", status, "", [error = error] { errno = error; });
        EXPECT_OUTCOME(ask(), {.result = -1,
                               .code = 0x2A00,
                               .unit = kUnit,
                               .log = {client_failure(strerror(error))},
                               .commands = {client()}});
    }
}

TEST_F(get_dhcp_test_net_info, KOVAIGetDHCPTestNetInfo_missingInfo_fails) {
    EXPECT_OUTCOME(ask(), {.result = -1,
                           .code = 0x900,
                           .unit = "key_value",
                           .log = {missing_key("IPADDR", "900")},
                           .commands = {client()}});
}

TEST_F(get_dhcp_test_net_info, KOVAIGetDHCPTestNetInfo_missingKeys_fail) {
    lease("");
    EXPECT_OUTCOME(ask(), {.result = -1, .log = {missing_key("IPADDR", "0")}, .commands = {client()}});
    lease("NETMASK=255.255.255.0\n");
    EXPECT_OUTCOME(ask(), {.result = -1, .log = {missing_key("IPADDR", "0")}, .commands = {client()}});
    lease("IPADDR=192.168.50.10\n");
    EXPECT_OUTCOME(ask(), {.result = -1, .log = {missing_key("NETMASK", "0")}, .commands = {client()}});
    EXPECT_STREQ("192.168.50.10", info.szIP);
    rig.fail("KLIBCFileGetKeyValue", 2);
    lease("IPADDR=192.168.50.10\nNETMASK=255.255.255.0\n");
    EXPECT_OUTCOME(ask(), {.result = -1,
                           .code = 0x900,
                           .unit = "platform",
                           .log = {missing_key("NETMASK", "900")},
                           .commands = {client()}});
}

TEST_F(get_dhcp_test_net_info, KOVAIGetDHCPTestNetInfo_badRecords_areRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVAIGetDHCPTestNetInfo(nullptr); }), refusal(kUnit, "NULL != info"));
    EXPECT_OUTCOME(ask(""), refusal(kUnit, "'\\0' != *info->szIfname"));
    for (const char *name : {"eth 0", "eth/0", "../../etc", ".", "..", "eth0\n", "\x01", "a\x7f"}) {
        EXPECT_OUTCOME(ask(name), refusal(kUnit, "is_interface_name(info->szIfname)"));
    }
    for (const char *name : {"-r", "--version", "-"}) {
        EXPECT_OUTCOME(ask(name), refusal(kUnit, "'-' != *info->szIfname"));
    }
    EXPECT_STREQ("untouched", info.szIP);
}

TEST_F(get_dhcp_test_net_info, KOVAIGetDHCPTestNetInfo_nameThatFillsItsField_isReadToItsEnd) {
    const std::string name = "eth0123456789ab0";
    ASSERT_EQ(sizeof info.szIfname, name.size());
    rig.answer("/usr/sbin/dhclient", 2);
    const outcome got = rig.observe([&] {
        memcpy(info.szIfname, name.data(), sizeof info.szIfname);
        memset(info.abMac, 'x', sizeof info.abMac); // what follows is not part of it
        return KOVAIGetDHCPTestNetInfo(&info);
    });
    EXPECT_EQ(texts{client(name)}, got.commands);
    EXPECT_EQ(-1, got.result);
}
