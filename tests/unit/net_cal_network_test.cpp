#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

using calculation = int (*)(const char *, char *, int);

class net_cal_network : public unit_test {
protected:
    /** Calls with an output of exactly the size told. */
    outcome call(calculation function, const char *subnet, size_t size = 64) {
        std::string before = "before";
        before.resize(size);
        std::vector<char> out(before.begin(), before.end());
        out.back() = '\0';
        const outcome got = rig.observe([&] { return function(subnet, out.data(), static_cast<int>(size)); });
        output = out.data();
        return got;
    }

    std::string output;
};

TEST_F(net_cal_network, KOVANetCalNetwork_toolAnswers_givesNetwork) {
    rig.answer("/bin/ipcalc -n", 0, "NETWORK=192.168.1.0\n");
    EXPECT_OUTCOME(call(KOVANetCalNetwork, "192.168.1.77/24"),
                   {.result = 0, .commands = {"/bin/ipcalc -n 192.168.1.77/24"}});
    EXPECT_EQ("192.168.1.0", output);
}

TEST_F(net_cal_network, KOVANetCalBroadcast_toolAnswers_givesBroadcast) {
    rig.answer("/bin/ipcalc -b", 0, "BROADCAST=192.168.1.255\n");
    EXPECT_OUTCOME(call(KOVANetCalBroadcast, "192.168.1.77/24"),
                   {.result = 0, .commands = {"/bin/ipcalc -b 192.168.1.77/24"}});
    EXPECT_EQ("192.168.1.255", output);
}

TEST_F(net_cal_network, KOVANetCalNetwork_onlyFirstLineCounts) {
    rig.answer("/bin/ipcalc", 0, "BROADCAST=1.2.3.255\nNETWORK=1.2.3.0\n");
    EXPECT_OUTCOME(call(KOVANetCalNetwork, "1.2.3.4/24"), {.result = 0, .commands = {"/bin/ipcalc -n 1.2.3.4/24"}});
    EXPECT_EQ("before", output);
    EXPECT_OUTCOME(call(KOVANetCalBroadcast, "1.2.3.4/24"), {.result = 0, .commands = {"/bin/ipcalc -b 1.2.3.4/24"}});
    EXPECT_EQ("1.2.3.255", output);
}

TEST_F(net_cal_network, KOVANetCalNetwork_unmatchedOutput_leavesTheOutput) {
    const std::string binary("NETWORK=\0\xff\x01\n", 12);
    for (const std::string &printed : {std::string(), std::string("\n"), std::string("NETWORK=\n"),
                                       std::string("usage: ipcalc\n"), binary, long_text(100000)}) {
        rig.answer("/bin/ipcalc", 1, printed);
        EXPECT_OUTCOME(call(KOVANetCalNetwork, "x"), {.result = 0, .commands = {"/bin/ipcalc -n x"}});
        EXPECT_EQ("before", output);
        EXPECT_OUTCOME(call(KOVANetCalBroadcast, "x"), {.result = 0, .commands = {"/bin/ipcalc -b x"}});
        EXPECT_EQ("before", output);
    }
}

TEST_F(net_cal_network, KOVANetCalNetwork_firstWordBehindTheKey_isTheAddress) {
    for (const char *value : {"1.2.3.0", "1.2.3.0\n", " \t1.2.3.0\n", "1.2.3.0 PREFIX=24\n", "1.2.3.0\r\n"}) {
        SCOPED_TRACE(value);
        rig.answer("/bin/ipcalc -n", 0, std::string("NETWORK=") + value);
        rig.answer("/bin/ipcalc -b", 0, std::string("BROADCAST=") + value);
        EXPECT_OUTCOME(call(KOVANetCalNetwork, "x"), {.result = 0, .commands = {"/bin/ipcalc -n x"}});
        EXPECT_EQ("1.2.3.0", output);
        EXPECT_OUTCOME(call(KOVANetCalBroadcast, "x"), {.result = 0, .commands = {"/bin/ipcalc -b x"}});
        EXPECT_EQ("1.2.3.0", output);
    }
    for (const char *line : {" NETWORK=1.2.3.0\n", "network=1.2.3.0\n", "NETWORK =1.2.3.0\n", "NETWORK= \n1.2.3.0\n"}) {
        SCOPED_TRACE(line);
        rig.answer("/bin/ipcalc -n", 0, line);
        EXPECT_OUTCOME(call(KOVANetCalNetwork, "x"), {.result = 0, .commands = {"/bin/ipcalc -n x"}});
        EXPECT_EQ("before", output);
    }
}

