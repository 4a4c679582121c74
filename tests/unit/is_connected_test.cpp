#include "support/connections.h"
#include "support/fake_names.h"
#include "support/memory.h"

#include <chrono>
#include <fcntl.h>
#include <kovanetsdk/stats.h>
#include <sys/resource.h>

using namespace kova_test;

namespace {

const std::string kUnit = "is_connected";
const std::string kLookup = "/usr/bin/nmblookup";
const std::optional<std::string> kZeroByte{std::string(1, '\0')};
constexpr int kLimit = 30; ///< seconds that no test waits for

/** Ends waits for what gives no answer, as if their time had passed, and keeps their limits in milliseconds. */
class no_waiting {
public:
    no_waiting() {
        on_poll = [this](pollfd &asked, long ms) {
            constexpr int kLongEnoughOnLoopback = 200;
            const int ready = poll(&asked, 1, kLongEnoughOnLoopback);
            if (ready == 0) {
                limits.push_back(ms);
            }
            return ready;
        };
    }
    no_waiting(const no_waiting &) = delete;
    no_waiting &operator=(const no_waiting &) = delete;
    ~no_waiting() { on_poll = {}; }

    std::vector<long> limits;
};

/** Answers ppoll in the place of the kernel. */
class poll_answer {
public:
    explicit poll_answer(std::function<int(pollfd &, long)> answer) { on_poll = std::move(answer); }
    poll_answer(const poll_answer &) = delete;
    poll_answer &operator=(const poll_answer &) = delete;
    ~poll_answer() { on_poll = {}; }
};

} // namespace

class is_connected : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        host.emplace();
    }
    void TearDown() override {
        host.reset();
        unit_test::TearDown();
    }
    outcome reach(const std::string &name, int port, int timeout = kLimit) {
        return rig.observe([&] { return BlKLIBIsConnected(name.c_str(), port, timeout); });
    }
    outcome reach(int timeout = kLimit) { return reach("nas01", host->port(), timeout); }
    static outcome asked(long result, const std::string &name = "nas01") {
        return {.result = result, .commands = {kLookup + " " + name}};
    }

    std::optional<listener> host;
    fake_names names;
};

// ---- one address

TEST_F(is_connected, BlKLIBIsConnected_openPort_isConnectedAndGetsOneZeroByte) {
    names.add("nas01", {"127.0.0.1"});
    for (const int timeout : {0, 1, kLimit, INT32_MAX}) {
        EXPECT_OUTCOME(reach(timeout), {.result = 1});
        EXPECT_EQ(kZeroByte, host->received());
        EXPECT_EQ(std::nullopt, host->received());
    }
    EXPECT_EQ("nas01/" + std::to_string(host->port()), names.asked.front());
}

TEST_F(is_connected, BlKLIBIsConnected_closedPort_isToldAtOnceAndTheNetworkIsAsked) {
    names.add("127.0.0.1", {"127.0.0.1"});
    const int port = closed_port();
    const auto start = std::chrono::steady_clock::now();
    EXPECT_OUTCOME(reach("127.0.0.1", port), asked(0, "127.0.0.1"));
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds{kLimit / 2});
}

TEST_F(is_connected, BlKLIBIsConnected_noAnswer_isWaitedForTheTimeGiven) {
    names.add("nas01", {"127.0.0.1"});
    host->stop_answering();
    const no_waiting waits;
    EXPECT_OUTCOME(reach(7), asked(0));
    ASSERT_EQ(1U, waits.limits.size());
    EXPECT_GT(waits.limits[0], 2000); // it may have been busy meanwhile
    EXPECT_LE(waits.limits[0], 7000);
    EXPECT_OUTCOME(reach(0), asked(0));
    EXPECT_EQ(0, waits.limits[1]);
    EXPECT_OUTCOME(reach(INT32_MAX), asked(0));
    EXPECT_GT(waits.limits[2], 1000L * INT32_MAX - 60000);
}

