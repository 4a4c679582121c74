#include "platform_test.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <random>
#include <sstream>

#include <fcntl.h>
#include <sched.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace kova_test;

namespace {

constexpr const char *kPlain = "%s=%s\n";

using file_rewrite = platform_test;

/** A small file system of its own. */
class small_mount {
public:
    explicit small_mount(std::string path) : path_(std::move(path)) {
        mkdir(path_.c_str(), 0755);
        mounted_ = mount("small", path_.c_str(), "tmpfs", 0, "size=64k") == 0;
    }
    ~small_mount() {
        if (mounted_)
            umount2(path_.c_str(), MNT_DETACH);
    }
    small_mount(const small_mount &) = delete;
    small_mount &operator=(const small_mount &) = delete;
    [[nodiscard]] bool mounted() const { return mounted_; }
    bool make_read_only() const { return mount("", path_.c_str(), "", MS_REMOUNT | MS_RDONLY, "") == 0; }

private:
    std::string path_;
    bool mounted_;
};

} // namespace

TEST_F(file_rewrite, KLIBCFileSetKeyValue_readOnlyFileSystem_keepsTheOldFile) {
    const small_mount disk{path("disk")};
    ASSERT_TRUE(disk.mounted());
    write_file(path("disk/file"), "A=1\n");
    ASSERT_TRUE(disk.make_read_only());
    EXPECT_FAILS(KLIBCFileSetKeyValue(path("disk/file").c_str(), "A", "2", kPlain), -1, 0x900);
    EXPECT_EQ(read_file(path("disk/file")), "A=1\n");
    EXPECT_EQ(names_in(path("disk")), std::vector<std::string>{"file"});
}

TEST_F(file_rewrite, KLIBCFileSetKeyValue_fullFileSystem_keepsTheOldFile) {
    const small_mount disk{path("disk")};
    ASSERT_TRUE(disk.mounted());
    write_file(path("disk/file"), "A=1\n");
    write_file(path("disk/ballast"), std::string(65536, 'x'));
    EXPECT_FAILS(KLIBCFileSetKeyValue(path("disk/file").c_str(), "A", "2", kPlain), -1, 0xB00);
    EXPECT_EQ(read_file(path("disk/file")), "A=1\n");
    EXPECT_EQ(names_in(path("disk")), (std::vector<std::string>{"ballast", "file"}));
}

TEST_F(file_rewrite, KLIBCFileSetKeyValue_spaceForAPartOnly_keepsTheOldFile) {
    const small_mount disk{path("disk")};
    ASSERT_TRUE(disk.mounted());
    write_file(path("disk/file"), "A=1\n" + std::string(40000, 'x') + "\n");
    const std::string before = read_file(path("disk/file"));
    EXPECT_FAILS(KLIBCFileSetKeyValue(path("disk/file").c_str(), "A", "2", kPlain), -1, 0xB00);
    EXPECT_EQ(read_file(path("disk/file")), before);
    EXPECT_EQ(names_in(path("disk")), std::vector<std::string>{"file"});
}

TEST_F(file_rewrite, KLIBCFileSetKeyValue_fileThatCannotBeReplaced_isARenameFailure) {
    write_file(path("file"), "A=1\n");
    ASSERT_EQ(mount(path("file").c_str(), path("file").c_str(), nullptr, MS_BIND, nullptr), 0);
    EXPECT_FAILS(KLIBCFileSetKeyValue(path("file").c_str(), "A", "2", kPlain), -1, 0x2800);
    EXPECT_EQ(umount2(path("file").c_str(), MNT_DETACH), 0);
    EXPECT_EQ(read_file(path("file")), "A=1\n");
    EXPECT_EQ(names_in(directory()), std::vector<std::string>{"file"});
}

TEST_F(file_rewrite, KLIBCFileSetKeyValue_leftTemporary_isReplaced) {
    // a child that dies in the middle of a rewrite leaves its temporary: the size limit of files kills it
    write_file(path("file"), "A=1\n" + std::string(9000, 'x') + "\n");
    const int status = in_child([&] {
        const rlimit limit = {8192, 8192};
        setrlimit(RLIMIT_FSIZE, &limit);
        return KLIBCFileSetKeyValue(path("file").c_str(), "A", "2", kPlain);
    });
    ASSERT_EQ(status, 128 + SIGXFSZ);
    const std::vector<std::string> names = names_in(directory());
    ASSERT_EQ(names.size(), 2U);
    EXPECT_EQ(names[0].front(), '.');
    EXPECT_EQ(read_file(path("file")).substr(0, 4), "A=1\n");

    EXPECT_WORKS(KLIBCFileSetKeyValue(path("file").c_str(), "A", "3", kPlain), 0);
    EXPECT_EQ(read_file(path("file")).substr(0, 4), "A=3\n");
    EXPECT_EQ(names_in(directory()), std::vector<std::string>{"file"});
}

