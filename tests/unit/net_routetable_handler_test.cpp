#include "support/fake_kernel.h"

#include <climits>
#include <kovanetsdk/routing.h>

using namespace kova_test;

namespace {

constexpr int kAdd = NET_ROUTE_ADD;
constexpr int kDelete = NET_ROUTE_DELETE;

const std::string kLease = "/etc/dhclient/ipv4/dhcpcd-eth0.info";
const std::string kStatic = "BOOTPROTO=static\nIPADDR=192.168.1.10\nNETMASK=255.255.255.0\n";
const texts kLocks{"+0x105", "-0x100"}; // of the question for DHCP

texts deleted(const std::string &name = "eth0", const std::string &ip = "192.168.1.10") {
    return {"/sbin/ip route del 192.168.1.0/24 dev " + name + " src " + ip};
}
texts added(const std::string &name = "eth0", const std::string &ip = "192.168.1.10") {
    return {deleted(name, ip)[0], "/sbin/ip route add 192.168.1.0/24 dev " + name + " src " + ip};
}

} // namespace

class net_routetable_handler : public unit_test {
protected:
    outcome handle(int type, const char *szIfname = "eth0") {
        return rig.observe([=] { return NetRoutetableHandler(type, szIfname); });
    }
    void use_lease(const std::string &lease = "IPADDR=192.168.1.77\nNETMASK=255.255.255.0\n") {
        write_file(ifcfg("eth0"), "BOOTPROTO=dhcp\n");
        write_file(kLease, lease);
    }

    fake_kernel kernel{rig};
};

TEST_F(net_routetable_handler, NetRoutetableHandler_missingName_isRefused) {
    for (const int type : {kAdd, kDelete, 7}) {
        EXPECT_OUTCOME(handle(type, nullptr), refusal("net_routetable_handler", "((void *)0) != szIfname"));
        EXPECT_OUTCOME(handle(type, ""), refusal("net_routetable_handler", "'\\0' != *szIfname"));
    }
}

TEST_F(net_routetable_handler, NetRoutetableHandler_nameThatIsNone_isRefused) {
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(handle(kDelete, name.c_str()), refusal("net_routetable_handler", "is_interface_name(szIfname)"));
    }
}

TEST_F(net_routetable_handler, NetRoutetableHandler_longestName_isNoInterface) {
    kernel.add("eth0");
    for (const size_t length : {15U, 16U, 17U, 63U, 64U, 235U}) {
        EXPECT_OUTCOME(handle(kDelete, long_text(length, 'e').c_str()),
                       {.result = 0, .code = 0xBC00, .unit = "net_is_dev_type_match"});
    }
}

TEST_F(net_routetable_handler, NetRoutetableHandler_staticInterface_isEditedWithItsFile) {
    kernel.add("eth0");
    write_file(ifcfg("eth0"), kStatic);
    EXPECT_OUTCOME(handle(kAdd), {.commands = added(), .locks = kLocks});
    EXPECT_OUTCOME(handle(kDelete), {.commands = deleted(), .locks = kLocks});
}

TEST_F(net_routetable_handler, NetRoutetableHandler_interfaceWithoutLink_isEdited) {
    kernel.add("eth0", {.flags = IFF_UP});
    write_file(ifcfg("eth0"), kStatic);
    EXPECT_OUTCOME(handle(kDelete), {.commands = deleted(), .locks = kLocks});
}

TEST_F(net_routetable_handler, NetRoutetableHandler_interfaceOfAnotherKind_isLeftAlone) {
    kernel.add("eth0", {.flags = IFF_RUNNING}); // down
    kernel.add("eth1", {.flags = IFF_UP | IFF_SLAVE});
    kernel.add("eth2");
    kernel.add("lo", {.flags = IFF_UP | IFF_LOOPBACK});
    kernel.add("ppp0", {.flags = IFF_UP | IFF_POINTOPOINT});
    rig.replace_file("/sys/class/net/eth2/brport", "");
    for (const char *szIfname : {"eth0", "eth1", "eth2", "lo", "ppp0", "eth9"}) {
        write_file(ifcfg(szIfname), "BOOTPROTO=dhcp\n"); // without a lease, which is not asked for
        for (const int type : {kAdd, kDelete}) {
            EXPECT_OUTCOME(handle(type, szIfname), {.result = 0, .code = 0xBC00, .unit = "net_is_dev_type_match"});
        }
    }
}

TEST_F(net_routetable_handler, NetRoutetableHandler_interfacesThatCannotBeListed_areLeftAlone) {
    kernel.add("eth0");
    write_file(ifcfg("eth0"), kStatic);
    rig.fail("socket");
    const outcome got = handle(kDelete);
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(0x3400U, got.code);
    EXPECT_EQ(texts{}, got.commands);
}

