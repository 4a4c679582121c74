#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/link.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_link_aggr_conf_del";

const std::string kMember = "USERCTL=no\nMASTER=bond0\nSLAVE=yes\n";
const std::string kEth0 = "DEVICE=eth0\nBOOTPROTO=none\n" + kMember;
const std::string kEth1 = "DEVICE=eth1\nBOOTPROTO=dhcp\n";
const std::string kBond = "DEVICE=bond0\nBOOTPROTO=static\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n"
                          "USERCTL=no\nBONDING_OPTS=\"mode=4\"\n";

std::string copy(const std::string &from, const std::string &to) {
    return "/bin/cp -f " + ifcfg(from) + " " + ifcfg(to);
}
std::string put_back(const std::string &name) {
    return "/bin/mv -f " + ifcfg(name + ".saved") + " " + ifcfg(name);
}
const texts kCopies{copy("bond0", "eth0"), copy("eth0", "eth0.saved"), copy("eth1", "eth1.saved")};
const texts kLocks{"+0x105", "-0x100", "+0x105", "-0x100"};

} // namespace

class net_link_aggr_conf_del : public unit_test {
protected:
    /** bond0 of eth0 and eth1 in the files alone: the kernel is not asked. */
    void SetUp() override {
        unit_test::SetUp();
        write_file(ifcfg("bond0"), kBond);
        write_file(ifcfg("eth0"), kEth0);
        write_file(ifcfg("eth1"), kEth1 + kMember);
        request("bond0", {"eth0", "eth1"});
    }
    void request(const std::string &name, const texts &slaves) {
        memset(&bond, 0, sizeof bond);
        memcpy(bond.szName, name.c_str(), name.size());
        bond.cSlaves = static_cast<int>(slaves.size());
        for (size_t i = 0; i < slaves.size(); ++i) {
            memcpy(bond.aszSlaves[i], slaves[i].c_str(), slaves[i].size());
        }
    }
    outcome del() {
        return rig.observe([this] { return KOVANetLinkAggrConfDel(&bond); });
    }
    static void expect_untouched() {
        EXPECT_EQ((texts{"ifcfg-bond0", "ifcfg-eth0", "ifcfg-eth1"}), list_dir("/etc/sysconfig/network-scripts"));
        EXPECT_EQ(kBond, read_file(ifcfg("bond0")));
        EXPECT_EQ(kEth0, read_file(ifcfg("eth0")));
        EXPECT_EQ(kEth1 + kMember, read_file(ifcfg("eth1")));
    }

