#include "support/fake_kernel.h"

#include <cstring>
#include <kovanetsdk/link.h>

using namespace kova_test;

class net_link_aggr_get : public unit_test {
protected:
    outcome get(const char *name) {
        memset(&bond, 'u', sizeof bond);
        return rig.observe([&] { return KOVANetLinkAggrGet(name, &bond); });
    }
    void add_kernel_bond(const std::string &slaves, const std::string &mode) {
        rig.replace_file("/sys/class/net/bond0/bonding/slaves", slaves);
        rig.replace_file("/sys/class/net/bond0/bonding/mode", mode);
    }
    void add_switch_bond(const std::string &file) {
        rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
        write_file(ifcfg("ovs_bond0"), file);
    }
    texts slaves() const {
        texts names;
        for (int i = 0; i < bond.cSlaves; ++i) {
            names.emplace_back(bond.aszSlaves[i]);
        }
        return names;
    }
    /** Whether no byte beyond the values is set. */
    bool is_clean() const {
        KOVALINKAGGROPT clean;
        memset(&clean, 0, sizeof clean);
        snprintf(clean.szName, sizeof clean.szName, "%s", bond.szName);
        clean.mode = bond.mode;
        clean.blNoPartner = bond.blNoPartner;
        clean.cSlaves = bond.cSlaves;
        for (int i = 0; i < bond.cSlaves; ++i) {
            snprintf(clean.aszSlaves[i], sizeof clean.aszSlaves[i], "%s", bond.aszSlaves[i]);
        }
        return memcmp(&clean, &bond, sizeof bond) == 0;
    }

