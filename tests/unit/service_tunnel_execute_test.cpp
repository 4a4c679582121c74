#include "support/rig.h"

#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <kovanetsdk/tunnel.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace kova_test;

namespace {

const std::string kUnit = "service_tunnel_execute";
const std::string kConf = "/etc/gogoc/gogoc.conf";
const std::string kSeen = "/tmp/seen-gogoc.conf";
const std::string kSeenMode = "/tmp/seen-mode";
const std::string kMine = "/tmp/descriptor-of-the-caller";
const std::string kNoBrokers =
    "INFO service_tunnel_execute:N unable to move broker_list, tsp-broker-list.txt, errno:2, "
    "No such file or directory";
const std::string kDone = "INFO service_tunnel_execute:N done gogoc processing";
const std::string kUp = "INFO service_tunnel_execute:N tunnel connection setup";
const std::string kTimeout = "INFO service_tunnel_execute:N connecting to tunnel broker timeout";
const std::string kHangs = "ERR service_tunnel_execute:N gogoc hangs, terminate it.";
const texts kConfLocks{"file+" + kConf, "file-"};

/** So often is the configuration locked: to write it, to delete it after the script, to delete it in the end. */
texts conf_locks(int times) {
    texts locks;
    for (int i = 0; i < times; ++i) {
        locks.insert(locks.end(), kConfLocks.begin(), kConfLocks.end());
    }
    return locks;
}

TUNNEL_CONF account() {
    TUNNEL_CONF conf = {};
    strcpy(conf.szServer, "broker.example");
    strcpy(conf.szUserId, "us'er \"x\"");
    strcpy(conf.szPassword, "se cr*t$\xc3\xbc");
    return conf;
}

std::string lines(bool is_start, const std::string &end) {
    return std::string("host_type=host\nprefixlen=64\nif_prefix=\ndns_server=\ngogoc_dir=/etc/gogoc\n") +
           (is_start ? "auto_retry_connect=yes\nretry_delay=10\nretry_delay_max=30\n"
                     : "auto_retry_connect=no\nretry_delay=3\nretry_delay_max=5\n") +
           "keepalive=yes\nkeepalive_interval=30\ntunnel_mode=v6udpv4\nif_tunnel_v6v4=sit1\nif_tunnel_v6udpv4=tun\n"
           "if_tunnel_v4v6=sit0\nclient_v4=auto\nclient_v6=auto\ntemplate=linux\nproxy_client=no\n"
           "broker_list=tsp-broker-list.txt\nlast_server=tsp-last-server.txt\nalways_use_same_server=no\nlog_file=0\n"
           "log_filename=gogoc.log\nlog_rotation=yes\nlog_rotation_size=32\nlog_rotation_delete=no\n"
           "syslog_facility=USER\n" +
           end;
}

/** A descriptor that the caller has open. */
struct descriptor_of_caller {
    descriptor_of_caller() = default;
    descriptor_of_caller(const descriptor_of_caller &) = delete;
    descriptor_of_caller &operator=(const descriptor_of_caller &) = delete;
    ~descriptor_of_caller() {
        close(fd);
        unlink(kMine.c_str());
    }
    int fd = open(kMine.c_str(), O_RDWR | O_CREAT, 0600);
};

} // namespace

/** A process that looks like the client. */
class fake_client {
public:
    fake_client() : pid_(fork()) {
        if (pid_ == 0) {
            execl("/bin/sleep", "/usr/bin/gogoc", "1000", nullptr);
            _exit(127);
        }
        while (read_file("/proc/" + std::to_string(pid_) + "/cmdline").rfind("/usr/bin/gogoc", 0) != 0) {
            usleep(1000);
        }
    }
    fake_client(const fake_client &) = delete;
    fake_client &operator=(const fake_client &) = delete;
    ~fake_client() { end(); }