// ---- DHCP

TEST_F(net_routetable_handler, NetRoutetableHandler_lease_isDeletedAndNeverAdded) {
    kernel.add("eth0");
    use_lease();
    EXPECT_OUTCOME(handle(kDelete), {.commands = deleted("eth0", "192.168.1.77"), .locks = kLocks});
    EXPECT_OUTCOME(handle(kAdd), {.result = 0, .locks = kLocks});
}

TEST_F(net_routetable_handler, NetRoutetableHandler_missingLease_failsWhateverTheType) {
    kernel.add("eth0");
    write_file(ifcfg("eth0"), "BOOTPROTO=dhcp\nIPADDR=192.168.1.10\nNETMASK=255.255.255.0\n");
    for (const int type : {kAdd, kDelete, 2, -1}) {
        EXPECT_OUTCOME(handle(type), {.result = -1,
                                      .log = {"ERR net_routetable_handler:N "
                                              "/etc/dhclient/ipv4/dhcpcd-eth0.info is not exist"},
                                      .locks = kLocks});
    }
}

TEST_F(net_routetable_handler, NetRoutetableHandler_leaseWithoutAddress_failsToDeleteAndIsNotReadToAdd) {
    kernel.add("eth0");
    use_lease("DNS=1.2.3.4\n");
    EXPECT_OUTCOME(handle(kDelete),
                   {.result = -1,
                    .log = {"ERR net_routetable_handler:N Get IP from /etc/dhclient/ipv4/dhcpcd-eth0.info fail"},
                    .locks = kLocks});
    EXPECT_OUTCOME(handle(kAdd), {.result = 0, .locks = kLocks});
    use_lease("IPADDR=192.168.1.77\n");
    EXPECT_OUTCOME(handle(kDelete),
                   {.result = -1,
                    .log = {"ERR net_routetable_handler:N Get netmask from /etc/dhclient/ipv4/dhcpcd-eth0.info fail"},
                    .locks = kLocks});
}

TEST_F(net_routetable_handler, NetRoutetableHandler_configurationThatIsLocked_countsAsStatic) {
    kernel.add("eth0");
    use_lease();
    const lock_elsewhere other{0x106};
    const outcome got = handle(kDelete);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x400U, got.code);
    EXPECT_EQ((texts{"ERR BlKOVALnxIsDHCP(N) KLIBCFileLock failed.",
                     "ERR net_routetable_handler:N Get IP from /etc/sysconfig/network-scripts/ifcfg-eth0 fail"}),
              got.log);
}

// ---- static files

TEST_F(net_routetable_handler, NetRoutetableHandler_incompleteFile_fails) {
    kernel.add("eth0");
    for (const int type : {kAdd, kDelete}) {
        write_file(ifcfg("eth0"), "BOOTPROTO=static\nNETMASK=255.255.255.0\n");
        EXPECT_OUTCOME(handle(type), {.result = -1,
                                      .log = {"ERR net_routetable_handler:N Get IP from "
                                              "/etc/sysconfig/network-scripts/ifcfg-eth0 fail"},
                                      .locks = kLocks});
        write_file(ifcfg("eth0"), "BOOTPROTO=static\nIPADDR=192.168.1.10\n");
        EXPECT_OUTCOME(handle(type), {.result = -1,
                                      .log = {"ERR net_routetable_handler:N Get netmask from "
                                              "/etc/sysconfig/network-scripts/ifcfg-eth0 fail"},
                                      .locks = kLocks});
    }
}

TEST_F(net_routetable_handler, NetRoutetableHandler_fileThatCannotBeRead_fails) {
    kernel.add("eth0");
    write_file(ifcfg("eth0"), kStatic);
    rig.fail("KLIBCFileGetKeyValue", 3); // after those for the cluster and for BOOTPROTO
    EXPECT_OUTCOME(handle(kAdd), {.result = -1,
                                  .code = 0x900,
                                  .unit = "platform",
                                  .log = {"ERR net_routetable_handler:N Get IP from "
                                          "/etc/sysconfig/network-scripts/ifcfg-eth0 fail"},
                                  .locks = kLocks});
    rig.fail("KLIBCFileGetKeyValue", 4);
    EXPECT_OUTCOME(handle(kAdd), {.result = -1,
                                  .code = 0x900,
                                  .unit = "platform",
                                  .log = {"ERR net_routetable_handler:N Get netmask from "
                                          "/etc/sysconfig/network-scripts/ifcfg-eth0 fail"},
                                  .locks = kLocks});
}

