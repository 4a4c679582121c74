#include "support/memory.h"
#include "support/rig.h"

#include <climits>
#include <cstring>
#include <kovanetsdk/stats.h>

using namespace kova_test;

namespace {

constexpr char kHeader[] =
    "Inter-|   Receive                                                |  Transmit\n"
    " face |bytes    packets errs drop fifo frame compressed multicast|bytes    packets errs drop fifo colls carrier "
    "compressed\n";
constexpr char kPath[] = "/proc/net/dev";

/** A line of an interface with its four counters that count; the others are 7. */
std::string line(const std::string &name, const std::string &rx_bytes = "1", const std::string &rx_packets = "2",
                 const std::string &tx_bytes = "3", const std::string &tx_packets = "4") {
    return "  " + name + ": " + rx_bytes + "    " + rx_packets + "    7    7    7     7          7         7 " +
           tx_bytes + "    " + tx_packets + "    7    7    7     7       7          7\n";
}

class net_stat_init : public unit_test {
protected:
    /** Reads all from a file with this content behind the header. */
    outcome read_lines(const std::string &lines, int capacity = 64) { return read_file_of(kHeader + lines, capacity); }

    outcome read_file_of(const std::string &content, int capacity = 64) {
        rig.replace_file(kPath, content);
        return read_all(capacity);
    }

    /** Reads all into marked records and collects the names; what lies behind has to be as before. */
    outcome read_all(int capacity = 64) {
        NETSTAT marked;
        memset(&marked, 0xEE, sizeof marked);
        records.assign(static_cast<size_t>(capacity) + 1, marked);
        const outcome got = rig.observe([&] { return KLIBNetStatGetAll(records.data(), capacity); });
        names.clear();
        for (long i = 0; i < got.result; ++i) {
            names.emplace_back(records[static_cast<size_t>(i)].szIfname);
            EXPECT_EQ(1U, records[static_cast<size_t>(i)].blValid);
        }
        for (size_t i = static_cast<size_t>(std::max(got.result, 0L)); got.result >= 0 && i < records.size(); ++i) {
            EXPECT_EQ(0, memcmp(&marked, &records[i], sizeof marked)) << "record " << i;
        }
        return got;
    }

    void expect_counters(size_t index, const std::vector<int64_t> &expected) {
        const NETSTAT &record = records.at(index);
        EXPECT_EQ(expected,
                  (std::vector<int64_t>{record.nRxBytes, record.nRxPackets, record.nTxBytes, record.nTxPackets}));
    }

    std::vector<NETSTAT> records;
    texts names;
};

// ---- KLIBNetStatInit, KLIBNetStatFree

TEST_F(net_stat_init, KLIBNetStatInit_count_givesZeroedValidRecords) {
    for (const int count : {1, 2, 64, 1000}) {
        NETSTAT *made = nullptr;
        EXPECT_OUTCOME(rig.observe([&] {
            made = KLIBNetStatInit(count);
            return made != nullptr ? 1 : 0;
        }),
                       {.result = 1});
        ASSERT_NE(nullptr, made);
        NETSTAT expected = {};
        expected.blValid = 1;
        for (int i = 0; i < count; ++i) {
            EXPECT_EQ(0, memcmp(&expected, &made[i], sizeof expected)) << "record " << i;
        }
        KLIBNetStatFree(made);
    }
}

TEST_F(net_stat_init, KLIBNetStatInit_badCount_isRefused) {
    const auto make = [&](int count) { return rig.observe([&] { return KLIBNetStatInit(count) == nullptr ? 0 : 1; }); };
    EXPECT_OUTCOME(make(0), refusal("net_stat_init", "0 != nItem", 0));
    for (const int count : {-1, -64, INT_MIN}) {
        EXPECT_OUTCOME(make(count), refusal("net_stat_init", "0 < nItem", 0));
    }
}

TEST_F(net_stat_init, KLIBNetStatInit_noMemory_fails) {
    NEEDS_OWN_ALLOCATOR();
    rig.fail("calloc");
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetStatInit(64) == nullptr ? 0 : 1; }),
                   {.result = 0, .code = 0x200, .unit = "net_stat_init"});
}

