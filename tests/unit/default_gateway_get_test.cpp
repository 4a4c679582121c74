#include "support/rig.h"

#include <climits>
#include <cstring>
#include <kovanetsdk/routing.h>

using namespace kova_test;

namespace {

const std::string kTable = "/proc/net/route";

/** As the kernel writes a line: padded with blanks to 127 characters. */
std::string padded(const std::string &line) {
    return line + long_text(127 - line.size(), ' ') + "\n";
}

const std::string kHeader =
    padded("Iface\tDestination\tGateway \tFlags\tRefCnt\tUse\tMetric\tMask\t\tMTU\tWindow\tIRTT");
const std::string kSubnet = padded("eth0\t0001A8C0\t00000000\t0001\t0\t0\t0\t00FFFFFF\t0\t0\t0");
const std::string kDefault = padded("eth0\t00000000\t0101A8C0\t0003\t0\t0\t0\t00000000\t0\t0\t0");

} // namespace

class default_gateway_get : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        snprintf(gateway, sizeof gateway, "before");
        snprintf(ifname, sizeof ifname, "before");
    }
    outcome get(const std::string &table) {
        rig.replace_file(kTable, table);
        return again();
    }
    outcome again() {
        return rig.observe([this] {
            errno = 0;
            return DefaultGatewayGet(gateway, sizeof gateway, ifname, sizeof ifname);
        });
    }
    void expect_found(const std::string &table, const char *expected_gateway, const char *expected_ifname) {
        EXPECT_OUTCOME(get(table), {.result = 0});
        EXPECT_STREQ(expected_gateway, gateway);
        EXPECT_STREQ(expected_ifname, ifname);
    }
    void expect_untouched() const {
        EXPECT_STREQ("before", gateway);
        EXPECT_STREQ("before", ifname);
    }
    static outcome unreadable(const std::string &reason = "Success/0") {
        return {.result = -1,
                .log = {"ERR default_gateway_get (N) Unknow kernel routing table format, errno=[" + reason + "]"}};
    }

    char gateway[300];
    char ifname[300];
};

TEST_F(default_gateway_get, DefaultGatewayGet_defaultRoute_isFound) {
    expect_found(kHeader + kDefault + kSubnet, "192.168.1.1", "eth0");
    expect_found(kHeader + kSubnet + kDefault, "192.168.1.1", "eth0");
}

TEST_F(default_gateway_get, DefaultGatewayGet_ofSeveralDefaultRoutes_theFirstCounts) {
    expect_found(kHeader + "lan0\t00000000\tFE00000A\t0003\t0\t0\t100\t00000000\t0\t0\t0\n" + kDefault, "10.0.0.254",
                 "lan0");
}

TEST_F(default_gateway_get, DefaultGatewayGet_linesBehindTheDefaultRoute_areNotRead) {
    expect_found(kHeader + kDefault + "nonsense\n", "192.168.1.1", "eth0");
}

TEST_F(default_gateway_get, DefaultGatewayGet_withoutDefaultRoute_leavesTheBuffersUntouched) {
    for (const std::string &table : {std::string(), kHeader, kHeader + kSubnet, std::string("no newline at all")}) {
        EXPECT_OUTCOME(get(table), {.result = 0});
        expect_untouched();
    }
}

TEST_F(default_gateway_get, DefaultGatewayGet_routesThatAreNotTheDefault_arePassedOver) {
    const texts lines{
        "eth0\t00000000\t0101A8C0\t0002\t0\t0\t0\t00000000\t0\t0\t0\n",           // down
        "eth0\t00000000\t00000000\t0001\t0\t0\t0\t00000000\t0\t0\t0\n",           // no gateway
        "eth0\t00000000\t0101A8C0\tFFFC\t0\t0\t0\t00000000\t0\t0\t0\n",           // every flag but the two
        "eth0\t0000000A\t0101A8C0\t0003\t0\t0\t0\t00000000\t0\t0\t0\n",           // a destination
        "eth0\t00000000\t0101A8C0\t0003\t0\t0\t0\t00000080\t0\t0\t0\n",           // half of all addresses
        "eth0\t00000000\t0101A8C0\t0003\t0\t0\t0\t100000000\t0\t0\t0\n",          // more than an address
        "eth0\t100000000\t0101A8C0\t0003\t0\t0\t0\t00000000\t0\t0\t0\n",          //
        "eth0\tFFFFFFFFFFFFFFFFFF\t0101A8C0\t0003\t0\t0\t0\t00000000\t0\t0\t0\n", //
    };
    std::string table = kHeader;
    for (const std::string &line : lines) {
        table += line;
    }
    EXPECT_OUTCOME(get(table), {.result = 0});
    expect_untouched();
}

