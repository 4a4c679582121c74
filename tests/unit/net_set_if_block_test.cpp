#include "support/rig.h"

#include <kova/core.h>
#include <kovanetsdk/iface.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace kova_test;

namespace {

const std::string kFile = "/etc/sysconfig/network-scripts/ifcfg-eth0";
const texts kLocked{"file+" + kFile, "file-"};

} // namespace

class net_set_if_block : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        write_file(kFile, "DEVICE=eth0\n");
    }
    outcome set(unsigned mask, int on) {
        return rig.observe([=] { return KOVANetSetIfBlock("eth0", mask, on); });
    }
    static outcome failure(unsigned code, const std::string &unit, const texts &log, const texts &locks = kLocked) {
        return {.result = -1, .code = code, .unit = unit, .log = log, .locks = locks};
    }
};

TEST_F(net_set_if_block, KOVANetSetIfBlock_bad_name_is_refused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetSetIfBlock(nullptr, 1, 1); }),
                   refusal("net_set_if_block", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetSetIfBlock("", 1, 1); }),
                   refusal("net_set_if_block", "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetSetIfBlock(name.c_str(), 1, 1); }),
                       refusal("net_set_if_block", "is_interface_name(szIfname)"));
    }
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_reason_is_noted_and_counted_once) {
    EXPECT_OUTCOME(set(1, 1), {.locks = kLocked});
    EXPECT_EQ("DEVICE=eth0\nBLOCK_HA=\"yes\"\nBLOCK_CNT=\"1\"\n", read_file(kFile));
    EXPECT_OUTCOME(set(1, 1), {.locks = kLocked});
    EXPECT_EQ("DEVICE=eth0\nBLOCK_HA=\"yes\"\nBLOCK_CNT=\"1\"\n", read_file(kFile));
    EXPECT_OUTCOME(set(8, 1), {.locks = kLocked});
    EXPECT_EQ("DEVICE=eth0\nBLOCK_HA=\"yes\"\nBLOCK_CNT=\"2\"\nBLOCK_ORLENA=\"yes\"\n", read_file(kFile));
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_reason_is_taken_back_once) {
    write_file(kFile, "BLOCK_HA=\"yes\"\nBLOCK_CNT=\"2\"\nBLOCK_AHA=\"yes\"\n");
    EXPECT_OUTCOME(set(1, 0), {.locks = kLocked});
    EXPECT_EQ("BLOCK_HA=\"no\"\nBLOCK_CNT=\"1\"\nBLOCK_AHA=\"yes\"\n", read_file(kFile));
    EXPECT_OUTCOME(set(1, 0), {.locks = kLocked});
    EXPECT_EQ("BLOCK_HA=\"no\"\nBLOCK_CNT=\"1\"\nBLOCK_AHA=\"yes\"\n", read_file(kFile));
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_reasons_are_handled_in_the_order_of_their_bits) {
    EXPECT_OUTCOME(set(0xffffffff, 1), {.locks = kLocked});
    EXPECT_EQ("DEVICE=eth0\nBLOCK_HA=\"yes\"\nBLOCK_CNT=\"4\"\nBLOCK_AHA=\"yes\"\nBLOCK_VIRTUAL=\"yes\"\n"
              "BLOCK_ORLENA=\"yes\"\n",
              read_file(kFile));
    EXPECT_OUTCOME(set(2 | 4, 0), {.locks = kLocked});
    EXPECT_EQ("DEVICE=eth0\nBLOCK_HA=\"yes\"\nBLOCK_CNT=\"2\"\nBLOCK_AHA=\"no\"\nBLOCK_VIRTUAL=\"no\"\n"
              "BLOCK_ORLENA=\"yes\"\n",
              read_file(kFile));
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_unknown_bits_change_nothing) {
    for (const unsigned mask : {0U, 0x10U, 0xfffffff0U}) {
        EXPECT_OUTCOME(set(mask, 1), {.locks = kLocked});
        EXPECT_EQ("DEVICE=eth0\n", read_file(kFile));
    }
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_other_switch_values_write_no_and_count) {
    EXPECT_OUTCOME(set(4, 2), {.locks = kLocked});
    EXPECT_EQ("DEVICE=eth0\nBLOCK_VIRTUAL=\"no\"\nBLOCK_CNT=\"1\"\n", read_file(kFile));
    EXPECT_OUTCOME(set(4, -1), {.locks = kLocked});
    EXPECT_EQ("DEVICE=eth0\nBLOCK_VIRTUAL=\"no\"\nBLOCK_CNT=\"2\"\n", read_file(kFile));
    write_file(kFile, "BLOCK_VIRTUAL=yes\n");
    EXPECT_OUTCOME(set(4, 2), {.locks = kLocked});
    EXPECT_EQ("BLOCK_VIRTUAL=yes\n", read_file(kFile));
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_value_that_begins_with_yes_is_noted) {
    write_file(kFile, "BLOCK_HA=yesterday, and more of it than fits\nBLOCK_CNT=1\n");
    EXPECT_OUTCOME(set(1, 1), {.locks = kLocked});
    EXPECT_EQ("BLOCK_HA=yesterday, and more of it than fits\nBLOCK_CNT=1\n", read_file(kFile));
    EXPECT_OUTCOME(set(1, 0), {.locks = kLocked});
    EXPECT_EQ("BLOCK_HA=\"no\"\nBLOCK_CNT=\"0\"\n", read_file(kFile));
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_count_may_be_anything) {
    const std::map<std::string, std::string> counts{{"", "-1"},
                                                    {"many", "-1"},
                                                    {"-5", "-6"},
                                                    {"7 of them", "6"},
                                                    {"99999999999999999999999999", "999999999999998"}};
    for (const auto &[before, after] : counts) {
        write_file(kFile, "BLOCK_HA=yes\nBLOCK_CNT=" + before + "\n");
        EXPECT_OUTCOME(set(1, 0), {.locks = kLocked});
        EXPECT_EQ("BLOCK_HA=\"no\"\nBLOCK_CNT=\"" + after + "\"\n", read_file(kFile));
    }
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_without_file_fails) {
    shell("rm " + kFile);
    EXPECT_OUTCOME(set(1, 1), failure(0x900, "key_value",
                                      {"ERR net_set_if_block:N Failed to get key [BLOCK_HA]",
                                       "ERR net_set_if_block:N Failed to set mode [BLOCK_HA] of [eth0]"}));
    EXPECT_EQ("<absent>", read_file(kFile));
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_lock_not_had_changes_nothing) {
    rig.fail("KLIBCFileLockTimeByFile");
    EXPECT_OUTCOME(set(1, 1), failure(0x400, "platform",
                                      {"ERR net_set_if_block:N KLIBCFileLockTimeByFile failed!",
                                       "ERR net_set_if_block:N Failed to get lock"},
                                      {}));
    EXPECT_EQ("DEVICE=eth0\n", read_file(kFile));
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_lock_held_elsewhere_is_waited_for_and_given_up) {
    int ready[2];
    ASSERT_EQ(0, pipe(ready));
    const pid_t holder = fork();
    if (holder == 0) {
        int fd = -1;
        const char answer = KLIBCFileLockTimeByFile(kFile.c_str(), 1, 1, &fd) == 0 ? 'y' : 'n';
        (void)!write(ready[1], &answer, 1);
        pause();
        _exit(0);
    }
    char answer = 'n';
    EXPECT_EQ(1, read(ready[0], &answer, 1));
    EXPECT_EQ('y', answer);
    outcome got = set(1, 1);
    long waited = 0;
    for (const long slept : got.sleeps) {
        waited += slept;
    }
    EXPECT_GE(waited, 29000);
    EXPECT_LE(waited, 31000);
    got.sleeps.clear();
    EXPECT_EQ(
        (texts{"ERR net_set_if_block:N KLIBCFileLockTimeByFile failed!", "ERR net_set_if_block:N Failed to get lock"}),
        got.log);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x400U, got.code);
    kill(holder, SIGKILL);
    waitpid(holder, nullptr, 0);
    close(ready[0]);
    close(ready[1]);
    EXPECT_EQ("DEVICE=eth0\n", read_file(kFile));
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_lock_not_released_is_told) {
    rig.fail("KLIBCFileUnlockByFile");
    EXPECT_OUTCOME(set(1, 1), failure(0xD00, "platform",
                                      {"ERR net_set_if_block:N Failed to release file lock of [" + kFile + "]"}));
    EXPECT_EQ("DEVICE=eth0\nBLOCK_HA=\"yes\"\nBLOCK_CNT=\"1\"\n", read_file(kFile));
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_first_failure_ends_the_call) {
    struct step {
        const char *operation;
        int nth;
        unsigned code;
        texts log;
        std::string file;
    };
    const std::string ha = "DEVICE=eth0\nBLOCK_HA=\"yes\"\nBLOCK_CNT=\"1\"\n";
    const std::string no_ha = "ERR net_set_if_block:N Failed to set mode [BLOCK_HA] of [eth0]";
    const std::string no_aha = "ERR net_set_if_block:N Failed to set mode [BLOCK_AHA] of [eth0]";
    const std::string get = "ERR net_set_if_block:N Failed to get key ";
    const std::string set_key = "ERR net_set_if_block:N Failed to set key ";
    const step steps[] = {
        {"KLIBCFileGetKeyValue", 1, 0x900, {get + "[BLOCK_HA]", no_ha}, "DEVICE=eth0\n"},
        {"KLIBCFileSetKeyValue", 1, 0xB00, {set_key + "[BLOCK_HA] with value [yes]", no_ha}, "DEVICE=eth0\n"},
        {"KLIBCFileGetKeyValue", 2, 0x900, {get + "[BLOCK_CNT]", no_ha}, "DEVICE=eth0\nBLOCK_HA=\"yes\"\n"},
        {"KLIBCFileSetKeyValue",
         2,
         0xB00,
         {set_key + "[BLOCK_CNT] with value [1]", no_ha},
         "DEVICE=eth0\nBLOCK_HA=\"yes\"\n"},
        {"KLIBCFileGetKeyValue", 3, 0x900, {get + "[BLOCK_AHA]", no_aha}, ha},
        {"KLIBCFileSetKeyValue", 3, 0xB00, {set_key + "[BLOCK_AHA] with value [yes]", no_aha}, ha},
    };
    for (const step &failing : steps) {
        write_file(kFile, "DEVICE=eth0\n");
        rig.fail(failing.operation, failing.nth);
        EXPECT_OUTCOME(set(1 | 2 | 4, 1), failure(failing.code, "platform", failing.log));
        EXPECT_EQ(failing.file, read_file(kFile));
    }
}

TEST_F(net_set_if_block, KOVANetSetIfBlock_processes_at_once_lose_no_count) {
    std::vector<pid_t> children;
    for (const unsigned mask : {1U, 2U, 4U, 8U}) {
        const pid_t child = fork();
        if (child == 0) {
            _exit(KOVANetSetIfBlock("eth0", mask, 1) == 0 ? 0 : 1);
        }
        children.push_back(child);
    }
    for (const pid_t child : children) {
        int status = -1;
        waitpid(child, &status, 0);
        EXPECT_EQ(0, status);
    }
    char count[8];
    KLIBCFileGetKeyValue(kFile.c_str(), "BLOCK_CNT", count, sizeof count, 0);
    EXPECT_STREQ("4", count);
}
