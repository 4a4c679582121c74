#include "support/rig.h"

#include <arpa/inet.h>
#include <climits>
#include <ctime>
#include <kovanetsdk/addr.h>
#include <limits>
#include <numeric>
#include <sys/resource.h>
#include <sys/socket.h>
#include <unistd.h>

using namespace kova_test;

namespace {

constexpr int kTcp = 1;
constexpr int kUdp = 2;
constexpr char kHead[] =
    "  sl  local_address rem_address   st tx_queue rx_queue tr tm->when retrnsmt   uid  timeout inode\n";
constexpr char kHead6[] =
    "  sl  local_address                         remote_address                        st tx_queue "
    "rx_queue tr tm->when retrnsmt   uid  timeout inode\n";

/** A line as the kernel writes it: for IPv4 an address of 8 digits, for IPv6 of 32. */
std::string line(int number, int port, unsigned state, size_t digits = 8) {
    char text[256];
    const std::string address = long_text(digits, '0');
    snprintf(text, sizeof text,
             "%4d: %s:%04X %s:%04X %02X 00000000:00000000 00:00000000 00000000     0        0 %d 1\n", number,
             address.c_str(), static_cast<unsigned>(port), address.c_str(), 0U, state, 10000 + number);
    return text;
}

/** A socket that is bound to a port of the kernel's choice, and perhaps listens. */
class bound_socket {
public:
    bound_socket(int family, int type, bool listens) : fd_(socket(family, type | SOCK_CLOEXEC, 0)) {
        sockaddr_in6 address{};
        address.sin6_family = static_cast<sa_family_t>(family);
        const socklen_t size = family == AF_INET ? sizeof(sockaddr_in) : sizeof(sockaddr_in6);
        EXPECT_EQ(0, bind(fd_, reinterpret_cast<const sockaddr *>(&address), size));
        if (listens) {
            EXPECT_EQ(0, listen(fd_, 1));
        }
        socklen_t room = sizeof address;
        EXPECT_EQ(0, getsockname(fd_, reinterpret_cast<sockaddr *>(&address), &room));
        port_ = ntohs(address.sin6_port); // which is where IPv4 has it
    }
    bound_socket(const bound_socket &) = delete;
    bound_socket &operator=(const bound_socket &) = delete;
    ~bound_socket() { close(fd_); }

    [[nodiscard]] int port() const { return port_; }

private:
    int fd_;
    int port_ = 0;
};

class net_is_port_range_used : public unit_test {
protected:
    /** What the kernel's tables of a protocol hold below their first lines. */
    void tables(const char *protocol, const std::string &v4, const std::string &v6 = "") {
        const std::string path = std::string("/proc/net/") + protocol;
        rig.replace_file(path, kHead + v4);
        rig.replace_file(path + "6", kHead6 + v6);
    }
    outcome is_used(int low, int high, int protocol = kTcp) {
        return rig.observe([=] { return KOVANetIsPortRangeUsed(low, high, protocol); });
    }
    /** The ports, of which there is room for so many; what is behind them has to stay as it is. */
    outcome list(int room, int low = 0, int high = 65535, int protocol = kTcp) {
        ports.assign(static_cast<size_t>(room) + 1, -7);
        int count = room;
        const outcome got =
            rig.observe([&] { return KOVANetGetPortUsedInRange(ports.data(), &count, low, high, protocol); });
        EXPECT_LE(count, room);
        for (size_t i = static_cast<size_t>(count); i < ports.size(); ++i) {
            EXPECT_EQ(-7, ports[i]) << "written behind the ports";
        }
        ports.resize(static_cast<size_t>(count));
        return got;
    }