TEST_F(file_rewrite, KLIBCFileSetKeyValue_linkInTheTemporarysPlace_isNotFollowed) {
    write_file(path("victim"), "untouched");
    write_file(path("file"), "A=1\n" + std::string(9000, 'x') + "\n");
    in_child([&] {
        const rlimit limit = {8192, 8192};
        setrlimit(RLIMIT_FSIZE, &limit);
        return KLIBCFileSetKeyValue(path("file").c_str(), "A", "2", kPlain);
    });
    const std::string temporary = path(names_in(directory())[0]);
    ASSERT_EQ(unlink(temporary.c_str()), 0);
    ASSERT_EQ(symlink("victim", temporary.c_str()), 0);
    EXPECT_WORKS(KLIBCFileSetKeyValue(path("file").c_str(), "A", "3", kPlain), 0);
    EXPECT_EQ(read_file(path("victim")), "untouched");
    EXPECT_EQ(names_in(directory()), (std::vector<std::string>{"file", "victim"}));
}

TEST_F(file_rewrite, KLIBCFileSetKeyValue_lockDirectoryOfAStranger_isNotUsed) {
    write_file(path("file"), "A=1\n");
    const int status = in_child([&] {
        // in a private name space, so that no other test sees it
        if (unshare(CLONE_NEWNS) != 0 || mount("lock", "/run/lock", "tmpfs", 0, nullptr) != 0 ||
            mkdir("/run/lock/kova", 0755) != 0)
            return 2;
        if (chown("/run/lock/kova", 1000, 1000) != 0)
            return 77;
        const int result = KLIBCFileSetKeyValue(path("file").c_str(), "A", "2", kPlain);
        return result == -1 && KLIBCErrGet() == 0x400 ? 0 : 1;
    });
    if (status == 77)
        GTEST_SKIP() << "no other user in this user namespace";
    EXPECT_EQ(status, 0);
    EXPECT_EQ(read_file(path("file")), "A=1\n");
}

TEST_F(file_rewrite, KLIBCFileSetKeyValue_descriptors_areAllClosed) {
    const auto before = open_descriptors();
    write_file(path("file"), "A=1\n");
    EXPECT_EQ(KLIBCFileSetKeyValue(path("file").c_str(), "A", "2", kPlain), 0);
    EXPECT_EQ(KLIBCFileRemoveKey(path("file").c_str(), "B"), 0);
    EXPECT_EQ(KLIBCFileSetKeyValue(directory().c_str(), "A", "2", kPlain), -1);
    EXPECT_EQ(open_descriptors(), before);
}

namespace {

constexpr int kWriters = 64;

/** What the writers have begun to store and what they know to be stored; shared with them. */
struct progress {
    std::array<volatile int, kWriters> begun;
    std::array<volatile int, kWriters> done;
};

int write_for_ever(const std::string &file, progress &shared, int writer) {
    const std::string key = "key" + std::to_string(writer);
    while (true) {
        shared.begun[writer] = shared.begun[writer] + 1;
        if (KLIBCFileSetKeyValue(file.c_str(), key.c_str(), std::to_string(shared.begun[writer]).c_str(), kPlain) != 0)
            return 1;
        shared.done[writer] = shared.begun[writer];
    }
}

/** @return what is wrong with a text of the file, nothing when it holds everything that was stored before */
std::string fault_in(const std::string &text, const std::array<int, kWriters> &stored, const progress &shared) {
    std::array<int, kWriters> found{};
    std::istringstream lines{text};
    int others = 0;
    for (std::string line; std::getline(lines, line);) {
        int writer = 0;
        int value = 0;
        char rest = 0;
        if (sscanf(line.c_str(), "key%d=%d%c", &writer, &value, &rest) == 2)
            found.at(writer) += value;
        else if (line == "# first" || line == "# last")
            others++;
        else
            return "torn line: " + line;
    }
    if (others != 2 || !text.ends_with('\n'))
        return "torn file";
    for (int i = 0; i < kWriters; i++)
        if (found[i] < stored[i] || found[i] > shared.begun[i])
            return "key" + std::to_string(i) + " is " + std::to_string(found[i]) + " after " +
                   std::to_string(stored[i]);
    return "";
}

} // namespace