    /** Ends it if it has not been. @return the signal that ended it */
    int end() {
        if (pid_ > 0) {
            kill(pid_, SIGTERM);
            waitpid(pid_, &status_, 0);
            pid_ = -1;
        }
        return WTERMSIG(status_);
    }
    /** Whether it has been ended; waits for what was sent to it. */
    bool was_killed() {
        siginfo_t info = {};
        return waitid(P_PID, static_cast<id_t>(pid_), &info, WEXITED | WNOWAIT | (wants_kill_ ? 0 : WNOHANG)) == 0 &&
               info.si_status == SIGKILL;
    }
    /** Says that a signal has been sent, so that was_killed waits for it. */
    fake_client &after_kill() {
        wants_kill_ = true;
        return *this;
    }

private:
    pid_t pid_;
    int status_ = 0;
    bool wants_kill_ = false;
};

class service_tunnel_execute : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        shell("rm -f " + kSeen + " " + kSeenMode);
        write_file("/etc/kova/service/kovatunnel.conf", "run=no\n");
        for (const char *word : {"start", "stop", "restart"}) {
            rig.answer(std::string("/etc/gogoc/rc.tun ") + word, 0, "", look);
        }
        address_is(false);
    }
    void TearDown() override {
        EXPECT_EQ("<absent>", read_file(kConf));
        EXPECT_EQ(-1, waitpid(-1, nullptr, WNOHANG)) << "a child was left";
        unit_test::TearDown();
    }

    /** What the script finds, or there is no such file. */
    static void look() {
        struct stat status = {};
        if (stat(kConf.c_str(), &status) == 0) {
            write_file(kSeen, read_file(kConf));
            write_file(kSeenMode, std::to_string(status.st_mode & 07777U));
        }
    }
    void address_is(bool there) {
        rig.replace_file("/proc/net/if_inet6", there ? "20010db8000000000000000000000002 05 40 00 80      tun\n"
                                                     : "20010db8000000000000000000000002 05 40 00 80     tun0\n");
    }
    outcome execute(int action, const TUNNEL_CONF *conf = nullptr) {
        return rig.observe([=] { return KOVATunnelExecute(action, conf); });
    }
};

// ---- what the client is given

TEST_F(service_tunnel_execute, KOVATunnelExecute_start_givesTheAccount) {
    const TUNNEL_CONF conf = account();
    address_is(true);
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_START, &conf), {.result = 0,
                                                       .log = {kDone, kNoBrokers, kUp},
                                                       .commands = {"/etc/gogoc/rc.tun start"},
                                                       .locks = conf_locks(3)});
    EXPECT_EQ(lines(true, "server=broker.example\nauth_method=any\nuserid=us'er \"x\"\npasswd=se cr*t$\xc3\xbc\n"),
              read_file(kSeen));
    EXPECT_EQ(std::to_string(0600), read_file(kSeenMode));
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_restart_triesOnce) {
    const TUNNEL_CONF conf = account();
    address_is(true);
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_RESTART, &conf), {.result = 0,
                                                         .log = {kDone, kNoBrokers, kUp},
                                                         .commands = {"/etc/gogoc/rc.tun restart"},
                                                         .locks = conf_locks(3)});
    EXPECT_EQ(lines(false, "server=broker.example\nauth_method=any\nuserid=us'er \"x\"\npasswd=se cr*t$\xc3\xbc\n"),
              read_file(kSeen));
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_anonymous_namesNobody) {
    TUNNEL_CONF conf = account();
    conf.blAnonymous = 1;
    EXPECT_EQ(0, execute(KOVA_TUNNEL_START, &conf).result);
    EXPECT_EQ(lines(true, "server=broker.example\nauth_method=anonymous\nuserid=\npasswd=\n"), read_file(kSeen));
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_stop_givesNothing) {
    EXPECT_OUTCOME(
        execute(KOVA_TUNNEL_STOP),
        {.result = 0, .log = {kDone, kNoBrokers}, .commands = {"/etc/gogoc/rc.tun stop"}, .locks = conf_locks(1)});
    EXPECT_EQ("<absent>", read_file(kSeen));
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_withoutAccount_takesTheStoredOne) {
    const TUNNEL_CONF conf = account();
    ASSERT_EQ(0, KOVATunnelConfigSet(&conf));
    EXPECT_EQ(0, execute(KOVA_TUNNEL_RESTART).result);
    EXPECT_EQ(lines(false, "server=broker.example\nauth_method=any\nuserid=us'er \"x\"\npasswd=se cr*t$\xc3\xbc\n"),
              read_file(kSeen));
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_secretBytes_areTheClientsWord) {
    for (const std::string &secret :
         {std::string("p"), std::string(31, '\xff'), std::string("\"\""), std::string("a=b"), std::string("\x01\t\x7f"),
          std::string(" x "), std::string("#"), std::string()}) {
        TUNNEL_CONF conf = {};
        memcpy(conf.szPassword, secret.data(), secret.size());
        memset(conf.szUserId, 'u', sizeof conf.szUserId - 1);
        EXPECT_EQ(0, execute(KOVA_TUNNEL_START, &conf).result);
        EXPECT_EQ(lines(true, "server=\nauth_method=any\nuserid=" + long_text(255, 'u') + "\npasswd=" + secret + "\n"),
                  read_file(kSeen));
    }
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_oldConfiguration_isReplacedAndNeverReadable) {
    write_file(kConf, "passwd=old\nextra=1\n");
    shell("chmod 666 " + kConf + " && ln " + kConf + " /etc/ppp/still-open");
    const mode_t old = umask(0);
    TUNNEL_CONF conf = account();
    EXPECT_EQ(0, execute(KOVA_TUNNEL_START, &conf).result);
    umask(old);
    EXPECT_EQ(std::string::npos, read_file(kSeen).find("extra"));
    EXPECT_EQ(std::to_string(0600), read_file(kSeenMode));
    EXPECT_EQ("passwd=old\nextra=1\n", read_file("/etc/ppp/still-open"));
    shell("ln -s /etc/ppp/still-open " + kConf);
    EXPECT_EQ(0, execute(KOVA_TUNNEL_START, &conf).result);
    EXPECT_EQ("passwd=old\nextra=1\n", read_file("/etc/ppp/still-open"));
    shell("rm /etc/ppp/still-open");
}

