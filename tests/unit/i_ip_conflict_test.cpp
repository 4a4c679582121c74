#include "support/fake_kernel.h"

#include <cerrno>
#include <kovanetsdk/addr.h>

using namespace kova_test;

class i_ip_conflict : public unit_test {
protected:
    outcome conflict(const char *ifname, const char *ip) {
        return rig.observe([&] { return KOVAIIpConflict(ifname, ip); });
    }

    fake_kernel kernel{rig};
};

TEST_F(i_ip_conflict, KOVAIIpConflict_reply_isAConflict) {
    kernel.add("eth0", {.ip = "192.168.1.10"});
    rig.answer("/bin/ping", 0);
    EXPECT_OUTCOME(conflict("eth0", "192.168.1.20"), {.result = 1, .commands = {"/bin/ping -c 1 -w 2 192.168.1.20"}});
}

TEST_F(i_ip_conflict, KOVAIIpConflict_noReply_isNoConflict) {
    kernel.add("eth0", {.ip = "192.168.1.10"});
    for (const int status : {1, 2, 126, 128 + 9, 255}) {
        rig.answer("/bin/ping", status);
        EXPECT_OUTCOME(conflict("eth0", "192.168.1.20"),
                       {.result = 0, .commands = {"/bin/ping -c 1 -w 2 192.168.1.20"}});
    }
}

TEST_F(i_ip_conflict, KOVAIIpConflict_ownAddress_isNotAskedFor) {
    kernel.add("eth0", {.ip = "192.168.1.10"});
    for (const char *own : {"192.168.1.10", "192.168.1.012", "0xc0.168.1.0xA", "3232235786", "192.168.266"}) {
        EXPECT_OUTCOME(conflict("eth0", own), {.result = 0});
    }
}

TEST_F(i_ip_conflict, KOVAIIpConflict_interfaceWithoutAddress_asksForEvery) {
    kernel.add("eth0");
    rig.answer("/bin/ping", 1);
    for (const char *ip : {"192.168.1.10", "0.0.0.0", "2001:db8::10", "fe80::1%eth0"}) {
        EXPECT_OUTCOME(conflict("eth0", ip), {.result = 0, .commands = {std::string("/bin/ping -c 1 -w 2 ") + ip}});
    }
}

TEST_F(i_ip_conflict, KOVAIIpConflict_unknownInterface_failsWithTheLowerCode) {
    EXPECT_OUTCOME(conflict("eth7", "192.168.1.20"),
                   {.result = -1,
                    .code = 0x3400,
                    .unit = "net_lnx_get_ip",
                    .log = {"ERR net_lnx_get_ip:N Cannot get IP of eth7: No such device",
                            "ERR KOVAIIpConflict(N) KOVAILnxGetIP failed.(3400)"}});
}

TEST_F(i_ip_conflict, KOVAIIpConflict_toolThatCannotRun_is2A00) {
    kernel.add("eth0", {.ip = "192.168.1.10"});
    for (const int status : {-1, 127}) {
        rig.answer("/bin/ping", status, "", [] { errno = ENOENT; });
        EXPECT_OUTCOME(
            conflict("eth0", "192.168.1.20"),
            {.result = -1,
             .code = 0x2A00,
             .unit = "i_ip_conflict",
             .log = {"ERR KOVAIIpConflict(N): system(/bin/ping) failed.(strerror=No such file or directory)"},
             .commands = {"/bin/ping -c 1 -w 2 192.168.1.20"}});
    }
}

TEST_F(i_ip_conflict, KOVAIIpConflict_absentTool_isToldByThePlatform) {
    kernel.add("eth0", {.ip = "192.168.1.10"});
    shell("mv /bin/ping /bin/ping.kept");
    rig.let_run("/bin/ping");
    const outcome got = conflict("eth0", "192.168.1.20");
    shell("mv /bin/ping.kept /bin/ping");
    EXPECT_OUTCOME(got, {.result = -1,
                         .code = 0x2A00,
                         .unit = "i_ip_conflict",
                         .log = {"ERR KOVAIIpConflict(N): system(/bin/ping) failed."
                                 "(strerror=No such file or directory)"},
                         .commands = {"/bin/ping -c 1 -w 2 192.168.1.20"}});
}

TEST_F(i_ip_conflict, KOVAIIpConflict_badArguments_areRefused) {
    const auto refused = [](const std::string &condition) { return refusal("i_ip_conflict", condition); };
    EXPECT_OUTCOME(conflict(nullptr, "192.168.1.20"), refused("((void *)0) != szIfname"));
    EXPECT_OUTCOME(conflict("", "192.168.1.20"), refused("'\\0' != *szIfname"));
    EXPECT_OUTCOME(conflict("eth0", nullptr), refused("((void *)0) != szIP"));
    EXPECT_OUTCOME(conflict("eth0", ""), refused("'\\0' != *szIP"));
    EXPECT_OUTCOME(conflict("eth0", "-f"), refused("'-' != *szIP"));
}
