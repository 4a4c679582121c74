#include "platform_test.h"

#include <csignal>
#include <thread>

#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

using namespace kova_test;

namespace {

constexpr uint32_t kShared = 0x4205;
constexpr uint32_t kExclusive = 0x4206;
constexpr uint32_t kName = 0x4200;

/** @return whether another process could take a lock now */
bool is_free(uint32_t lock) {
    return in_child([lock] { return KLIBCFileLock(lock, 0) == 0 ? 0 : 1; }) == 0;
}

class named_lock : public testing::Test {
protected:
    // whatever a test has left held
    ~named_lock() override {
        for (int i = 0; i < 8; i++)
            KLIBCFileUnlock(kName);
    }
};

/** A child that takes a lock and keeps it until it is let go or killed. */
class holder {
public:
    explicit holder(uint32_t lock) {
        EXPECT_EQ(pipe2(ready_, O_CLOEXEC), 0);
        EXPECT_EQ(pipe2(go_, O_CLOEXEC), 0);
        pid_ = start_child([&] {
            close(go_[1]);
            const char result = KLIBCFileLock(lock, 1) == 0 ? '0' : '1';
            if (write(ready_[1], &result, 1) != 1)
                return 1;
            char byte;
            (void)!read(go_[0], &byte, 1);
            return KLIBCFileUnlock(lock & ~0xFFU);
        });
        close(ready_[1]);
        close(go_[0]);
        char result = '?';
        EXPECT_EQ(read(ready_[0], &result, 1), 1);
        EXPECT_EQ(result, '0');
    }
    ~holder() {
        if (pid_ > 0)
            let_go();
        close(ready_[0]);
    }
    holder(const holder &) = delete;
    holder &operator=(const holder &) = delete;
    void let_go() {
        close(go_[1]);
        EXPECT_EQ(wait_for(pid_), 0);
        pid_ = 0;
    }
    void die() {
        kill(pid_, SIGKILL);
        EXPECT_EQ(wait_for(pid_), 128 + SIGKILL);
        close(go_[1]);
        pid_ = 0;
    }

private:
    int ready_[2];
    int go_[2];
    pid_t pid_;
};

} // namespace

TEST_F(named_lock, KLIBCFileLock_exclusive_keepsEverybodyOut) {
    EXPECT_WORKS(KLIBCFileLock(kExclusive, 5), 0);
    EXPECT_FALSE(is_free(kShared));
    EXPECT_FALSE(is_free(kExclusive));
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_TRUE(is_free(kExclusive));
}

TEST_F(named_lock, KLIBCFileLock_shared_letsReadersIn) {
    EXPECT_WORKS(KLIBCFileLock(kShared, 5), 0);
    EXPECT_TRUE(is_free(kShared));
    EXPECT_FALSE(is_free(kExclusive));
}

TEST_F(named_lock, KLIBCFileLock_makerKilledBeforeTheModeWasRight_isPutRight) {
    ASSERT_EQ(KLIBCFileLock(kShared, 5), 0);
    ASSERT_EQ(chmod("/run/lock/kova/4200", 0600), 0);
    ASSERT_EQ(chmod("/run/lock/kova", 0700), 0);
    EXPECT_EQ(in_child([] { return KLIBCFileLock(kShared, 0); }), 0);
    struct stat status;
    ASSERT_EQ(stat("/run/lock/kova", &status), 0);
    EXPECT_EQ(status.st_mode, S_IFDIR | 0755U);
    ASSERT_EQ(stat("/run/lock/kova/4200", &status), 0);
    EXPECT_EQ(status.st_mode, S_IFREG | 0644U);
}

TEST_F(named_lock, KLIBCFileLock_otherName_isIndependent) {
    EXPECT_WORKS(KLIBCFileLock(kExclusive, 5), 0);
    EXPECT_WORKS(KLIBCFileLock(0x4306, 5), 0);
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_TRUE(is_free(kExclusive));
    EXPECT_FALSE(is_free(0x4305));
    EXPECT_WORKS(KLIBCFileUnlock(0x4300), 0);
}

