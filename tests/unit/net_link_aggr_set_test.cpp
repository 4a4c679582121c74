#include "support/fake_kernel.h"

#include <algorithm>
#include <cstring>
#include <kovanetsdk/link.h>
#include <optional>

using namespace kova_test;

namespace {

const std::string kUnit = "net_link_aggr_set";
const std::string kDel = "net_link_aggr_conf_del";

/** The files of an appliance, by interface; "<absent>" for none. */
using files = std::map<std::string, std::string>;

const std::string kLine802 = "BONDING_OPTS=\"mode=4 use_carrier=0 miimon=100 updelay=100 lacp_rate=fast\"\n";
const std::string kLineRr = "BONDING_OPTS=\"mode=0 use_carrier=0 miimon=100 updelay=100\"\n";
const std::string kEth0 = "DEVICE=eth0\nBOOTPROTO=static\nONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n";
const std::string kEth1 = "DEVICE=eth1\nBOOTPROTO=dhcp\nONBOOT=yes\n";
const std::string kEth2 = "DEVICE=eth2\nBOOTPROTO=none\nONBOOT=yes\n";
const std::string kAddress = "DEVICE=bond0\nBOOTPROTO=static\nONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n"
                             "USERCTL=no\n";
const std::string kBond = kAddress + kLine802;
const std::string kMember = "USERCTL=no\nMASTER=bond0\nSLAVE=yes\n";

const files kApart{{"eth0", kEth0}, {"eth1", kEth1}, {"eth2", kEth2}};
const files kBonded{{"bond0", kBond}, {"eth0", kEth0 + kMember}, {"eth1", kEth1 + kMember}, {"eth2", kEth2}};

std::string copy(const std::string &from, const std::string &to) {
    return "/bin/cp -f " + ifcfg(from) + " " + ifcfg(to);
}
std::string save(const std::string &name) {
    return copy(name, name + ".saved");
}
std::string put_back(const std::string &name) {
    return "/bin/mv -f " + ifcfg(name + ".saved") + " " + ifcfg(name);
}
const std::string kLease = "/bin/cp -f /tmp/dhcpv4.leases.eth0 /tmp/dhcpv4.leases.bond0";
const texts kPutBack{put_back("eth0"), put_back("eth1")};
const std::string kStop = "/etc/rc.network stop bond0 eth0 eth1";
const std::string kStart = "/etc/rc.network start bond0 eth0 eth1";
const std::string kNoBondFile = "INFO net_link_aggr_set:N remove file " + ifcfg("bond0") + " failed";

texts operator+(texts left, const texts &right) {
    left.insert(left.end(), right.begin(), right.end());
    return left;
}
texts between_stop_and_start(const texts &commands) {
    return texts{kStop} + commands + texts{kStart};
}

texts events(const std::string &origin, const std::string &now, int result) {
    const std::string names = " ORIGIN_IFNAME=[" + origin + "] IFNAME=[" + now + "] RESULT=";
    return {"net/ifname_change 4" + names + "0", "net/ifname_change 5" + names + "0" + names + std::to_string(result)};
}
texts made(int result) {
    return events("eth0 eth1", "bond0", result);
}
texts deleted(int result) {
    return events("bond0", "eth0 eth1", result);
}

/** The three changes, by the mode that asks for each. */
constexpr int kCreate = KOVA_LINK_AGGR_8023AD;
constexpr int kChange = KOVA_LINK_AGGR_BALANCE_RR;
constexpr int kDelete = KOVA_LINK_AGGR_UNKNOWN;

/** A copy that fails, alone or along with a rewrite, whose rollback then meets the file that is not there. */
struct failed_copy {
    int operation;
    std::string command;
    int occurrence;
    int failing_rewrite; ///< 0 for none
    long result;
    texts log;
    texts commands; ///< between stop and start
    files left;
};

/** Calls of one operation, counted from 1, each of which fails alone: what comes of the change then. */
struct failing {
    const char *operation;
    int first, last;
    long result;
    unsigned code;
    std::string unit;
    texts log;
    texts commands; ///< between stop and start
    files left;
};

} // namespace

class net_link_aggr_set : public unit_test {
protected:
    void SetUp() override { begin(kApart); }