TEST_F(default_gateway_get, DefaultGatewayGet_moreFlags_areStillADefaultRoute) {
    expect_found(kHeader + "eth0\t00000000\t0101A8C0\t0007\t0\t0\t0\t00000000\t0\t0\t0\n", "192.168.1.1", "eth0");
    expect_found(kHeader + "eth0\t00000000\t0101A8C0\tffff\t0\t0\t0\t00000000\t0\t0\t0\n", "192.168.1.1", "eth0");
}

TEST_F(default_gateway_get, DefaultGatewayGet_gateway_isTheLowHalfInNetworkByteOrder) {
    expect_found(kHeader + "eth0\t0\t04030201\t3\t0\t0\t0\t0\t0\t0\t0\n", "1.2.3.4", "eth0");
    expect_found(kHeader + "eth0\t0\tFFFFFFFF\t3\t0\t0\t0\t0\t0\t0\t0\n", "255.255.255.255", "eth0");
    expect_found(kHeader + "eth0\t0\t504030201\t3\t0\t0\t0\t0\t0\t0\t0\n", "1.2.3.4", "eth0");
    expect_found(kHeader + "eth0\t0\t0\t3\t0\t0\t0\t0\t0\t0\t0\n", "0.0.0.0", "eth0");
}

TEST_F(default_gateway_get, DefaultGatewayGet_counters_mayBeOfAnySize) {
    expect_found(kHeader + "eth0 0 0101A8C0 3 -1 4294967295 -2147483648 0 99999999999999999999 0 0\n", "192.168.1.1",
                 "eth0");
}

TEST_F(default_gateway_get, DefaultGatewayGet_lastLineWithoutNewline_isRead) {
    expect_found(kHeader + "eth0\t0\t0101A8C0\t3\t0\t0\t0\t0\t0\t0\t0", "192.168.1.1", "eth0");
}

TEST_F(default_gateway_get, DefaultGatewayGet_moreThanElevenFields_countAsEleven) {
    expect_found(kHeader + "eth0 0 0101A8C0 3 0 0 0 0 0 0 0 more\n", "192.168.1.1", "eth0");
}

TEST_F(default_gateway_get, DefaultGatewayGet_longestName_isWhole) {
    const std::string name = long_text(233, 'n'); // what 255 characters have room for beside the numbers
    const std::string line = name + " 0 0101A8C0 3 0 0 0 0 0 0 0";
    EXPECT_EQ(260U, line.size());
    EXPECT_OUTCOME(get(kHeader + line + "\n"), unreadable());
    expect_found(kHeader + line.substr(5) + "\n", "192.168.1.1", name.substr(5).c_str());
}

TEST_F(default_gateway_get, DefaultGatewayGet_lineOfAnotherFormat_fails) {
    const texts lines{"\n",
                      "   \n",
                      "eth0\n",
                      "eth0\t0\t0101A8C0\t3\t0\t0\t0\t0\t0\t0\n",       // ten fields
                      "eth0\t0\t0101A8C0\t3\t0\t0\t0\t0\t0\t0",         // the same, cut off
                      "eth0\t00000000\t0101A8",                         // cut off within a field
                      "eth0\t0\tgateway\t3\t0\t0\t0\t0\t0\t0\t0\n",     // no number
                      "eth0\t0\t192.168.1.1\t3\t0\t0\t0\t0\t0\t0\t0\n", // not hexadecimal
                      "et h0\t0\t0101A8C0\t3\t0\t0\t0\t0\t0\t0\t0\n",   // one field too many at the front
                      std::string("eth0\0\t0\t0101A8C0\t3\t0\t0\t0\t0\t0\t0\t0\n", 32), // a NUL
                      long_text(254, ' ') + "\n",
                      long_text(100000) + "\n"};
    for (const std::string &line : lines) {
        EXPECT_OUTCOME(get(kHeader + line), unreadable());
        EXPECT_OUTCOME(get(kHeader + kSubnet + line + kDefault), unreadable());
        expect_untouched();
    }
}

TEST_F(default_gateway_get, DefaultGatewayGet_lineWiderThanItsBuffer_isNoLine) {
    const std::string fields = "eth0\t00000000\t0101A8C0\t0001\t0\t0\t0\t00000000\t0\t0\t0";
    EXPECT_OUTCOME(get(kHeader + fields + long_text(254 - fields.size(), ' ') + "\n"), {.result = 0});
    EXPECT_OUTCOME(get(kHeader + fields + long_text(255 - fields.size(), ' ') + "\n"), unreadable());
    EXPECT_OUTCOME(get(kHeader + fields + long_text(1000000, ' ')), unreadable());
    expect_untouched();
}

TEST_F(default_gateway_get, DefaultGatewayGet_headerWiderThanItsBuffer_isNoHeader) {
    EXPECT_OUTCOME(get(long_text(300, ' ') + "\n" + kDefault), unreadable());
    expect_untouched();
}