TEST_F(file_rewrite, KLIBCFileSetKeyValue_64writersKilledAtRandom_loseNothing) {
    const std::string file = path("file");
    write_file(file, "# first\n# last\n");
    auto *shared = static_cast<progress *>(
        mmap(nullptr, sizeof(progress), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0));
    ASSERT_NE(shared, MAP_FAILED);
    std::array<pid_t, kWriters> writers{};
    const auto start = [&](int i) { writers[i] = start_child([&, i] { return write_for_ever(file, *shared, i); }); };
    for (int i = 0; i < kWriters; i++)
        start(i);

    std::mt19937 random{4711};
    int kills = 0;
    int reads = 0;
    std::string fault;
    constexpr int kKillsMin = 100; // takes longer than usual on a machine that has much else to do
    const auto begin = std::chrono::steady_clock::now();
    const auto has_time = [&](int seconds) {
        return std::chrono::steady_clock::now() < begin + std::chrono::seconds{seconds};
    };
    while (fault.empty() && (has_time(4) || (kills <= kKillsMin && has_time(600)))) {
        std::array<int, kWriters> stored{};
        for (int i = 0; i < kWriters; i++)
            stored[i] = shared->done[i];
        fault = fault_in(read_file(file), stored, *shared);
        reads++;
        if (reads % 4 == 0) {
            const int victim = static_cast<int>(random() % kWriters);
            kill(writers[victim], SIGKILL);
            // any other end means that a write has failed
            EXPECT_EQ(wait_for(writers[victim]), 128 + SIGKILL);
            kills++;
            start(victim);
        }
        usleep(random() % 1500);
    }
    for (const pid_t pid : writers) {
        kill(pid, SIGKILL);
        EXPECT_EQ(wait_for(pid), 128 + SIGKILL);
    }
    EXPECT_EQ(fault, "");
    EXPECT_GT(kills, kKillsMin);
    std::array<int, kWriters> stored{};
    int sum = 0;
    for (int i = 0; i < kWriters; i++)
        sum += stored[i] = shared->done[i];
    EXPECT_GT(sum, kWriters * 2);
    EXPECT_EQ(fault_in(read_file(file), stored, *shared), "");
    RecordProperty("kills", kills);
    RecordProperty("writes", sum);

    // what the killed ones left does not disturb, and one more rewrite takes it away
    EXPECT_EQ(KLIBCFileSetKeyValue(file.c_str(), "key0", "0", kPlain), 0);
    EXPECT_EQ(names_in(directory()), std::vector<std::string>{"file"});
    munmap(shared, sizeof(progress));
}

TEST_F(file_rewrite, KLIBCFileSetKeyValue_fileComesAndGoes_neverFails) {
    const std::string file = path("file");
    const pid_t other = start_child([&] {
        for (int i = 0;; i++) {
            close(open(file.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0644));
            // the two fall into every step of each other
            for (volatile int spin = i % 4096; spin > 0;)
                spin = spin - 1;
            unlink(file.c_str());
        }
        return 0;
    });
    int failures = 0;
    for (int i = 0; i < 20000; i++)
        failures += KLIBCFileSetKeyValue(file.c_str(), "A", std::to_string(i).c_str(), kPlain) != 0 ? 1 : 0;
    EXPECT_EQ(failures, 0);
    kill(other, SIGKILL);
    EXPECT_EQ(wait_for(other), 128 + SIGKILL);
}

TEST_F(file_rewrite, KLIBCFileAddLine_manyWriters_loseNothing) {
    std::array<pid_t, 8> writers{};
    for (size_t i = 0; i < writers.size(); i++)
        writers[i] = start_child([&, i] {
            for (int line = 0; line < 25; line++)
                if (KLIBCFileAddLine(path("file").c_str(), nullptr, std::to_string(i * 100 + line).c_str(), 0) != 0)
                    return 1;
            return 0;
        });
    for (const pid_t pid : writers)
        EXPECT_EQ(wait_for(pid), 0);
    std::istringstream lines{read_file(path("file"))};
    std::vector<bool> seen(800);
    int count = 0;
    for (std::string line; std::getline(lines, line); count++)
        seen.at(std::stoul(line)) = true;
    EXPECT_EQ(count, 200);
    EXPECT_EQ(std::count(seen.begin(), seen.end(), true), 200);
}