    void begin(const files &wanted) {
        unit_test::SetUp();
        rig = {};
        kernel.emplace(rig);
        rig.hide("/sys/class/net/bond0");
        rig.hide("/proc/net/bonding");
        for (const auto &[name, content] : wanted) {
            write_file(ifcfg(name), content);
        }
        write_file("/tmp/dhcpv4.leases.eth0", "lease { interface \"eth0\"; } # eth0\n");
        shell("rm -f /tmp/dhcpv4.leases.bond0");
        if (wanted.count("bond0") != 0) {
            write_file("/tmp/sys-bond0/bonding/slaves", "eth0 eth1\n");
            write_file("/tmp/sys-bond0/bonding/mode", "802.3ad 4\n");
            rig.redirect("/sys/class/net/bond0", "/tmp/sys-bond0");
        }
        request("bond0", KOVA_LINK_AGGR_8023AD, {"eth0", "eth1"});
    }
    void begin_bonded(const files &changed = {}) {
        files wanted = kBonded;
        for (const auto &[name, content] : changed) {
            wanted[name] = content;
        }
        begin(wanted);
    }
    void request(const std::string &name, int mode, const texts &slaves) {
        memset(&bond, 0, sizeof bond);
        memcpy(bond.szName, name.c_str(), name.size());
        bond.mode = mode;
        bond.cSlaves = static_cast<int>(slaves.size());
        for (size_t i = 0; i < slaves.size() && i < 32; ++i) {
            memcpy(bond.aszSlaves[i], slaves[i].c_str(), slaves[i].size());
        }
    }
    outcome set() {
        return rig.observe([this] { return KOVANetLinkAggrSet(&bond); });
    }
    /** A clean appliance before one of the three changes. */
    void begin_for(int operation) {
        begin(operation == kCreate ? kApart : kBonded);
        bond.mode = operation;
    }
    /** A copy that fails at its first run, or at its second: that of a change which writes the bond anew. */
    void fail_copy(const std::string &command, int occurrence, int status) {
        const auto fail_it = [=, this] { rig.answer(command, status); };
        if (occurrence == 1) {
            fail_it();
        }
        rig.before("KLIBCFileSetKeys", [=, this, calls = 0]() mutable {
            constexpr int kOfTheBond = 3; // behind those of the members that leave
            if (++calls == kOfTheBond && occurrence == 1) {
                rig.let_run(command);
            } else if (calls == kOfTheBond) {
                fail_it();
            }
        });
    }
    void expect_failed_copy(const failed_copy &row, int status) {
        SCOPED_TRACE(std::to_string(row.operation) + " " + row.command + " " + std::to_string(row.occurrence) +
                     ", rewrite " + std::to_string(row.failing_rewrite) + ", status " + std::to_string(status));
        begin_for(row.operation);
        fail_copy(row.command, row.occurrence, status);
        if (row.failing_rewrite != 0) {
            rig.fail("KLIBCFileSetKeys", row.failing_rewrite);
        }
        const outcome got = set();
        EXPECT_EQ(row.result, got.result);
        EXPECT_EQ(row.log, got.log);
        EXPECT_EQ(between_stop_and_start(row.commands), got.commands);
        expect_files(row.left);
        const bool has_lease = row.operation != kDelete && row.command != kLease;
        EXPECT_EQ(has_lease ? "lease { interface \"bond0\"; } # bond0\n" : "<absent>",
                  read_file("/tmp/dhcpv4.leases.bond0"));
    }
    /** An event that cannot be opened ends the change; one that cannot be raised is a line in the log, and no more. */
    void expect_events_that_fail(int operation, const texts &commands, const files &present, const files &meant) {
        begin_for(operation);
        rig.fail("KLIBPluginSDKInit");
        EXPECT_OUTCOME(set(), {.result = -1,
                               .code = 0x200,
                               .unit = "platform",
                               .log = {"ERR net_link_aggr_set:N plugin sdk init failed"}});
        expect_files(present);
        const auto expect_one_line = [&](const char *call, int nth, const char *phase, const char *code,
                                         size_t raised) {
            SCOPED_TRACE(call + std::string(" ") + std::to_string(nth));
            begin_for(operation);
            rig.fail(call, nth);
            const outcome got = set();
            EXPECT_EQ(0, got.result);
            EXPECT_EQ(texts{std::string("ERR net_link_aggr_set:N Fail to execute net plugin (") + phase + ") [" + code +
                            " platform:N]"},
                      got.log);
            EXPECT_EQ(between_stop_and_start(commands), got.commands);
            EXPECT_EQ(raised, got.events.size());
            expect_files(meant);
        };
        for (const auto &[call, first_of_post, last] :
             {std::tuple{"KLIBPluginSetArgByArray", 3, 4}, std::tuple{"KLIBPluginSetArgByInt", 2, 2}}) {
            for (int nth = 1; nth <= last; ++nth) {
                expect_one_line(call, nth, nth < first_of_post ? "PRE" : "POST", "0x0200", 1);
            }
        }
        expect_one_line("KLIBPluginAction", 1, "PRE", "0x2A00", 2); // it was raised, and failed
        expect_one_line("KLIBPluginAction", 2, "POST", "0x2A00", 2);
    }
    static files found_files() {
        files found;
        for (const std::string &name : list_dir("/etc/sysconfig/network-scripts")) {
            const std::string ifname = name.substr(sizeof "ifcfg-" - 1);
            found[ifname] = read_file(ifcfg(ifname));
        }
        return found;
    }
    static void expect_files(const files &expected) { EXPECT_EQ(expected, found_files()); }

    /** One row, with one of its calls. */
    void expect_row(const failing &row, int nth, const std::function<texts(int)> &events_of) {
        SCOPED_TRACE(row.operation + std::string(" ") + std::to_string(nth));
        rig.fail(row.operation, nth);
        const outcome got = set();
        EXPECT_OUTCOME(got, {.result = row.result,
                             .code = row.code,
                             .unit = row.unit,
                             .log = row.log,
                             .commands = between_stop_and_start(row.commands),
                             .events = events_of(static_cast<int>(row.result)),
                             .locks = got.locks});
        expect_files(row.left);
    }
    /** Every row, with each of its calls, and that each operation has no call that is in no row. */
    void expect_all(const std::vector<failing> &rows, const std::function<void()> &prepare,
                    const std::function<texts(int)> &events_of) {
        prepare();
        const outcome clean = set();
        const files meant = found_files();
        std::map<std::string, int> numbers;
        for (const failing &row : rows) {
            EXPECT_EQ(numbers[row.operation] + 1, row.first) << row.operation;
            numbers[row.operation] = row.last;
            for (int nth = row.first; nth <= row.last; ++nth) {
                prepare();
                expect_row(row, nth, events_of);
            }
        }
        for (const auto &[operation, number] : numbers) {
            SCOPED_TRACE(operation);
            prepare();
            rig.fail(operation, number + 1);
            EXPECT_OUTCOME(set(), clean);
            expect_files(meant);
        }
    }

    std::optional<fake_kernel> kernel;
    KOVALINKAGGROPT bond;
};

