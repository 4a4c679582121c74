#include "support/fake_names.h"
#include "support/memory.h"

#include <climits>
#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

/** A script in the place of the tool while this lives. */
class script_as_tool {
public:
    explicit script_as_tool(const std::string &lines) {
        shell("mv " + kTool + " " + kKept);
        write_file(kTool, "#!/bin/sh\n" + lines);
        shell("chmod 755 " + kTool);
    }
    script_as_tool(const script_as_tool &) = delete;
    script_as_tool &operator=(const script_as_tool &) = delete;
    ~script_as_tool() { shell("mv " + kKept + " " + kTool); }

private:
    static inline const std::string kTool = "/usr/bin/nmblookup";
    static inline const std::string kKept = "/usr/bin/nmblookup.kept";
};

class net_lookup_ip : public unit_test {
protected:
    /** Looks up with room for so many addresses; what is behind them has to stay as it is. */
    outcome look_up(const std::string &name, int room = 4, int count_all = 0) {
        records.assign(static_cast<size_t>(room) + 1, kDirty);
        const outcome got = rig.observe([&] { return KOVANetLookupIP(name.c_str(), records.data(), room, count_all); });
        EXPECT_EQ(0, memcmp(&kDirty, &records.back(), sizeof kDirty)) << "written behind the records";
        records.pop_back();
        return got;
    }
    /** The records, "10.0.0.1 2"; "" is one that is zeroed. */
    [[nodiscard]] texts found() const {
        texts shown;
        for (const KOVALOOKUPIP &record : records) {
            const KOVALOOKUPIP zeroed{};
            shown.push_back(memcmp(&zeroed, &record, sizeof zeroed) == 0
                                ? ""
                                : record.szIP + std::string(" ") + std::to_string(record.nFamily));
        }
        return shown;
    }
    void answer_netbios(const std::string &output, int status = 0) { rig.answer("/usr/bin/nmblookup", status, output); }
    static outcome asked(const std::string &name, long result) {
        return {.result = result, .commands = {"/usr/bin/nmblookup " + name}};
    }

    static inline const KOVALOOKUPIP kDirty = [] {
        KOVALOOKUPIP record;
        memset(&record, '~', sizeof record);
        return record;
    }();
    fake_names names;
    std::vector<KOVALOOKUPIP> records;
};

TEST_F(net_lookup_ip, KOVANetLookupIP_addressesOfBothFamilies_areStoredInOrder) {
    names.add("nas01", {"2001:db8::1", "10.0.0.1", "fe80::ffff:ffff:ffff:ffff"});
    EXPECT_OUTCOME(look_up("nas01"), {.result = 3});
    EXPECT_EQ((texts{"2001:db8::1 10", "10.0.0.1 2", "fe80::ffff:ffff:ffff:ffff 10", ""}), found());
    EXPECT_EQ(texts{"nas01"}, names.asked);
}

TEST_F(net_lookup_ip, KOVANetLookupIP_longestAddress_fits) {
    names.add("nas01", {"ffff:ffff:ffff:ffff:ffff:ffff:ffff:ffff"});
    EXPECT_OUTCOME(look_up("nas01", 1), {.result = 1});
    EXPECT_EQ(texts{"ffff:ffff:ffff:ffff:ffff:ffff:ffff:ffff 10"}, found());
}

TEST_F(net_lookup_ip, KOVANetLookupIP_otherFamilies_arePassedOver) {
    names.add("nas01", {"of another family", "10.0.0.1", "of another family"});
    EXPECT_OUTCOME(look_up("nas01", 1), {.result = 1});
    EXPECT_EQ(texts{"10.0.0.1 2"}, found());
}

TEST_F(net_lookup_ip, KOVANetLookupIP_onlyOtherFamilies_areNone) {
    names.add("nas01.example.net", {"of another family"});
    EXPECT_OUTCOME(look_up("nas01.example.net", 1), {.result = 0});
    EXPECT_EQ(texts{""}, found());
}

TEST_F(net_lookup_ip, KOVANetLookupIP_moreThanThereIsRoomFor_areCountedWhenAskedFor) {
    names.add("nas01", {"10.0.0.1", "10.0.0.2", "2001:db8::3"});
    EXPECT_OUTCOME(look_up("nas01", 2), {.result = 2});
    EXPECT_EQ((texts{"10.0.0.1 2", "10.0.0.2 2"}), found());
    EXPECT_OUTCOME(look_up("nas01", 2, 1), {.result = 3});
    EXPECT_EQ((texts{"10.0.0.1 2", "10.0.0.2 2"}), found());
    EXPECT_OUTCOME(look_up("nas01", 0, 1), {.result = 3});
    EXPECT_OUTCOME(rig.observe([] { return KOVANetLookupIP("nas01", nullptr, 0, -1); }), {.result = 3});
}

