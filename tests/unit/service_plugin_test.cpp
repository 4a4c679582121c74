#include "support/rig.h"

#include <kovanetsdk/events.h>

using namespace kova_test;

namespace {

const texts kLocked{"+0x1000006", "-0x1000000"};
const std::string kNoPre = "ERR service_plugin:N Fail to execute service plugin (PRE)";
const std::string kNoPost = "ERR service_plugin:N Fail to execute service plugin (POST)";

class service_plugin : public unit_test {
protected:
    outcome raise(int action, uint32_t flags) {
        return rig.observe([=] { return KLIBServicePlugin(action, flags); });
    }
    /** Both phases of the event; arguments of a handle stay, and each phase sets them again. */
    static texts events(const std::string &arguments) {
        return {"service 4 " + arguments, "service 5 " + arguments + " " + arguments};
    }
    static std::string arguments(int ip, int hostname, int mtu, int action = 0) {
        return "SERVICE_IP_CHANGE=" + std::to_string(ip) + " SERVICE_HOSTNAME_CHANGE=" + std::to_string(hostname) +
               " SERVICE_MTU_CHANGE=" + std::to_string(mtu) + " SERVICE_DAEMON_ACTION=" + std::to_string(action) +
               " RESULT=0";
    }
};

TEST_F(service_plugin, KLIBServicePlugin_flags_becomeArguments) {
    const std::map<uint32_t, std::string> expected{
        {0, arguments(0, 0, 0)},           {0x1, arguments(1, 0, 0)},        {0x2, arguments(0, 1, 0)},
        {0x4, arguments(0, 0, 1)},         {0x3, arguments(1, 1, 0)},        {0x7, arguments(1, 1, 1)},
        {0xfffffff8U, arguments(0, 0, 0)}, {0xffffffffU, arguments(1, 1, 1)}};
    for (const auto &[flags, shown] : expected) {
        EXPECT_OUTCOME(raise(0, flags), {.result = 0, .events = events(shown), .locks = kLocked});
    }
}

TEST_F(service_plugin, KLIBServicePlugin_action_isPassedThrough) {
    for (const int action : {0, 1, -1, INT32_MAX, INT32_MIN}) {
        EXPECT_OUTCOME(raise(action, 0x7),
                       {.result = 0, .events = events(arguments(1, 1, 1, action)), .locks = kLocked});
    }
}

TEST_F(service_plugin, KLIBServicePlugin_failingPre_stillGetsPost) {
    rig.fail("KLIBPluginAction");
    EXPECT_OUTCOME(raise(2, 0x2), {.result = 0,
                                   .code = 0x2A00,
                                   .unit = "platform",
                                   .log = {kNoPre},
                                   .events = events(arguments(0, 1, 0, 2)),
                                   .locks = kLocked});
}

TEST_F(service_plugin, KLIBServicePlugin_failingPost_isTold) {
    rig.fail("KLIBPluginAction", 2);
    EXPECT_OUTCOME(raise(2, 0x2), {.result = 0,
                                   .code = 0x2A00,
                                   .unit = "platform",
                                   .log = {kNoPost},
                                   .events = events(arguments(0, 1, 0, 2)),
                                   .locks = kLocked});
}

TEST_F(service_plugin, KLIBServicePlugin_bothPhasesFail_succeeds) {
    rig.fail_from("KLIBPluginAction");
    EXPECT_OUTCOME(raise(0, 0x1), {.result = 0,
                                   .code = 0x2A00,
                                   .unit = "platform",
                                   .log = {kNoPre, kNoPost},
                                   .events = events(arguments(1, 0, 0)),
                                   .locks = kLocked});
}

TEST_F(service_plugin, KLIBServicePlugin_argumentThatCannotBeSet_skipsThePhase) {
    const texts keys{"SERVICE_IP_CHANGE=1", "SERVICE_HOSTNAME_CHANGE=0", "SERVICE_MTU_CHANGE=0",
                     "SERVICE_DAEMON_ACTION=3", "RESULT=0"};
    std::string set;
    for (size_t i = 0; i < keys.size(); ++i) {
        rig.fail("KLIBPluginSetArgByInt", static_cast<int>(i) + 1);
        EXPECT_OUTCOME(raise(3, 0x1), {.result = 0,
                                       .code = 0x200,
                                       .unit = "platform",
                                       .log = {kNoPre},
                                       .events = {"service 5" + set + " " + arguments(1, 0, 0, 3)},
                                       .locks = kLocked});
        set += " " + keys[i];
    }
    rig.fail_from("KLIBPluginSetArgByInt");
    EXPECT_OUTCOME(raise(3, 0x1),
                   {.result = 0, .code = 0x200, .unit = "platform", .log = {kNoPre, kNoPost}, .locks = kLocked});
}

TEST_F(service_plugin, KLIBServicePlugin_handleThatIsNotOpen_firesNothing) {
    rig.fail_from("KLIBPluginHasInit");
    EXPECT_OUTCOME(raise(0, 0x7), {.result = 0, .log = {kNoPre, kNoPost}, .locks = kLocked});
}

TEST_F(service_plugin, KLIBServicePlugin_eventThatCannotBeOpened_fails) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(raise(0, 0x7), {.result = -1,
                                   .code = 0x200,
                                   .unit = "platform",
                                   .log = {"ERR service_plugin:N Fail to do plugin init[0x0200 platform:N]"},
                                   .locks = kLocked});
}

TEST_F(service_plugin, KLIBServicePlugin_dispatchElsewhere_isWaitedForAndGivenUp) {
    const lock_elsewhere other{0x1000006};
    outcome got = raise(0, 0x7);
    EXPECT_FALSE(got.sleeps.empty());
    got.sleeps.clear();
    EXPECT_OUTCOME(got,
                   {.result = -1, .code = 0x400, .unit = "named_lock", .log = {"ERR service_plugin:N Lock failed"}});
}

TEST_F(service_plugin, KLIBServicePlugin_configurationLock_isNotInTheWay) {
    const lock_elsewhere other{0x106};
    EXPECT_OUTCOME(raise(0, 0x1), {.result = 0, .events = events(arguments(1, 0, 0)), .locks = kLocked});
}

TEST_F(service_plugin, KLIBServiceStopBeforeIPChange_stopsTheRelay) {
    EXPECT_OUTCOME(rig.observe([] { return KLIBServiceStopBeforeIPChange(); }),
                   {.result = 0, .commands = {"/sbin/stop pppoerelay"}});
}

TEST_F(service_plugin, KLIBServiceStopBeforeIPChange_relayThatDoesNotStop_fails) {
    for (const int status : {1, 2, 127, 137, -1}) {
        rig.answer("/sbin/stop", status);
        EXPECT_OUTCOME(rig.observe([] { return KLIBServiceStopBeforeIPChange(); }),
                       {.result = -1, .code = 0x2A00, .unit = "service", .commands = {"/sbin/stop pppoerelay"}});
    }
}

} // namespace
