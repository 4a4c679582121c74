#include "platform_test.h"

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <cstring>

#include <fcntl.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

using namespace kova_test;

namespace {

class exec : public platform_test {
protected:
    exec() : script_(path("script")) {}

    /** Runs a shell script of its own. */
    int run(const std::string &text, const char *argument = nullptr) {
        write_file(script_, "#!/bin/sh\n" + text + "\n", 0755);
        return KLIBCExec(script_.c_str(), argument, nullptr, nullptr, nullptr);
    }
    [[nodiscard]] std::string output() const { return read_file(path("out")); }
    [[nodiscard]] std::string to_output() const { return " > " + path("out"); }

    const std::string script_;
};

/** A signal's disposition for the time of a test. */
class signal_setting {
public:
    signal_setting(int signal, void (*handler)(int), int flags = 0) : signal_(signal) {
        struct sigaction action = {};
        action.sa_handler = handler;
        action.sa_flags = flags;
        sigaction(signal, &action, &before_);
    }
    ~signal_setting() { sigaction(signal_, &before_, nullptr); }
    signal_setting(const signal_setting &) = delete;
    signal_setting &operator=(const signal_setting &) = delete;

private:
    int signal_;
    struct sigaction before_ = {};
};

} // namespace

TEST_F(exec, KLIBCExec_exitStatus_isGiven) {
    EXPECT_WORKS(run("exit 0"), 0);
    EXPECT_WORKS(run("exit 3"), 3);
    EXPECT_WORKS(run("exit 255"), 255);
    EXPECT_WORKS(run("exit 127"), 127);
}

TEST_F(exec, KLIBCExec_killed_gives128AndTheSignal) {
    EXPECT_WORKS(run("kill -KILL $$"), 128 + SIGKILL);
    EXPECT_WORKS(run("kill -HUP $$"), 128 + SIGHUP);
    EXPECT_WORKS(run("kill -TERM $$"), 128 + SIGTERM);
}

TEST_F(exec, KLIBCExec_cannotBeExecuted_gives127) {
    EXPECT_FAILS(KLIBCExec(path("missing").c_str(), nullptr, nullptr, nullptr, nullptr), 127, 0x2A00);
    EXPECT_FAILS(KLIBCExec(path("missing/below").c_str(), nullptr, nullptr, nullptr, nullptr), 127, 0x2A00);
    EXPECT_FAILS(KLIBCExec(directory().c_str(), nullptr, nullptr, nullptr, nullptr), 127, 0x2A00);
    write_file(path("plain"), "#!/bin/sh\nexit 0\n", 0644);
    EXPECT_FAILS(KLIBCExec(path("plain").c_str(), nullptr, nullptr, nullptr, nullptr), 127, 0x2A00);
    write_file(path("no-interpreter"), "#!/missing/interpreter\n", 0755);
    EXPECT_FAILS(KLIBCExec(path("no-interpreter").c_str(), nullptr, nullptr, nullptr, nullptr), 127, 0x2A00);
    write_file(path("no-header"), "exit 0\n", 0755);
    EXPECT_FAILS(KLIBCExec(path("no-header").c_str(), nullptr, nullptr, nullptr, nullptr), 127, 0x2A00);
}

TEST_F(exec, KLIBCExec_cannotBeExecuted_leavesTheReasonInErrno) {
    const kept_file keep{"/etc/kova/platform.conf"};
    write_file(path("plain"), "#!/bin/sh\nexit 0\n", 0644);
    for (const char *const trace : {"no", "yes"}) {
        // traced to a log that nobody reads, too
        write_file("/etc/kova/platform.conf", std::string{"trace_commands="} + trace + "\n");
        const char *const argv[] = {"plain", nullptr};
        errno = 0;
        EXPECT_EQ(KLIBCExec(path("plain").c_str(), nullptr, nullptr, nullptr, nullptr), 127);
        EXPECT_EQ(errno, EACCES);
        errno = 0;
        EXPECT_EQ(KLIBCExecv(path("plain").c_str(), argv, 0), 127);
        EXPECT_EQ(errno, EACCES);
    }
    closelog();
}

TEST_F(exec, KLIBCExec_noProcess_givesMinus1) {
    const int status = in_child([] {
        const rlimit none = {0, 0};
        if (setresuid(54321, 54321, 54321) != 0)
            return 77;
        setrlimit(RLIMIT_NPROC, &none);
        return KLIBCExec("/bin/true", nullptr, nullptr, nullptr, nullptr) == -1 && KLIBCErrGet() == 0x2A00 ? 0 : 1;
    });
    if (status == 77)
        GTEST_SKIP() << "no other user in this user namespace";
    EXPECT_EQ(status, 0);
}

