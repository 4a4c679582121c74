#include "support/fake_kernel.h"

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
const std::string kEth0 = "DEVICE=eth0\nBOOTPROTO=static\nONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n";
const std::string kEth1 = "DEVICE=eth1\nBOOTPROTO=dhcp\nONBOOT=yes\n";
const std::string kEth2 = "DEVICE=eth2\nBOOTPROTO=none\nONBOOT=yes\n";
const std::string kBond = "DEVICE=bond0\nBOOTPROTO=static\nONBOOT=yes\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n"
                          "USERCTL=no\n" +
                          kLine802;
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
    void request(const std::string &name, KOVA_LINK_AGGR_MODE mode, const texts &slaves) {
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

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_scriptThatFails_isNotLookedAt) {
    rig.answer("/etc/rc.network", 127);
    EXPECT_EQ(0, set().result);
    expect_files(kBonded);
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

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_makingWhereACopyFails_goesOn) {
    rig.answer(copy("eth0", "bond0"), 1);
    EXPECT_EQ(0, set().result);
    EXPECT_EQ("BOOTPROTO=dhcp\nDEVICE=bond0\nONBOOT=yes\nUSERCTL=no\n" + kLine802, read_file(ifcfg("bond0")));
    begin(kApart);
    rig.answer(kLease, 1);
    EXPECT_EQ(0, set().result);
    expect_files(kBonded);
    EXPECT_EQ("<absent>", read_file("/tmp/dhcpv4.leases.bond0"));
    begin(kApart);
    rig.answer(save("eth1"), 1);
    const outcome got = set();
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(texts{"INFO net_link_aggr_set:N remove file " + ifcfg("eth1.saved") + " failed"}, got.log);
    expect_files(kBonded);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_memberWithoutACopy_staysAsWritten) {
    rig.answer(save("eth0"), 1);
    rig.fail("KLIBCFileSetKeys", 3);
    EXPECT_EQ(-1, set().result);
    expect_files({{"eth0", kEth0 + kMember}, {"eth1", kEth1}, {"eth2", kEth2}});
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

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_deletingWhereACopyToGoBackToFails_goesOn) {
    for (const char *const name : {"eth0", "eth1"}) {
        begin_bonded();
        rig.answer(save(name), 1);
        bond.mode = 0;
        const outcome got = set();
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{}, got.log);
        files left = kApart;
        left["eth0.saved"] = kBond;
        left["eth1.saved"] = kEth1 + kMember;
        left.erase(name + std::string(".saved"));
        expect_files(left);
    }
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_deletingFailsWithoutACopyToGoBackTo_keepsTheFirstMember) {
    begin_bonded();
    rig.answer(save("eth0"), 1);
    rig.fail("KLIBCFileSetKeys", 2);
    bond.mode = 0;
    EXPECT_EQ(-1, set().result);
    expect_files(kBonded);
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

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_changeWhereTheFirstCopyFails_goesOnWithTheMembersFile) {
    begin_bonded();
    bond.mode = KOVA_LINK_AGGR_BALANCE_RR;
    rig.answer(copy("bond0", "eth0"), 1);
    const outcome got = set();
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(between_stop_and_start(texts{copy("bond0", "eth0")} + kPutBack +
                                     texts{copy("eth0", "bond0"), kLease, save("eth0"), save("eth1")}),
              got.commands);
    files changed = kBonded;
    changed["bond0"] = "DEVICE=bond0\nBOOTPROTO=static\nONBOOT=yes\nIPADDR=10.0.0.1\n"
                       "NETMASK=255.0.0.0\nUSERCTL=no\nBONDING_OPTS=\"mode=0 use_carrier=0 miimon=100 updelay=100\"\n";
    expect_files(changed);
}

// ---- events

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_eventThatCannotBeOpened_changesNothing) {
    rig.fail("KLIBPluginSDKInit");
    EXPECT_OUTCOME(
        set(),
        {.result = -1, .code = 0x200, .unit = "platform", .log = {"ERR net_link_aggr_set:N plugin sdk init failed"}});
    expect_files(kApart);
}

TEST_F(net_link_aggr_set, KOVANetLinkAggrSet_eventThatFails_isLoggedAlone) {
    for (const int nth : {1, 2}) {
        begin(kApart);
        rig.fail("KLIBPluginAction", nth);
        const outcome got = set();
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{std::string("ERR net_link_aggr_set:N Fail to execute net plugin (") +
                        (nth == 1 ? "PRE" : "POST") + ") [0x2A00 platform:N]"},
                  got.log);
        EXPECT_EQ(made(0), got.events);
        expect_files(kBonded);
        begin(kApart);
        rig.fail("KLIBPluginSetArgByInt", nth);
        EXPECT_EQ(0, set().result);
        EXPECT_EQ(1U, rig.now.log.size());
        EXPECT_EQ(1U, rig.now.events.size());
    }
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