TEST_F(named_lock, KLIBCFileLock_heldElsewhere_failsAfterTheWait) {
    holder other{kExclusive};
    EXPECT_LT(seconds_of([] { EXPECT_FAILS(KLIBCFileLock(kShared, 0), -1, 0x400); }), kDelay);
    const double time = seconds_of([] { EXPECT_FAILS(KLIBCFileLock(kShared, 1), -1, 0x400); });
    EXPECT_GT(time, 0.95);
    EXPECT_LT(time, 1 + kDelay);
    other.let_go();
    EXPECT_WORKS(KLIBCFileLock(kShared, 0), 0);
}

TEST_F(named_lock, KLIBCFileLock_releasedMeanwhile_isTakenSoon) {
    holder other{kExclusive};
    std::thread release{[&] {
        usleep(200 * 1000);
        other.let_go();
    }};
    const double time = seconds_of([] { EXPECT_WORKS(KLIBCFileLock(kExclusive, 60), 0); });
    release.join();
    EXPECT_GT(time, 0.15);
    EXPECT_LT(time, kDelay);
}

TEST_F(named_lock, KLIBCFileLock_again_isCounted) {
    EXPECT_WORKS(KLIBCFileLock(kShared, 5), 0);
    EXPECT_WORKS(KLIBCFileLock(kShared, 5), 0);
    EXPECT_WORKS(KLIBCFileLock(kShared, 5), 0);
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_FALSE(is_free(kExclusive));
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_TRUE(is_free(kExclusive));
}

TEST_F(named_lock, KLIBCFileLock_sharedUnderExclusive_keepsTheStrongerMode) {
    EXPECT_WORKS(KLIBCFileLock(kExclusive, 5), 0);
    EXPECT_WORKS(KLIBCFileLock(kShared, 5), 0);
    EXPECT_FALSE(is_free(kShared));
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_FALSE(is_free(kShared));
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_TRUE(is_free(kExclusive));
}

TEST_F(named_lock, KLIBCFileLock_exclusiveUnderShared_upgrades) {
    EXPECT_WORKS(KLIBCFileLock(kShared, 5), 0);
    EXPECT_WORKS(KLIBCFileLock(kExclusive, 5), 0);
    EXPECT_FALSE(is_free(kShared));
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_TRUE(is_free(kExclusive));
}

TEST_F(named_lock, KLIBCFileLock_upgradeRefused_keepsTheSharedLock) {
    holder other{kShared};
    EXPECT_WORKS(KLIBCFileLock(kShared, 5), 0);
    const double time = seconds_of([] { EXPECT_FAILS(KLIBCFileLock(kExclusive, 1), -1, 0x400); });
    EXPECT_GT(time, 0.95);
    EXPECT_LT(time, 1 + kDelay);
    other.let_go();
    EXPECT_FALSE(is_free(kExclusive));
    EXPECT_TRUE(is_free(kShared));
    // the failed one is not counted
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_TRUE(is_free(kExclusive));
}

TEST_F(named_lock, KLIBCFileLock_upgrade_waitsForTheOtherReader) {
    holder other{kShared};
    EXPECT_WORKS(KLIBCFileLock(kShared, 5), 0);
    std::thread release{[&] {
        usleep(200 * 1000);
        other.let_go();
    }};
    EXPECT_WORKS(KLIBCFileLock(kExclusive, 60), 0);
    release.join();
    EXPECT_FALSE(is_free(kShared));
}

TEST_F(named_lock, KLIBCFileLock_deadOwner_isFree) {
    holder other{kExclusive};
    EXPECT_FALSE(is_free(kShared));
    other.die();
    EXPECT_WORKS(KLIBCFileLock(kExclusive, 1), 0);
}

TEST_F(named_lock, KLIBCFileLock_deadOwnerWithLivingChild_isFree) {
    int pid_pipe[2];
    ASSERT_EQ(pipe(pid_pipe), 0);
    const int status = in_child([&] {
        if (KLIBCFileLock(kExclusive, 1) != 0)
            return 1;
        start_child([&] {
            const pid_t self = getpid(); // told by the child itself, which has let go of the lock by then
            return write(pid_pipe[1], &self, sizeof self) == sizeof self ? static_cast<int>(sleep(30)) : 1;
        });
        return kill(getpid(), SIGKILL);
    });
    EXPECT_EQ(status, 128 + SIGKILL);
    pid_t survivor = 0;
    ASSERT_EQ(read(pid_pipe[0], &survivor, sizeof survivor), static_cast<ssize_t>(sizeof survivor));
    EXPECT_EQ(kill(survivor, 0), 0);
    EXPECT_TRUE(is_free(kExclusive));
    kill(survivor, SIGKILL);
    close(pid_pipe[0]);
    close(pid_pipe[1]);
}