TEST_F(net_stat_init, KLIBNetStatGetSingle_noMemory_fails) {
    NEEDS_OWN_ALLOCATOR();
    NETSTAT record = {};
    rig.fail("calloc");
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetSingle("lo", &record); }),
                   {.result = -1, .code = 0x200, .unit = "net_stat_init"});
}

TEST_F(net_stat_init, KLIBNetStatFree_null_isAllowed) {
    EXPECT_OUTCOME(rig.observe([] {
        KLIBNetStatFree(nullptr);
        return 0;
    }),
                   {.result = 0});
}

// ---- KLIBNetStatGetAll

TEST_F(net_stat_init, KLIBNetStatGetAll_kernelFile_holdsLoopback) {
    const outcome got = read_all();
    EXPECT_GE(got.result, 1);
    EXPECT_EQ(0U, got.code);
    EXPECT_NE(names.end(), std::find(names.begin(), names.end(), "lo"));
}

TEST_F(net_stat_init, KLIBNetStatGetAll_lines_giveTheirCounters) {
    EXPECT_OUTCOME(read_lines(line("eth0", "100", "20", "3000", "400") + line("lo", "0", "0", "0", "0")),
                   {.result = 2});
    EXPECT_EQ((texts{"eth0", "lo"}), names);
    expect_counters(0, {100, 20, 3000, 400});
    expect_counters(1, {0, 0, 0, 0});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_noBlankAfterTheColon_isRead) {
    EXPECT_OUTCOME(read_lines("eth0:100 20 7 7 7 7 7 7 3000 400 7 7 7 7 7 7\n\t eth1:1\t2 7 7 7 7 7 7\t3 4\n"),
                   {.result = 2});
    EXPECT_EQ((texts{"eth0", "eth1"}), names);
    expect_counters(0, {100, 20, 3000, 400});
    expect_counters(1, {1, 2, 3, 4});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_hiddenDevices_areLeftOut) {
    const texts hidden{"docker0", "docker",    "tap1",       "tapestry",           "dhmx0",
                       "dhmx_br", "mon.wlan0", "wlan0mon.1", "abcdefghijklmnmon.x"};
    const texts shown{"Tap0", "atap0", "dhm0", "docke", "lo", "monitor", "wlan0mon", "xdocker0"};
    std::string lines;
    for (const texts &part : {hidden, shown}) {
        for (const std::string &name : part) {
            lines += line(name);
        }
    }
    EXPECT_OUTCOME(read_lines(lines), {.result = static_cast<long>(shown.size())});
    EXPECT_EQ(shown, names);
}

TEST_F(net_stat_init, KLIBNetStatGetAll_names_areSortedNaturally) {
    EXPECT_OUTCOME(read_lines(line("eth10") + line("eth2") + line("wlan0") + line("bond0") + line("eth") + line("lo") +
                              line("eth2.100") + line("eth2.20") + line("ethx") + line("eth0") + line("e1000") +
                              line("ovs_eth11") + line("ovs_eth9")),
                   {.result = 13});
    EXPECT_EQ((texts{"bond0", "e1000", "eth", "eth0", "eth2", "eth2.100", "eth2.20", "eth10", "ethx", "lo", "ovs_eth9",
                     "ovs_eth11", "wlan0"}),
              names);
}

TEST_F(net_stat_init, KLIBNetStatGetAll_namesEqualInNaturalOrder_areSortedByByte) {
    EXPECT_OUTCOME(read_lines(line("eth1b") + line("eth1") + line("eth01") + line("eth1a") + line("eth001")),
                   {.result = 5});
    EXPECT_EQ((texts{"eth001", "eth01", "eth1", "eth1a", "eth1b"}), names);
}

TEST_F(net_stat_init, KLIBNetStatGetAll_numbersOfAnyLength_areCompared) {
    EXPECT_OUTCOME(read_lines(line("999999999999999") + line("a99999999999999") + line("a9") + line("100000000000000")),
                   {.result = 4});
    EXPECT_EQ((texts{"100000000000000", "999999999999999", "a9", "a99999999999999"}), names);
}