TEST_F(exec, KLIBCExec_arguments_arePassedAsTheyAre) {
    write_file(script_, "#!/bin/sh\nprintf '%s|' \"$@\"" + to_output() + "\n", 0755);
    EXPECT_WORKS(KLIBCExec(script_.c_str(), "a b", "", "$HOME;*", "'\"\n"), 0);
    EXPECT_EQ(output(), "a b||$HOME;*|'\"\n|");
    EXPECT_WORKS(KLIBCExec(script_.c_str(), "one", nullptr, "lost", nullptr), 0);
    EXPECT_EQ(output(), "one|");
}

TEST_F(exec, KLIBCExecl_arguments_arePassedAsTheyAre) {
    write_file(script_, "#!/bin/sh\nprintf '%s|' \"$@\"" + to_output() + "\n", 0755);
    EXPECT_WORKS(KLIBCExecl(script_.c_str(), 0xBB, "1", "2", "3", "4", "5", "6", "7", "8", "9", "10", nullptr), 0);
    EXPECT_EQ(output(), "1|2|3|4|5|6|7|8|9|10|");
    EXPECT_WORKS(KLIBCExecl("/bin/sh", 0xBB, "-c", "exit 9", nullptr), 9);
    EXPECT_FAILS(KLIBCExecl("/missing", 0xBB, nullptr), 127, 0x2A00);
}

TEST_F(exec, KLIBCExecv_vector_holdsTheProgramsName) {
    const char *const argv[] = {"/bin/sh", "-c", "exit 5", nullptr};
    EXPECT_WORKS(KLIBCExecv("/bin/sh", argv, 1), 5);
    EXPECT_FAILS(KLIBCExecv("/missing", argv, 1), 127, 0x2A00);
}

TEST_F(exec, KLIBCExecv_withoutWaiting_returnsAtOnceAndLeavesNoZombie) {
    const std::string go_on = path("go-on");
    const std::string command =
        "for i in $(seq 1000); do [ -e " + go_on + " ] && break; sleep 0.02; done; echo done" + to_output();
    const char *const argv[] = {"/bin/sh", "-c", command.c_str(), nullptr};
    EXPECT_WORKS(KLIBCExecv("/bin/sh", argv, 0), 0);
    EXPECT_EQ(output(), "(no file)");
    EXPECT_EQ(waitpid(-1, nullptr, 0), -1);
    EXPECT_EQ(errno, ECHILD);
    write_file(go_on, "");
    EXPECT_TRUE(eventually([&] { return output() == "done\n"; }));
    EXPECT_FAILS(KLIBCExecv("/missing", argv, 0), 127, 0x2A00);
}