    std::vector<int> ports;
};

using numbers = std::vector<int>;

TEST_F(net_is_port_range_used, KOVANetIsPortRangeUsed_socketsOfAllStates_count) {
    tables("tcp", line(0, 22, 10) + line(1, 8080, 1), line(0, 443, 6, 32));
    for (const int port : {22, 8080, 443}) {
        EXPECT_OUTCOME(is_used(port, port), {.result = 1});
        EXPECT_OUTCOME(is_used(port - 1, port), {.result = 1});
        EXPECT_OUTCOME(is_used(port, port + 1), {.result = 1});
    }
    EXPECT_OUTCOME(is_used(23, 442), {.result = 0});
    EXPECT_OUTCOME(is_used(8081, 65535), {.result = 0});
    EXPECT_OUTCOME(is_used(INT_MIN, INT_MAX), {.result = 1});
}

TEST_F(net_is_port_range_used, KOVANetIsPortRangeUsed_lowestAboveHighest_isNotUsed) {
    tables("tcp", line(0, 22, 10));
    EXPECT_OUTCOME(is_used(23, 22), {.result = 0});
    EXPECT_OUTCOME(is_used(22, 21), {.result = 0});
    EXPECT_OUTCOME(is_used(INT_MAX, INT_MIN), {.result = 0});
}

TEST_F(net_is_port_range_used, KOVANetIsPortRangeUsed_everyNumberButOne_meansUdp) {
    tables("tcp", line(0, 22, 10));
    tables("udp", line(0, 53, 7), line(0, 546, 7, 32));
    for (const int protocol : {0, 2, 17, -1}) {
        EXPECT_OUTCOME(is_used(53, 53, protocol), {.result = 1});
        EXPECT_OUTCOME(is_used(546, 546, protocol), {.result = 1});
        EXPECT_OUTCOME(is_used(22, 22, protocol), {.result = 0});
    }
    EXPECT_OUTCOME(is_used(53, 546, kTcp), {.result = 0});
}

TEST_F(net_is_port_range_used, KOVANetIsPortRangeUsed_lowestAndHighestPort_count) {
    tables("tcp", line(0, 0, 7) + line(1, 65535, 10));
    EXPECT_OUTCOME(is_used(0, 0), {.result = 1});
    EXPECT_OUTCOME(is_used(65535, 65535), {.result = 1});
    EXPECT_OUTCOME(is_used(1, 65534), {.result = 0});
}

TEST_F(net_is_port_range_used, KOVANetIsPortRangeUsed_absentTable_isNotedAndSkipped) {
    tables("tcp", "", line(0, 443, 10, 32));
    rig.hide("/proc/net/tcp");
    const std::string noted = "INFO net_is_port_range_used:N Fail to open [/proc/net/tcp], "
                              "errno=[2/No such file or directory]";
    EXPECT_OUTCOME(is_used(443, 443), {.result = 1, .log = {noted}});
    rig.hide("/proc/net/tcp6");
    const std::string noted6 = "INFO net_is_port_range_used:N Fail to open [/proc/net/tcp6], "
                               "errno=[2/No such file or directory]";
    EXPECT_OUTCOME(is_used(443, 443), {.result = 0, .log = {noted, noted6}});
    EXPECT_OUTCOME(list(4), {.result = 0, .log = {noted, noted6}});
    EXPECT_EQ(numbers{}, ports);
}

TEST_F(net_is_port_range_used, KOVANetIsPortRangeUsed_tableThatCannotBeRead_isNotedAndSkipped) {
    tables("udp", "", line(0, 546, 10, 32));
    rig.redirect("/proc/net/udp", "/tmp");
    const std::string noted = "INFO net_is_port_range_used:N Fail to read [/proc/net/udp], errno=[21/Is a directory]";
    EXPECT_OUTCOME(is_used(546, 546, kUdp), {.result = 1, .log = {noted}});
    EXPECT_OUTCOME(list(4, 1, 65535, kUdp), {.result = 0, .log = {noted}});
    EXPECT_EQ(numbers{546}, ports);
}

/** Lines that say nothing, between two that do. */
std::string foreign_lines() {
    return line(0, 22, 10) + "\n   \nnonsense\n" + "0: 00000000\n0: 00000000:\n0: 00000000:zz\n: 00000000:0050\n" +
           "0: :0050 00000000:0000 0A\n" + "0: 0000 0000:0050 00000000:0000 0A\n" + "0: " + long_text(65, '0') +
           ":0050 00000000:0000 0A\n" + "0: 00000000:10050 00000000:0000 0A\n" +
           "0: 00000000:FFFFFFFFFFFFFFFFFFFF0050 00000000:0000 0A\n0: 00000000:-50 00000000:0000 0A\n" +
           long_text(100000, 'x') + "\n" + "\x01\xff%s%n\n" + long_text(510, ' ') + line(1, 80, 10) + line(2, 8080, 10);
}

TEST_F(net_is_port_range_used, KOVANetIsPortRangeUsed_foreignLines_arePassedOver) {
    tables("tcp", foreign_lines());
    EXPECT_OUTCOME(is_used(22, 22), {.result = 1});
    EXPECT_OUTCOME(is_used(8080, 8080), {.result = 1});
    EXPECT_OUTCOME(is_used(0, 21), {.result = 0});
    EXPECT_OUTCOME(is_used(23, 8079), {.result = 0});
    EXPECT_OUTCOME(is_used(8081, INT_MAX), {.result = 0});
    EXPECT_OUTCOME(is_used(INT_MIN, -1), {.result = 0});
    EXPECT_OUTCOME(list(16), {.result = 0});
    EXPECT_EQ((numbers{22, 8080}), ports);
}

TEST_F(net_is_port_range_used, KOVANetIsPortRangeUsed_lastLineWithoutNewline_counts) {
    const std::string whole = line(0, 22, 10);
    tables("tcp", whole.substr(0, whole.size() - 1));
    EXPECT_OUTCOME(is_used(22, 22), {.result = 1});
    EXPECT_OUTCOME(list(4), {.result = 0});
    EXPECT_EQ(numbers{22}, ports);
}

TEST_F(net_is_port_range_used, KOVANetGetPortUsedInRange_listeningPorts_areStoredInOrder) {
    tables("tcp", line(0, 443, 10) + line(1, 22, 10) + line(2, 8080, 1), line(0, 80, 10, 32) + line(1, 81, 6, 32));
    EXPECT_OUTCOME(list(8), {.result = 0});
    EXPECT_EQ((numbers{443, 22, 80}), ports);
    EXPECT_OUTCOME(list(8, 22, 80), {.result = 0});
    EXPECT_EQ((numbers{22, 80}), ports);
    EXPECT_OUTCOME(list(8, 80, 22), {.result = 0});
    EXPECT_EQ(numbers{}, ports);
}

TEST_F(net_is_port_range_used, KOVANetGetPortUsedInRange_noMoreThanThereIsRoomFor_areStored) {
    tables("tcp", line(0, 443, 10) + line(1, 22, 10), line(0, 80, 10, 32));
    EXPECT_OUTCOME(list(2), {.result = 0});
    EXPECT_EQ((numbers{443, 22}), ports);
    EXPECT_OUTCOME(list(0), {.result = 0});
    EXPECT_EQ(numbers{}, ports);
}

TEST_F(net_is_port_range_used, KOVANetGetPortUsedInRange_portOfBothFamilies_isStoredOnce) {
    tables("tcp", line(0, 22, 10) + line(1, 22, 10) + line(2, 443, 10), line(0, 22, 10, 32) + line(1, 80, 10, 32));
    EXPECT_OUTCOME(list(3), {.result = 0});
    EXPECT_EQ((numbers{22, 443, 80}), ports);
}

TEST_F(net_is_port_range_used, KOVANetGetPortUsedInRange_udp_needsTheStateOfListening) {
    tables("udp", line(0, 53, 7) + line(1, 67, 10), line(0, 546, 1, 32) + line(1, 547, 10, 32));
    EXPECT_OUTCOME(list(8, 0, 65535, kUdp), {.result = 0});
    EXPECT_EQ((numbers{67, 547}), ports);
}

TEST_F(net_is_port_range_used, KOVANetGetPortUsedInRange_everyPort_isStoredOnce) {
    std::string all;
    for (int port = 65535; port >= 0; --port) {
        all += line(port, port, 10);
    }
    tables("tcp", all, all);
    EXPECT_OUTCOME(list(65536 + 8), {.result = 0});
    numbers expected(65536);
    std::iota(expected.rbegin(), expected.rend(), 0);
    EXPECT_EQ(expected, ports);
}

TEST_F(net_is_port_range_used, KOVANetGetPortUsedInRange_badArguments_areRefused) {
    const auto refused = [](const std::string &condition) { return refusal("net_is_port_range_used", condition); };
    int port = -7;
    int count = 1;
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetGetPortUsedInRange(nullptr, &count, 1, 9, kTcp); }),
                   refused("NULL != rgPort"));
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetGetPortUsedInRange(&port, nullptr, 1, 9, kTcp); }),
                   refused("NULL != pcPort"));
    EXPECT_EQ(1, count);
    for (const int capacity : {-1, INT_MIN}) {
        count = capacity;
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetGetPortUsedInRange(&port, &count, 1, 9, kTcp); }),
                       refused("0 <= *pcPort"));
        EXPECT_EQ(capacity, count);
    }
    EXPECT_EQ(-7, port);
}