TEST_F(named_lock, KLIBCFileLock_forkedChild_neitherHoldsNorReleases) {
    EXPECT_WORKS(KLIBCFileLock(kExclusive, 5), 0);
    const int status = in_child([] {
        if (KLIBCFileLock(kShared, 0) != -1)
            return 1;
        return KLIBCFileUnlock(kName);
    });
    EXPECT_EQ(status, 0);
    EXPECT_FALSE(is_free(kShared));
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_TRUE(is_free(kExclusive));
}

TEST_F(named_lock, KLIBCFileUnlock_whileAForkedChildLives_releases) {
    EXPECT_WORKS(KLIBCFileLock(kExclusive, 5), 0);
    const pid_t child = start_child([] { return static_cast<int>(sleep(30)); });
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_TRUE(is_free(kExclusive));
    kill(child, SIGKILL);
    EXPECT_EQ(wait_for(child), 128 + SIGKILL);
}

TEST_F(named_lock, KLIBCFileLock_programStartedUnderIt_doesNotKeepIt) {
    const int status = in_child([] {
        const char *const argv[] = {"/bin/sleep", "2", nullptr};
        return KLIBCFileLock(kExclusive, 1) == 0 && KLIBCExecv("/bin/sleep", argv, 0) == 0 ? kill(getpid(), SIGKILL)
                                                                                           : 1;
    });
    EXPECT_EQ(status, 128 + SIGKILL);
    EXPECT_WORKS(KLIBCFileLock(kExclusive, 0), 0);
}

TEST_F(named_lock, KLIBCFileUnlock_notHeld_isHarmless) {
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_WORKS(KLIBCFileUnlock(0x1000000), 0);
}

TEST_F(named_lock, KLIBCFileLock_badArguments_areRefused) {
    for (const uint32_t lock : {0x100U, 0x104U, 0x107U, 0x1FFU, 5U, 6U})
        EXPECT_FAILS(KLIBCFileLock(lock, 5), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileLock(kShared, -1), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileUnlock(0x105), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileUnlock(0), -1, 0xD00);
}

TEST_F(named_lock, KLIBCFileLock_descriptors_areGivenBack) {
    const auto before = open_descriptors();
    EXPECT_WORKS(KLIBCFileLock(kShared, 5), 0);
    EXPECT_EQ(open_descriptors().size(), before.size() + 1);
    EXPECT_WORKS(KLIBCFileUnlock(kName), 0);
    EXPECT_EQ(open_descriptors(), before);
}

TEST_F(named_lock, KLIBCFileLock_manyProcesses_excludeEachOther) {
    char counter_name[] = "/tmp/counter-XXXXXX";
    const int counter = mkstemp(counter_name);
    ASSERT_GE(counter, 0);
    std::vector<pid_t> children;
    for (int i = 0; i < 8; i++)
        children.push_back(start_child([&] {
            for (int n = 0; n < 50; n++) {
                if (KLIBCFileLock(kExclusive, 300) != 0)
                    return 1;
                int value = 0;
                if (pread(counter, &value, sizeof value, 0) < 0)
                    return 1;
                sched_yield();
                value++;
                if (pwrite(counter, &value, sizeof value, 0) < 0)
                    return 1;
                KLIBCFileUnlock(kName);
            }
            return 0;
        }));
    for (const pid_t pid : children)
        EXPECT_EQ(wait_for(pid), 0);
    int value = 0;
    EXPECT_EQ(pread(counter, &value, sizeof value, 0), static_cast<ssize_t>(sizeof value));
    EXPECT_EQ(value, 8 * 50);
    close(counter);
    unlink(counter_name);
}

TEST_F(named_lock, KLIBCFileLock_manyThreads_countRightly) {
    std::vector<std::thread> threads;
    for (int i = 0; i < 8; i++)
        threads.emplace_back([i] {
            for (int n = 0; n < 500; n++) {
                EXPECT_EQ(KLIBCFileLock(i % 2 == 0 ? kShared : kExclusive, 5), 0);
                EXPECT_EQ(KLIBCFileUnlock(kName), 0);
            }
        });
    for (std::thread &thread : threads)
        thread.join();
    EXPECT_TRUE(is_free(kExclusive));
}

