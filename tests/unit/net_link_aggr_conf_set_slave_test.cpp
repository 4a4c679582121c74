#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/link.h>

using namespace kova_test;

namespace {

const std::string kFile = ifcfg("eth0");
const std::string kSaved = kFile + ".saved";
const texts kCopy{"/bin/cp -f " + kFile + " " + kSaved};
const std::string kUnit = "net_link_aggr_conf_set_slave";

} // namespace

class net_link_aggr_conf_set_slave : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        bond = {};
        memcpy(bond.szName, "bond0", sizeof "bond0");
        keys = KLIBCSzHashAlloc(4);
    }
    void TearDown() override {
        KLIBCSzHashFree(keys);
        unit_test::TearDown();
    }
    outcome join() {
        return rig.observe([this] { return KOVANetLinkAggrConfSetSlave("eth0", 1, &bond); });
    }
    outcome leave() {
        return rig.observe([] { return KOVANetLinkAggrConfSetSlave("eth0", 0, nullptr); });
    }
    outcome update() {
        KLIBCSzHashFree(keys);
        keys = KLIBCSzHashAlloc(4);
        return rig.observe([this] { return KOVANetLinkAggrConfUpdateBootProto(kFile.c_str(), keys); });
    }
    std::string value(const char *key) const {
        const char *const found = KLIBCSzHashGetValue(keys, key);
        return found != nullptr ? found : "<none>";
    }

    KOVALINKAGGROPT bond;
    KLIBSZHASH *keys = nullptr;
};

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfSetSlave_joining_keepsTheOtherKeysAndTheOldFile) {
    const std::string old = "# a comment\nDEVICE=eth7\nBOOTPROTO=static\nIPADDR=10.0.0.1\nMASTER=bond9\nSLAVE=no";
    write_file(kFile, old);
    EXPECT_OUTCOME(join(), {.commands = kCopy});
    EXPECT_EQ("# a comment\nDEVICE=eth0\nBOOTPROTO=static\nIPADDR=10.0.0.1\nMASTER=bond0\nSLAVE=yes\nUSERCTL=no\n",
              read_file(kFile));
    EXPECT_EQ(old, read_file(kSaved));
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfSetSlave_joiningWithoutAFile_makesIt) {
    EXPECT_OUTCOME(join(), {.commands = kCopy});
    EXPECT_EQ("DEVICE=eth0\nUSERCTL=no\nMASTER=bond0\nSLAVE=yes\n", read_file(kFile));
    EXPECT_EQ("<absent>", read_file(kSaved));
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfSetSlave_leaving_dropsTheKeysOfAMember) {
    const std::string old = "DEVICE=eth0\nBOOTPROTO=static\nIPADDR=10.0.0.1\nUSERCTL=no\nBONDING_OPTS=\"mode=4\"\n"
                            "MASTER=bond0\nSLAVE=yes\nSLAVE_LIST=\"kept\"\n";
    write_file(kFile, old);
    EXPECT_OUTCOME(leave(), {.commands = kCopy});
    EXPECT_EQ("DEVICE=eth0\nBOOTPROTO=static\nIPADDR=10.0.0.1\nSLAVE_LIST=\"kept\"\n", read_file(kFile));
    EXPECT_EQ(old, read_file(kSaved));
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfSetSlave_leavingWithoutAddresses_asksForOne) {
    write_file(kFile, "DEVICE=eth0\nBOOTPROTO=none\nIPADDR=10.0.0.1\nMASTER=bond0\nSLAVE=yes\n");
    EXPECT_OUTCOME(leave(), {.commands = kCopy});
    EXPECT_EQ("DEVICE=eth0\nBOOTPROTO=dhcp\nIPADDR=\nNETMASK=\n", read_file(kFile));
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfSetSlave_copyThatFails_isNotLookedAt) {
    write_file(kFile, "DEVICE=eth0\n");
    rig.answer("/bin/cp", 1);
    EXPECT_OUTCOME(join(), {.commands = kCopy});
    EXPECT_EQ("DEVICE=eth0\nUSERCTL=no\nMASTER=bond0\nSLAVE=yes\n", read_file(kFile));
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfSetSlave_rewriteThatFails_leavesTheFile) {
    write_file(kFile, "DEVICE=eth0\nMASTER=bond0\n");
    for (const bool is_joining : {true, false}) {
        rig.fail("KLIBCFileSetKeys");
        EXPECT_OUTCOME(is_joining ? join() : leave(),
                       {.result = -1, .code = 0xB00, .unit = "platform", .commands = kCopy});
        EXPECT_EQ("DEVICE=eth0\nMASTER=bond0\n", read_file(kFile));
    }
    shell("rm " + kFile + " && mkdir " + kFile);
    EXPECT_EQ(-1, join().result);
    EXPECT_EQ(0x900U, rig.now.code);
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfSetSlave_noMemory_is200AndTouchesNothing) {
    write_file(kFile, "DEVICE=eth0\nBOOTPROTO=none\n");
    const outcome no_memory{.result = -1, .code = 0x200, .unit = kUnit};
    for (const int nth : {1, 2}) {
        rig.fail("KLIBCSzHashAlloc", nth);
        EXPECT_OUTCOME(join(), no_memory);
        rig.fail("KLIBCSzHashAlloc", nth);
        EXPECT_OUTCOME(leave(), no_memory);
    }
    for (int nth = 1; nth <= 4; ++nth) {
        rig.fail("KLIBCSzHashSetValue", nth);
        EXPECT_OUTCOME(join(), no_memory);
    }
    for (int nth = 1; nth <= 8; ++nth) {
        rig.fail("KLIBCSzHashSetValue", nth);
        EXPECT_OUTCOME(leave(), no_memory);
    }
    EXPECT_EQ("DEVICE=eth0\nBOOTPROTO=none\n", read_file(kFile));
    EXPECT_EQ("<absent>", read_file(kSaved));
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfSetSlave_longNames_areTakenWhole) {
    for (const size_t length : {15U, 16U, 17U}) {
        const std::string name = long_text(length);
        const std::string path = ifcfg(name);
        const outcome copied{.commands = {"/bin/cp -f " + path + " " + path + ".saved"}};
        const std::string joined = "DEVICE=" + name + "\nUSERCTL=no\nMASTER=bond0\nSLAVE=yes\n";
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetLinkAggrConfSetSlave(name.c_str(), 1, &bond); }), copied);
        EXPECT_EQ(joined, read_file(path));
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetLinkAggrConfSetSlave(name.c_str(), 0, nullptr); }), copied);
        EXPECT_EQ("DEVICE=" + name + "\nBOOTPROTO=dhcp\n", read_file(path));
        EXPECT_EQ(joined, read_file(path + ".saved"));
    }
    EXPECT_EQ(6U, list_dir("/etc/sysconfig/network-scripts").size());
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfSetSlave_badArguments_areRefused) {
    const auto set = [this](const char *slave, int on, const KOVALINKAGGROPT *opt) {
        return rig.observe([=] { return KOVANetLinkAggrConfSetSlave(slave, on, opt); });
    };
    EXPECT_OUTCOME(set(nullptr, 1, &bond), refusal(kUnit, "((void *)0) != szSlave"));
    EXPECT_OUTCOME(set("", 1, &bond), refusal(kUnit, "'\\0' != *szSlave"));
    EXPECT_OUTCOME(set("eth0", 1, nullptr), refusal(kUnit, "NULL != pOpt"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(set(name.c_str(), 0, nullptr), refusal(kUnit, "is_interface_name(szSlave)"));
    }
    for (const char *name : {"", "a b", "a/b", "..", "a\nb"}) {
        memset(bond.szName, 0, sizeof bond.szName);
        memcpy(bond.szName, name, strlen(name));
        EXPECT_OUTCOME(set("eth0", 1, &bond), refusal(kUnit, "has_usable_name(*pOpt)"));
    }
    memset(bond.szName, 'a', sizeof bond.szName);
    EXPECT_OUTCOME(set("eth0", 1, &bond), refusal(kUnit, "has_usable_name(*pOpt)"));
    EXPECT_EQ(texts{}, list_dir("/etc/sysconfig/network-scripts"));
}

// ---- what a new owner of a file needs

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfUpdateBootProto_staticAndDhcp_stay) {
    for (const char *proto : {"static", "dhcp", "STATIC", "Dhcp", "\"static\""}) {
        write_file(kFile, std::string("BOOTPROTO=") + proto + "\n");
        EXPECT_OUTCOME(update(), {.result = 0});
        EXPECT_EQ("<none><none><none>", value("BOOTPROTO") + value("IPADDR") + value("NETMASK"));
    }
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfUpdateBootProto_anythingElse_isDhcpWithoutAnAddress) {
    for (const std::string &proto : texts{"none", "", "dhcp6", "statically", " dhcp", long_text(1000)}) {
        write_file(kFile, "BOOTPROTO=" + proto + "\n");
        EXPECT_OUTCOME(update(), {.result = 0});
        EXPECT_EQ("dhcp", value("BOOTPROTO"));
        EXPECT_EQ("", value("IPADDR") + value("NETMASK"));
    }
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfUpdateBootProto_noKey_isDhcp) {
    write_file(kFile, "DEVICE=eth0\nIPADDR=10.0.0.1\n");
    EXPECT_OUTCOME(update(), {.result = 0});
    EXPECT_EQ("dhcp<none><none>", value("BOOTPROTO") + value("IPADDR") + value("NETMASK"));
    shell("rm " + kFile);
    EXPECT_EQ(0, update().result);
    EXPECT_EQ("dhcp<none><none>", value("BOOTPROTO") + value("IPADDR") + value("NETMASK"));
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfUpdateBootProto_noMemory_is200) {
    write_file(kFile, "BOOTPROTO=none\n");
    for (const int nth : {1, 2, 3}) {
        rig.fail("KLIBCSzHashSetValue", nth);
        EXPECT_OUTCOME(update(), {.result = -1, .code = 0x200, .unit = "platform"});
    }
    write_file(kFile, "");
    rig.fail("KLIBCSzHashSetValue");
    EXPECT_OUTCOME(update(), {.result = -1, .code = 0x200, .unit = "platform"});
}

TEST_F(net_link_aggr_conf_set_slave, KOVANetLinkAggrConfUpdateBootProto_badArguments_areRefused) {
    EXPECT_OUTCOME(rig.observe([this] { return KOVANetLinkAggrConfUpdateBootProto(nullptr, keys); }),
                   refusal(kUnit, "((void *)0) != szPath"));
    EXPECT_OUTCOME(rig.observe([this] { return KOVANetLinkAggrConfUpdateBootProto("", keys); }),
                   refusal(kUnit, "'\\0' != *szPath"));
    EXPECT_OUTCOME(rig.observe([] { return KOVANetLinkAggrConfUpdateBootProto(kFile.c_str(), nullptr); }),
                   refusal(kUnit, "NULL != pKeys"));
}