// ---- making

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_newBond_takesOverItsFirstMembersSettings) {
    EXPECT_OUTCOME(set(),
                   {.code = 0x900, // of looking for the bond
                    .unit = "net_link_aggr_phy_get",
                    .commands = between_stop_and_start({copy("eth0", "bond0"), kLease, save("eth0"), save("eth1")}),
                    .events = made(0)});
    expect_files(kBonded);
    EXPECT_EQ("lease { interface \"bond0\"; } # bond0\n", read_file("/tmp/dhcpv4.leases.bond0"));
    EXPECT_EQ("lease { interface \"eth0\"; } # eth0\n", read_file("/tmp/dhcpv4.leases.eth0"));
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_modes_writeTheirOptions) {
    for (int mode = 1; mode < KOVA_LINK_AGGR_MODES; ++mode) {
        begin(kApart);
        bond.mode = mode;
        EXPECT_EQ(0, set().result);
        const std::string line = std::string("BONDING_OPTS=") + grgBondDesc[mode].szOptions + "\n";
        EXPECT_NE(std::string::npos, read_file(ifcfg("bond0")).find(line)) << line;
    }
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_32Members_areTaken) {
    texts names;
    for (int i = 10; i < 42; ++i) {
        names.push_back("eth" + std::to_string(i));
        write_file(ifcfg(names.back()), "DEVICE=" + names.back() + "\n");
    }
    request("bond0", KOVA_LINK_AGGR_BALANCE_RR, names);
    const outcome got = set();
    EXPECT_EQ(0, got.result);
    std::string all = "bond0";
    for (const std::string &name : names) {
        all += " " + name;
        EXPECT_EQ("DEVICE=" + name + "\n" + kMember, read_file(ifcfg(name)));
    }
    EXPECT_EQ("/etc/rc.network stop " + all, got.commands.front());
    EXPECT_EQ("/etc/rc.network start " + all, got.commands.back());
    EXPECT_EQ(events(all.substr(6), "bond0", 0), got.events);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_memberThatWasOneElsewhere_startsWithAnAddressOfItsOwn) {
    write_file(ifcfg("eth0"), "DEVICE=eth0\nBOOTPROTO=none\nIPADDR=1.2.3.4\nMASTER=bond9\nSLAVE=yes\nUSERCTL=yes");
    EXPECT_EQ(0, set().result);
    EXPECT_EQ("DEVICE=bond0\nBOOTPROTO=dhcp\nIPADDR=\nUSERCTL=no\nNETMASK=\nONBOOT=yes\n" + kLine802,
              read_file(ifcfg("bond0")));
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_membersWithoutFiles_getThem) {
    begin({});
    EXPECT_OUTCOME(set(),
                   {.code = 0x900,
                    .unit = "key_value",
                    .log = {"INFO net_link_aggr_set:N remove file " + ifcfg("eth0.saved") + " failed",
                            "INFO net_link_aggr_set:N remove file " + ifcfg("eth1.saved") + " failed"},
                    .commands = between_stop_and_start({copy("eth0", "bond0"), kLease, save("eth0"), save("eth1")}),
                    .events = made(0)});
    expect_files({{"bond0", "BOOTPROTO=dhcp\nDEVICE=bond0\nONBOOT=yes\nUSERCTL=no\n" + kLine802},
                  {"eth0", "DEVICE=eth0\n" + kMember},
                  {"eth1", "DEVICE=eth1\n" + kMember}});
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_linkInPlaceOfTheLease_isNotFollowed) {
    write_file("/tmp/bait", "eth0\n");
    shell("ln -s /tmp/bait /tmp/dhcpv4.leases.bond0");
    EXPECT_EQ(0, set().result);
    EXPECT_EQ("eth0\n", read_file("/tmp/bait"));
    EXPECT_EQ("lease { interface \"bond0\"; } # bond0\n", read_file("/tmp/dhcpv4.leases.bond0"));
    shell("rm /tmp/bait");
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_leaseThatIsNotThere_isNoFailure) {
    shell("rm /tmp/dhcpv4.leases.eth0");
    const outcome got = set();
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(texts{}, got.log);
    expect_files(kBonded);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_copiesOfEarlierChanges_areNotPutBack) {
    write_file(ifcfg("eth0.saved"), "an old one\n");
    write_file(ifcfg("eth1.saved"), "an old one\n");
    rig.fail("KLIBCFileSetKeys", 1);
    EXPECT_EQ(-1, set().result);
    expect_files(kApart);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_makingFailsAtAStep_putsEverythingBackAndStartsIt) {
    const std::string member = "net_link_aggr_conf_set_slave";
    const texts taken_over{copy("eth0", "bond0"), kLease};
    const texts one = taken_over + texts{save("eth0")};
    const texts two = one + texts{save("eth1")};
    files dynamic = kBonded;
    dynamic["bond0"] =
        "DEVICE=bond0\nBOOTPROTO=dhcp\nONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\nUSERCTL=no\n" + kLine802;
    const texts back = kPutBack;
    const std::vector<failing> rows{
        {"KLIBCSzHashAlloc", 1, 2, -1, 0x200, kUnit, {kNoBondFile}, back, kApart},
        {"KLIBCSzHashAlloc", 3, 4, -1, 0x200, member, {}, taken_over + back, kApart},
        {"KLIBCSzHashAlloc", 5, 6, -1, 0x200, member, {}, one + back, kApart},
        {"KLIBCSzHashSetValue", 1, 6, -1, 0x200, kUnit, {}, taken_over + back, kApart},
        {"KLIBCSzHashSetValue", 7, 10, -1, 0x200, member, {}, taken_over + back, kApart},
        {"KLIBCSzHashSetValue", 11, 14, -1, 0x200, member, {}, one + back, kApart},
        {"KLIBCFileSetKeys", 1, 1, -1, 0xB00, "platform", {}, taken_over + back, kApart},
        {"KLIBCFileSetKeys", 2, 2, -1, 0xB00, "platform", {}, one + back, kApart},
        {"KLIBCFileSetKeys", 3, 3, -1, 0xB00, "platform", {}, two + back, kApart},
        // not looked at: a protocol that cannot be read is none, and a lease may be missing
        {"KLIBCFileGetKeyValue", 1, 1, 0, 0x900, "platform", {}, two, dynamic},
        {"KLIBCFileReplaceSubStr", 1, 1, 0, 0xB00, "platform", {}, two, kBonded},
    };
    expect_all(
        rows, [this] { begin(kApart); }, made);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_memberWhoseFileVanishes_getsOne) {
    // before it is copied, and between the copy and the rewrite
    rig.answer("/etc/rc.network stop", 0, "", [] { shell("rm " + ifcfg("eth1")); });
    EXPECT_EQ(0, set().result);
    files left = kBonded;
    left["eth1"] = "DEVICE=eth1\n" + kMember;
    expect_files(left);
    begin(kApart);
    rig.answer(save("eth1"), 0, "", [] { shell("mv " + ifcfg("eth1") + " " + ifcfg("eth1.saved")); });
    EXPECT_EQ(0, set().result);
    expect_files(left);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_directoryInPlaceOfAFile_putsTheOthersBack) {
    shell("rm " + ifcfg("eth1") + " && mkdir " + ifcfg("eth1"));
    const outcome got = set();
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x900U, got.code);
    shell("rmdir " + ifcfg("eth1"));
    expect_files({{"eth0", kEth0}, {"eth2", kEth2}});
    begin(kApart);
    shell("mkdir " + ifcfg("bond0"));
    EXPECT_EQ(-1, set().result);
    shell("rm -r " + ifcfg("bond0"));
    expect_files(kApart);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_readOnlyFiles_keepTheirModes) {
    shell("chmod 400 " + ifcfg("eth0") + " " + ifcfg("eth1"));
    EXPECT_EQ(0, set().result);
    expect_files(kBonded);
    for (const char *name : {"bond0", "eth0", "eth1"}) {
        shell("test $(stat -c %a " + ifcfg(name) + ") = 400");
    }
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_disksThatTakeNothing_leaveEverything) {
    const std::string directory = "/etc/sysconfig/network-scripts";
    for (const int mode : {KOVA_LINK_AGGR_8023AD, KOVA_LINK_AGGR_UNKNOWN, KOVA_LINK_AGGR_BALANCE_RR}) {
        const files present = mode == KOVA_LINK_AGGR_8023AD ? kApart : kBonded;
        begin(present);
        bond.mode = mode;
        shell("cp -a " + directory + " /tmp/scripts && mount -t tmpfs tmpfs " + directory +
              " && cp -a /tmp/scripts/. " + directory + " && mount -o remount,ro " + directory);
        EXPECT_EQ(-1, set().result) << mode;
        expect_files(present);
        shell("umount " + directory + " && rm -r /tmp/scripts");
    }
}

