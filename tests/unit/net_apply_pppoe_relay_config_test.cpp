#include "support/rig.h"

#include <csignal>
#include <kovanetsdk/pppoe.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_apply_pppoe_relay_config";
const std::string kDirectory = "/etc/sysconfig/pppoe-relay";
const std::string kRelay = "/usr/sbin/pppoe-relay";
const std::string kProcesses = "/tmp/relay-processes";
const std::string kEnabled = "enable=yes\nserver=eth1\n";
const std::string kLocalLan = "TYPE=bridge\nLOCAL_LAN=yes\nPRIMARY=eth0\n";
const std::string kUp = "0x1003\n";
const std::string kDown = "0x1002\n";
const std::string kNoConfig = "ERR net_apply_pppoe_relay_config:N Failed to get interfaces' config";

std::string started(const std::string &ifname, const std::string &server) {
    return kRelay + " -C " + ifname + " -S " + server;
}

/** A process whose command line is that of a relay: arguments separated by blanks. */
class process {
public:
    explicit process(std::string command) : pid_(fork()) {
        if (pid_ == 0) {
            pause();
            _exit(0);
        }
        for (char &byte : command) {
            byte = byte == ' ' ? '\0' : byte;
        }
        const std::string directory = kProcesses + "/" + std::to_string(pid_);
        write_file(directory + "/stat", std::to_string(pid_) + " (pppoe-relay) S 1\n");
        write_file(directory + "/cmdline", command + '\0');
    }
    process(const process &) = delete;
    process &operator=(const process &) = delete;
    ~process() {
        if (ended_by_ < 0) {
            kill(pid_, SIGKILL);
            waitpid(pid_, nullptr, 0);
        }
    }
    /** The signal that ended it, 0 when it runs. */
    int ended_by() {
        int status = 0;
        if (ended_by_ < 0 && waitpid(pid_, &status, WNOHANG) == pid_) {
            ended_by_ = WTERMSIG(status);
        }
        return ended_by_ < 0 ? 0 : ended_by_;
    }
    int wait_for_end() {
        if (ended_by_ < 0) {
            int status = 0;
            waitpid(pid_, &status, 0);
            ended_by_ = WTERMSIG(status);
        }
        return ended_by_;
    }
    /** Goes when it has been told to end, after some pauses. */
    void end_after(test_rig &rig, int pauses = 1) {
        rig.on_sleep([this, pauses](long) mutable {
            if (--pauses == 0) {
                wait_for_end();
                shell("rm -r " + kProcesses + "/" + std::to_string(pid_));
            }
        });
    }

private:
    pid_t pid_;
    int ended_by_ = -1;
};

} // namespace

class net_apply_pppoe_relay_config : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        write_file(kProcesses + "/version", "");
        rig.redirect("/proc", kProcesses);
        lay_out("lbr0", kEnabled);
    }
    void TearDown() override {
        shell("rm -r " + kProcesses);
        unit_test::TearDown();
    }
    void lay_out(const std::string &ifname, const std::string &settings, const std::string &flags = kUp,
                 const std::string &file = kLocalLan) {
        write_file(kDirectory + "/" + ifname, settings);
        write_file(ifcfg(ifname), file);
        rig.replace_file("/sys/class/net/" + ifname + "/flags", flags);
    }
    outcome apply(const char *ifname = "lbr0") {
        return rig.observe([=] { return KOVANetApplyPPPoERelayConfig(ifname); });
    }
    outcome apply_all() {
        return rig.observe([] { return KOVANetApplyPPPoERelayConfigAll(); });
    }
    outcome clear() {
        return rig.observe([] { return KOVANetClearPPPoERelayConfigAll(); });
    }
};

