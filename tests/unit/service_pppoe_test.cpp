#include "support/rig.h"

#include <kovanetsdk/pppoe.h>

using namespace kova_test;

namespace {

const std::string kInfo = "/etc/kovainfo.conf";
const std::string kStart = "/usr/sbin/pppoe-start";
const std::string kStop = "/usr/sbin/pppoe-stop";
const std::string kYes = "pppoe_enable=\"yes\"\n";
const std::string kNo = "pppoe_enable=\"no\"\n";

} // namespace

class service_pppoe : public unit_test {
protected:
    outcome service(int op) {
        return rig.observe([=] { return KOVAPPPoEService(op); });
    }
};

TEST_F(service_pppoe, KOVAPPPoEService_start_isMarkedBeforeItRuns) {
    std::string marked;
    rig.answer(kStart, 0, "", [&] { marked = read_file(kInfo); });
    EXPECT_OUTCOME(service(1), {.result = 0, .commands = {kStart}});
    EXPECT_EQ(kYes, marked);
    EXPECT_EQ(kYes, read_file(kInfo));
}

TEST_F(service_pppoe, KOVAPPPoEService_startThatFails_isMarkedOff) {
    for (const int status : {1, 2, 18, 19, 20, 127, 137, -1}) {
        rig.answer(kStart, status);
        EXPECT_OUTCOME(service(1), {.result = status == 19 ? 19 : -1, .commands = {kStart}});
        EXPECT_EQ(kNo, read_file(kInfo));
    }
}

TEST_F(service_pppoe, KOVAPPPoEService_startThatCannotBeMarked_doesNotRun) {
    rig.fail("KLIBCINFOSetKeyValue");
    EXPECT_OUTCOME(service(1), {.result = -1, .code = 0xB00, .unit = "platform"});
    EXPECT_EQ(kNo, read_file(kInfo));
}

TEST_F(service_pppoe, KOVAPPPoEService_stop_isMarkedWhateverTheScriptAnswers) {
    for (const int status : {0, 1, 127, -1}) {
        write_file(kInfo, kYes);
        std::string marked;
        rig.answer(kStop, status, "", [&] { marked = read_file(kInfo); });
        EXPECT_OUTCOME(service(0), {.result = 0, .commands = {kStop}});
        EXPECT_EQ(kNo, marked);
        EXPECT_EQ(kNo, read_file(kInfo));
    }
}

TEST_F(service_pppoe, KOVAPPPoEService_stopThatCannotBeMarked_doesNotRun) {
    rig.fail("KLIBCINFOSetKeyValue");
    EXPECT_OUTCOME(service(0), {.result = -1, .code = 0xB00, .unit = "platform"});
    EXPECT_EQ(kYes, read_file(kInfo));
}

TEST_F(service_pppoe, KOVAPPPoEService_otherOperations_areRefused) {
    for (const int op : {-1, 2, 19, 2147483647, -2147483647 - 1}) {
        EXPECT_OUTCOME(service(op), refusal("service_pppoe", "(op == 1 || op == 0)"));
    }
    EXPECT_EQ("<absent>", read_file(kInfo));
}
