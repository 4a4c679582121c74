#include "platform_test.h"

#include <algorithm>
#include <array>
#include <csignal>

#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace kova_test;

namespace {

/** A program that sleeps, under the given arguments; ended with the object. */
class sleeper {
public:
    explicit sleeper(const std::string &program, std::vector<std::string> arguments) {
        pid_ = start_child([&] {
            prctl(PR_SET_PDEATHSIG, SIGKILL);
            std::vector<char *> argv;
            for (std::string &argument : arguments)
                argv.push_back(argument.data());
            argv.push_back(nullptr);
            execv(program.c_str(), argv.data());
            return 127;
        });
        const std::string comm = "/proc/" + std::to_string(pid_) + "/comm";
        EXPECT_TRUE(eventually([&] { return read_file(comm).rfind("kova-platform", 0) != 0; }));
    }
    ~sleeper() {
        if (pid_ > 0) {
            kill(pid_, SIGKILL);
            wait_for(pid_);
        }
    }
    sleeper(const sleeper &) = delete;
    sleeper &operator=(const sleeper &) = delete;
    [[nodiscard]] pid_t pid() const { return pid_; }
    int reap() {
        const int status = wait_for(pid_);
        pid_ = 0;
        return status;
    }

private:
    pid_t pid_;
};

class process : public platform_test {
protected:
    process() {
        // "exec sleep" would change the name: the script stays the process
        write_file(script_, "#!/bin/sh -e\nread line < " + path("fifo") + "\n", 0755);
        EXPECT_EQ(mkfifo(path("fifo").c_str(), 0644), 0);
        EXPECT_EQ(symlink("/bin/sleep", tool_.c_str()), 0);
    }

    static std::string name_of(pid_t pid, int size = 64) {
        char name[64] = "before";
        const int result = KLIBCProcGetByPid(pid, name, size);
        return std::to_string(result) + " " + name;
    }

    const std::string script_ = path("kova-connect");
    const std::string tool_ = path("kova-relay");
};

} // namespace

TEST_F(process, KLIBCPs_binary_isFoundByItsName) {
    const sleeper first{"/bin/sleep", {"/bin/sleep", "1000"}};
    const sleeper second{"/bin/sleep", {"kova-renamed", "1000"}};
    std::array<pid_t, 4> found{};
    EXPECT_WORKS(KLIBCPs("kova-renamed", found.data(), 4, 0), 1);
    EXPECT_EQ(found[0], second.pid());
    EXPECT_WORKS(KLIBCPs("sleep", found.data(), 4, 0), 2);
    EXPECT_NE(std::find(found.begin(), found.end(), first.pid()), found.end());
    EXPECT_WORKS(KLIBCPs("slee", found.data(), 4, 0), 0);
    EXPECT_WORKS(KLIBCPs("/bin/sleep", found.data(), 4, 0), 0);
}

TEST_F(process, KLIBCPs_smallBuffer_countsOn) {
    const sleeper first{"/bin/sleep", {"kova-many", "1000"}};
    const sleeper second{"/bin/sleep", {"kova-many", "1000"}};
    std::array<pid_t, 2> found{};
    EXPECT_WORKS(KLIBCPs("kova-many", found.data(), 1, 0), 2);
    EXPECT_NE(found[0], 0);
    EXPECT_EQ(found[1], 0);
    EXPECT_WORKS(KLIBCPs("kova-many", nullptr, 0, 0), 2);
}

TEST_F(process, KLIBCPs_script_isFoundByItsNameAndItsInterpreters) {
    const sleeper direct{script_, {script_}};
    pid_t pid = 0;
    EXPECT_WORKS(KLIBCPs("kova-connect", &pid, 1, 0), 1);
    EXPECT_EQ(pid, direct.pid());
    const sleeper through{"/bin/sh", {"sh", script_}};
    EXPECT_WORKS(KLIBCPs("kova-connect", nullptr, 0, 0), 2);
    EXPECT_GE(KLIBCPs("sh", nullptr, 0, 0), 2);
}

TEST_F(process, KLIBCPs_mentionedInAnArgument_isNotFound) {
    const sleeper other{"/bin/sh", {"sh", "-c", "read x < " + path("fifo") + " # kova-connect", "kova-connect"}};
    EXPECT_WORKS(KLIBCPs("kova-connect", nullptr, 0, 0), 0);
}

TEST_F(process, KLIBCPs_zombie_isNotCounted) {
    sleeper dead{"/bin/sleep", {"kova-dead", "1000"}};
    EXPECT_WORKS(KLIBCPs("kova-dead", nullptr, 0, 0), 1);
    kill(dead.pid(), SIGKILL);
    siginfo_t info;
    ASSERT_EQ(waitid(P_PID, static_cast<id_t>(dead.pid()), &info, WEXITED | WNOWAIT), 0);
    EXPECT_WORKS(KLIBCPs("kova-dead", nullptr, 0, 0), 0);
    EXPECT_WORKS(KLIBCIsProcAlive(std::to_string(dead.pid()).c_str()), 0);
    EXPECT_FAILS(name_of(dead.pid()), "-1 ", 0xBC00);
    EXPECT_EQ(dead.reap(), 128 + SIGKILL);
}