// ---- what goes wrong before the script

TEST_F(service_tunnel_execute, KOVATunnelExecute_storedAccountThatCannotBeRead_startsNothing) {
    shell("rm /etc/kova/service/kovatunnel.conf");
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_START),
                   {.result = 0,
                    .log = {"ERR tunnel_config_get:N Failed to get the run key of [kovatunnel], kovaerr=[0x0900]",
                            "ERR service_tunnel_execute:N unable to get Tunnel config, file crashed or not set.",
                            "ERR service_tunnel_execute:N Failed to make tunnel config file.", kNoBrokers},
                    .locks = conf_locks(1)});
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_configurationThatCannotBeWritten_startsNothing) {
    const TUNNEL_CONF conf = account();
    const texts log{"ERR service_tunnel_execute:N failed to make gogoc config file",
                    "ERR service_tunnel_execute:N Failed to make tunnel config file.", kNoBrokers};
    for (const char *operation : {"KLIBCFileTouch", "chmod", "KLIBCFileSetKeys"}) {
        rig.fail(operation);
        EXPECT_OUTCOME(execute(KOVA_TUNNEL_START, &conf), {.result = 0, .log = log, .locks = conf_locks(2)});
    }
    for (const char *operation : {"KLIBCSzHashAlloc", "KLIBCSzHashSetValue"}) {
        rig.fail(operation);
        EXPECT_OUTCOME(execute(KOVA_TUNNEL_START, &conf), {.result = 0, .log = log, .locks = conf_locks(1)});
    }
    rig.fail("KLIBCFileLockTimeByFile");
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_START, &conf), {.result = 0, .log = log, .locks = conf_locks(1)});
    EXPECT_EQ("<absent>", read_file(kSeen));
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_noProcess_isAFailure) {
    for (const int nth : {1, 2}) {
        rig.fail("fork", nth);
        EXPECT_OUTCOME(execute(KOVA_TUNNEL_STOP), {.result = -1,
                                                   .log = {"ERR service_tunnel_execute:N Fail to fork, "
                                                           "errno=[11/Resource temporarily unavailable]"}});
    }
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_otherActions_runNothing) {
    for (const int action : {-1, 3, 99}) {
        write_file(kConf, "left\n");
        EXPECT_OUTCOME(execute(action), {.result = 0, .log = {kNoBrokers}, .locks = conf_locks(2)});
        EXPECT_EQ("<absent>", read_file(kConf));
    }
    address_is(true);
    EXPECT_OUTCOME(execute(3), {.result = 0, .log = {kNoBrokers}, .locks = conf_locks(2)});
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_badAccounts_areRefused) {
    const auto expect_refused = [this](const char *condition, const TUNNEL_CONF &conf) {
        EXPECT_OUTCOME(execute(KOVA_TUNNEL_START, &conf), refusal(kUnit, condition));
    };
    TUNNEL_CONF conf = account();
    memset(conf.szServer, 's', sizeof conf.szServer);
    expect_refused("is_one_line(pConf->szServer)", conf);
    conf = account();
    memset(conf.szUserId, 's', sizeof conf.szUserId);
    expect_refused("is_one_line(pConf->szUserId)", conf);
    conf = account();
    memset(conf.szPassword, 's', sizeof conf.szPassword);
    expect_refused("is_one_line(pConf->szPassword)", conf);
    memset(conf.szUserId, 's', sizeof conf.szUserId);
    conf.blAnonymous = 1; // nobody asks for user and password
    EXPECT_EQ(0, execute(KOVA_TUNNEL_START, &conf).result);
    EXPECT_EQ(lines(true, "server=broker.example\nauth_method=anonymous\nuserid=\npasswd=\n"), read_file(kSeen));
    strcpy(conf.szServer, "\n");
    expect_refused("is_one_line(pConf->szServer)", conf);
    for (const char *end : {"\n", "\r", "\npasswd=x"}) {
        conf = account();
        strcpy(conf.szServer, end);
        expect_refused("is_one_line(pConf->szServer)", conf);
        conf = account();
        strcpy(conf.szUserId, end);
        expect_refused("is_one_line(pConf->szUserId)", conf);
        conf = account();
        strcpy(conf.szPassword, end);
        expect_refused("is_one_line(pConf->szPassword)", conf);
    }
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_accountThatIsNotUsed_isNotLookedAt) {
    TUNNEL_CONF conf;
    memset(&conf, '\n', sizeof conf);
    conf.blAnonymous = 0;
    EXPECT_OUTCOME(
        execute(KOVA_TUNNEL_STOP, &conf),
        {.result = 0, .log = {kDone, kNoBrokers}, .commands = {"/etc/gogoc/rc.tun stop"}, .locks = conf_locks(1)});
    EXPECT_OUTCOME(execute(3, &conf), {.result = 0, .log = {kNoBrokers}, .locks = conf_locks(2)});
}