TEST_F(default_gateway_get, DefaultGatewayGet_endlessTable_ends) {
    rig.redirect(kTable, "/dev/zero");
    EXPECT_OUTCOME(again(), unreadable());
}

TEST_F(default_gateway_get, DefaultGatewayGet_tableOfManyRoutes_isReadToItsDefault) {
    std::string table = kHeader;
    for (int i = 0; i < 20000; ++i) {
        table += kSubnet;
    }
    expect_found(table + kDefault, "192.168.1.1", "eth0");
}

TEST_F(default_gateway_get, DefaultGatewayGet_tableThatCannotBeRead_fails) {
    rig.redirect(kTable, "/tmp");
    EXPECT_OUTCOME(again(), unreadable("Is a directory/21"));
    expect_untouched();
}

TEST_F(default_gateway_get, DefaultGatewayGet_tableThatCannotBeOpened_fails) {
    rig.hide(kTable);
    const outcome expected{
        .result = -1,
        .log = {"ERR default_gateway_get (N) Failed to open /proc/net/route, errno=[No such file or directory/2]"}};
    EXPECT_OUTCOME(again(), expected);
    EXPECT_OUTCOME(rig.observe([this] { return KOVANetDefaultGatewayGet(gateway, sizeof gateway); }), expected);
    EXPECT_OUTCOME(rig.observe([this] { return KOVANetDefaultGatewayInterfaceGet(ifname, sizeof ifname); }), expected);
    expect_untouched();
}

TEST_F(default_gateway_get, DefaultGatewayGet_bufferThatIsTooSmall_isFilledAndTerminated) {
    rig.replace_file(kTable, kHeader + kDefault);
    EXPECT_OUTCOME(rig.observe([this] { return DefaultGatewayGet(gateway, 5, ifname, 4); }), {.result = 0});
    EXPECT_STREQ("192.", gateway);
    EXPECT_STREQ("eth", ifname);
    EXPECT_EQ('e', gateway[5]) << "written behind its end";
    EXPECT_OUTCOME(rig.observe([this] { return DefaultGatewayGet(gateway, 1, ifname, 1); }), {.result = 0});
    EXPECT_STREQ("", gateway);
    EXPECT_STREQ("", ifname);
    EXPECT_OUTCOME(rig.observe([this] { return DefaultGatewayGet(gateway, 12, ifname, 5); }), {.result = 0});
    EXPECT_STREQ("192.168.1.1", gateway);
    EXPECT_STREQ("eth0", ifname);
}

TEST_F(default_gateway_get, DefaultGatewayGet_bufferWithoutRoom_isUntouched) {
    rig.replace_file(kTable, kHeader + kDefault);
    for (const int size : {0, -1, INT_MIN}) {
        EXPECT_OUTCOME(rig.observe([=, this] { return DefaultGatewayGet(gateway, size, ifname, size); }),
                       {.result = 0});
        expect_untouched();
    }
}

TEST_F(default_gateway_get, DefaultGatewayGet_absentBuffers_areLeftOut) {
    rig.replace_file(kTable, kHeader + kDefault);
    EXPECT_OUTCOME(rig.observe([] { return DefaultGatewayGet(nullptr, 0, nullptr, 0); }), {.result = 0});
    EXPECT_OUTCOME(rig.observe([] { return DefaultGatewayGet(nullptr, 16, nullptr, 16); }), {.result = 0});
    EXPECT_OUTCOME(rig.observe([this] { return DefaultGatewayGet(gateway, sizeof gateway, nullptr, 0); }),
                   {.result = 0});
    EXPECT_STREQ("192.168.1.1", gateway);
    EXPECT_STREQ("before", ifname);
}

TEST_F(default_gateway_get, KOVANetDefaultGatewayGet_givesTheGatewayAlone) {
    rig.replace_file(kTable, kHeader + kDefault);
    EXPECT_OUTCOME(rig.observe([this] { return KOVANetDefaultGatewayGet(gateway, 16); }), {.result = 0});
    EXPECT_STREQ("192.168.1.1", gateway);
    EXPECT_OUTCOME(rig.observe([] { return KOVANetDefaultGatewayGet(nullptr, 16); }), {.result = 0});
}

TEST_F(default_gateway_get, KOVANetDefaultGatewayInterfaceGet_givesTheInterfaceAlone) {
    rig.replace_file(kTable, kHeader + kDefault);
    EXPECT_OUTCOME(rig.observe([this] { return KOVANetDefaultGatewayInterfaceGet(ifname, 16); }), {.result = 0});
    EXPECT_STREQ("eth0", ifname);
    EXPECT_OUTCOME(rig.observe([] { return KOVANetDefaultGatewayInterfaceGet(nullptr, 16); }), {.result = 0});
}