// ---- deleting

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_modeZero_givesTheFirstMemberTheBondsSettings) {
    begin_bonded();
    request("bond0", KOVA_LINK_AGGR_UNKNOWN, {});
    memset(bond.aszSlaves, '/', sizeof bond.aszSlaves); // not looked at
    bond.cSlaves = -7;
    EXPECT_OUTCOME(set(), {.code = 0xBC00, // no status of the aggregation
                           .unit = "net_link_aggr_get",
                           .commands = between_stop_and_start({copy("bond0", "eth0"), save("eth0"), save("eth1")}),
                           .events = deleted(0),
                           .locks = {"+0x105", "-0x100", "+0x105", "-0x100"}});
    files left = kApart;
    left["eth0"] = "DEVICE=eth0\nBOOTPROTO=static\nONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n";
    left["eth0.saved"] = kBond;
    left["eth1.saved"] = kEth1 + kMember;
    expect_files(left);
    EXPECT_EQ(2, bond.cSlaves);
    EXPECT_STREQ("eth0", bond.aszSlaves[0]);
    EXPECT_STREQ("eth1", bond.aszSlaves[1]);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_membersWithTheBondsAddress_loseIt) {
    begin_bonded({{"eth1", "DEVICE=eth1\nBOOTPROTO=static\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n" + kMember}});
    bond.mode = 0;
    EXPECT_EQ(0, set().result);
    EXPECT_EQ("DEVICE=eth1\nBOOTPROTO=dhcp\nIPADDR=\nNETMASK=\n", read_file(ifcfg("eth1")));
    EXPECT_EQ("DEVICE=eth0\nBOOTPROTO=static\nONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n",
              read_file(ifcfg("eth0")));
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_bondWithoutAddress_asksNoMember) {
    begin_bonded({{"bond0", "DEVICE=bond0\nBOOTPROTO=dhcp\n"}, {"eth1", "DEVICE=eth1\nBOOTPROTO=static\nIPADDR=\n"}});
    bond.mode = 0;
    const outcome got = set();
    EXPECT_EQ(0, got.result);
    EXPECT_EQ((texts{"+0x105", "-0x100"}), got.locks);
    EXPECT_EQ("DEVICE=eth1\nBOOTPROTO=static\nIPADDR=\n", read_file(ifcfg("eth1")));
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_deletingWhatIsNoBond_isRefused) {
    bond.mode = 0;
    EXPECT_OUTCOME(set(), {.result = -1,
                           .code = 0xD00,
                           .unit = kDel,
                           .log = {"ERR net_link_aggr_conf_del:N Invaild Argument ('\\0' != *pOpt->aszSlaves[0])=[0]"},
                           .commands = {"/etc/rc.network stop bond0", "/etc/rc.network start bond0"},
                           .events = events("bond0", "", -1)});
    expect_files(kApart);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_deletingFailsAtAStep_leavesTheBondWithAllItsMembers) {
    const std::string member = "net_link_aggr_conf_set_slave";
    const std::string lock = "ERR net_lnx_get_ip:N KLIBCFileLock() failed.(400)";
    const std::string begins = "ERR net_link_aggr_conf_del:N ";
    const auto unread = [](const std::string &name) {
        return "ERR net_lnx_get_ip:N Failed to get [IPADDR] from [" + ifcfg(name) + "], kovaerr=[0x0900]";
    };
    const std::string no_address = "INFO net_link_aggr_conf_del:N get IP of bond0 failed";
    const std::string no_second = begins + "get IP on eth1 failed";
    const texts zero{copy("bond0", "eth0")};
    const texts one = zero + texts{save("eth0")};
    const texts two = one + texts{save("eth1")};
    const texts back = kPutBack;
    files apart = kApart;
    apart["eth0.saved"] = kBond;
    apart["eth1.saved"] = kEth1 + kMember;
    files dynamic = apart;
    dynamic["eth0"] = "DEVICE=eth0\nBOOTPROTO=dhcp\nONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n";
    const std::vector<failing> rows{
        {"KLIBCSzHashAlloc", 1, 2, -1, 0x200, member, {}, zero + back, kBonded},
        {"KLIBCSzHashAlloc", 3, 4, -1, 0x200, member, {}, one + back, kBonded},
        {"KLIBCSzHashSetValue", 1, 5, -1, 0x200, member, {}, zero + back, kBonded},
        {"KLIBCSzHashSetValue", 6, 10, -1, 0x200, member, {}, one + back, kBonded},
        {"KLIBCFileSetKeys", 1, 1, -1, 0xB00, "platform", {}, one + back, kBonded},
        {"KLIBCFileSetKeys", 2, 2, -1, 0xB00, "platform", {}, two + back, kBonded},
        {"KLIBCFileLock", 1, 1, 0, 0x400, "net_lnx_get_ip", {lock, no_address}, two, apart},
        {"KLIBCFileLock", 2, 2, -1, 0x400, "net_lnx_get_ip", {lock, no_second}, one + back, kBonded},
        {"KLIBCFileUnlock", 1, 2, 0, 0xD00, "platform", {}, two, apart},
        // a protocol that cannot be read is none
        {"KLIBCFileGetKeyValue", 1, 1, 0, 0x900, "platform", {unread("bond0"), no_address}, two, apart},
        {"KLIBCFileGetKeyValue", 2, 2, 0, 0x900, "platform", {}, two, dynamic},
        {"KLIBCFileGetKeyValue", 3, 3, -1, 0x900, "platform", {unread("eth1"), no_second}, one + back, kBonded},
        {"KLIBCFileGetKeyValue", 4, 4, 0, 0x900, "platform", {}, two, apart},
    };
    const auto prepare = [this] {
        begin_bonded();
        bond.mode = 0;
    };
    expect_all(rows, prepare, deleted);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_deletingWhereTheFirstCopyFails_endsThere) {
    begin_bonded();
    rig.answer(copy("bond0", "eth0"), 1);
    bond.mode = 0;
    EXPECT_OUTCOME(set(), {.result = -1,
                           .code = 0x2A00,
                           .unit = kDel,
                           .log = {"ERR " + kDel + ":N Failed to copy " + ifcfg("bond0") + " to " + ifcfg("eth0")},
                           .commands = between_stop_and_start(texts{copy("bond0", "eth0")} + kPutBack),
                           .events = deleted(-1)});
    expect_files(kBonded);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_deletingWhereTheFirstCopyFailsHalfway_keepsTheMember) {
    for (const int whole : {1, 0}) { // whole, or its first line
        begin_bonded();
        rig.answer(copy("bond0", "eth0"), whole == 1 ? -1 : 1, "",
                   [whole] { shell((whole == 1 ? "cat " : "head -n 1 ") + ifcfg("bond0") + " > " + ifcfg("eth0")); });
        bond.mode = 0;
        const outcome got = set();
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ(0x2A00U, got.code);
        files left = kBonded;
        left["eth0"] = (whole == 1 ? kEth0 : "DEVICE=eth0\n") + kMember;
        expect_files(left);
    }
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_deletingFailsBehindAMembersAddress_keepsTheMember) {
    const std::string same = "DEVICE=eth1\nBOOTPROTO=static\nIPADDR=10.0.0.1\n" + kMember;
    begin_bonded({{"eth1", same}});
    rig.fail("KLIBCFileSetKeyValue");
    bond.mode = 0;
    const outcome got = set();
    EXPECT_OUTCOME(got, {.result = -1,
                         .code = 0xB00,
                         .unit = "platform",
                         .log = {"ERR " + kDel + ":N set " + ifcfg("eth1") + " BOOTPROTO=none failed"},
                         .commands = between_stop_and_start(texts{copy("bond0", "eth0"), save("eth0")} + kPutBack),
                         .events = deleted(-1),
                         .locks = got.locks});
    files left = kBonded;
    left["eth1"] = same;
    expect_files(left);
    begin_bonded({{"eth1", same}});
    rig.fail("KLIBCFileSetKeys", 2);
    bond.mode = 0;
    EXPECT_EQ(-1, set().result);
    left["eth1"] = "DEVICE=eth1\nBOOTPROTO=none\nIPADDR=10.0.0.1\n" + kMember; // its copy is made behind that
    expect_files(left);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_deletingWhereTheBondsFileStays_putsTheCopiesBack) {
    begin_bonded();
    rig.answer(save("eth1"), 0, "", [] {
        shell("cp " + ifcfg("eth1") + " " + ifcfg("eth1.saved") + " && rm " + ifcfg("bond0") + " && mkdir " +
              ifcfg("bond0"));
    });
    bond.mode = 0;
    const outcome got = set();
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(texts{"ERR net_link_aggr_conf_del:N remove file " + ifcfg("bond0") + " failed"}, got.log);
    EXPECT_EQ(between_stop_and_start(texts{copy("bond0", "eth0"), save("eth0"), save("eth1")} + kPutBack),
              got.commands);
    EXPECT_EQ(deleted(-1), got.events);
    EXPECT_EQ(kEth1 + kMember, read_file(ifcfg("eth1")));
    EXPECT_EQ(kEth0 + kMember, read_file(ifcfg("eth0")));
}