TEST_F(net_is_port_range_used, KOVANetGetPortUsedInRange_socketsOfThisMachine_areFound) {
    for (const int family : {AF_INET, AF_INET6}) {
        const bound_socket listening{family, SOCK_STREAM, true};
        const bound_socket bound{family, SOCK_DGRAM, false};
        EXPECT_OUTCOME(is_used(listening.port(), listening.port(), kTcp), {.result = 1});
        EXPECT_OUTCOME(is_used(bound.port(), bound.port(), kUdp), {.result = 1});
        EXPECT_OUTCOME(list(8, listening.port(), listening.port(), kTcp), {.result = 0});
        EXPECT_EQ(numbers{listening.port()}, ports);
        EXPECT_OUTCOME(list(8, bound.port(), bound.port(), kUdp), {.result = 0});
        EXPECT_EQ(numbers{}, ports);
    }
}

// ---- what a table of many lines costs

/** A table of listening ports, each of them there many times. */
std::string table_of(int lines) {
    std::string table;
    for (int i = 0; i < lines; ++i) {
        table += line(i, 1024 + i % 50000, 10);
    }
    return table;
}

TEST_F(net_is_port_range_used, KOVANetGetPortUsedInRange_manyLines_takeTimeInProportion) {
    const auto shortest_of_five = [&](int lines) {
        tables("tcp", table_of(lines));
        double best = std::numeric_limits<double>::max();
        for (int round = 0; round < 5; ++round) {
            const clock_t begin = clock(); // of this process alone, however busy the machine is
            EXPECT_OUTCOME(list(65536), {.result = 0});
            EXPECT_OUTCOME(is_used(1, 2), {.result = 0});
            best = std::min(best, static_cast<double>(clock() - begin));
        }
        EXPECT_EQ(static_cast<size_t>(std::min(lines, 50000)), ports.size());
        return best;
    };
    const double ratio = shortest_of_five(100000) / shortest_of_five(10000);
    printf("100,000 lines take %.1f times as long as 10,000\n", ratio);
    EXPECT_LT(ratio, 30) << "ten times as many lines would take a hundred times as long if it were quadratic";
}

