#include "support/fake_kernel.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

class net_bond_ip_conflict : public unit_test {
protected:
    /** A bond of the kernel with these members, the first of which gave it its address. */
    void bond_of(const std::string &members) {
        rig.replace_file("/sys/class/net/bond0/bonding/slaves", members + "\n");
        rig.replace_file("/sys/class/net/bond0/bonding/mode", "balance-rr 0\n");
        configure("bond0", "192.168.1.10");
        configure("eth0", "192.168.1.10");
    }
    void bond_of_switch() {
        for (const char *name : {"ovs_bond0", "ovs_eth0", "ovs_eth1"}) {
            rig.replace_file(std::string("/sys/devices/virtual/net/") + name, "");
        }
        for (const char *name : {"eth0", "eth1"}) {
            kernel.add(name);
        }
        write_file(ifcfg("ovs_bond0"), "SLAVE_LIST=\"eth0 eth1\"\nBOND_MODE=balance-slb\nIPADDR=192.168.1.10\n");
    }
    static void configure(const std::string &ifname, const std::string &ip) {
        write_file(ifcfg(ifname), "DEVICE=" + ifname + "\nIPADDR=" + ip + "\n");
    }
    outcome conflict(const char *bond = "bond0", int size = 16) {
        return rig.observe([&] { return KOVANetBondIPConflict(bond, szName, size); });
    }
    /** As many reads of an interface file, each under the lock; adding members leaves a code behind. */
    static outcome read(int files, long result) {
        outcome expected{.result = result, .code = 0xBC00, .unit = "net_link_aggr_opt_slsave_add"};
        for (int i = 0; i < files; ++i) {
            expected.locks.insert(expected.locks.end(), {"+0x105", "-0x100"});
        }
        return expected;
    }
    static outcome failed(outcome expected, unsigned code, const std::string &unit, const texts &log) {
        expected.result = -1;
        expected.code = code;
        expected.unit = unit;
        expected.log = log;
        return expected;
    }