TEST_F(net_routetable_handler, NetRoutetableHandler_failedEdit_isSuccess) {
    kernel.add("eth0");
    write_file(ifcfg("eth0"), "BOOTPROTO=static\nIPADDR=nonsense\nNETMASK=255.255.255.0\n");
    EXPECT_OUTCOME(handle(kAdd), {.log = {"ERR net_routetable_edit:N inet_pton error (nonsense)"}, .locks = kLocks});
    write_file(ifcfg("eth0"), "BOOTPROTO=static\nIPADDR=\nNETMASK=255.255.255.0\n");
    EXPECT_OUTCOME(handle(kDelete), {.log = {"ERR net_routetable_edit:N bad parameter"}, .locks = kLocks});
    write_file(ifcfg("eth0"), "BOOTPROTO=static\nIPADDR=" + long_text(50, '1') + "\nNETMASK=255.255.255.0\n");
    EXPECT_OUTCOME(handle(kAdd), {.log = {"ERR net_routetable_edit:N inet_pton error (" + long_text(19, '1') + ")"},
                                  .locks = kLocks});
}

TEST_F(net_routetable_handler, NetRoutetableHandler_anyOtherType_doesNothing) {
    kernel.add("eth0");
    write_file(ifcfg("eth0"), "BOOTPROTO=static\n"); // not read
    for (const int type : {2, -1, INT_MAX, INT_MIN}) {
        EXPECT_OUTCOME(handle(type), {.result = 0, .locks = kLocks});
    }
}

// ---- members of bridges, bonds and the virtual switch

TEST_F(net_routetable_handler, NetRoutetableHandler_bondMember_isDeletedAndNeverAdded) {
    fake_interface &eth0 = kernel.add("eth0");
    write_file(ifcfg("eth0"), kStatic);
    int asked = 0;
    // it joins the bond after the interfaces were listed, or it would not be of the kind
    rig.answer_ioctl([&](unsigned long request, void *argument) -> std::optional<int> {
        auto &record = *static_cast<ifreq *>(argument);
        if (request == SIOCGIFFLAGS && std::string(record.ifr_name) == "eth0") {
            record.ifr_flags = static_cast<short>(IFF_UP | IFF_RUNNING | (++asked > 1 ? IFF_SLAVE : 0));
            return 0;
        }
        if (request == SIOCGIFHWADDR || request == SIOCGIFADDR || request == SIOCGIFNETMASK) {
            return 0;
        }
        errno = EOPNOTSUPP;
        return -1;
    });
    (void)eth0;
    EXPECT_OUTCOME(handle(kAdd), {.result = 0, .locks = kLocks});
    EXPECT_EQ(2, asked);
    asked = 0;
    EXPECT_OUTCOME(handle(kDelete), {.commands = deleted(), .locks = kLocks});
}

TEST_F(net_routetable_handler, NetRoutetableHandler_memberOfASwitchBond_standsForItsPort) {
    kernel.add("eth0");
    kernel.add("ovs_eth0");
    rig.replace_file("/sys/class/net/kova_ovs_bonds", "ovs_bond0 eth0 eth1\n");
    write_file(ifcfg("ovs_eth0"), kStatic);
    EXPECT_OUTCOME(handle(kAdd), {.commands = added("ovs_eth0"), .locks = kLocks});
    EXPECT_OUTCOME(handle(kDelete), {.commands = deleted("ovs_eth0"), .locks = kLocks});
}

TEST_F(net_routetable_handler, NetRoutetableHandler_memberOfASwitchBondByAnotherName_standsForItself) {
    kernel.add("lan0");
    kernel.add("ovs_lan0");
    kernel.add("eth1");
    rig.replace_file("/sys/class/net/kova_ovs_bonds", "ovs_bond0 lan0\n");
    write_file(ifcfg("ovs_lan0"), kStatic);
    write_file(ifcfg("eth1"), kStatic);
    EXPECT_OUTCOME(handle(kDelete, "lan0"), {.result = 0, .code = 0xBC00, .unit = "net_is_dev_type_match"});
    EXPECT_OUTCOME(handle(kDelete, "eth1"), {.commands = deleted("eth1"), .locks = kLocks});
}

TEST_F(net_routetable_handler, NetRoutetableHandler_memberOfASwitchBondWithoutPort_isLeftAlone) {
    kernel.add("eth0");
    rig.replace_file("/sys/class/net/kova_ovs_bonds", "ovs_bond0 eth0\n");
    write_file(ifcfg("eth0"), kStatic);
    EXPECT_OUTCOME(handle(kDelete), {.result = 0, .code = 0xBC00, .unit = "net_is_dev_type_match"});
}
