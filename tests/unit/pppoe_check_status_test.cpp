#include "support/rig.h"

#include <csignal>
#include <kova/core.h>
#include <kovanetsdk/pppoe.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace kova_test;

namespace {

const std::string kInfo = "/etc/kovainfo.conf";
const std::string kConf = "/etc/ppp/pppoe.conf";
const std::string kStop = "/usr/sbin/pppoe-stop";
const std::string kYes = "pppoe_enable=\"yes\"\n";
const std::string kNo = "pppoe_enable=\"no\"\n";
const std::string kUnit = "pppoe_check_status";

texts locks(int fix) {
    return {fix != 0 ? "+0x806" : "+0x805", "-0x800"};
}

/** A process of the connection's name while this lives. */
class connection {
public:
    connection() : pid_(fork()) {
        if (pid_ == 0) {
            execl("/bin/sleep", "pppoe-connect", "600", static_cast<char *>(nullptr));
            _exit(127);
        }
        while (KLIBCPs("pppoe-connect", nullptr, 0, 0) == 0 && waitpid(pid_, nullptr, WNOHANG) == 0) {
        }
    }
    connection(const connection &) = delete;
    connection &operator=(const connection &) = delete;
    ~connection() {
        kill(pid_, SIGKILL);
        waitpid(pid_, nullptr, 0);
    }

private:
    pid_t pid_;
};

} // namespace

class pppoe_check_status : public unit_test {
protected:
    outcome check(int fix) {
        return rig.observe([=] { return KOVAPPPoECheckStatus(fix); });
    }
    outcome disable(const char *ifname) {
        return rig.observe([=] { return KLIBDisablePPPoEOnIf(ifname); });
    }
};

TEST_F(pppoe_check_status, KOVAPPPoECheckStatus_enabledAndRunning_isOne) {
    const connection up;
    for (const char *word : {"yes", "YES", "Yes"}) {
        for (const int fix : {0, 1, -1}) {
            write_file(kInfo, std::string("pppoe_enable=\"") + word + "\"\n");
            EXPECT_OUTCOME(check(fix), {.result = 1, .locks = locks(fix)});
            EXPECT_EQ(std::string("pppoe_enable=\"") + word + "\"\n", read_file(kInfo));
        }
    }
}

TEST_F(pppoe_check_status, KOVAPPPoECheckStatus_enabledButDown_isSwitchedOffWhenAsked) {
    write_file(kInfo, kYes);
    EXPECT_OUTCOME(check(0), {.result = 0, .locks = locks(0)});
    EXPECT_EQ(kYes, read_file(kInfo));
    EXPECT_OUTCOME(check(1), {.result = 0, .locks = locks(1)});
    EXPECT_EQ(kNo, read_file(kInfo));
}

TEST_F(pppoe_check_status, KOVAPPPoECheckStatus_disabledButRunning_isStopped) {
    const connection up;
    for (const char *word : {"no", "", "y", "yes!"}) {
        for (const int fix : {0, 1}) {
            write_file(kInfo, std::string("pppoe_enable=\"") + word + "\"\n");
            EXPECT_OUTCOME(check(fix), {.result = 0, .commands = {kStop}, .locks = locks(fix)});
        }
    }
    rig.answer(kStop, 1);
    EXPECT_EQ(0, check(0).result);
}

TEST_F(pppoe_check_status, KOVAPPPoECheckStatus_disabledAndDown_isZero) {
    write_file(kInfo, kNo);
    EXPECT_OUTCOME(check(1), {.result = 0, .locks = locks(1)});
}

TEST_F(pppoe_check_status, KOVAPPPoECheckStatus_noKey_isZeroWithoutAStop) {
    const connection up;
    write_file(kInfo, "dns_mode=\"static\"\n");
    EXPECT_OUTCOME(check(1), {.result = 0, .locks = locks(1)});
}