// ---- one interface

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfig_wantedAndNoneRuns_isStarted) {
    EXPECT_OUTCOME(apply(), {.result = 0, .commands = {started("lbr0", "eth1")}});
    process other("/usr/sbin/pppoe-relay -C lbr01 -S eth1");
    process stranger("/usr/sbin/other -C lbr0 -S eth1");
    EXPECT_OUTCOME(apply(), {.result = 0, .commands = {started("lbr0", "eth1")}});
    EXPECT_EQ(0, other.ended_by());
    EXPECT_EQ(0, stranger.ended_by());
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfig_wantedAndRuns_isLeftAlone) {
    for (const char *command : {"/usr/sbin/pppoe-relay -C lbr0 -S eth1", "/usr/sbin/pppoe-relay -C lbr0 -S eth1 -F",
                                "/bin/sh /usr/sbin/pppoe-relay -C lbr0 -S eth1"}) {
        process relay(command);
        EXPECT_OUTCOME(apply(), {.result = 0});
        EXPECT_OUTCOME(apply(), {.result = 0});
        EXPECT_EQ(0, relay.ended_by());
    }
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfig_otherServer_isStartedAnew) {
    for (const char *command : {"/usr/sbin/pppoe-relay -C lbr0 -S eth10", "/usr/sbin/pppoe-relay -C lbr0 -S eth0"}) {
        process relay(command);
        relay.end_after(rig);
        EXPECT_OUTCOME(apply(), {.result = 0, .commands = {started("lbr0", "eth1")}, .sleeps = {25}});
        EXPECT_EQ(SIGTERM, relay.ended_by());
    }
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfig_relayThatTakesItsTime_isWaitedForASecond) {
    process relay("/usr/sbin/pppoe-relay -C lbr0 -S eth0");
    relay.end_after(rig, 3);
    EXPECT_OUTCOME(apply(), {.result = 0, .commands = {started("lbr0", "eth1")}, .sleeps = {25, 25, 25}});
    process other("/usr/sbin/pppoe-relay -C lbr0 -S eth0");
    other.end_after(rig, 100);
    const std::vector<long> second(40, 25);
    EXPECT_OUTCOME(apply(), {.result = 0, .commands = {started("lbr0", "eth1")}, .sleeps = second});
    write_file(kDirectory + "/lbr0", "enable=no\n");
    EXPECT_OUTCOME(apply(), {.result = 0, .sleeps = second});
    EXPECT_EQ(SIGTERM, other.wait_for_end());
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfig_notWanted_isStopped) {
    const struct {
        const char *why;
        std::string settings, flags, file;
    } cases[] = {
        {"off", "enable=no\nserver=eth1\n", kUp, kLocalLan},
        {"no settings", "", kUp, kLocalLan},
        {"down", kEnabled, kDown, kLocalLan},
        {"no bridge", kEnabled, kUp, "DEVICE=lbr0\n"},
        {"bridge of another kind", kEnabled, kUp, "TYPE=bridge\nPRIMARY=eth0\n"},
        {"port of a bridge", kEnabled, kUp, "BRIDGE=br0\n"},
    };
    for (const auto &one : cases) {
        SCOPED_TRACE(one.why);
        lay_out("lbr0", one.settings, one.flags, one.file);
        EXPECT_OUTCOME(apply(), {.result = 0});
        process relay("/usr/sbin/pppoe-relay -C lbr0 -S eth1");
        process other("/usr/sbin/pppoe-relay -C lbr1 -S eth1");
        relay.end_after(rig);
        EXPECT_OUTCOME(apply(), {.result = 0, .sleeps = {25}});
        EXPECT_EQ(SIGTERM, relay.ended_by());
        EXPECT_EQ(0, other.ended_by());
        shell("rm -r " + kProcesses + "/[0-9]*");
    }
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfig_unknownInterface_isStoppedAndGetsAFile) {
    process relay("/usr/sbin/pppoe-relay -C br7 -S eth1");
    relay.end_after(rig);
    EXPECT_OUTCOME(apply("br7"),
                   {.result = 0,
                    .log = {"ERR net_get_bridge_config:N Failed to access [/etc/sysconfig/network-scripts/ifcfg-br7].",
                            "ERR net_get_bridge_config:N Failed to get PPPoE relay config"},
                    .sleeps = {25}});
    EXPECT_EQ(SIGTERM, relay.ended_by());
    EXPECT_EQ("", read_file(kDirectory + "/br7"));
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfig_startThatFails_isMinusOne) {
    for (const int status : {1, 127, 139}) {
        rig.answer(kRelay, status);
        EXPECT_OUTCOME(apply(),
                       {.result = -1,
                        .code = 0x2A00,
                        .unit = kUnit,
                        .log = {"ERR net_apply_pppoe_relay_config:N Failed to start /usr/sbin/pppoe-relay on lbr0"},
                        .commands = {started("lbr0", "eth1")}});
    }
    process relay("/usr/sbin/pppoe-relay -C lbr0 -S eth0");
    EXPECT_EQ(-1, apply().result);
    EXPECT_EQ(SIGTERM, relay.wait_for_end());
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfig_relayThatCannotBeStopped_isNotStartedTwice) {
    const outcome failed{.result = -1,
                         .code = 0x900,
                         .unit = "platform",
                         .log = {"ERR net_apply_pppoe_relay_config:N Failed to kill process"}};
    process relay("/usr/sbin/pppoe-relay -C lbr0 -S eth0");
    rig.fail("KLIBCKill");
    EXPECT_OUTCOME(apply(), failed);
    write_file(kDirectory + "/lbr0", "enable=no\n");
    rig.fail("KLIBCKill");
    EXPECT_OUTCOME(apply(), failed);
    EXPECT_EQ(0, relay.ended_by());
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfig_settingsThatCannotBeRead_leaveTheRelay) {
    process relay("/usr/sbin/pppoe-relay -C lbr0 -S eth0");
    rig.fail("KLIBCFileTouch");
    EXPECT_EQ(-1, apply().result);
    rig.fail("KLIBCFileGetKeyValue");
    EXPECT_EQ(-1, apply().result);
    EXPECT_EQ(texts{}, rig.now.commands);
    EXPECT_EQ(0, relay.ended_by());
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfig_badNames_areRefused) {
    EXPECT_OUTCOME(
        apply(nullptr),
        {.result = -1, .code = 0xD00, .unit = kUnit, .log = {"ERR net_apply_pppoe_relay_config:N Bad parameter"}});
    EXPECT_OUTCOME(apply(""), refusal("net_get_pppoe_relay_config", "'\\0' != *szIfname"));
    EXPECT_OUTCOME(apply("../x"), refusal("net_get_pppoe_relay_config", "is_interface_name(szIfname)"));
}

