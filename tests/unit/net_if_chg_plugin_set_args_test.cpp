#include "support/rig.h"

#include <kova/plugin.h>
#include <kovanetsdk/events.h>

using namespace kova_test;

namespace {

const char *const kOld[] = {"eth0", "eth1"};
const char *const kNew[] = {"bond0"};

class net_if_chg_plugin_set_args : public unit_test {
protected:
    /** Opens the event as a caller does, sets its arguments, raises it when they could be set, and gives it back. */
    outcome set(const char *const *origin, int origins, const char *const *changed, int number, int result) {
        return rig.observe([&] {
            uint64_t handle = 0;
            EXPECT_EQ(0, KLIBPluginSDKInit("net", "net/ifname_change", &handle));
            const int got = KLIBNetIFChgPluginSetArgs(handle, origin, origins, changed, number, result);
            if (got == 0) {
                EXPECT_EQ(0, KLIBPluginAction(KLIB_PLUGIN_PRE, handle));
            }
            KLIBPluginExit(handle);
            return got;
        });
    }
};

TEST_F(net_if_chg_plugin_set_args, KLIBNetIFChgPluginSetArgs_setsNamesAndResult) {
    EXPECT_OUTCOME(set(kOld, 2, kNew, 1, 0),
                   {.result = 0, .events = {"net/ifname_change 4 ORIGIN_IFNAME=[eth0 eth1] IFNAME=[bond0] RESULT=0"}});
    EXPECT_OUTCOME(set(kNew, 1, kOld, 2, -1),
                   {.result = 0, .events = {"net/ifname_change 4 ORIGIN_IFNAME=[bond0] IFNAME=[eth0 eth1] RESULT=-1"}});
    EXPECT_OUTCOME(set(kOld, 0, kNew, 0, INT32_MIN),
                   {.result = 0, .events = {"net/ifname_change 4 ORIGIN_IFNAME=[] IFNAME=[] RESULT=-2147483648"}});
}

TEST_F(net_if_chg_plugin_set_args, KLIBNetIFChgPluginSetArgs_anySetterFails_failsSilently) {
    for (const int nth : {1, 2}) {
        rig.fail("KLIBPluginSetArgByArray", nth);
        EXPECT_OUTCOME(set(kOld, 2, kNew, 1, 0), {.result = -1, .code = 0x200, .unit = "platform"});
    }
    rig.fail("KLIBPluginSetArgByInt");
    EXPECT_OUTCOME(set(kOld, 2, kNew, 1, 0), {.result = -1, .code = 0x200, .unit = "platform"});
}

TEST_F(net_if_chg_plugin_set_args, KLIBNetIFChgPluginSetArgs_badCountOrName_keepsCodeOfThePlatform) {
    const char *const hole[] = {"eth0", nullptr};
    for (const outcome &got :
         {set(kOld, -1, kNew, 1, 0), set(kOld, 2, kNew, -1, 0), set(hole, 2, kNew, 1, 0), set(kOld, 2, hole, 2, 0)}) {
        EXPECT_OUTCOME(got, {.result = -1, .code = 0xD00, .unit = "plugin"});
    }
}

TEST_F(net_if_chg_plugin_set_args, KLIBNetIFChgPluginSetArgs_missingArgument_isRefused) {
    const auto expect_refused = [&](uint64_t handle, const char *const *origin, const char *const *changed,
                                    const std::string &condition) {
        EXPECT_OUTCOME(rig.observe([&] { return KLIBNetIFChgPluginSetArgs(handle, origin, 1, changed, 1, 0); }),
                       refusal("net_if_chg_plugin_set_args", condition));
    };
    expect_refused(0, kOld, kNew, "0 != hPlugin");
    expect_refused(1, nullptr, kNew, "NULL != rgszOrigin");
    expect_refused(1, kOld, nullptr, "NULL != rgszNew");
}

} // namespace