// ---- changing

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_sameRecord_isNothingToDo) {
    begin_bonded();
    bond.blNoPartner = 1; // as read
    EXPECT_OUTCOME(set(), {.code = 0xBC00, .unit = "net_link_aggr_get"});
    expect_files(kBonded);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_otherModeAndMembers_rewriteTheBondWithoutAnEvent) {
    begin_bonded();
    request("bond0", KOVA_LINK_AGGR_ACTIVE_BACKUP, {"eth0", "eth2"});
    EXPECT_OUTCOME(set(), {.code = 0xBC00,
                           .unit = "net_link_aggr_get",
                           .commands = {"/etc/rc.network stop bond0 eth0 eth2", copy("bond0", "eth0"), save("eth0"),
                                        save("eth1"), copy("eth0", "bond0"), kLease, save("eth0"), save("eth2"),
                                        "/etc/rc.network start bond0 eth0 eth2"},
                           .locks = {"+0x105", "-0x100", "+0x105", "-0x100"}});
    const std::string address = "BOOTPROTO=static\nONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n";
    expect_files({{"bond0", "DEVICE=bond0\n" + address +
                                "USERCTL=no\nBONDING_OPTS=\"mode=1 use_carrier=0 miimon=100 updelay=100\"\n"},
                  {"eth0", "DEVICE=eth0\n" + address + kMember},
                  {"eth1", kEth1},
                  {"eth1.saved", kEth1 + kMember},
                  {"eth2", kEth2 + kMember}});
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_changeFailsAtAStep_leavesTheBondOrTheMembersApart) {
    const std::string member = "net_link_aggr_conf_set_slave";
    const std::string lock = "ERR net_lnx_get_ip:N KLIBCFileLock() failed.(400)";
    const auto unread = [](const std::string &name) {
        return "ERR net_lnx_get_ip:N Failed to get [IPADDR] from [" + ifcfg(name) + "], kovaerr=[0x0900]";
    };
    const std::string no_address = "INFO net_link_aggr_conf_del:N get IP of bond0 failed";
    const std::string no_second = "ERR net_link_aggr_conf_del:N get IP on eth1 failed";
    const texts zero{copy("bond0", "eth0")};
    const texts one = zero + texts{save("eth0")};
    const texts apart = one + texts{save("eth1")};
    const texts taken_over{copy("eth0", "bond0"), kLease};
    const texts joined_one = taken_over + texts{save("eth0")};
    const texts joined = joined_one + texts{save("eth1")};
    const texts back = kPutBack;
    const std::string options = "BONDING_OPTS=\"mode=0 use_carrier=0 miimon=100 updelay=100\"\n";
    const std::string address = "ONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n";
    files changed = kBonded;
    changed["bond0"] = "DEVICE=bond0\nBOOTPROTO=static\n" + address + "USERCTL=no\n" + options;
    files bond_alone = changed;
    bond_alone["bond0"] = "DEVICE=bond0\nBOOTPROTO=dhcp\n" + address + "USERCTL=no\n" + options;
    files dynamic = bond_alone;
    dynamic["eth0"] = "DEVICE=eth0\nBOOTPROTO=dhcp\n" + address + kMember;
    const std::vector<failing> rows{
        // how the present bond ends is not looked at
        {"KLIBCSzHashAlloc", 1, 2, 0, 0x200, member, {}, zero + back + joined, changed},
        {"KLIBCSzHashAlloc", 3, 4, 0, 0x200, member, {}, one + back + joined, changed},
        {"KLIBCSzHashAlloc", 5, 6, -1, 0x200, kUnit, {kNoBondFile}, apart + back, kApart},
        {"KLIBCSzHashAlloc", 7, 8, -1, 0x200, member, {}, apart + taken_over + back, kApart},
        {"KLIBCSzHashAlloc", 9, 10, -1, 0x200, member, {}, apart + joined_one + back, kApart},
        {"KLIBCSzHashSetValue", 1, 5, 0, 0x200, member, {}, zero + back + joined, changed},
        {"KLIBCSzHashSetValue", 6, 10, 0, 0x200, member, {}, one + back + joined, changed},
        {"KLIBCSzHashSetValue", 11, 16, -1, 0x200, kUnit, {}, apart + taken_over + back, kApart},
        {"KLIBCSzHashSetValue", 17, 20, -1, 0x200, member, {}, apart + taken_over + back, kApart},
        {"KLIBCSzHashSetValue", 21, 24, -1, 0x200, member, {}, apart + joined_one + back, kApart},
        {"KLIBCFileSetKeys", 1, 1, 0, 0xB00, "platform", {}, one + back + joined, changed},
        {"KLIBCFileSetKeys", 2, 2, 0, 0xB00, "platform", {}, apart + back + joined, changed},
        {"KLIBCFileSetKeys", 3, 3, -1, 0xB00, "platform", {}, apart + taken_over + back, kApart},
        {"KLIBCFileSetKeys", 4, 4, -1, 0xB00, "platform", {}, apart + joined_one + back, kApart},
        {"KLIBCFileSetKeys", 5, 5, -1, 0xB00, "platform", {}, apart + joined + back, kApart},
        {"KLIBCFileLock", 1, 1, 0, 0x400, "net_lnx_get_ip", {lock, no_address}, apart + joined, changed},
        {"KLIBCFileLock", 2, 2, 0, 0x400, "net_lnx_get_ip", {lock, no_second}, one + back + joined, changed},
        {"KLIBCFileUnlock", 1, 2, 0, 0xD00, "platform", {}, apart + joined, changed},
        {"KLIBCFileGetKeyValue", 1, 1, 0, 0x900, "platform", {unread("bond0"), no_address}, apart + joined, changed},
        {"KLIBCFileGetKeyValue", 2, 2, 0, 0x900, "platform", {}, apart + joined, dynamic},
        {"KLIBCFileGetKeyValue", 3, 3, 0, 0x900, "platform", {unread("eth1"), no_second}, one + back + joined, changed},
        {"KLIBCFileGetKeyValue", 4, 4, 0, 0x900, "platform", {}, apart + joined, changed},
        {"KLIBCFileGetKeyValue", 5, 5, 0, 0x900, "platform", {}, apart + joined, bond_alone},
        {"KLIBCFileReplaceSubStr", 1, 1, 0, 0xB00, "platform", {}, apart + joined, changed},
    };
    const auto prepare = [this] {
        begin_bonded();
        bond.mode = KOVA_LINK_AGGR_BALANCE_RR;
    };
    expect_all(rows, prepare, [](int) { return texts{}; });
}

