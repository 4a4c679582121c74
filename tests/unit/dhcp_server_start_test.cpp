#include "support/rig.h"

#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

const std::string kStart = "/etc/rc.network nat-start-dhcp";
const std::string kRestart = "/etc/rc.network nat-restart-dhcp";
const texts kFailed{"ERR dhcp_server_start:N Failed to restart DHCP SERVER"};
const std::vector<int> kOtherStatuses{0, 2, 126, 127, 137, 255, -1};

} // namespace

class dhcp_server_start : public unit_test {
protected:
    outcome start() {
        return rig.observe([] { return DHCPServerStart(); });
    }
    outcome restart() {
        return rig.observe([] { return DHCPServerRestart(); });
    }
    outcome restart_strictly() {
        return rig.observe([] { return KLIBNetDHCPServerRestart(); });
    }
};

TEST_F(dhcp_server_start, DHCPServerStart_statusOne_isTheOnlyFailure) {
    rig.answer(kStart, 1);
    EXPECT_OUTCOME(start(), {.result = 1, .log = kFailed, .commands = {kStart}});
    for (const int status : kOtherStatuses) {
        rig.answer(kStart, status);
        EXPECT_OUTCOME(start(), {.result = 0, .commands = {kStart}});
    }
}

TEST_F(dhcp_server_start, DHCPServerRestart_statusOne_isTheOnlyFailure) {
    rig.answer(kRestart, 1);
    EXPECT_OUTCOME(restart(), {.result = 1, .log = kFailed, .commands = {kRestart}});
    for (const int status : kOtherStatuses) {
        rig.answer(kRestart, status);
        EXPECT_OUTCOME(restart(), {.result = 0, .commands = {kRestart}});
    }
}

TEST_F(dhcp_server_start, DHCPServerRestart_scriptThatCannotBeRun_isNoFailure) {
    rig.let_run("/etc/rc.network");
    shell("rm -f /etc/rc.network");
    EXPECT_OUTCOME(restart(), {.result = 0, .code = 0x2A00, .unit = "exec", .commands = {kRestart}});
    EXPECT_OUTCOME(restart_strictly(), {.result = -1, .code = 0x2A00, .unit = "exec", .commands = {kRestart}});
}

TEST_F(dhcp_server_start, KLIBNetDHCPServerRestart_statusOtherThanZero_failsSilently) {
    EXPECT_OUTCOME(restart_strictly(), {.result = 0, .commands = {kRestart}});
    for (const int status : {1, 2, 127, 137, -1}) {
        rig.answer(kRestart, status);
        EXPECT_OUTCOME(restart_strictly(), {.result = -1, .commands = {kRestart}});
    }
}