TEST_F(net_stat_init, KLIBNetStatGetAll_numberBehindManyLetters_isCompared) {
    EXPECT_OUTCOME(read_lines(line("abcdefghijklm10") + line("abcdefghijklm9") + line("abcdefghijklmno") +
                              line("abcdefghijklm") + line("abcdefghijklmn1") + line("abcdefghijklm-1") +
                              line("\xC3\xA9th0") + line("eth0")),
                   {.result = 8});
    EXPECT_EQ((texts{"abcdefghijklm", "abcdefghijklm-1", "abcdefghijklm9", "abcdefghijklm10", "abcdefghijklmn1",
                     "abcdefghijklmno", "eth0", "\xC3\xA9th0"}),
              names);
}

TEST_F(net_stat_init, KLIBNetStatGetAll_lessRoomThanInterfaces_takesTheFirstAndSortsThem) {
    const std::string lines = line("eth9") + line("docker0") + line("eth1") + line("eth5") + line("lo") + line("eth0");
    EXPECT_OUTCOME(read_lines(lines, 2), {.result = 2});
    EXPECT_EQ((texts{"eth1", "eth9"}), names);
    EXPECT_OUTCOME(read_lines(lines, 1), {.result = 1});
    EXPECT_EQ((texts{"eth9"}), names);
    EXPECT_OUTCOME(read_lines(lines, 5), {.result = 5});
    EXPECT_EQ((texts{"eth0", "eth1", "eth5", "eth9", "lo"}), names);
}

TEST_F(net_stat_init, KLIBNetStatGetAll_manyInterfaces_areAllRead) {
    std::string lines;
    texts expected;
    for (int i = 0; i < 2000; ++i) {
        expected.push_back("eth" + std::to_string(i));
        lines.insert(0, line(expected.back()));
    }
    EXPECT_OUTCOME(read_lines(lines, 4096), {.result = 2000});
    EXPECT_EQ(expected, names);
}

TEST_F(net_stat_init, KLIBNetStatGetAll_longName_isCutTo15Characters) {
    EXPECT_OUTCOME(read_lines(line("abcdefghijklmno") + line("abcdefghijklmnp_and_more") + line(long_text(64))),
                   {.result = 3});
    EXPECT_EQ((texts{"aaaaaaaaaaaaaaa", "abcdefghijklmno", "abcdefghijklmnp"}), names);
}

TEST_F(net_stat_init, KLIBNetStatGetAll_lineWithoutColon_endsTheListUnsorted) {
    EXPECT_OUTCOME(read_lines(line("eth9") + line("eth1") + "no interface\n" + line("eth0")), {.result = 2});
    EXPECT_EQ((texts{"eth9", "eth1"}), names);
    EXPECT_OUTCOME(read_lines("\n" + line("eth0")), {.result = 0});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_hugeAndNegativeCounters_stayInside64Bits) {
    EXPECT_OUTCOME(read_lines(line("a", "9223372036854775807", "9223372036854775808", "18446744073709551615",
                                   "99999999999999999999999999999999") +
                              line("b", "-1", "-9223372036854775808", "-9223372036854775809",
                                   "-99999999999999999999999999999999")),
                   {.result = 2});
    expect_counters(0, {INT64_MAX, INT64_MAX, INT64_MAX, INT64_MAX});
    expect_counters(1, {-1, INT64_MIN, INT64_MIN, INT64_MIN});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_missingCounters_are0) {
    EXPECT_OUTCOME(read_lines("a:\nb: 1\nc: 1 2\nd: 1 2 7 7 7 7 7 7\ne: 1 2 7 7 7 7 7 7 3\nf: x 2 7 7 7 7 7 7 3 4\n"
                              "g: 1 2 x x x x x x 3 4\nh: 1 2 7 7 7 7 7 7 x 4\n"),
                   {.result = 8});
    EXPECT_EQ((texts{"a", "b", "c", "d", "e", "f", "g", "h"}), names);
    const std::vector<std::vector<int64_t>> expected{{0, 0, 0, 0}, {1, 0, 0, 0}, {1, 2, 0, 0}, {1, 2, 0, 0},
                                                     {1, 2, 3, 0}, {0, 0, 0, 0}, {1, 2, 3, 4}, {1, 2, 0, 0}};
    for (size_t i = 0; i < expected.size(); ++i) {
        expect_counters(i, expected[i]);
    }
}