// ---- copies that fail, are put back, or cannot be

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_eachCopyFails_leavesTheFilesOfItsRow) {
    const auto kept = [](const std::string &name) {
        return texts{"INFO net_link_aggr_set:N remove file " + ifcfg(name + ".saved") + " failed"};
    };
    const std::string from_bond = copy("bond0", "eth0");
    const std::string to_bond = copy("eth0", "bond0");
    const texts not_left{"ERR " + kDel + ":N Failed to copy " + ifcfg("bond0") + " to " + ifcfg("eth0")};
    const texts join{to_bond, kLease, save("eth0"), save("eth1")};
    const texts leave{from_bond, save("eth0"), save("eth1")};
    const texts stay = texts{from_bond} + kPutBack;
    const texts change = leave + join;
    const texts back = kPutBack;
    files bond_alone = kBonded; // which starts from nothing
    bond_alone["bond0"] = "BOOTPROTO=dhcp\nDEVICE=bond0\nONBOOT=yes\nUSERCTL=no\n" + kLine802;
    files changed = kBonded;
    changed["bond0"] = kAddress + kLineRr;
    files changed_alone = kBonded;
    changed_alone["bond0"] = "BOOTPROTO=dhcp\nDEVICE=bond0\nONBOOT=yes\nUSERCTL=no\n" + kLineRr;
    files first_joined = kApart;
    first_joined["eth0"] += kMember;
    files both_joined = first_joined; // as they were before
    both_joined["eth1"] += kMember;
    files apart = kApart;
    apart["eth0.saved"] = kBond;
    apart["eth1.saved"] = kEth1 + kMember;
    const auto without = [](files left, const std::string &name) {
        left.erase(name);
        return left;
    };
    const std::vector<failed_copy> rows{
        {kCreate, to_bond, 1, 0, 0, {}, join, bond_alone},
        {kCreate, to_bond, 1, 3, -1, {}, join + back, kApart},
        {kCreate, kLease, 1, 0, 0, {}, join, kBonded},
        {kCreate, kLease, 1, 3, -1, {}, join + back, kApart},
        {kCreate, save("eth0"), 1, 0, 0, kept("eth0"), join, kBonded},
        {kCreate, save("eth0"), 1, 3, -1, {}, join + back, first_joined},
        {kCreate, save("eth1"), 1, 0, 0, kept("eth1"), join, kBonded},
        {kCreate, save("eth1"), 1, 3, -1, {}, join + back, kApart},
        {kChange, from_bond, 1, 0, 0, not_left, stay + join, changed},
        {kChange, from_bond, 1, 3, -1, not_left, stay + join + back, both_joined},
        {kChange, save("eth0"), 1, 0, 0, {}, change, changed},
        {kChange, save("eth0"), 1, 5, -1, {}, change + back, kApart},
        {kChange, save("eth1"), 1, 0, 0, {}, change, changed},
        {kChange, save("eth1"), 1, 5, -1, {}, change + back, kApart},
        {kChange, to_bond, 1, 0, 0, {}, change, changed_alone},
        {kChange, to_bond, 1, 5, -1, {}, change + back, kApart},
        {kChange, kLease, 1, 0, 0, {}, change, changed},
        {kChange, kLease, 1, 5, -1, {}, change + back, kApart},
        {kChange, save("eth0"), 2, 0, 0, kept("eth0"), change, changed},
        {kChange, save("eth0"), 2, 5, -1, {}, change + back, first_joined},
        {kChange, save("eth1"), 2, 0, 0, kept("eth1"), change, changed},
        {kChange, save("eth1"), 2, 5, -1, {}, change + back, kApart},
        {kDelete, from_bond, 1, 0, -1, not_left, stay, kBonded},
        {kDelete, save("eth0"), 1, 0, 0, {}, leave, without(apart, "eth0.saved")},
        {kDelete, save("eth0"), 1, 2, -1, {}, leave + back, kBonded},
        {kDelete, save("eth1"), 1, 0, 0, {}, leave, without(apart, "eth1.saved")},
        {kDelete, save("eth1"), 1, 2, -1, {}, leave + back, kBonded},
    };
    for (const failed_copy &row : rows) {
        for (const int status : {1, 127, -1}) {
            expect_failed_copy(row, status);
        }
    }
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_rollbackThatFails_isNotLookedAt) {
    const struct {
        int operation;
        int failing_rewrite;
        files back;
        files copies;
    } rows[] = {
        {kCreate, 3, kApart, {{"eth0.saved", kEth0}, {"eth1.saved", kEth1}}},
        {kChange, 5, kApart, {{"eth0.saved", kEth0}, {"eth1.saved", kEth1}}},
        {kDelete, 2, kBonded, {{"eth0.saved", kBond}, {"eth1.saved", kEth1 + kMember}}},
    };
    for (const auto &row : rows) {
        for (const texts &names : {texts{"eth0"}, texts{"eth1"}, texts{"eth0", "eth1"}}) {
            SCOPED_TRACE(std::to_string(row.operation) + " " + names.front() + " " + names.back());
            begin_for(row.operation);
            rig.fail("KLIBCFileSetKeys", row.failing_rewrite); // that of eth1, which is as it was
            files left = row.back;
            for (const std::string &name : names) {
                rig.answer(put_back(name), 1);
                left[name + ".saved"] = row.copies.at(name + ".saved");
                left[name] = name == "eth0" ? kEth0 + kMember : left[name];
            }
            EXPECT_EQ(-1, set().result);
            const texts &commands = rig.now.commands;
            EXPECT_EQ(kPutBack + texts{kStart}, texts(commands.end() - 3, commands.end()));
            expect_files(left);
        }
    }
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_scriptThatFails_isNotLookedAt) {
    for (const int operation : {kCreate, kChange, kDelete}) {
        begin_for(operation);
        const outcome clean = set();
        const files meant = found_files();
        EXPECT_EQ(0, clean.result);
        for (const std::string &run : {kStop, kStart}) {
            SCOPED_TRACE(std::to_string(operation) + " " + run);
            begin_for(operation);
            rig.answer(run, 127);
            EXPECT_OUTCOME(set(), clean);
            expect_files(meant);
        }
    }
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_memberWhoseFileVanishesFromABond_endsTheDeletionAndNoChange) {
    const std::string stop = "/etc/rc.network stop";
    const std::string from_bond = copy("bond0", "eth0");
    const texts unread{"ERR net_lnx_get_ip:N Failed to get [IPADDR] from [" + ifcfg("eth1") + "], kovaerr=[0x0900]",
                       "ERR " + kDel + ":N get IP on eth1 failed"};
    const texts left_one{from_bond, save("eth0")};
    const texts left_both = left_one + texts{save("eth1")};
    const texts joined{copy("eth0", "bond0"), kLease, save("eth0"), save("eth1")};
    const texts no_copy{"INFO net_link_aggr_set:N remove file " + ifcfg("eth1.saved") + " failed"};
    files changed = kBonded;
    changed["bond0"] = kAddress + kLineRr;
    changed["eth1"] = "DEVICE=eth1\n" + kMember;
    files kept = kBonded;
    kept.erase("eth1");
    files apart = kApart;
    apart["eth0.saved"] = kBond;
    apart["eth1"] = "DEVICE=eth1\n";
    apart["eth1.saved"] = kEth1 + kMember;
    const struct {
        int operation;
        std::string command; ///< behind which the file is gone
        long result;
        texts log;
        texts commands;
        files left;
    } rows[] = {
        {kChange, stop, 0, unread + no_copy, left_one + kPutBack + joined, changed},
        {kChange, from_bond, 0, unread + no_copy, left_one + kPutBack + joined, changed},
        {kChange, save("eth1"), 0, {}, left_both + joined, changed},
        {kDelete, stop, -1, unread, left_one + kPutBack, kept},
        {kDelete, from_bond, -1, unread, left_one + kPutBack, kept},
        {kDelete, save("eth1"), 0, {}, left_both, apart},
    };
    for (const auto &row : rows) {
        SCOPED_TRACE(std::to_string(row.operation) + " " + row.command);
        begin_for(row.operation);
        const std::string really = row.command.rfind("/bin/", 0) == 0 ? row.command + " && " : "";
        rig.answer(row.command, 0, "", [&, really] {
            shell(really + "rm " + ifcfg("eth1"));
            rig.before("KLIBCFileSetKeys", [&] { rig.let_run(row.command); }); // once
        });
        const outcome got = set();
        EXPECT_EQ(row.result, got.result);
        EXPECT_EQ(row.log, got.log);
        EXPECT_EQ(between_stop_and_start(row.commands), got.commands);
        expect_files(row.left);
    }
}