    fake_kernel kernel{rig};
    char szName[16] = "untouched";
};

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_memberWithTheBondsAddress_isNamed) {
    bond_of("eth0 eth1 eth2");
    configure("eth1", "192.168.1.11");
    configure("eth2", "192.168.1.10");
    EXPECT_OUTCOME(conflict(), read(3, 1));
    EXPECT_STREQ("eth2", szName);
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_firstOfSeveral_isNamedAndNoOtherRead) {
    bond_of("eth0 eth1 eth2");
    configure("eth1", "192.168.1.10");
    EXPECT_OUTCOME(conflict(), read(2, 1));
    EXPECT_STREQ("eth1", szName);
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_otherAddresses_areNone) {
    bond_of("eth0 eth1");
    configure("eth1", "192.168.1.11");
    EXPECT_OUTCOME(conflict(), read(2, 0));
    EXPECT_STREQ("", szName);
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_firstMember_isNotLookedAt) {
    bond_of("eth0");
    EXPECT_OUTCOME(conflict(), read(1, 0));
    EXPECT_STREQ("", szName);
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_memberWithoutAddress_isNotedAndPassedOver) {
    bond_of("eth0 eth1 eth2");
    write_file(ifcfg("eth1"), "DEVICE=eth1\n");
    configure("eth2", "192.168.1.10");
    outcome expected = read(3, 1);
    expected.log = {"INFO net_bond_ip_conflict:N eth1's IP is empty"};
    EXPECT_OUTCOME(conflict(), expected);
    EXPECT_STREQ("eth2", szName);
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_bondAndMembersWithoutAddress_haveNoConflict) {
    bond_of("eth0 eth1");
    write_file(ifcfg("bond0"), "DEVICE=bond0\n");
    write_file(ifcfg("eth1"), "DEVICE=eth1\n");
    outcome expected = read(2, 0);
    expected.log = {"INFO net_bond_ip_conflict:N eth1's IP is empty"};
    EXPECT_OUTCOME(conflict(), expected);
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_noBond_hasNoMembers) {
    configure("eth0", "192.168.1.10");
    EXPECT_OUTCOME(conflict("eth0"),
                   {.result = 0, .code = 0x900, .unit = "net_link_aggr_phy_get", .locks = {"+0x105", "-0x100"}});
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_name_isCutToFourCharactersAndTheBuffer) {
    bond_of("eth0 lan15");
    configure("lan15", "192.168.1.10");
    for (const auto &[size, name] : std::map<int, std::string>{{16, "lan1"}, {5, "lan1"}, {4, "lan"}, {1, ""}}) {
        memset(szName, '~', sizeof szName);
        EXPECT_OUTCOME(conflict("bond0", size), read(2, 1));
        EXPECT_EQ(name, szName);
        EXPECT_EQ('~', szName[name.size() + 1]);
    }
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_switchBond_hasMembersFilesUnderTheSwitchsName) {
    bond_of_switch();
    configure("eth1", "192.168.1.10");
    configure("ovs_eth1", "192.168.1.11");
    EXPECT_OUTCOME(conflict("ovs_bond0"), read(2, 0));
    configure("ovs_eth1", "192.168.1.10");
    EXPECT_OUTCOME(conflict("ovs_bond0"), read(2, 1));
    EXPECT_STREQ("eth1", szName);
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_unreadableBond_fails) {
    bond_of("eth0 eth1");
    rig.hide("/sys/class/net/bond0/bonding/mode");
    EXPECT_OUTCOME(conflict(), failed({}, 0x900, "net_link_aggr_get",
                                      {"ERR net_link_aggr_get:N Fail to open [/sys/class/net/bond0/bonding/mode], "
                                       "errno=[2/No such file or directory]",
                                       "ERR net_bond_ip_conflict:N get bond0 information failed"}));
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_unreadableSwitchBond_fails) {
    bond_of_switch();
    write_file(ifcfg("ovs_bond0"), "IPADDR=192.168.1.10\n");
    EXPECT_OUTCOME(conflict("ovs_bond0"), failed({}, 0, "",
                                                 {"ERR net_link_aggr_get:N Failed to get key [BLOCK_CNT]",
                                                  "ERR net_bond_ip_conflict:N get ovs_bond0 information failed"}));
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_bondWithoutFile_fails) {
    bond_of("eth0 eth1");
    shell("rm " + ifcfg("bond0"));
    EXPECT_OUTCOME(conflict(), failed(read(1, 0), 0x900, "key_value",
                                      {"ERR net_lnx_get_ip:N Failed to get [IPADDR] from "
                                       "[/etc/sysconfig/network-scripts/ifcfg-bond0], kovaerr=[0x0900]",
                                       "ERR net_bond_ip_conflict:N get bond0's IP failed"}));
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_memberWithoutFile_fails) {
    bond_of("eth0 eth1");
    EXPECT_OUTCOME(conflict(), failed(read(2, 0), 0x900, "key_value",
                                      {"ERR net_lnx_get_ip:N Failed to get [IPADDR] from "
                                       "[/etc/sysconfig/network-scripts/ifcfg-eth1], kovaerr=[0x0900]",
                                       "ERR net_bond_ip_conflict:N get eth1's IP from config failed"}));
    EXPECT_STREQ("", szName);
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_lockElsewhere_is400) {
    bond_of("eth0 eth1");
    const lock_elsewhere holder{0x106};
    outcome got = conflict();
    got.sleeps.clear(); // the platform asks again and again
    EXPECT_OUTCOME(got, failed({}, 0x400, "net_lnx_get_ip",
                               {"ERR net_lnx_get_ip:N KLIBCFileLock() failed.(400)",
                                "ERR net_bond_ip_conflict:N get bond0's IP failed"}));
}

TEST_F(net_bond_ip_conflict, KOVANetBondIPConflict_badArguments_areRefused) {
    const auto refused = [](const std::string &condition) { return refusal("net_bond_ip_conflict", condition); };
    EXPECT_OUTCOME(conflict(nullptr), refused("((void *)0) != szBond"));
    EXPECT_OUTCOME(conflict(""), refused("'\\0' != *szBond"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(conflict(name.c_str()), refused("is_interface_name(szBond)"));
    }
    EXPECT_OUTCOME(conflict("bond0", 0), refused("0 < cbName"));
    EXPECT_OUTCOME(conflict("bond0", -1), refused("0 < cbName"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetBondIPConflict("bond0", nullptr, 16); }), refused("NULL != szName"));
    EXPECT_STREQ("untouched", szName);
}