// ---- the script, and what comes of it

TEST_F(service_tunnel_execute, KOVATunnelExecute_scriptThatFails_isLogged) {
    const TUNNEL_CONF conf = account();
    for (const int status : {1, 127, -1, 137}) {
        rig.answer("/etc/gogoc/rc.tun restart", status, "", look);
        EXPECT_OUTCOME(
            execute(KOVA_TUNNEL_RESTART, &conf),
            {.result = 0,
             .log = {"ERR service_tunnel_execute:N excute command /etc/gogoc/rc.tun restart failed", kDone, kNoBrokers},
             .commands = {"/etc/gogoc/rc.tun restart"},
             .locks = conf_locks(3)});
    }
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_scriptThatTakesSomeSeconds_isWaitedFor) {
    const TUNNEL_CONF conf = account();
    rig.hold_forked();
    rig.answer("/etc/gogoc/rc.tun start", 0, "", [this] { rig.wait_for_release(); });
    int seconds = 0;
    rig.on_sleep([&](long) {
        EXPECT_NE("<absent>", read_file(kConf));
        if (++seconds == 3) {
            rig.release_forked();
        }
    });
    address_is(true);
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_START, &conf), {.result = 0,
                                                       .log = {kDone, kNoBrokers, kUp},
                                                       .commands = {"/etc/gogoc/rc.tun start"},
                                                       .locks = conf_locks(3),
                                                       .sleeps = {1000, 1000, 1000}});
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_scriptThatNeverEnds_isLeftAfter45Seconds) {
    const TUNNEL_CONF conf = account();
    rig.hold_forked();
    rig.answer("/etc/gogoc/rc.tun start", 0, "", [this] { rig.wait_for_release(); });
    rig.on_sleep([&](long) { EXPECT_NE("<absent>", read_file(kConf)); });
    // what the process of its own did comes at the end, when it is let go
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_START, &conf), {.result = 0,
                                                       .log = {kTimeout, kNoBrokers, kDone},
                                                       .commands = {"/etc/gogoc/rc.tun start"},
                                                       .locks = conf_locks(3),
                                                       .sleeps = std::vector<long>(45, 1000)});
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_signal_doesNotShortenTheWait) {
    const TUNNEL_CONF conf = account();
    rig.hold_forked();
    rig.answer("/etc/gogoc/rc.tun start", 0, "", [this] { rig.wait_for_release(); });
    rig.fail("nanosleep", 45);
    std::vector<long> sleeps(46, 1000);
    sleeps[44] = sleeps[45] = 500;
    EXPECT_EQ(sleeps, execute(KOVA_TUNNEL_START, &conf).sleeps);
}