    KOVALINKAGGROPT bond;
};

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_bond_leavesItsSettingsToTheFirstMember) {
    EXPECT_OUTCOME(del(), {.commands = kCopies, .locks = kLocks});
    EXPECT_EQ("DEVICE=eth0\nBOOTPROTO=static\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n", read_file(ifcfg("eth0")));
    EXPECT_EQ(kEth1, read_file(ifcfg("eth1")));
    EXPECT_EQ(kBond, read_file(ifcfg("eth0.saved"))) << "what it had when it left";
    EXPECT_EQ(kEth1 + kMember, read_file(ifcfg("eth1.saved")));
    EXPECT_EQ("<absent>", read_file(ifcfg("bond0")));
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_memberThatCannotLeave_isPutBackWithTheOthers) {
    rig.fail("KLIBCFileSetKeys", 2);
    EXPECT_OUTCOME(del(), {.result = -1,
                           .code = 0xB00,
                           .unit = "platform",
                           .commands = {kCopies[0], kCopies[1], kCopies[2], put_back("eth0"), put_back("eth1")},
                           .locks = kLocks});
    EXPECT_EQ((texts{"ifcfg-bond0", "ifcfg-eth0", "ifcfg-eth1"}), list_dir("/etc/sysconfig/network-scripts"));
    EXPECT_EQ(kBond, read_file(ifcfg("bond0")));
    EXPECT_EQ("DEVICE=eth0\nBOOTPROTO=static\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n" + kMember, read_file(ifcfg("eth0")))
        << "the bond's settings, but a member";
    EXPECT_EQ(kEth1 + kMember, read_file(ifcfg("eth1")));
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_firstMemberWithoutMemory_staysTheBonds) {
    for (const char *operation : {"KLIBCSzHashAlloc", "KLIBCSzHashSetValue", "KLIBCFileSetKeys"}) {
        SetUp();
        rig.fail_from(operation);
        EXPECT_EQ(-1, del().result);
        EXPECT_EQ(kBond, read_file(ifcfg("bond0")));
        EXPECT_EQ(kBond, read_file(ifcfg("eth0")));
        EXPECT_EQ(kEth1 + kMember, read_file(ifcfg("eth1")));
        rig = {};
    }
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_filesThatAreNotThere_endItWithTheBondLeft) {
    shell("rm " + ifcfg("bond0"));
    EXPECT_OUTCOME(del(), {.result = -1,
                           .code = 0x2A00,
                           .unit = kUnit,
                           .log = {"ERR " + kUnit + ":N Failed to copy " + ifcfg("bond0") + " to " + ifcfg("eth0")},
                           .commands = {kCopies[0], put_back("eth0"), put_back("eth1")}});
    EXPECT_EQ(kEth0, read_file(ifcfg("eth0")));
    EXPECT_EQ(kEth1 + kMember, read_file(ifcfg("eth1")));
    SetUp();
    shell("rm " + ifcfg("eth1")); // its address cannot be compared
    EXPECT_EQ(-1, del().result);
    EXPECT_EQ(0x900U, rig.now.code);
    EXPECT_EQ((texts{"ifcfg-bond0", "ifcfg-eth0"}), list_dir("/etc/sysconfig/network-scripts"));
    EXPECT_EQ(kBond, read_file(ifcfg("bond0")));
    SetUp();
    shell("rm " + ifcfg("eth0")); // it gets the bond's
    EXPECT_EQ(0, del().result);
    EXPECT_EQ("DEVICE=eth0\nBOOTPROTO=static\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n", read_file(ifcfg("eth0")));
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_directoriesForFiles_endItWithTheBondLeft) {
    for (const char *name : {"bond0", "eth0", "eth1"}) {
        SetUp();
        shell("rm " + ifcfg(name) + " && mkdir " + ifcfg(name));
        // a copy into a directory is no failure of the tool: the next step fails
        EXPECT_EQ(-1, del().result) << name;
        shell("rm -r " + ifcfg(name));
        EXPECT_EQ(name == std::string("bond0") ? "<absent>" : kBond, read_file(ifcfg("bond0"))) << name;
    }
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_foreignFiles_keepTheirOtherLines) {
    write_file(ifcfg("bond0"),
               "# bond\n\nDEVICE=bond0\nIPV6INIT=auto\nnonsense\nIPADDR=10.0.0.1\nBONDING_OPTS=\"mode=4\"");
    write_file(ifcfg("eth1"), "MASTER=bond0\n# card\nSLAVE=yes\nIPADDR=\"10.0.0.1\"");
    const outcome got = del();
    EXPECT_EQ(0, got.result);
    EXPECT_EQ("# bond\n\nDEVICE=eth0\nIPV6INIT=auto\nnonsense\nIPADDR=10.0.0.1\nBOOTPROTO=dhcp\n",
              read_file(ifcfg("eth0")));
    EXPECT_EQ("# card\nIPADDR=\nBOOTPROTO=dhcp\nDEVICE=eth1\nNETMASK=\n", read_file(ifcfg("eth1")));
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_32Members_allLeave) {
    texts names;
    for (int i = 10; i < 42; ++i) {
        names.push_back("eth" + std::to_string(i));
        write_file(ifcfg(names.back()), "DEVICE=" + names.back() + "\nBOOTPROTO=dhcp\n" + kMember);
    }
    request("bond0", names);
    EXPECT_EQ(0, del().result);
    EXPECT_EQ("DEVICE=eth10\nBOOTPROTO=static\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\n", read_file(ifcfg("eth10")));
    for (size_t i = 1; i < names.size(); ++i) {
        EXPECT_EQ("DEVICE=" + names[i] + "\nBOOTPROTO=dhcp\n", read_file(ifcfg(names[i])));
    }
    bond.cSlaves = 33;
    EXPECT_OUTCOME(del(), refusal(kUnit, "has_usable_slaves(*pOpt)"));
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_bondsFileThatCannotBeCopied_endsIt) {
    rig.answer(kCopies[0], 1);
    EXPECT_OUTCOME(del(), {.result = -1,
                           .code = 0x2A00,
                           .unit = kUnit,
                           .log = {"ERR " + kUnit + ":N Failed to copy " + ifcfg("bond0") + " to " + ifcfg("eth0")},
                           .commands = {kCopies[0], put_back("eth0"), put_back("eth1")}});
    expect_untouched();
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_memberWithoutAName_isPassedOver) {
    request("bond0", {"eth0", "", "eth1"});
    EXPECT_OUTCOME(del(), {.commands = kCopies, .locks = kLocks});
    EXPECT_EQ(kEth1, read_file(ifcfg("eth1")));
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_bondWithoutMembers_losesItsFileAlone) {
    request("bond0", {});
    EXPECT_OUTCOME(del(), {.locks = {"+0x105", "-0x100"}});
    EXPECT_EQ((texts{"ifcfg-eth0", "ifcfg-eth1"}), list_dir("/etc/sysconfig/network-scripts"));
    EXPECT_EQ(kEth0, read_file(ifcfg("eth0")));
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_interfaceThatIsNoBond_keepsItsFile) {
    for (const std::string &name : texts{"eth1", "eth7"}) {
        request(name, {});
        EXPECT_OUTCOME(del(), refusal(kUnit, "'\\0' != *pOpt->aszSlaves[0]"));
    }
    expect_untouched();
}

TEST_F(net_link_aggr_conf_del, KOVANetLinkAggrConfDel_badArguments_areRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetLinkAggrConfDel(nullptr); }), refusal(kUnit, "NULL != pOpt"));
    request("", {"eth0", "eth1"});
    EXPECT_OUTCOME(del(), refusal(kUnit, "'\\0' != *pOpt->szName"));
    request("../x", {"eth0", "eth1"});
    EXPECT_OUTCOME(del(), refusal(kUnit, "has_usable_name(*pOpt)"));
    request("bond0", {"eth0", "../x"});
    EXPECT_OUTCOME(del(), refusal(kUnit, "has_usable_slaves(*pOpt)"));
    request("bond0", {"", "eth1"});
    EXPECT_OUTCOME(del(), refusal(kUnit, "'\\0' != *pOpt->aszSlaves[0]"));
    expect_untouched();
}