TEST_F(net_stat_init, KLIBNetStatGetAll_truncatedFile_givesWhatIsThere) {
    EXPECT_OUTCOME(read_file_of(""), {.result = 0});
    EXPECT_OUTCOME(read_file_of("Inter-|"), {.result = 0});
    EXPECT_OUTCOME(read_file_of("Inter-|\n face |"), {.result = 0});
    EXPECT_OUTCOME(read_file_of(kHeader), {.result = 0});
    EXPECT_OUTCOME(read_lines(line("eth1") + "  eth0: 123 4"), {.result = 2});
    EXPECT_EQ((texts{"eth0", "eth1"}), names);
    expect_counters(0, {123, 4, 0, 0});
    EXPECT_OUTCOME(read_lines(line("eth1") + "  et"), {.result = 1});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_binaryFile_givesACleanResult) {
    std::string bytes;
    for (int i = 0; i < 100000; ++i) {
        bytes += static_cast<char>(i * 7919 >> 3);
    }
    const outcome got = read_file_of(bytes);
    EXPECT_EQ(0U, got.code);
    EXPECT_GE(got.result, 0);
    EXPECT_LE(got.result, 64);
    EXPECT_OUTCOME(read_lines(line("eth0") + std::string(4096, '\0') + line("eth1")), {.result = 1});
    EXPECT_OUTCOME(read_lines(std::string("a\0b: 1 2\n", 9) + line("eth0")), {.result = 0});
    EXPECT_OUTCOME(read_lines(std::string("a: 1\0 2 7 7 7 7 7 7 3 4\n", 24)), {.result = 1});
    expect_counters(0, {1, 0, 0, 0});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_endlessLine_isTakenInPieces) {
    EXPECT_OUTCOME(read_lines(line("eth1") + line("eth0") + long_text(100000)), {.result = 2});
    EXPECT_EQ((texts{"eth1", "eth0"}), names);
    EXPECT_OUTCOME(read_lines("eth0: 1 " + long_text(100000, '2')), {.result = 1});
    expect_counters(0, {1, INT64_MAX, 0, 0});
    EXPECT_OUTCOME(read_lines(long_text(100000, ':')), {.result = 64});
    EXPECT_OUTCOME(read_file_of(long_text(100000, ':')), {.result = 64});
    EXPECT_EQ(texts(64, ""), names);
}

TEST_F(net_stat_init, KLIBNetStatGetAll_lineOf511Bytes_isOneLine) {
    const std::string start = "eth0: 1 2 7 7 7 7 7 7 3 4";
    const std::string fits = start + long_text(510 - start.size(), ' ') + "\n";
    EXPECT_OUTCOME(read_lines(fits + line("eth1")), {.result = 2});
    EXPECT_OUTCOME(read_lines(start + long_text(511 - start.size(), ' ') + "\n" + line("eth1")), {.result = 1});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_missingFile_fails) {
    rig.hide(kPath);
    EXPECT_OUTCOME(read_all(), {.result = -1, .code = 0x900, .unit = "net_stat_init"});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_noDescriptor_fails) {
    rig.fail("fopen");
    EXPECT_OUTCOME(read_all(), {.result = -1, .code = 0x900, .unit = "net_stat_init"});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_readError_fails) {
    rig.redirect(kPath, "/tmp"); // a directory opens, but does not read
    EXPECT_OUTCOME(read_all(), {.result = -1, .code = 0x4000, .unit = "net_stat_init"});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_noMemoryToSort_fails) {
    NEEDS_OWN_ALLOCATOR();
    rig.replace_file(kPath, kHeader + line("eth1") + line("eth0"));
    records.resize(64);
    rig.fail("calloc");
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetAll(records.data(), 64); }),
                   {.result = -1, .code = 0x200, .unit = "net_stat_init"});
}