TEST_F(pppoe_check_status, KOVAPPPoECheckStatus_failures_areMinusOneWithTheLockGivenBack) {
    EXPECT_OUTCOME(check(1), {.result = -1, .code = 0x900, .unit = "key_value", .locks = locks(1)});
    write_file(kInfo, kYes);
    rig.fail("KLIBCFileSetKeyValue");
    EXPECT_OUTCOME(check(1), {.result = -1, .code = 0xB00, .unit = "platform", .locks = locks(1)});
    EXPECT_EQ(kYes, read_file(kInfo));
    rig.fail("KLIBCFileUnlock");
    EXPECT_OUTCOME(check(0), {.result = -1, .code = 0xD00, .unit = "platform", .locks = locks(0)});
}

TEST_F(pppoe_check_status, KOVAPPPoECheckStatus_processesThatCannotBeListed_areMinusOne) {
    write_file(kInfo, kYes);
    rig.hide("/proc");
    const outcome got = check(1);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ("process", got.unit);
    EXPECT_EQ(kYes, read_file(kInfo));
    write_file(kInfo, kNo);
    EXPECT_EQ(0, check(1).result);
    EXPECT_EQ(texts{}, rig.now.commands);
}

TEST_F(pppoe_check_status, KOVAPPPoECheckStatus_lockThatCannotBeHad_is400) {
    write_file(kInfo, kYes);
    for (const int fix : {0, 1}) {
        rig.fail("KLIBCFileLock");
        EXPECT_OUTCOME(check(fix), {.result = -1,
                                    .code = 0x400,
                                    .unit = kUnit,
                                    .log = {"ERR pppoe_check_status:N KLIBCFileLock() failed.(400)"}});
    }
    EXPECT_EQ(kYes, read_file(kInfo));
    const lock_elsewhere holder(0x805);
    EXPECT_EQ(0, check(0).result) << "readers share";
    EXPECT_EQ(-1, check(1).result);
    EXPECT_EQ(kYes, read_file(kInfo));
}

// ---- an interface that is about to change

TEST_F(pppoe_check_status, KLIBDisablePPPoEOnIf_connectionOverIt_isStopped) {
    const connection up;
    write_file(kInfo, kYes);
    write_file(kConf, "ETH=eth0\n");
    EXPECT_OUTCOME(disable("eth0"), {.result = 0, .commands = {kStop}, .locks = locks(1)});
    EXPECT_EQ(kNo, read_file(kInfo));
}

TEST_F(pppoe_check_status, KLIBDisablePPPoEOnIf_connectionOverAnother_isLeftAlone) {
    const connection up;
    write_file(kConf, "ETH=eth0\n");
    for (const char *ifname : {"eth1", "eth00", "eth", "eth0.10", "ETH0"}) {
        write_file(kInfo, kYes);
        EXPECT_OUTCOME(disable(ifname), {.result = 0, .locks = locks(1)});
        EXPECT_EQ(kYes, read_file(kInfo));
    }
}

TEST_F(pppoe_check_status, KLIBDisablePPPoEOnIf_noConnection_isNothingToDo) {
    write_file(kInfo, kNo);
    EXPECT_OUTCOME(disable("eth0"), {.result = 0, .locks = locks(1)});
}

TEST_F(pppoe_check_status, KLIBDisablePPPoEOnIf_failures_areMinusOne) {
    EXPECT_EQ(-1, disable("eth0").result) << "status";
    const connection up;
    write_file(kInfo, kYes);
    EXPECT_OUTCOME(disable("eth0"),
                   {.result = -1,
                    .code = 0x900,
                    .unit = "key_value",
                    .log = {"ERR pppoe_config_set:N Failed to get PPPoE ETH setting.[0x0900 key_value:N]"},
                    .locks = locks(1)});
    write_file(kConf, "ETH=eth0\n");
    rig.fail("KLIBCINFOSetKeyValue");
    EXPECT_OUTCOME(disable("eth0"), {.result = -1, .code = 0xB00, .unit = "platform", .locks = locks(1)});
    EXPECT_EQ(kYes, read_file(kInfo));
}

TEST_F(pppoe_check_status, KLIBDisablePPPoEOnIf_badNames_areRefused) {
    EXPECT_OUTCOME(disable(nullptr), refusal(kUnit, "((void *)0) != szIfname"));
    EXPECT_OUTCOME(disable(""), refusal(kUnit, "'\\0' != *szIfname"));
}