// ---- all of them

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfigAll_files_areAppliedByName) {
    lay_out("br2", "enable=yes\nserver=eth2\n");
    lay_out("lbr1", "enable=no\nserver=eth2\n");
    write_file(kDirectory + "/.hidden", kEnabled);
    shell("mkdir " + kDirectory + "/directory");
    EXPECT_OUTCOME(apply_all(), {.result = 0, .commands = {started("br2", "eth2"), started("lbr0", "eth1")}});
    EXPECT_EQ((texts{".hidden", "br2", "directory", "lbr0", "lbr1"}), list_dir(kDirectory));
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfigAll_firstFailure_isTheEnd) {
    lay_out("lbr1", kEnabled);
    lay_out("lbr2", kEnabled);
    rig.answer(started("lbr1", "eth1"), 1);
    const outcome got = apply_all();
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ((texts{started("lbr0", "eth1"), started("lbr1", "eth1")}), got.commands);
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfigAll_moreThan128_endThere) {
    shell("rm " + kDirectory + "/lbr0");
    for (int i = 0; i < 130; ++i) {
        lay_out("br" + std::to_string(100 + i), kEnabled);
    }
    const outcome got = apply_all();
    EXPECT_EQ(0, got.result);
    ASSERT_EQ(128U, got.commands.size());
    EXPECT_EQ(started("br100", "eth1"), got.commands.front());
    EXPECT_EQ(started("br227", "eth1"), got.commands.back());
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfigAll_noDirectory_isMade) {
    shell("rm -r " + kDirectory);
    const mode_t old = umask(0);
    EXPECT_OUTCOME(apply_all(), {.result = 0});
    umask(old);
    struct stat status = {};
    ASSERT_EQ(0, stat(kDirectory.c_str(), &status));
    EXPECT_EQ(0754U, status.st_mode & 07777U);
}