// ---- names

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_namesOf15Characters_areTakenWhole) {
    const std::string bond_name = long_text(15, 'b');
    const std::string first = long_text(15, 'c');
    const std::string second = long_text(15, 'd');
    const auto longer = [&](std::string text) {
        for (const auto &[name, full] : {std::pair{"bond0", bond_name}, {"eth0", first}, {"eth1", second}}) {
            for (size_t at = 0; (at = text.find(name, at)) != std::string::npos; at += full.size()) {
                text.replace(at, strlen(name), full);
            }
        }
        return text;
    };
    const auto all_longer = [&](texts lines) {
        std::transform(lines.begin(), lines.end(), lines.begin(), longer);
        return lines;
    };
    const auto files_longer = [&](const files &named) {
        files found;
        for (const auto &[name, content] : named) {
            found[longer(name)] = longer(content);
        }
        return found;
    };
    for (const int operation : {kCreate, kChange, kDelete}) {
        SCOPED_TRACE(operation);
        begin_for(operation);
        outcome expected = set();
        EXPECT_EQ(0, expected.result);
        expected.commands = all_longer(expected.commands);
        expected.events = all_longer(expected.events);
        const files meant = files_longer(found_files());

        begin_for(operation);
        const files present = files_longer(found_files());
        lay_out_clean_appliance();
        for (const auto &[name, content] : present) {
            write_file(ifcfg(name), content);
        }
        if (operation != kCreate) {
            rig.redirect("/sys/class/net/" + bond_name, "/tmp/sys-bond0");
            write_file("/tmp/sys-bond0/bonding/slaves", first + " " + second + "\n");
        }
        write_file("/tmp/dhcpv4.leases." + first, "lease " + first + "\n");
        request(bond_name, operation, {first, second});
        EXPECT_OUTCOME(set(), expected);
        expect_files(meant);
        EXPECT_EQ(operation == kDelete ? "<absent>" : "lease " + bond_name + "\n",
                  read_file("/tmp/dhcpv4.leases." + bond_name));
        shell("rm -f /tmp/dhcpv4.leases." + first + " /tmp/dhcpv4.leases." + bond_name);
    }
}