TEST_F(is_connected, BlKLIBIsConnected_answerWithinTheTime_isConnected) {
    names.add("nas01", {"127.0.0.1"});
    host->stop_answering();
    short told = POLLOUT;
    const poll_answer answer([&](pollfd &socket, long) {
        EXPECT_EQ(POLLIN | POLLOUT | POLLPRI, socket.events);
        socket.revents = told;
        return 1;
    });
    EXPECT_OUTCOME(reach(), {.result = 1});
    told = POLLIN;
    EXPECT_OUTCOME(reach(), {.result = 1});
    told = POLLPRI;
    EXPECT_OUTCOME(reach(), asked(0));
    told = POLLOUT | POLLERR | POLLHUP;
    rig.fail("SO_ERROR");
    EXPECT_OUTCOME(reach(), asked(0));
    rig.fail("getsockopt");
    EXPECT_OUTCOME(reach(), asked(0));
}

TEST_F(is_connected, BlKLIBIsConnected_signals_neitherEndNorProlongTheWait) {
    names.add("nas01", {"127.0.0.1"});
    host->stop_answering();
    std::vector<long> limits;
    const poll_answer answer([&](pollfd &, long ms) {
        limits.push_back(ms);
        rig.slept_ms += 2000;
        errno = EINTR;
        return -1;
    });
    EXPECT_OUTCOME(reach(5), asked(0));
    ASSERT_EQ(4U, limits.size());
    EXPECT_LE(limits[0], 5000);
    EXPECT_LE(limits[1], 3000);
    EXPECT_LE(limits[2], 1000);
    EXPECT_EQ(0, limits[3]);
}

TEST_F(is_connected, BlKLIBIsConnected_failuresOfTheSocket_areNoConnection) {
    names.add("nas01", {"127.0.0.1"});
    for (const char *operation : {"socket", "connect"}) {
        rig.fail(operation);
        EXPECT_OUTCOME(reach(), asked(0));
    }
    host->stop_answering();
    rig.fail("ppoll");
    EXPECT_OUTCOME(reach(), asked(0));
}

TEST_F(is_connected, BlKLIBIsConnected_byteThatCannotBeSent_isNoFailure) {
    names.add("nas01", {"127.0.0.1"});
    rig.fail("send");
    EXPECT_OUTCOME(reach(), {.result = 1});
    EXPECT_EQ(std::optional<std::string>{""}, host->received());
}

TEST_F(is_connected, BlKLIBIsConnected_callerWithManyDescriptors_isServed) {
    names.add("nas01", {"127.0.0.1"});
    rlimit most{};
    ASSERT_EQ(0, getrlimit(RLIMIT_NOFILE, &most));
    ASSERT_GT(most.rlim_max, 1200U);
    const rlimit more{std::max<rlim_t>(most.rlim_cur, 1200), most.rlim_max};
    ASSERT_EQ(0, setrlimit(RLIMIT_NOFILE, &more));
    std::vector<test_socket> taken;
    while (taken.empty() || taken.back().get() < 1100) {
        taken.emplace_back(fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, 3));
        ASSERT_GE(taken.back().get(), 0);
    }
    host->stop_answering();
    const poll_answer answer([](pollfd &socket, long) {
        EXPECT_GT(socket.fd, 1100);
        socket.revents = POLLOUT;
        return 1;
    });
    EXPECT_OUTCOME(reach(), {.result = 1});
    setrlimit(RLIMIT_NOFILE, &most);
}

// ---- several addresses

TEST_F(is_connected, BlKLIBIsConnected_severalAddresses_areTriedUntilOneAnswers) {
    const listener second{"127.0.0.3", host->port()};
    names.add("nas01", {"of another family", "2001:db8::1", "127.0.0.2", "127.0.0.1", "127.0.0.3"});
    EXPECT_OUTCOME(reach(), {.result = 1});
    EXPECT_EQ(kZeroByte, host->received());
}

TEST_F(is_connected, BlKLIBIsConnected_eachAddress_hasTheTimeGiven) {
    listener second{"127.0.0.2", host->port()};
    host->stop_answering();
    second.stop_answering();
    const listener third{"127.0.0.3", host->port()};
    names.add("nas01", {"127.0.0.1", "127.0.0.2", "127.0.0.4"});
    const no_waiting waits;
    EXPECT_OUTCOME(reach(9), asked(0));
    ASSERT_EQ(2U, waits.limits.size());
    EXPECT_GT(std::min(waits.limits[0], waits.limits[1]), 4500) << "they share the limit";
    names.add("nas01", {"127.0.0.1", "127.0.0.3"});
    EXPECT_OUTCOME(reach(9), {.result = 1});
}