    fake_kernel kernel{rig};
    KOVALINKAGGROPT bond;
};

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_noBond_isModeZeroAndSuccess) {
    EXPECT_EQ(0, get("eth0").result);
    EXPECT_EQ(texts{}, rig.now.log);
    EXPECT_STREQ("eth0", bond.szName);
    EXPECT_EQ(0, bond.mode);
    EXPECT_EQ(0, bond.cSlaves);
    EXPECT_TRUE(is_clean());
    EXPECT_EQ(0, get(long_text(64).c_str()).result);
    EXPECT_EQ(long_text(15), bond.szName);
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_bondWithoutMembers_isModeZero) {
    for (const char *line : {"\n", "", "  \t \n"}) {
        add_kernel_bond(line, "802.3ad 4\n");
        EXPECT_EQ(0, get("bond0").result);
        EXPECT_EQ(texts{}, rig.now.log);
        EXPECT_EQ(0, bond.mode);
    }
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_kernelModes_areMapped) {
    for (const auto &[line, mode] : std::map<std::string, int>{{"balance-alb 6\n", 1},
                                                               {"balance-xor 2\n", 3},
                                                               {"active-backup 1\n", 4},
                                                               {"balance-rr 0\n", 5},
                                                               {"balance-rr 0", 5}}) {
        add_kernel_bond("eth1 eth0\n", line);
        const outcome got = get("bond0");
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{}, got.log);
        EXPECT_EQ(mode, bond.mode);
        EXPECT_EQ(0, bond.blNoPartner);
        EXPECT_EQ((texts{"eth0", "eth1"}), slaves());
        EXPECT_TRUE(is_clean());
    }
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_otherMode_isLoggedAndZero) {
    for (const std::string &mode : texts{"balance-tlb 5", "802.3ad", "802.3ad ", "balance-rr", "balance-r", "4", " ",
                                         "BALANCE-RR 0", "\x01\xff", long_text(900)}) {
        add_kernel_bond("eth0 eth1\n", mode + "\n");
        const outcome got = get("bond0");
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{"WARNING net_link_aggr_get:N Non-supported bonding mode [" + mode + "]"}, got.log);
        EXPECT_EQ(0, bond.mode);
        EXPECT_EQ(2, bond.cSlaves);
    }
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_aggregation_looksForItsPartner) {
    add_kernel_bond("eth0 eth1\n", "802.3ad 4\n");
    const std::string line = "\tPartner Mac Address: ";
    for (const auto &[status, no_partner] :
         std::map<std::string, int>{{"Mode\n" + line + "00:11:22:33:44:55\n", 0},
                                    {line + " \t00:11:22:33:44:55\n", 0},
                                    {line + "00:00:00:00:00:00\n", 1},
                                    {line + "00:00:00:00:00:00", 1},
                                    {line + "\n", 1},
                                    {line + " \t\r\n", 1},
                                    {"Partner Mac Address: 00:11:22:33:44:55\n", 1},
                                    {"\tPartner Mac Address:00:11:22:33:44:55\n", 1},
                                    {line + "00:00:00:00:00:00\n" + line + "00:11:22:33:44:55\n", 1},
                                    {"", 1},
                                    {std::string("\0\xff\n", 3), 1},
                                    {long_text(100000), 1}}) {
        rig.replace_file("/proc/net/bonding//bond0", status);
        const outcome got = get("bond0");
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(2, bond.mode);
        EXPECT_EQ(no_partner, bond.blNoPartner) << status.substr(0, 60);
    }
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_aggregationWithoutStatus_hasNoPartner) {
    add_kernel_bond("eth0 eth1\n", "802.3ad 4\n");
    EXPECT_OUTCOME(get("bond0"), {.result = 0, .code = 0xBC00, .unit = "net_link_aggr_get"});
    EXPECT_EQ(1, bond.blNoPartner);
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_modeFile_hasToBeReadable) {
    rig.replace_file("/sys/class/net/bond0/bonding/slaves", "eth0 eth1\n");
    EXPECT_OUTCOME(get("bond0"), {.result = -1,
                                  .code = 0x900,
                                  .unit = "net_link_aggr_get",
                                  .log = {"ERR net_link_aggr_get:N Fail to open [/sys/class/net/bond0/bonding/mode], "
                                          "errno=[2/No such file or directory]"}});
    add_kernel_bond("eth0 eth1\n", "");
    EXPECT_OUTCOME(get("bond0"), {.result = -1,
                                  .code = 0xA00,
                                  .unit = "net_link_aggr_get",
                                  .log = {"ERR net_link_aggr_get:N Fail to read [/sys/class/net/bond0/bonding/mode], "
                                          "errno=[0/Success]"}});
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_directoryInPlaceOfAFile_isNoBondNoModeOrNoPartner) {
    const std::string bonding = "/sys/class/net/bond0/bonding/";
    const std::string directory = "/tmp/no-file";
    shell("mkdir -p " + directory);
    add_kernel_bond("eth0 eth1\n", "802.3ad 4\n");
    rig.redirect("/proc/net/bonding//bond0", directory);
    EXPECT_OUTCOME(get("bond0"), {.code = 0xBC00, .unit = "net_link_aggr_opt_slsave_add"}); // of a member added
    EXPECT_EQ(KOVA_LINK_AGGR_8023AD, bond.mode);
    EXPECT_EQ(1, bond.blNoPartner);
    rig.redirect(bonding + "mode", directory);
    EXPECT_OUTCOME(get("bond0"),
                   {.result = -1,
                    .code = 0xA00,
                    .unit = "net_link_aggr_get",
                    .log = {"ERR net_link_aggr_get:N Fail to read [" + bonding + "mode], errno=[21/Is a directory]"}});
    rig.redirect(bonding + "slaves", directory);
    EXPECT_OUTCOME(get("bond0"), {.code = 0xA00, .unit = "net_link_aggr_phy_get"});
    EXPECT_EQ(0, bond.mode + bond.cSlaves);
    EXPECT_TRUE(is_clean());
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_32Members_areTaken) {
    texts names;
    std::string line;
    for (int i = 41; i >= 10; --i) {
        names.insert(names.begin(), "eth" + std::to_string(i));
        line += names.front() + " ";
    }
    add_kernel_bond(line + "\n", "balance-rr 0\n");
    EXPECT_EQ(0, get("bond0").result);
    EXPECT_EQ(names, slaves());
    EXPECT_TRUE(is_clean());
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_foreignMemberList_isTakenByWords) {
    add_kernel_bond(std::string("eth1 \0eth0\n", 11), "balance-rr 0\n");
    EXPECT_EQ(0, get("bond0").result);
    EXPECT_EQ(texts{"eth1"}, slaves());
    add_kernel_bond("eth1\teth0", "balance-rr 0\n"); // cut off
    EXPECT_EQ(0, get("bond0").result);
    EXPECT_EQ((texts{"eth0", "eth1"}), slaves());
    add_kernel_bond(long_text(100000), "balance-rr 0\n");
    EXPECT_EQ(0, get("bond0").result);
    EXPECT_EQ(texts{long_text(15)}, slaves());
    add_kernel_bond("eth0 eth0\n", "balance-rr 0\n");
    EXPECT_EQ(-1, get("bond0").result);
    EXPECT_EQ(0xBB00U, rig.now.code);
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_bondThatVanishesMeanwhile_failsOrIsNone) {
    add_kernel_bond("eth0 eth1\n", "802.3ad 4\n");
    rig.fail("fopen", 2); // the mode, behind the members
    EXPECT_EQ(-1, get("bond0").result);
    EXPECT_EQ(0x900U, rig.now.code);
    rig.fail("fopen", 1);
    EXPECT_EQ(0, get("bond0").result);
    EXPECT_EQ(0, bond.mode + bond.cSlaves);
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_tooManyMembers_fail) {
    std::string line;
    for (int i = 0; i < 33; ++i) {
        line += "eth" + std::to_string(i) + " ";
    }
    add_kernel_bond(line + "\n", "802.3ad 4\n");
    EXPECT_OUTCOME(get("bond0"), {.result = -1,
                                  .code = 0xBD00,
                                  .unit = "net_link_aggr_opt_slsave_add",
                                  .log = {"ERR net_link_aggr_opt_slsave_add:N No room for slave eth32 in [bond0]"}});
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_noMemory_is200) {
    add_kernel_bond("eth0 eth1\n", "802.3ad 4\n");
    rig.fail("KLIBCSzListAlloc");
    EXPECT_OUTCOME(get("bond0"), {.result = -1,
                                  .code = 0x200,
                                  .unit = "net_link_aggr_get",
                                  .log = {"ERR net_link_aggr_get:N Failed to alloc memory."}});
}