// ---- events

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_makingWhereAnEventFails_isLoggedAlone) {
    expect_events_that_fail(kCreate, {copy("eth0", "bond0"), kLease, save("eth0"), save("eth1")}, kApart, kBonded);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_deletingWhereAnEventFails_isLoggedAlone) {
    files left = kApart;
    left["eth0.saved"] = kBond;
    left["eth1.saved"] = kEth1 + kMember;
    expect_events_that_fail(kDelete, {copy("bond0", "eth0"), save("eth0"), save("eth1")}, kBonded, left);
}

// ---- what is refused

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_fewerThanTwoMembers_areRefusedBetweenStopAndStart) {
    request("bond0", KOVA_LINK_AGGR_8023AD, {"eth0"});
    EXPECT_OUTCOME(set(), {.result = -1,
                           .code = 0xD00,
                           .unit = kUnit,
                           .log = {"ERR net_link_aggr_set:N Invaild Argument (2 <= pOpt->cSlaves)=[0]"},
                           .commands = {"/etc/rc.network stop bond0 eth0", "/etc/rc.network start bond0 eth0"},
                           .events = events("eth0", "bond0", -1)});
    expect_files(kApart);
    request("bond0", KOVA_LINK_AGGR_8023AD, {});
    EXPECT_EQ(-1, set().result);
    expect_files(kApart);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_memberWithoutAName_isRefusedBetweenStopAndStart) {
    request("bond0", KOVA_LINK_AGGR_8023AD, {"eth0", "", "eth1"});
    EXPECT_EQ(-1, set().result);
    EXPECT_EQ(texts{"ERR net_link_aggr_set:N Invaild Argument ('\\0' != *pOpt->aszSlaves[i])=[0]"}, rig.now.log);
    EXPECT_EQ(0xD00U, rig.now.code);
    expect_files(kApart);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_interfaceNamedTwice_isRefusedBetweenStopAndStart) {
    for (const texts &slaves : {texts{"eth0", "eth0"}, texts{"eth0", "eth1", "eth0"}, texts{"bond0", "eth0"}}) {
        request("bond0", KOVA_LINK_AGGR_8023AD, slaves);
        EXPECT_EQ(-1, set().result);
        EXPECT_EQ(texts{"ERR net_link_aggr_set:N Invaild Argument (has_distinct_names(*pOpt))=[0]"}, rig.now.log);
        EXPECT_EQ(0xD00U, rig.now.code);
        expect_files(kApart);
    }
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_changeThatIsRefused_leavesThePresentBond) {
    begin_bonded();
    request("bond0", KOVA_LINK_AGGR_BALANCE_RR, {"eth0"});
    EXPECT_OUTCOME(set(), {.result = -1,
                           .code = 0xD00,
                           .unit = kUnit,
                           .log = {"ERR net_link_aggr_set:N Invaild Argument (2 <= pOpt->cSlaves)=[0]"},
                           .commands = {"/etc/rc.network stop bond0 eth0", "/etc/rc.network start bond0 eth0"}});
    expect_files(kBonded);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_badArguments_areRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetLinkAggrSet(nullptr); }), refusal(kUnit, "NULL != pOpt"));
    for (const int mode : {-1, 9, 2147483647, -2147483647 - 1}) {
        bond.mode = mode;
        EXPECT_OUTCOME(set(), refusal(kUnit, "pOpt->mode <= 8"));
    }
    request("", KOVA_LINK_AGGR_8023AD, {"eth0", "eth1"});
    EXPECT_OUTCOME(set(), refusal(kUnit, "'\\0' != *pOpt->szName"));
    for (const std::string &name : texts{"a b", "a/b", "..", "a\nb", "a\tb", long_text(16)}) {
        request(name, KOVA_LINK_AGGR_8023AD, {"eth0", "eth1"});
        EXPECT_OUTCOME(set(), refusal(kUnit, "has_usable_name(*pOpt)"));
        request("bond0", KOVA_LINK_AGGR_8023AD, {"eth0", name});
        EXPECT_OUTCOME(set(), refusal(kUnit, "has_usable_slaves(*pOpt)"));
    }
    for (const int number : {-1, 33, 2147483647, -2147483647 - 1}) {
        request("bond0", KOVA_LINK_AGGR_8023AD, {"eth0", "eth1"});
        bond.cSlaves = number;
        EXPECT_OUTCOME(set(), refusal(kUnit, "has_usable_slaves(*pOpt)"));
    }
    expect_files(kApart);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_bondThatCannotBeRead_changesNothing) {
    begin_bonded();
    shell("rm /tmp/sys-bond0/bonding/mode");
    const outcome got = set();
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x900U, got.code);
    EXPECT_EQ(texts{}, got.commands);
    EXPECT_EQ(texts{}, got.events);
    expect_files(kBonded);
}