TEST_F(exec, KLIBCExec_badArguments_areRefused) {
    const char *const none[] = {nullptr};
    const char *const some[] = {"x", nullptr};
    EXPECT_FAILS(KLIBCExec(nullptr, nullptr, nullptr, nullptr, nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCExec("", nullptr, nullptr, nullptr, nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCExec("true", nullptr, nullptr, nullptr, nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCExecl("/bin/true", 0, nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCExecl(nullptr, 0xBB, nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCExecv("/bin/true", nullptr, 1), -1, 0xD00);
    EXPECT_FAILS(KLIBCExecv("/bin/true", none, 1), -1, 0xD00);
    EXPECT_FAILS(KLIBCExecv("/bin/true", some, 2), -1, 0xD00);
}

TEST_F(exec, KLIBCExec_streams_areTheNullDevice) {
    EXPECT_WORKS(run("streams=$(readlink /proc/$$/fd/0 /proc/$$/fd/1 /proc/$$/fd/2); echo \"$streams\"" + to_output()),
                 0);
    EXPECT_EQ(output(), "/dev/null\n/dev/null\n/dev/null\n");
}

TEST_F(exec, KLIBCExec_descriptors_areNotInherited) {
    const int plain = open("/dev/zero", O_RDONLY);
    const int high = fcntl(plain, F_DUPFD, 200);
    ASSERT_GE(high, 200);
    const auto before = open_descriptors();
    // the shell itself adds the script it reads, above 9
    const char *const argv[] = {"/bin/ls", "/proc/self/fd", nullptr};
    FILE *stream = KLIBCPopen("/bin/ls", "r", "/proc/self/fd", nullptr);
    ASSERT_NE(stream, nullptr);
    std::string listed;
    for (int c = fgetc(stream); c != EOF; c = fgetc(stream))
        listed += static_cast<char>(c);
    EXPECT_EQ(KLIBCPclose(stream), 0);
    // 3 is the directory that ls reads
    EXPECT_EQ(listed, "0\n1\n2\n3\n");
    EXPECT_EQ(KLIBCExecv("/bin/ls", argv, 1), 0);
    EXPECT_EQ(KLIBCExecv("/bin/ls", argv, 0), 0);
    EXPECT_EQ(KLIBCExecv("/missing", argv, 1), 127);
    EXPECT_EQ(open_descriptors(), before);
    close(plain);
    close(high);
}

TEST_F(exec, KLIBCExec_callerWithoutStreams_works) {
    const int status = in_child([&] {
        for (const int fd : {0, 1, 2})
            close(fd);
        if (KLIBCExec("/bin/sh", "-c", "readlink /proc/$$/fd/0 /proc/$$/fd/1 && exit 4", nullptr, nullptr) != 4)
            return 1;
        FILE *stream = KLIBCPopen("/bin/echo", "r", "text", nullptr);
        char line[16] = "";
        if (stream == nullptr || fgets(line, sizeof line, stream) == nullptr || strcmp(line, "text\n") != 0)
            return 2;
        return KLIBCPclose(stream);
    });
    EXPECT_EQ(status, 0);
}

TEST_F(exec, KLIBCExec_maskAndIgnoredSignals_areReset) {
    const signal_setting pipe{SIGPIPE, SIG_IGN};
    const signal_setting hangup{SIGHUP, SIG_IGN};
    sigset_t blocked;
    sigset_t before;
    sigemptyset(&blocked);
    sigaddset(&blocked, SIGTERM);
    sigprocmask(SIG_BLOCK, &blocked, &before);
    FILE *stream = KLIBCPopen("/bin/grep", "r", "-E", "^Sig(Blk|Ign)", "/proc/self/status", nullptr);
    sigprocmask(SIG_SETMASK, &before, nullptr);
    ASSERT_NE(stream, nullptr);
    unsigned long mask = ~0UL;
    unsigned long ignored = ~0UL;
    EXPECT_EQ(fscanf(stream, "SigBlk: %lx SigIgn: %lx", &mask, &ignored), 2);
    EXPECT_EQ(KLIBCPclose(stream), 0);
    EXPECT_EQ(mask, 0U);
    // the C library's own two, 32 and 33, are its matter
    EXPECT_EQ(ignored & ~0x180000000UL, 0U);
}

TEST_F(exec, KLIBCExec_callerIgnoresItsChildren_statusIsKnown) {
    const signal_setting ignored{SIGCHLD, SIG_IGN};
    EXPECT_WORKS(run("exit 6"), 6);
    FILE *stream = KLIBCPopen("/bin/sh", "r", "-c", "exit 7", nullptr);
    EXPECT_WORKS(run("exit 8"), 8);
    EXPECT_EQ(KLIBCPclose(stream), 7);
    struct sigaction action;
    sigaction(SIGCHLD, nullptr, &action);
    EXPECT_EQ(action.sa_handler, SIG_IGN);
}

TEST_F(exec, KLIBCExec_callerWithoutZombies_statusIsKnown) {
    const signal_setting no_wait{SIGCHLD, [](int) {}, SA_NOCLDWAIT | SA_RESTART};
    EXPECT_WORKS(run("exit 6"), 6);
    struct sigaction action;
    sigaction(SIGCHLD, nullptr, &action);
    EXPECT_TRUE(action.sa_flags & SA_NOCLDWAIT);
}

TEST_F(exec, KLIBCExec_interruptedBySignals_goesOn) {
    const signal_setting alarm_handler{SIGALRM, [](int) {}};
    const itimerval often = {{0, 5000}, {0, 5000}};
    const itimerval never = {};
    setitimer(ITIMER_REAL, &often, nullptr);
    EXPECT_WORKS(run("sleep 0.2; exit 2"), 2);
    setitimer(ITIMER_REAL, &never, nullptr);
}

TEST_F(exec, KLIBCExec_environmentAndDirectory_areTheCallers) {
    setenv("KOVA_EXEC_TEST", "a b", 1);
    ASSERT_EQ(chdir(directory().c_str()), 0);
    EXPECT_WORKS(run("echo \"$KOVA_EXEC_TEST\" $PWD" + to_output()), 0);
    EXPECT_EQ(output(), "a b " + directory() + "\n");
    ASSERT_EQ(chdir("/"), 0);
    unsetenv("KOVA_EXEC_TEST");
}

TEST_F(exec, KLIBCExec_ownChildren_areNotWaitedFor) {
    const pid_t child = start_child([] { return 42; });
    EXPECT_WORKS(run("exit 1"), 1);
    EXPECT_EQ(wait_for(child), 42);
}

namespace {

pid_t g_caller;
volatile int g_strayed;

/** Sends a signal to a group of processes again and again; ends with the group's leader. */
int hammer(pid_t group, int signal) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    while (kill(-group, signal) == 0)
        usleep(20);
    return 0;
}

} // namespace

TEST_F(exec, KLIBCExecv_withoutWaiting_callersHandlersRunInTheCallerOnly) {
    const int status = in_child([] {
        g_caller = getpid();
        const signal_setting handler{SIGUSR1, [](int) { g_strayed = g_strayed + (getpid() != g_caller ? 1 : 0); }};
        setpgid(0, 0);
        const pid_t sender = start_child([] {
            setpgid(0, 0);
            return hammer(getppid(), SIGUSR1);
        });
        const char *const argv[] = {"/bin/true", nullptr};
        int failures = 0;
        for (int i = 0; i < 200; i++)
            failures += KLIBCExecv("/bin/true", argv, 0) != 0 ? 1 : 0;
        kill(sender, SIGKILL);
        wait_for(sender);
        return failures != 0 ? 1 : g_strayed != 0 ? 2 : 0;
    });
    EXPECT_EQ(status, 0);
}

namespace {

/** The system log's socket, as a file of the messages received; what had the name before stays elsewhere. */
class log_receiver {
public:
    log_receiver() : fd_(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0)) {
        had_one_ = rename("/dev/log", "/dev/log.before") == 0;
        sockaddr_un address = {AF_UNIX, "/dev/log"};
        EXPECT_EQ(bind(fd_, reinterpret_cast<sockaddr *>(&address), sizeof address), 0);
    }
    ~log_receiver() {
        closelog();
        close(fd_);
        unlink("/dev/log");
        if (had_one_)
            rename("/dev/log.before", "/dev/log");
    }
    log_receiver(const log_receiver &) = delete;
    log_receiver &operator=(const log_receiver &) = delete;

    /** @return the next message as "<priority> text", "" when there is none */
    std::string next() {
        char buffer[1024];
        const ssize_t size = recv(fd_, buffer, sizeof buffer, 0);
        const std::string message{buffer, static_cast<size_t>(std::max<ssize_t>(size, 0))};
        const size_t text = message.find("run: ");
        return text == std::string::npos ? message
                                         : message.substr(0, message.find('>') + 1) + " " + message.substr(text);
    }

private:
    int fd_;
    bool had_one_;
};

} // namespace

TEST_F(exec, KLIBCExec_tracedCommands_areLogged) {
    const kept_file keep{"/etc/kova/platform.conf"};
    log_receiver log;
    write_file("/etc/kova/platform.conf", "trace_commands=\"yes\"\n");
    const char *const argv[] = {"/bin/sh", "-c", "exit 3", nullptr};
    EXPECT_EQ(KLIBCExec("/bin/true", "a b", "%s", nullptr, nullptr), 0);
    EXPECT_EQ(log.next(), "<15> run: /bin/true a b %s -> 0");
    EXPECT_EQ(KLIBCExecl("/missing", 0xBB, "x", nullptr), 127);
    EXPECT_EQ(log.next(), "<15> run: /missing x -> 127");
    EXPECT_EQ(KLIBCExecv("/bin/sh", argv, 1), 3);
    EXPECT_EQ(log.next(), "<15> run: /bin/sh -c exit 3 -> 3");
    EXPECT_EQ(KLIBCPclose(KLIBCPopen("/bin/sh", "r", "-c", "exit 4", nullptr)), 4);
    EXPECT_EQ(log.next(), "<15> run: /bin/sh -c exit 4 -> 4");
    write_file("/etc/kova/platform.conf", "trace_commands=\"no\"\n");
    EXPECT_EQ(KLIBCExec("/bin/true", nullptr, nullptr, nullptr, nullptr), 0);
    EXPECT_EQ(log.next(), "");
}