TEST_F(process, KLIBCPs_badArguments_areRefused) {
    EXPECT_FAILS(KLIBCPs(nullptr, nullptr, 0, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCPs("", nullptr, 0, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCPs("x", nullptr, -1, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCPs("x", nullptr, 0, 1), -1, 0xD00);
}

TEST_F(process, KLIBCReadPidFile_everyForm_isReadOrNone) {
    const std::string file = path("pid");
    const std::pair<const char *, int> cases[] = {{"123\n", 123},       {"  45", 45},
                                                  {"7 rest\n", 7},      {"", 0},
                                                  {"x12\n", 0},         {"12x\n", 0},
                                                  {"0\n", 0},           {"-5\n", 0},
                                                  {"99999999999\n", 0}, {"2147483647", 2147483647},
                                                  {"\n\n", 0}};
    for (const auto &[text, pid] : cases) {
        write_file(file, text);
        SCOPED_TRACE(text);
        EXPECT_WORKS(KLIBCReadPidFile(file.c_str()), pid);
    }
    EXPECT_WORKS(KLIBCReadPidFile(path("missing").c_str()), 0);
    EXPECT_WORKS(KLIBCReadPidFile(path("fifo").c_str()), 0);
    EXPECT_FAILS(KLIBCReadPidFile(nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCReadPidFile(""), -1, 0xD00);
}

TEST_F(process, KLIBCProcGetByPid_binary_givesTheExecutablesName) {
    const sleeper one{"/bin/sleep", {"kova-renamed", "1000"}};
    EXPECT_WORKS(name_of(one.pid()), "0 sleep");
    EXPECT_WORKS(name_of(one.pid(), 4), "0 sle");
    EXPECT_WORKS(name_of(one.pid(), 1), "0 ");
}

TEST_F(process, KLIBCProcGetByPid_script_givesTheScriptsName) {
    const sleeper direct{script_, {script_}};
    EXPECT_WORKS(name_of(direct.pid()), "0 kova-connect");
}

TEST_F(process, KLIBCProcGetByPid_noProcess_isNotFound) {
    EXPECT_FAILS(name_of(4194304), "-1 ", 0xBC00);
    EXPECT_FAILS(name_of(0), "-1 before", 0xD00);
    EXPECT_FAILS(name_of(-1), "-1 before", 0xD00);
    EXPECT_FAILS(KLIBCProcGetByPid(1, nullptr, 5), -1, 0xD00);
    char name[4];
    EXPECT_FAILS(KLIBCProcGetByPid(1, name, 0), -1, 0xD00);
}

TEST_F(process, KLIBCIsProcAlive_pid_isLookedUp) {
    sleeper one{"/bin/sleep", {"sleep", "1000"}};
    const std::string pid = std::to_string(one.pid());
    EXPECT_WORKS(KLIBCIsProcAlive(pid.c_str()), 1);
    EXPECT_WORKS(KLIBCIsProcAlive(std::to_string(getpid()).c_str()), 0);
    kill(one.pid(), SIGKILL);
    one.reap();
    EXPECT_WORKS(KLIBCIsProcAlive(pid.c_str()), 0);
    EXPECT_WORKS(KLIBCIsProcAlive("99999999999"), 0);
    EXPECT_WORKS(KLIBCIsProcAlive("0"), 0);
    EXPECT_FAILS(KLIBCIsProcAlive(""), 0, 0xD00);
    EXPECT_FAILS(KLIBCIsProcAlive(nullptr), 0, 0xD00);
}

TEST_F(process, KLIBCIsProcAlive_commandLine_matchesAtArgumentEnds) {
    const sleeper relay{"/bin/sh", {tool_, "-c", "read x < " + path("fifo"), "-C", "lbr01", "-S", "eth0"}};
    const std::string start = tool_ + " -c read x < " + path("fifo");
    EXPECT_WORKS(KLIBCIsProcAlive((start + " -C lbr01").c_str()), 1);
    EXPECT_WORKS(KLIBCIsProcAlive((start + " -C lbr01 -S eth0").c_str()), 1);
    EXPECT_WORKS(KLIBCIsProcAlive(tool_.c_str()), 1);
    EXPECT_WORKS(KLIBCIsProcAlive((start + " -C lbr0").c_str()), 0);
    EXPECT_WORKS(KLIBCIsProcAlive((start + " -C lbr01 -S eth").c_str()), 0);
    EXPECT_WORKS(KLIBCIsProcAlive((start + " -C lbr01 -S eth0 more").c_str()), 0);
    EXPECT_WORKS(KLIBCIsProcAlive("-C lbr01"), 0);
    EXPECT_WORKS(KLIBCIsProcAlive("kova-relay"), 0);
}

TEST_F(process, KLIBCIsProcAlive_interpreterBeforeIt_isPassedOver) {
    const sleeper relay{script_, {script_, "-C", "lbr0"}};
    EXPECT_WORKS(KLIBCIsProcAlive((script_ + " -C lbr0").c_str()), 1);
    EXPECT_WORKS(KLIBCIsProcAlive(script_.c_str()), 1);
    EXPECT_WORKS(KLIBCIsProcAlive((script_ + " -C lbr").c_str()), 0);
    EXPECT_WORKS(KLIBCIsProcAlive(("/bin/sh -e " + script_ + " -C lbr0").c_str()), 1);
    EXPECT_WORKS(KLIBCIsProcAlive("-C lbr0"), 0);
}

TEST_F(process, KLIBCIsProcAlive_programOnItsWayToTheBackground_isNotMissed) {
    // as daemons do, it goes on in a child of its child
    const std::string daemon = path("kova-daemon");
    write_file(daemon, "#!/bin/sh\n( ( read line < " + path("fifo") + " ) & ) &\n", 0755);
    for (int i = 0; i < 100; ++i) {
        const std::string number = std::to_string(i);
        const std::string command = daemon + " -C " + number;
        ASSERT_EQ(KLIBCExec(daemon.c_str(), "-C", number.c_str(), nullptr, nullptr), 0);
        EXPECT_EQ(KLIBCIsProcAlive(command.c_str()), 1) << i;
        EXPECT_EQ(KLIBCKill(command.c_str(), SIGKILL), 0);
        EXPECT_TRUE(eventually([&] { return KLIBCIsProcAlive(command.c_str()) == 0; })) << i;
    }
}

TEST_F(process, KLIBCKill_commandLine_endsEveryMatch) {
    sleeper first{script_, {script_, "-C", "lbr0"}};
    sleeper second{script_, {script_, "-C", "lbr0", "-S", "eth0"}};
    const sleeper other{script_, {script_, "-C", "lbr01"}};
    EXPECT_WORKS(KLIBCKill((script_ + " -C lbr0").c_str(), SIGTERM), 0);
    EXPECT_EQ(first.reap(), 128 + SIGTERM);
    EXPECT_EQ(second.reap(), 128 + SIGTERM);
    EXPECT_WORKS(KLIBCIsProcAlive((script_ + " -C lbr01").c_str()), 1);
}

TEST_F(process, KLIBCKill_pid_getsTheSignal) {
    sleeper one{"/bin/sleep", {"sleep", "1000"}};
    EXPECT_WORKS(KLIBCKill(std::to_string(one.pid()).c_str(), 0), 0);
    EXPECT_WORKS(KLIBCKill(std::to_string(one.pid()).c_str(), SIGUSR1), 0);
    EXPECT_EQ(one.reap(), 128 + SIGUSR1);
}

TEST_F(process, KLIBCKill_nothingToKill_isSuccess) {
    EXPECT_WORKS(KLIBCKill("/no/such/program -x", SIGTERM), 0);
    EXPECT_WORKS(KLIBCKill("4194304", SIGTERM), 0);
    EXPECT_WORKS(KLIBCKill(std::to_string(getpid()).c_str(), SIGTERM), 0);
}

TEST_F(process, KLIBCKill_notAllowed_fails) {
    const sleeper one{"/bin/sleep", {"sleep", "1000"}};
    const int status = in_child([&] {
        if (setresuid(65534, 65534, 65534) != 0)
            return 77;
        return KLIBCKill(std::to_string(one.pid()).c_str(), SIGTERM) == -1 && KLIBCErrGet() == 0x8100 ? 0 : 1;
    });
    if (status == 77)
        GTEST_SKIP() << "no other user in this user namespace";
    EXPECT_EQ(status, 0);
}

TEST_F(process, KLIBCKill_badArguments_areRefused) {
    EXPECT_FAILS(KLIBCKill(nullptr, SIGTERM), -1, 0xD00);
    EXPECT_FAILS(KLIBCKill("", SIGTERM), -1, 0xD00);
    EXPECT_FAILS(KLIBCKill("0", SIGTERM), -1, 0xD00);
    EXPECT_FAILS(KLIBCKill("99999999999", SIGTERM), -1, 0xD00);
    EXPECT_FAILS(KLIBCKill("x", -1), -1, 0xD00);
    EXPECT_FAILS(KLIBCKill("x", 1000), -1, 0xD00);
}
