#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/iface.h>
#include <unistd.h>

using namespace kova_test;

/** The list is kept for the process, so every test asks in a process of its own. */
class net_get_local_lan_config : public unit_test {
protected:
    void SetUp() override {
        GTEST_FLAG_SET(death_test_style, "threadsafe");
        unit_test::SetUp();
    }
    outcome get() {
        return rig.observe([&] { return KLIBNetGetLocalLanConfig(names, &count); });
    }
    static void set_list(const std::string &list) {
        write_file("/etc.defaults/kovainfo.conf", "local_lan=\"" + list + "\"\n");
    }
    static std::string many(int number) {
        std::string list;
        for (int i = 0; i < number; ++i) {
            list += "eth" + std::to_string(i) + " ";
        }
        return list;
    }
    [[noreturn]] static void leave() { _exit(HasFailure() ? 1 : 0); }

    char names[32][16] = {};
    int count = 77;
};

#define EXPECT_IN_NEW_PROCESS(...) EXPECT_EXIT({ __VA_ARGS__ leave(); }, ::testing::ExitedWithCode(0), "")

TEST_F(net_get_local_lan_config, KLIBNetGetLocalLanConfig_names_areSplitAtBlanks) {
    EXPECT_IN_NEW_PROCESS({
        set_list("  eth1 wlan0   lan_of_15_bytes a_name_of_16_byt");
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_EQ(4, count);
        EXPECT_STREQ("eth1", names[0]);
        EXPECT_STREQ("wlan0", names[1]);
        EXPECT_STREQ("lan_of_15_bytes", names[2]);
        EXPECT_STREQ("a_name_of_16_by", names[3]);
        EXPECT_STREQ("", names[4]);
    });
}

TEST_F(net_get_local_lan_config, KLIBNetGetLocalLanConfig_list_isReadOnce) {
    EXPECT_IN_NEW_PROCESS({
        set_list("eth1");
        EXPECT_OUTCOME(get(), {.result = 0});
        set_list("eth2 eth3");
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_EQ(1, count);
        EXPECT_STREQ("eth1", names[0]);
    });
}

TEST_F(net_get_local_lan_config, KLIBNetGetLocalLanConfig_missingKey_isAnEmptyList) {
    EXPECT_IN_NEW_PROCESS({
        write_file("/etc.defaults/kovainfo.conf", "maxlanport=2\n");
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_EQ(0, count);
    });
}

TEST_F(net_get_local_lan_config, KLIBNetGetLocalLanConfig_failedRead_isNotKept) {
    EXPECT_IN_NEW_PROCESS({
        EXPECT_OUTCOME(get(), {.result = -1,
                               .code = 0x100,
                               .unit = "net_get_local_lan_config",
                               .log = {"ERR net_get_local_lan_config:N Failed to get [local_lan] from "
                                       "[/etc.defaults/kovainfo.conf], kovaerr=[0x0900]"}});
        EXPECT_EQ(-1, count);
        set_list("eth1");
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_EQ(1, count);
    });
}

TEST_F(net_get_local_lan_config, KLIBNetGetLocalLanConfig_thirtyTwoNames_areTaken) {
    EXPECT_IN_NEW_PROCESS({
        set_list(many(32));
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_EQ(32, count);
        EXPECT_STREQ("eth31", names[31]);
    });
}

TEST_F(net_get_local_lan_config, KLIBNetGetLocalLanConfig_moreThanThirtyTwoNames_areRefusedAsAWhole) {
    EXPECT_IN_NEW_PROCESS({
        for (const int number : {33, 2000}) {
            set_list(many(number));
            EXPECT_OUTCOME(get(), {.result = -1,
                                   .code = 0x100,
                                   .unit = "net_get_local_lan_config",
                                   .log = {"ERR local lan exceed NUM_MAXIFACES"}});
            EXPECT_EQ(-1, count);
            EXPECT_STREQ("", names[0]);
        }
        set_list("eth1");
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_EQ(1, count);
        EXPECT_STREQ("", names[1]);
    });
}

TEST_F(net_get_local_lan_config, KLIBNetGetLocalLanConfig_noOutput_isRefused) {
    const auto refused = [](const std::string &condition) {
        return outcome{.result = -1,
                       .code = 0xD00,
                       .unit = "net_get_local_lan_config",
                       .log = {"ERR net_get_local_lan_config:N Invaild Argument (" + condition + ")=[0]"}};
    };
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetGetLocalLanConfig(nullptr, &count); }), {refused("NULL != names")});
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetGetLocalLanConfig(names, nullptr); }), {refused("NULL != pCount")});
}