// ---- the local network

TEST_F(is_connected, BlKLIBIsConnected_nameThatDoesNotResolve_isAskedForOnTheNetwork) {
    rig.answer(kLookup, 0, "querying nas01 on 10.0.0.255\n127.0.0.1 nas01<00>\n127.0.0.9 nas01<20>\n");
    EXPECT_OUTCOME(reach(), asked(1));
    EXPECT_EQ(kZeroByte, host->received());
    rig.fail("getaddrinfo");
    names.add("nas01", {"127.0.0.1"});
    EXPECT_OUTCOME(reach(), asked(1));
}

TEST_F(is_connected, BlKLIBIsConnected_addressesOfTheNetwork_areTriedUntilOneAnswers) {
    names.add("nas01", {"127.0.0.4"});
    rig.answer(kLookup, 0, "127.0.0.2 nas01<00>\n127.0.0.3 other<00>\nnone nas01<00>\n127.0.0.1 nas01<20>\n");
    EXPECT_OUTCOME(reach(), asked(1));
    EXPECT_EQ(kZeroByte, host->received());
    rig.answer(kLookup, 0, "127.0.0.2 nas01<00>\n127.0.0.1 nas<20>\n");
    EXPECT_OUTCOME(reach(), asked(0));
    host->stop_answering();
    const no_waiting waits;
    rig.answer(kLookup, 0, "127.0.0.1 nas01<00>\n127.0.0.1 nas01<20>\n");
    EXPECT_OUTCOME(reach(4), asked(0));
    EXPECT_EQ(2U, waits.limits.size());
}

TEST_F(is_connected, BlKLIBIsConnected_toolThatFails_isNoConnection) {
    rig.answer(kLookup, 1, "name_query failed to find name nas01\n");
    EXPECT_OUTCOME(reach(), asked(0));
    rig.fail("KLIBCPopen");
    EXPECT_OUTCOME(reach(), {.result = 0,
                             .code = 0x2A00,
                             .unit = "platform",
                             .log = {"INFO is_connected:N Fail to execute [/usr/bin/nmblookup], kovaerr=[0x2A00]"},
                             .commands = {kLookup + " nas01"}});
}

TEST_F(is_connected, BlKLIBIsConnected_noMemoryForLines_isNoConnection) {
    NEEDS_OWN_ALLOCATOR();
    rig.fail("malloc");
    EXPECT_OUTCOME(reach(), {.result = 0,
                             .code = 0x200,
                             .unit = kUnit,
                             .log = {"ERR is_connected:N pszBuf is NULL"},
                             .commands = {kLookup + " nas01"}});
}

// ---- arguments

TEST_F(is_connected, BlKLIBIsConnected_namesThatNoHostHas_areNotConnected) {
    for (const std::string &name : {std::string("-h"), long_text(70), long_text(100000)}) {
        EXPECT_OUTCOME(reach(name, host->port()), {.result = 0});
    }
}

TEST_F(is_connected, BlKLIBIsConnected_badArguments_areRefused) {
    EXPECT_OUTCOME(
        rig.observe([] { return BlKLIBIsConnected(nullptr, 80, 1); }),
        {.result = 0, .code = 0xD00, .unit = kUnit, .log = {"ERR is_connected:N bad parameter, szHost is NULL"}});
    EXPECT_OUTCOME(reach("", 80), refusal(kUnit, "'\\0' != *szHost", 0));
    for (const int port : {0, -1, 65536, INT32_MAX, INT32_MIN}) {
        EXPECT_OUTCOME(reach("nas01", port), refusal(kUnit, "(0 < nPort && nPort <= 65535)", 0));
    }
    for (const int timeout : {-1, INT32_MIN}) {
        EXPECT_OUTCOME(reach(timeout), refusal(kUnit, "0 <= nTimeout", 0));
    }
    EXPECT_EQ(texts{}, names.asked);
}