/** What a later call writes while the script of this one runs. */
TEST_F(service_tunnel_execute, KOVATunnelExecute_configurationOfAnotherCall_isLeft) {
    const TUNNEL_CONF conf = account();
    const auto replace = [] {
        write_file(kConf + ".other", "server=other\n");
        std::filesystem::rename(kConf + ".other", kConf);
    };
    const auto expect_left = [](const char *what) {
        EXPECT_EQ("server=other\n", read_file(kConf)) << what;
        std::filesystem::remove(kConf);
    };
    rig.answer("/etc/gogoc/rc.tun start", 0, "", replace);
    EXPECT_EQ(0, execute(KOVA_TUNNEL_START, &conf).result);
    expect_left("by the process of its own and by the call");
    rig.answer("/etc/gogoc/rc.tun start", 0, "", [&] {
        replace();
        kill(getpid(), SIGKILL);
    });
    EXPECT_EQ(0, execute(KOVA_TUNNEL_START, &conf).result);
    expect_left("by the call alone");
    rig.answer("/etc/gogoc/rc.tun stop", 0, "", replace);
    EXPECT_EQ(0, execute(KOVA_TUNNEL_STOP).result);
    expect_left("by a stop, which writes none");
    write_file(kConf, "server=other\n");
    shell("rm /etc/kova/service/kovatunnel.conf");
    EXPECT_EQ(0, execute(KOVA_TUNNEL_START).result);
    expect_left("by a call that got no account");
}