TEST_F(net_lookup_ip, KOVANetLookupIP_dottedNameThatDoesNotResolve_isNotAskedForOnTheNetwork) {
    answer_netbios("10.0.0.1 nas01.example.net<00>\n10.0.0.1 fe80::1<00>\n");
    for (const char *name : {"nas01.example.net", "fe80::1", "nas01.", ":"}) {
        EXPECT_OUTCOME(look_up(name), {.result = 0});
        EXPECT_EQ((texts{"", "", "", ""}), found());
    }
}

TEST_F(net_lookup_ip, KOVANetLookupIP_bareNameThatDoesNotResolve_isAskedForOnTheNetwork) {
    answer_netbios("querying nas01 on 10.0.0.255\n10.0.0.1 nas01<00>\n10.0.0.2 nas01<20>\n");
    EXPECT_OUTCOME(look_up("nas01"), asked("nas01", 2));
    EXPECT_EQ((texts{"10.0.0.1 2", "10.0.0.2 2", "", ""}), found());
}

TEST_F(net_lookup_ip, KOVANetLookupIP_nobodyAnswers_findsNone) {
    answer_netbios("querying nas01 on 10.0.0.255\nname_query failed to find name nas01\n", 1);
    EXPECT_OUTCOME(look_up("nas01"), asked("nas01", 0));
    EXPECT_EQ((texts{"", "", "", ""}), found());
}

TEST_F(net_lookup_ip, KOVANetLookupIP_networkAnswersMoreThanThereIsRoomFor_areCountedWhenAskedFor) {
    answer_netbios("10.0.0.1 nas01<00>\n10.0.0.2 nas01<00>\n10.0.0.3 nas01<00>\n");
    EXPECT_OUTCOME(look_up("nas01", 2), asked("nas01", 2));
    EXPECT_EQ((texts{"10.0.0.1 2", "10.0.0.2 2"}), found());
    EXPECT_OUTCOME(look_up("nas01", 2, 1), asked("nas01", 3));
    EXPECT_OUTCOME(look_up("nas01", 0, 1), asked("nas01", 3));
    EXPECT_OUTCOME(look_up("nas01", 0), asked("nas01", 0));
}

TEST_F(net_lookup_ip, KOVANetLookupIP_linesThatAreNoAnswers_arePassedOver) {
    answer_netbios("10.0.0.1 other<00>\n"
                   "nas01<00>\n"
                   "querying nas01<00> on 10.0.0.255\n"
                   "10.0.0.300 nas01<00>\n"
                   "2001:db8::1 nas01<00>\n"
                   "10.0.0.1000000000000 nas01<00>\n"
                   "\n   \n<\n"
                   "\t 10.0.0.9 \t nas01<1d>\n"
                   "10.0.0.8 xnas01<00>\n"
                   "10.0.0.7 NAS01<00>\n"
                   "10.0.0.6 nas01<00>");
    EXPECT_OUTCOME(look_up("nas01"), asked("nas01", 3));
    EXPECT_EQ((texts{"10.0.0.9 2", "10.0.0.8 2", "10.0.0.6 2", ""}), found());
}

TEST_F(net_lookup_ip, KOVANetLookupIP_longLines_hideNoAnswer) {
    for (const size_t length : {1021U, 1022U, 1023U, 1024U, 1025U, 2046U, 100000U}) {
        SCOPED_TRACE(length);
        answer_netbios(long_text(length, '1') + "\n10.0.0.1 nas01<00>\n" + long_text(length, '\xff') +
                       "10.0.0.3 nas01<00>\n10.0.0.2 nas01<00>\n");
        EXPECT_OUTCOME(look_up("nas01"), asked("nas01", 2));
        EXPECT_EQ((texts{"10.0.0.1 2", "10.0.0.2 2", "", ""}), found());
    }
}

TEST_F(net_lookup_ip, KOVANetLookupIP_bytesOfAllKinds_hideNoAnswer) {
    const script_as_tool tool{"printf '\\0\\0 nas01<\\n\\001\\377%%s%%n\\n'; head -c 5000 /dev/zero\n"
                              "printf '\\n\\0\\n10.0.0.1 nas01<00>\\n'\n"};
    rig.let_run("/usr/bin/nmblookup");
    EXPECT_OUTCOME(look_up("nas01"), asked("nas01", 1));
    EXPECT_EQ((texts{"10.0.0.1 2", "", "", ""}), found());
}