/** Leaves this process little more memory than it has while one lives. */
class little_memory {
public:
    explicit little_memory(size_t more) {
        EXPECT_EQ(0, getrlimit(RLIMIT_AS, &before_));
        const size_t pages = std::stoul(read_file("/proc/self/statm"));
        const rlimit limit{pages * static_cast<size_t>(getpagesize()) + more, before_.rlim_max};
        EXPECT_EQ(0, setrlimit(RLIMIT_AS, &limit));
    }
    little_memory(const little_memory &) = delete;
    little_memory &operator=(const little_memory &) = delete;
    ~little_memory() { setrlimit(RLIMIT_AS, &before_); }

private:
    rlimit before_{};
};

TEST_F(net_is_port_range_used, KOVANetGetPortUsedInRange_longestLine_takesNoMemory) {
    constexpr size_t kMegabyte = 1U << 20;
    tables("tcp", long_text(32 * kMegabyte, 'x') + "\n" + line(0, 22, 10));
    outcome used;
    outcome listed;
    {
        const little_memory limit{8 * kMegabyte};
        used = is_used(22, 22);
        listed = list(4);
    }
    EXPECT_OUTCOME(used, {.result = 1});
    EXPECT_OUTCOME(listed, {.result = 0});
    EXPECT_EQ(numbers{22}, ports);
}

} // namespace