/** A file system gives the number of a deleted file to the next one. */
TEST_F(service_tunnel_execute, KOVATunnelExecute_configurationWithTheSameNumber_isLeft) {
    const TUNNEL_CONF conf = account();
    rig.answer("/etc/gogoc/rc.tun start", 0, "", [] {
        write_file(kConf, "server=other\n");
        std::filesystem::last_write_time(kConf, std::filesystem::file_time_type::clock::now() + std::chrono::hours(1));
    });
    EXPECT_EQ(0, execute(KOVA_TUNNEL_START, &conf).result);
    EXPECT_EQ("server=other\n", read_file(kConf));
    std::filesystem::remove(kConf);
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_processThatIsKilledWhileItWrites_leavesNoConfiguration) {
    const TUNNEL_CONF conf = account();
    rig.before("KLIBCFileSetKeys", [] {
        EXPECT_EQ("", read_file(kConf));
        kill(getpid(), SIGKILL);
    });
    const outcome got = execute(KOVA_TUNNEL_START, &conf); // how soon the kernel takes its lock away is not known
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(texts{kNoBrokers}, got.log);
    EXPECT_EQ("<absent>", read_file(kConf));
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_descriptorLimit_isNoEndOfTheScript) {
    rlimit before = {};
    ASSERT_EQ(0, getrlimit(RLIMIT_NOFILE, &before));
    rig.hold_forked();
    int forks = 0;
    rig.before("fork", [&] {
        const rlimit none{3, before.rlim_max};
        if (++forks == 2) { // the process in between
            setrlimit(RLIMIT_NOFILE, &none);
        }
    });
    rig.answer("/etc/gogoc/rc.tun stop", 0, "", [&] {
        setrlimit(RLIMIT_NOFILE, &before);
        rig.wait_for_release();
    });
    int seconds = 0;
    rig.on_sleep([&](long) {
        if (++seconds == 2) {
            rig.release_forked();
        }
    });
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_STOP), {.result = 0,
                                               .log = {kDone, kNoBrokers},
                                               .commands = {"/etc/gogoc/rc.tun stop"},
                                               .locks = conf_locks(1),
                                               .sleeps = {1000, 1000}});
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_streamsThatCannotBeSilenced_areAFailure) {
    rig.fail("open");
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_STOP),
                   {.result = -1,
                    .log = {"ERR service_tunnel_execute:N Fail to fork, errno=[11/Resource temporarily unavailable]"}});
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_processThatIsKilled_leavesNoConfiguration) {
    const TUNNEL_CONF conf = account();
    rig.answer("/etc/gogoc/rc.tun start", 0, "", [] { kill(getpid(), SIGKILL); });
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_START, &conf), {.result = 0, .log = {kNoBrokers}, .locks = conf_locks(1)});
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_process_isNobodysChildAndHoldsNothing) {
    const descriptor_of_caller mine;
    rig.answer("/etc/gogoc/rc.tun stop", 0, "", [] {
        EXPECT_EQ(getpid(), getsid(0)) << "what ends its caller from the terminal leaves it alone";
        for (const std::string &target : open_descriptors()) {
            EXPECT_EQ(std::string::npos, target.find(kMine)) << "a descriptor of the caller";
        }
        char stream[64] = "";
        EXPECT_LT(0, readlink("/proc/self/fd/1", stream, sizeof stream - 1));
        EXPECT_STREQ("/dev/null", stream);
        EXPECT_EQ(0, prctl(PR_GET_DUMPABLE)) << "others could read the password in its memory";
    });
    EXPECT_EQ(0, execute(KOVA_TUNNEL_STOP).result);
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_callerThatIgnoresItsChildren_isServed) {
    const auto before = signal(SIGCHLD, SIG_IGN);
    address_is(true);
    const TUNNEL_CONF conf = account();
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_START, &conf), {.result = 0,
                                                       .log = {kDone, kNoBrokers, kUp},
                                                       .commands = {"/etc/gogoc/rc.tun start"},
                                                       .locks = conf_locks(3)});
    signal(SIGCHLD, before);
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_clientWithoutAddress_isKilledUnlessItWasStarted) {
    const TUNNEL_CONF conf = account();
    fake_client client;
    EXPECT_OUTCOME(
        execute(KOVA_TUNNEL_START, &conf),
        {.result = 0, .log = {kDone, kNoBrokers}, .commands = {"/etc/gogoc/rc.tun start"}, .locks = conf_locks(3)});
    EXPECT_FALSE(client.was_killed());
    EXPECT_OUTCOME(execute(7), {.result = 0, .log = {kNoBrokers}, .locks = conf_locks(2)});
    EXPECT_FALSE(client.was_killed());
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_RESTART, &conf), {.result = -1,
                                                         .log = {kDone, kNoBrokers, kHangs},
                                                         .commands = {"/etc/gogoc/rc.tun restart"},
                                                         .locks = conf_locks(4)});
    EXPECT_TRUE(client.after_kill().was_killed());
    client.end();
    fake_client other;
    write_file(kConf, "passwd=left by a call that was killed\n");
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_STOP), {.result = -1,
                                               .log = {kDone, kNoBrokers, kHangs},
                                               .commands = {"/etc/gogoc/rc.tun stop"},
                                               .locks = conf_locks(2)});
    EXPECT_EQ("<absent>", read_file(kConf));
    EXPECT_TRUE(other.after_kill().was_killed());
    other.end();
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_hangingRestart_killsAfterTheTimeout) {
    const TUNNEL_CONF conf = account();
    fake_client client;
    rig.hold_forked();
    rig.answer("/etc/gogoc/rc.tun restart", 0, "", [this] { rig.wait_for_release(); });
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_RESTART, &conf), {.result = -1,
                                                         .log = {kTimeout, kNoBrokers, kHangs, kDone},
                                                         .commands = {"/etc/gogoc/rc.tun restart"},
                                                         .locks = conf_locks(4),
                                                         .sleeps = std::vector<long>(45, 1000)});
    EXPECT_TRUE(client.after_kill().was_killed());
    client.end();
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_addressAfterAStop_isAFailure) {
    address_is(true);
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_STOP),
                   {.result = -1,
                    .log = {kDone, kNoBrokers, "ERR service_tunnel_execute:N gogoc still alive, failed to stop"},
                    .commands = {"/etc/gogoc/rc.tun stop"},
                    .locks = conf_locks(1)});
}