TEST_F(net_apply_pppoe_relay_config, KOVANetApplyPPPoERelayConfigAll_failures_areMinusOne) {
    rig.fail("KLIBCSzListAlloc");
    EXPECT_OUTCOME(apply_all(), {.result = -1, .code = 0x200, .unit = "platform", .log = {kNoConfig}});
    rig.fail("KLIBCFileEnumDir");
    EXPECT_OUTCOME(apply_all(), {.result = -1, .code = 0x900, .unit = "platform", .log = {kNoConfig}});
    shell("rm -r " + kDirectory);
    write_file(kDirectory, "in the way\n");
    EXPECT_OUTCOME(apply_all(), {.result = -1,
                                 .code = 0x900,
                                 .unit = kUnit,
                                 .log = {"ERR net_apply_pppoe_relay_config:N Generat directory "
                                         "[/etc/sysconfig/pppoe-relay/] failed(20)",
                                         kNoConfig}});
}

// ---- deleting

TEST_F(net_apply_pppoe_relay_config, KOVANetClearPPPoERelayConfigAll_settings_goAndRelaysStay) {
    process relay("/usr/sbin/pppoe-relay -C lbr0 -S eth1");
    lay_out("br2", kEnabled);
    write_file("/tmp/bait", "bait\n");
    shell("ln -s /tmp/bait " + kDirectory + "/link");
    EXPECT_OUTCOME(clear(), {.result = 0});
    EXPECT_EQ(texts{}, list_dir(kDirectory));
    EXPECT_EQ("bait\n", read_file("/tmp/bait"));
    EXPECT_EQ(0, relay.ended_by());
    EXPECT_OUTCOME(clear(), {.result = 0});
    shell("rm /tmp/bait && rmdir " + kDirectory);
    EXPECT_OUTCOME(clear(), {.result = 0});
    EXPECT_EQ("<absent>", read_file(kDirectory));
}

TEST_F(net_apply_pppoe_relay_config, KOVANetClearPPPoERelayConfigAll_fileThatStays_isLogged) {
    shell("mkdir " + kDirectory + "/directory");
    lay_out("lbr1", kEnabled);
    EXPECT_OUTCOME(
        clear(),
        {.result = 0,
         .log = {"INFO net_apply_pppoe_relay_config:N Failed to unlink [/etc/sysconfig/pppoe-relay/directory]"}});
    EXPECT_EQ((texts{"directory"}), list_dir(kDirectory));
}

TEST_F(net_apply_pppoe_relay_config, KOVANetClearPPPoERelayConfigAll_failures_areMinusOne) {
    rig.fail("KLIBCSzListAlloc");
    EXPECT_OUTCOME(clear(), {.result = -1,
                             .code = 0x200,
                             .unit = kUnit,
                             .log = {"ERR net_apply_pppoe_relay_config:N Failed to alloc memory for list"}});
    rig.fail("KLIBCFileEnumDir");
    EXPECT_OUTCOME(clear(),
                   {.result = -1,
                    .code = 0x900,
                    .unit = "platform",
                    .log = {"ERR net_apply_pppoe_relay_config:N Failed to enum [/etc/sysconfig/pppoe-relay/]"}});
    EXPECT_EQ((texts{"lbr0"}), list_dir(kDirectory));
    shell("rm -r " + kDirectory);
    write_file(kDirectory, "in the way\n");
    EXPECT_OUTCOME(clear(), {.result = -1, .code = 0x900, .unit = kUnit});
    EXPECT_EQ("in the way\n", read_file(kDirectory));
}