TEST_F(named_lock, KLIBCFileLock_lockFiles_areReadableByAll) {
    const mode_t mask = umask(077);
    EXPECT_WORKS(KLIBCFileLock(0x44556605, 5), 0);
    EXPECT_WORKS(KLIBCFileUnlock(0x44556600), 0);
    umask(mask);
    struct stat status;
    ASSERT_EQ(stat("/run/lock/kova/44556600", &status), 0);
    EXPECT_EQ(status.st_mode, S_IFREG | 0644U);
    ASSERT_EQ(stat("/run/lock/kova", &status), 0);
    EXPECT_EQ(status.st_mode, S_IFDIR | 0755U);
}

TEST_F(named_lock, KLIBCFileLock_unprivilegedReader_canShare) {
    EXPECT_WORKS(KLIBCFileLock(kShared, 5), 0);
    const int status = in_child([] {
        if (setresgid(65534, 65534, 65534) != 0 || setresuid(65534, 65534, 65534) != 0)
            return 77;
        if (KLIBCFileLock(kShared, 0) != 0 || KLIBCFileLock(kExclusive, 0) != -1 || KLIBCErrGet() != 0x400)
            return 1;
        return KLIBCFileUnlock(kName);
    });
    if (status == 77)
        GTEST_SKIP() << "no other user in this user namespace";
    EXPECT_EQ(status, 0);
}

TEST_F(named_lock, KLIBCFileLock_unprivilegedReaderBeforeAnyFile_canShare) {
    const int status = in_child([] {
        if (unshare(CLONE_NEWNS) != 0 || mount("lock", "/run/lock", "tmpfs", 0, "mode=755") != 0)
            return 1;
        if (setresgid(65534, 65534, 65534) != 0 || setresuid(65534, 65534, 65534) != 0)
            return 77;
        if (KLIBCFileLock(kShared, 0) != 0 || KLIBCFileLock(kShared, 0) != 0)
            return 2;
        if (KLIBCFileLock(kExclusive, 0) != -1 || KLIBCErrGet() != 0x400)
            return 3;
        return KLIBCFileUnlock(kName) + KLIBCFileUnlock(kName);
    });
    if (status == 77)
        GTEST_SKIP() << "no other user in this user namespace";
    EXPECT_EQ(status, 0);
}

TEST_F(named_lock, KLIBCFileLock_unprivilegedReaderFirst_leavesNothingInTheWay) {
    const int status = in_child([] {
        // open to everybody, as systems have it
        if (unshare(CLONE_NEWNS) != 0 || mount("lock", "/run/lock", "tmpfs", 0, "mode=1777") != 0)
            return 1;
        const int reader = in_child([] {
            if (setresgid(65534, 65534, 65534) != 0 || setresuid(65534, 65534, 65534) != 0)
                return 77;
            if (KLIBCFileLock(kExclusive, 0) != -1 || KLIBCErrGet() != 0x400)
                return 2;
            return KLIBCFileLock(kShared, 0) == 0 ? KLIBCFileUnlock(kName) : 3;
        });
        if (reader != 0)
            return reader;
        return KLIBCFileLock(kExclusive, 0) == 0 ? KLIBCFileUnlock(kName) : 4;
    });
    if (status == 77)
        GTEST_SKIP() << "no other user in this user namespace";
    EXPECT_EQ(status, 0);
}

TEST_F(named_lock, KLIBCFileLock_linkInTheLocksPlace_isNotFollowed) {
    ASSERT_EQ(KLIBCFileLock(0x778805, 0), 0); // makes the directory
    ASSERT_EQ(KLIBCFileUnlock(0x778800), 0);
    unlink("/run/lock/kova/778800");
    ASSERT_EQ(symlink("/tmp/not-a-lock", "/run/lock/kova/778800"), 0);
    EXPECT_FAILS(KLIBCFileLock(0x778806, 0), -1, 0x400);
    EXPECT_NE(access("/tmp/not-a-lock", F_OK), 0);
    unlink("/run/lock/kova/778800");
}