TEST_F(net_cal_network, KOVANetCalNetwork_smallBuffer_readsThatMuchOfTheLine) {
    rig.answer("/bin/ipcalc -n", 0, "NETWORK=192.168.100.100\n");
    rig.answer("/bin/ipcalc -b", 0, "BROADCAST=192.168.100.255\n");
    const std::map<size_t, std::string> networks{
        {7, "before"}, {16, "192.168"}, {23, "192.168.100.10"}, {24, "192.168.100.100"}};
    for (const auto &[size, network] : networks) {
        SCOPED_TRACE(size);
        EXPECT_OUTCOME(call(KOVANetCalNetwork, "x", size), {.result = 0, .commands = {"/bin/ipcalc -n x"}});
        EXPECT_EQ(network, output);
    }
    EXPECT_OUTCOME(call(KOVANetCalNetwork, "x", 1), {.result = 0, .commands = {"/bin/ipcalc -n x"}});
    EXPECT_OUTCOME(call(KOVANetCalBroadcast, "x", 25), {.result = 0, .commands = {"/bin/ipcalc -b x"}});
    EXPECT_EQ("192.168.100.25", output);
    EXPECT_OUTCOME(call(KOVANetCalBroadcast, "x", 26), {.result = 0, .commands = {"/bin/ipcalc -b x"}});
    EXPECT_EQ("192.168.100.255", output);
}

TEST_F(net_cal_network, KOVANetCalNetwork_endlessLineInALargeBuffer_staysInside) {
    rig.answer("/bin/ipcalc", 0, "NETWORK=" + long_text(100000, '1'));
    EXPECT_OUTCOME(call(KOVANetCalNetwork, "x", 65536), {.result = 0, .commands = {"/bin/ipcalc -n x"}});
    EXPECT_EQ(long_text(503, '1'), output);
}

TEST_F(net_cal_network, KOVANetCalNetwork_toolNotStarted_failsNamingTheBroadcastCall) {
    for (const calculation function : {KOVANetCalNetwork, KOVANetCalBroadcast}) {
        rig.fail("KLIBCPopen");
        EXPECT_OUTCOME(
            call(function, "10.0.0.1/8"),
            {.result = -1,
             .code = 0x2A00,
             .unit = "platform",
             .log = {"ERR net_cal_network:N excute cmd /bin/ipcalc -b 10.0.0.1/8 failed"},
             .commands = {function == KOVANetCalNetwork ? "/bin/ipcalc -n 10.0.0.1/8" : "/bin/ipcalc -b 10.0.0.1/8"}});
        EXPECT_EQ("before", output);
    }
}

TEST_F(net_cal_network, KOVANetCalNetwork_badArgument_isRefused) {
    char out[16];
    const auto expect_refused = [&](const std::function<long()> &refused, const std::string &condition) {
        EXPECT_OUTCOME(rig.observe(refused), refusal("net_cal_network", condition));
    };
    expect_refused([&] { return KOVANetCalNetwork(nullptr, out, 16); }, "((void *)0) != szSubnet");
    expect_refused([&] { return KOVANetCalNetwork("", out, 16); }, "'\\0' != *szSubnet");
    expect_refused([&] { return KOVANetCalNetwork("x", nullptr, 16); }, "NULL != szNetwork");
    expect_refused([&] { return KOVANetCalNetwork("x", out, 0); }, "0 < cbNetwork");
    expect_refused([&] { return KOVANetCalNetwork("x", out, -1); }, "0 < cbNetwork");
    expect_refused([&] { return KOVANetCalBroadcast(nullptr, out, 16); }, "((void *)0) != szSubnet");
    expect_refused([&] { return KOVANetCalBroadcast("", out, 16); }, "'\\0' != *szSubnet");
    expect_refused([&] { return KOVANetCalBroadcast("x", nullptr, 16); }, "NULL != szBroadcast");
    expect_refused([&] { return KOVANetCalBroadcast("x", out, 0); }, "0 < cbBroadcast");
    expect_refused([&] { return KOVANetCalBroadcast("x", out, INT32_MIN); }, "0 < cbBroadcast");
}

} // namespace
