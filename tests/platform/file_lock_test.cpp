#include "platform_test.h"

#include <csignal>

#include <fcntl.h>
#include <unistd.h>

using namespace kova_test;

namespace {

class file_lock : public platform_test {
protected:
    bool is_free(int mode) const {
        return in_child([&] {
                   int fd;
                   return KLIBCFileLockTimeByFile(name_.c_str(), mode, 0, &fd) == 0 ? 0 : 1;
               }) == 0;
    }

    const std::string name_ = path("ifcfg-eth0");
};

} // namespace

TEST_F(file_lock, KLIBCFileLockTimeByFile_exclusive_keepsEverybodyOut) {
    int fd = 7;
    EXPECT_WORKS(KLIBCFileLockTimeByFile(name_.c_str(), 1, 30, &fd), 0);
    ASSERT_GE(fd, 0);
    EXPECT_TRUE(fcntl(fd, F_GETFD) & FD_CLOEXEC);
    EXPECT_FALSE(is_free(1));
    EXPECT_FALSE(is_free(0));
    EXPECT_WORKS(KLIBCFileUnlockByFile(fd), 1);
    EXPECT_TRUE(is_free(1));
}

TEST_F(file_lock, KLIBCFileLockTimeByFile_shared_letsReadersIn) {
    int fd = -1;
    EXPECT_WORKS(KLIBCFileLockTimeByFile(name_.c_str(), 0, 30, &fd), 0);
    EXPECT_TRUE(is_free(0));
    EXPECT_FALSE(is_free(1));
    EXPECT_WORKS(KLIBCFileUnlockByFile(fd), 1);
}

TEST_F(file_lock, KLIBCFileLockTimeByFile_fileReplacedMeanwhile_staysLocked) {
    write_file(name_, "A=1\n");
    int fd = -1;
    EXPECT_WORKS(KLIBCFileLockTimeByFile(name_.c_str(), 1, 30, &fd), 0);
    EXPECT_WORKS(KLIBCFileSetKeyValue(name_.c_str(), "A", "2", "%s=%s\n"), 0);
    EXPECT_EQ(read_file(name_), "A=2\n");
    EXPECT_FALSE(is_free(1));
    EXPECT_EQ(names_in(directory()), std::vector<std::string>{"ifcfg-eth0"});
    EXPECT_WORKS(KLIBCFileUnlockByFile(fd), 1);
}

TEST_F(file_lock, KLIBCFileLockTimeByFile_sameFileByAnotherPath_isTheSameLock) {
    int fd = -1;
    int second = 7;
    EXPECT_WORKS(KLIBCFileLockTimeByFile(name_.c_str(), 1, 30, &fd), 0);
    EXPECT_FAILS(KLIBCFileLockTimeByFile(path("./ifcfg-eth0").c_str(), 1, 0, &second), -1, 0x400);
    EXPECT_EQ(second, -1);
    EXPECT_WORKS(KLIBCFileLockTimeByFile(path("ifcfg-eth1").c_str(), 1, 0, &second), 0);
    EXPECT_WORKS(KLIBCFileUnlockByFile(second), 1);
    EXPECT_WORKS(KLIBCFileUnlockByFile(fd), 1);
}

TEST_F(file_lock, KLIBCFileLockTimeByFile_held_failsAfterTheLimit) {
    int fd = -1;
    int second = -1;
    EXPECT_WORKS(KLIBCFileLockTimeByFile(name_.c_str(), 1, 30, &fd), 0);
    const double time =
        seconds_of([&] { EXPECT_FAILS(KLIBCFileLockTimeByFile(name_.c_str(), 1, 1, &second), -1, 0x400); });
    EXPECT_GT(time, 0.95);
    EXPECT_LT(time, 1 + kDelay);
    EXPECT_WORKS(KLIBCFileUnlockByFile(fd), 1);
}

TEST_F(file_lock, KLIBCFileUnlockByFile_whileAForkedChildLives_releases) {
    int fd = -1;
    EXPECT_WORKS(KLIBCFileLockTimeByFile(name_.c_str(), 1, 30, &fd), 0);
    const pid_t child = start_child([] { return static_cast<int>(sleep(30)); });
    EXPECT_WORKS(KLIBCFileUnlockByFile(fd), 1);
    EXPECT_TRUE(is_free(1));
    kill(child, SIGKILL);
    EXPECT_EQ(wait_for(child), 128 + SIGKILL);
}

TEST_F(file_lock, KLIBCFileLockTimeByFile_badArguments_areRefused) {
    int fd = -1;
    EXPECT_FAILS(KLIBCFileLockTimeByFile(nullptr, 1, 1, &fd), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileLockTimeByFile("", 1, 1, &fd), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileLockTimeByFile(name_.c_str(), 2, 1, &fd), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileLockTimeByFile(name_.c_str(), 1, -1, &fd), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileLockTimeByFile(name_.c_str(), 1, 1, nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileLockTimeByFile(path("missing/file").c_str(), 1, 1, &fd), -1, 0x400);
}

TEST_F(file_lock, KLIBCFileUnlockByFile_noDescriptor_isRefused) {
    EXPECT_FAILS(KLIBCFileUnlockByFile(-1), 0, 0xD00);
    EXPECT_FAILS(KLIBCFileUnlockByFile(987), 0, 0xD00);
}