TEST_F(net_lookup_ip, KOVANetLookupIP_outputWithoutEnd_isLeft) {
    rig.let_run("/usr/bin/nmblookup");
    for (const char *endless : {"cat /dev/zero", "tr '\\0' x </dev/zero", "yes other", "yes ''"}) {
        SCOPED_TRACE(endless);
        const script_as_tool tool{std::string("echo '10.0.0.1 nas01<00>'\nexec ") + endless + "\n"};
        EXPECT_OUTCOME(look_up("nas01"), asked("nas01", 1));
        EXPECT_EQ((texts{"10.0.0.1 2", "", "", ""}), found());
    }
}

TEST_F(net_lookup_ip, KOVANetLookupIP_namesThatNoHostHas_areNotAskedFor) {
    answer_netbios("10.0.0.1 -U<00>\n");
    EXPECT_OUTCOME(look_up("-U"), {.result = 0});
    EXPECT_OUTCOME(look_up(long_text(69)), {.result = 0});
    EXPECT_OUTCOME(look_up(long_text(100000)), {.result = 0});
    answer_netbios("10.0.0.1 " + long_text(68) + "<00>\n");
    EXPECT_OUTCOME(look_up(long_text(68)), asked(long_text(68), 1));
}

TEST_F(net_lookup_ip, KOVANetLookupIP_oddNames_areAskedForAsTheyAre) {
    for (const char *name : {"nas 01", "%s%n", "nas01;reboot", "$(reboot)", "\xc3\xa4", "*"}) {
        answer_netbios(std::string("10.0.0.1 ") + name + "<00>\n");
        EXPECT_OUTCOME(look_up(name, 1), asked(name, 1));
        EXPECT_EQ(texts{"10.0.0.1 2"}, found());
    }
}

TEST_F(net_lookup_ip, KOVANetLookupIP_failedResolver_leavesTheNetworkToBeAsked) {
    names.add("nas01", {"10.0.0.9"});
    answer_netbios("10.0.0.1 nas01<00>\n");
    rig.fail("getaddrinfo");
    EXPECT_OUTCOME(look_up("nas01", 1), asked("nas01", 1));
    EXPECT_EQ(texts{"10.0.0.1 2"}, found());
}

TEST_F(net_lookup_ip, KOVANetLookupIP_toolThatCannotRun_isNoted) {
    rig.fail("KLIBCPopen");
    EXPECT_OUTCOME(look_up("nas01", 1),
                   {.result = 0,
                    .code = 0x2A00,
                    .unit = "platform",
                    .log = {"INFO net_lookup_ip:N Fail to execute [/usr/bin/nmblookup], kovaerr=[0x2A00]"},
                    .commands = {"/usr/bin/nmblookup nas01"}});
    EXPECT_EQ(texts{""}, found());
}

TEST_F(net_lookup_ip, KOVANetLookupIP_noMemoryForLines_is200) {
    NEEDS_OWN_ALLOCATOR();
    answer_netbios("10.0.0.1 nas01<00>\n");
    rig.fail("malloc");
    EXPECT_OUTCOME(look_up("nas01", 1), {.result = 0,
                                         .code = 0x200,
                                         .unit = "net_lookup_ip",
                                         .log = {"ERR net_lookup_ip:N pszBuf is NULL"},
                                         .commands = {"/usr/bin/nmblookup nas01"}});
    EXPECT_EQ(texts{""}, found());
}

TEST_F(net_lookup_ip, KOVANetLookupIP_badArguments_areRefused) {
    const auto refused = [](const std::string &condition) { return refusal("net_lookup_ip", condition, 0); };
    KOVALOOKUPIP record = kDirty;
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetLookupIP(nullptr, &record, 1, 0); }),
                   refused("((void *)0) != szName"));
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetLookupIP("", &record, 1, 0); }), refused("'\\0' != *szName"));
    for (const int room : {-1, INT_MIN}) {
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetLookupIP("nas01", &record, room, 1); }),
                       refused("0 <= cResult"));
    }
    EXPECT_OUTCOME(rig.observe([] { return KOVANetLookupIP("nas01", nullptr, 1, 1); }), refused("NULL != pResult"));
    EXPECT_EQ(0, memcmp(&kDirty, &record, sizeof record));
    EXPECT_EQ(texts{}, names.asked);
}

} // namespace