// ---- after it

TEST_F(service_tunnel_execute, KOVATunnelExecute_brokerList_isPutAside) {
    const std::filesystem::path before = std::filesystem::current_path();
    shell("rm -rf /tmp/work && mkdir /tmp/work && echo old > /tmp/work/tsp-broker-list.txt.bak");
    std::filesystem::current_path("/tmp/work");
    rig.answer("/etc/gogoc/rc.tun stop", 0, "", [] { write_file("/tmp/work/tsp-broker-list.txt", "other\n"); });
    EXPECT_OUTCOME(execute(KOVA_TUNNEL_STOP),
                   {.result = 0, .log = {kDone}, .commands = {"/etc/gogoc/rc.tun stop"}, .locks = conf_locks(1)});
    EXPECT_EQ(texts{"tsp-broker-list.txt.bak"}, list_dir("/tmp/work"));
    EXPECT_EQ("other\n", read_file("/tmp/work/tsp-broker-list.txt.bak"));
    std::filesystem::current_path(before);
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_relayThatRuns_isReloaded) {
    write_file("/usr/kova/service/kovarelayd", "#!/bin/sh\n");
    rig.answer("/usr/kova/service/kovarelayd status", 0);
    for (const int status : {0, 1}) { // whether the reload succeeds is not looked at
        rig.answer("/usr/kova/service/kovarelayd reload", status);
        const outcome got = execute(KOVA_TUNNEL_STOP);
        EXPECT_EQ(0, got.result);
        EXPECT_EQ((texts{"/etc/gogoc/rc.tun stop", "/usr/kova/service/kovarelayd status",
                         "/usr/kova/service/kovarelayd reload"}),
                  got.commands);
    }
    rig.answer("/usr/kova/service/kovarelayd status", 3);
    EXPECT_EQ((texts{"/etc/gogoc/rc.tun stop", "/usr/kova/service/kovarelayd status"}),
              execute(KOVA_TUNNEL_STOP).commands);
    rig.answer("/usr/kova/service/kovarelayd status", 0);
    address_is(true);
    EXPECT_EQ(texts{"/etc/gogoc/rc.tun stop"}, execute(KOVA_TUNNEL_STOP).commands) << "a failure ends the call";
}

TEST_F(service_tunnel_execute, KOVATunnelExecute_secrets_areInNoLogAndOnNoCommandLine) {
    const TUNNEL_CONF conf = account();
    for (const char *failing : {"", "KLIBCFileSetKeys", "KLIBCFileTouch", "KLIBCSzHashSetValue", "fork"}) {
        if (*failing != '\0') {
            rig.fail(failing);
        }
        const outcome got = execute(KOVA_TUNNEL_RESTART, &conf);
        EXPECT_EQ(std::string::npos, got.str().find("cr*t")) << failing;
    }
}