// ---- bonds of the virtual switch

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_switchBond_listsTheMembersThatAreThere) {
    kernel.add("eth2");
    kernel.add("eth10", {.flags = 0});
    add_switch_bond("SLAVE_LIST=\"  eth2   eth10 gone0 \"\nBOND_MODE=\"balance-tcp\"\n");
    const outcome got = get("ovs_bond0");
    EXPECT_EQ(0, got.result);
    EXPECT_EQ((texts{"eth10", "eth2"}), slaves());
    EXPECT_EQ(8, bond.mode);
    EXPECT_TRUE(is_clean());
    EXPECT_EQ((texts{"INFO net_if_is_link:N Cannot get link status of the gone0: No such device",
                     "INFO net_if_is_link:N get link status failed on gone0"}),
              got.log);
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_switchBondWithUnknownMode_isModeZero) {
    add_switch_bond("SLAVE_LIST=\nBOND_MODE=whatever\n");
    EXPECT_OUTCOME(get("ovs_bond0"), {.result = 0});
    EXPECT_EQ(0, bond.mode);
    EXPECT_EQ(0, bond.cSlaves);
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_switchBondKeys_haveToBeThere) {
    add_switch_bond("BOND_MODE=balance-slb\n");
    EXPECT_OUTCOME(get("ovs_bond0"), {.result = 1, .log = {"ERR net_link_aggr_get:N Failed to get key [BLOCK_CNT]"}});
    add_switch_bond("SLAVE_LIST=\n");
    EXPECT_OUTCOME(get("ovs_bond0"), {.result = 1, .log = {"ERR net_link_aggr_get:N Failed to get key [BOND_MODE]"}});
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_switchBondNamesAMemberTwice_isLogged) {
    kernel.add("eth0");
    add_switch_bond("SLAVE_LIST=\"eth0 eth0\"\nBOND_MODE=balance-slb\n");
    EXPECT_OUTCOME(get("ovs_bond0"),
                   {.result = 1,
                    .code = 0xBB00,
                    .unit = "net_link_aggr_opt_slsave_add",
                    .log = {"ERR net_link_aggr_opt_slsave_add:N Slave eth0 is already in [ovs_bond0]",
                            "ERR net_link_aggr_get:N Failed to add the slave eth0 into KOVALINKAGGROPT"}});
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_switchBondOf33Members_isLogged) {
    for (const int number : {32, 33}) {
        std::string list;
        for (int i = 0; i < number; ++i) {
            const std::string name = "e" + std::to_string(i);
            kernel.add(name);
            list += name + " ";
        }
        add_switch_bond("SLAVE_LIST=\"" + list + "\"\nBOND_MODE=balance-slb\n");
        EXPECT_EQ(number == 32 ? 0 : 1, get("ovs_bond0").result);
        EXPECT_EQ(32, bond.cSlaves);
    }
    EXPECT_EQ(0xBD00U, rig.now.code);
    EXPECT_EQ("ERR net_link_aggr_get:N Failed to add the slave e32 into KOVALINKAGGROPT", rig.now.log.back());
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_switchBondFileThatCannotBeRead_isOne) {
    add_switch_bond("");
    for (const char *break_it : {"rm ", "rm -f ", "mkdir "}) {
        shell(break_it + ifcfg("ovs_bond0"));
        EXPECT_OUTCOME(get("ovs_bond0"), {.result = 1,
                                          .code = 0x900,
                                          .unit = "key_value",
                                          .log = {"ERR net_link_aggr_get:N Failed to get key [BLOCK_CNT]"}});
    }
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_switchBondNamesPaths_leavesThemOut) {
    add_switch_bond("SLAVE_LIST=\"../../../etc ovs_bond0 /\"\nBOND_MODE=balance-slb\n");
    EXPECT_EQ(0, get("ovs_bond0").result);
    EXPECT_EQ(0, bond.cSlaves);
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_switchBondWithoutMemory_isOneWithItsCode) {
    kernel.add("eth0");
    add_switch_bond("SLAVE_LIST=\"eth0\"\nBOND_MODE=balance-slb\n");
    for (const char *operation : {"KLIBCSzListAlloc", "KLIBCSzListPush"}) {
        rig.fail(operation);
        EXPECT_OUTCOME(get("ovs_bond0"), {.result = 1,
                                          .code = 0x200,
                                          .unit = "net_link_aggr_get",
                                          .log = {"ERR net_link_aggr_get:N Failed to alloc memory."}});
    }
}

TEST_F(net_link_aggr_get, KOVANetLinkAggrGet_badArguments_areRefused) {
    EXPECT_OUTCOME(get(nullptr), refusal("net_link_aggr_get", "((void *)0) != szName"));
    EXPECT_OUTCOME(get(""), refusal("net_link_aggr_get", "'\\0' != *szName"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetLinkAggrGet("bond0", nullptr); }),
                   refusal("net_link_aggr_get", "NULL != pOpt"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(name.c_str()), refusal("net_link_aggr_get", "is_interface_name(szName)"));
    }
}