TEST_F(net_stat_init, KLIBNetStatGetAll_badArgument_isRefused) {
    NETSTAT record = {};
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetStatGetAll(nullptr, 64); }),
                   refusal("net_stat_init", "NULL != pStat"));
    for (const int capacity : {0, -1, INT_MIN}) {
        EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetAll(&record, capacity); }),
                       refusal("net_stat_init", "0 < nItem"));
    }
}

// ---- KLIBNetStatGetSingle

TEST_F(net_stat_init, KLIBNetStatGetSingle_presentInterface_isCopied) {
    rig.replace_file(kPath, kHeader + line("eth1") + line("eth10", "5", "6", "7", "8") + line("eth1", "9"));
    records.resize(1);
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetSingle("eth10", records.data()); }), {.result = 0});
    EXPECT_STREQ("eth10", records[0].szIfname);
    EXPECT_EQ(1U, records[0].blValid);
    expect_counters(0, {5, 6, 7, 8});
}

TEST_F(net_stat_init, KLIBNetStatGetSingle_absentInterface_failsWithoutCodeAndLeavesTheRecord) {
    rig.replace_file(kPath, kHeader + line("eth1") + line("docker0") + line("abcdefghijklmnopqrst"));
    NETSTAT marked;
    memset(&marked, 0xEE, sizeof marked);
    texts absent = bad_names();
    for (const char *name : {"eth", "eth10", "ETH1", "docker0", "abcdefghijklmnopqrst", "eth1 ", " eth1"}) {
        absent.emplace_back(name);
    }
    for (const std::string &name : absent) {
        SCOPED_TRACE(name);
        NETSTAT record = marked;
        EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetSingle(name.c_str(), &record); }), {.result = -1});
        EXPECT_EQ(0, memcmp(&marked, &record, sizeof record));
    }
}

TEST_F(net_stat_init, KLIBNetStatGetSingle_longName_isFoundAsItIsStored) {
    rig.replace_file(kPath, kHeader + line("abcdefghijklmnopqrst"));
    NETSTAT record = {};
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetSingle("abcdefghijklmno", &record); }), {.result = 0});
    EXPECT_STREQ("abcdefghijklmno", record.szIfname);
}

TEST_F(net_stat_init, KLIBNetStatGetSingle_behindThe64th_isAbsent) {
    std::string lines;
    for (int i = 0; i < 65; ++i) {
        lines += line("eth" + std::to_string(i));
    }
    rig.replace_file(kPath, kHeader + lines);
    NETSTAT record = {};
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetSingle("eth63", &record); }), {.result = 0});
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetSingle("eth64", &record); }), {.result = -1});
}

TEST_F(net_stat_init, KLIBNetStatGetSingle_failedListing_keepsItsCode) {
    NETSTAT record = {};
    rig.hide(kPath);
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetSingle("lo", &record); }),
                   {.result = -1, .code = 0x900, .unit = "net_stat_init"});
    rig.redirect(kPath, "/tmp");
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetSingle("lo", &record); }),
                   {.result = -1, .code = 0x4000, .unit = "net_stat_init"});
}

TEST_F(net_stat_init, KLIBNetStatGetSingle_badArgument_isRefused) {
    NETSTAT record = {};
    const auto expect_refused = [&](const char *name, NETSTAT *out, const std::string &condition) {
        EXPECT_OUTCOME(rig.observe([&] { return KLIBNetStatGetSingle(name, out); }),
                       refusal("net_stat_init", condition));
    };
    expect_refused(nullptr, &record, "((void *)0) != szIfname");
    expect_refused("", &record, "'\\0' != *szIfname");
    expect_refused("lo", nullptr, "NULL != pStat");
}

} // namespace
