#include "support/memory.h"
#include "support/rig.h"

#include <kovanetsdk/dhcp.h>

using namespace kova_test;

namespace {

constexpr int kV4 = 0;
constexpr int kV6 = 1;

void make_files(const texts &names) {
    for (const std::string &name : names) {
        write_file("/etc/dhcpd/" + name, "enable=\"yes\"\n");
    }
}

} // namespace

class dhcp_interface_list_get : public unit_test {
protected:
    /** Lists and takes the names; the list the call is given holds "old" or is NULL. */
    outcome list(int type, bool has_old = false) {
        names.clear();
        return rig.observe([&]() -> long {
            KLIBSZLIST *given = has_old ? KLIBCSzListAlloc(4) : nullptr;
            if (has_old) {
                KLIBCSzListPush(&given, "old");
            }
            KLIBSZLIST *list = given;
            const int count = DHCPInterfaceListGet(&list, type);
            is_replaced = list != given;
            for (uint32_t i = 0; list != nullptr && i < list->nItem; ++i) {
                names.emplace_back(KLIBCSzListGet(list, static_cast<int>(i)));
            }
            KLIBCSzListFree(list);
            return count;
        });
    }

    texts names;
    bool is_replaced = false;
};

TEST_F(dhcp_interface_list_get, DHCPInterfaceListGet_withoutDirectory_isEmpty) {
    for (const int type : {kV4, kV6}) {
        EXPECT_OUTCOME(list(type), {.result = 0});
        EXPECT_EQ(texts{}, names);
    }
}

TEST_F(dhcp_interface_list_get, DHCPInterfaceListGet_nothingFound_leavesTheListAlone) {
    shell("mkdir /etc/dhcpd");
    EXPECT_OUTCOME(list(kV4, true), {.result = 0});
    EXPECT_EQ(texts{"old"}, names);
    make_files({"dhcpd-eth0-subnet0.info", "dhcpd6-eth0.info"}); // files that match, or of the other family
    EXPECT_OUTCOME(list(kV4, true), {.result = 0});
    EXPECT_EQ(texts{"old"}, names);
    EXPECT_FALSE(is_replaced);
}

TEST_F(dhcp_interface_list_get, DHCPInterfaceListGet_interfaces_areListedByFamilyInOrder) {
    make_files({"dhcpd-ovs_eth1.info", "dhcpd-eth0.info", "dhcpd-bond0.info", "dhcpd6-eth2.info", "dhcpd6-eth0.info",
                "dhcpd.info", "dhcpd-eth9.conf", "xdhcpd-eth8.info", "dhcpd-eth7.info.bak", "wpad-eth6.info"});
    EXPECT_OUTCOME(list(kV4), {.result = 3});
    EXPECT_EQ((texts{"bond0", "eth0", "ovs_eth1"}), names);
    EXPECT_OUTCOME(list(kV6), {.result = 2});
    EXPECT_EQ((texts{"eth0", "eth2"}), names);
}

TEST_F(dhcp_interface_list_get, DHCPInterfaceListGet_found_replacesTheOldListAndFreesIt) {
    make_files({"dhcpd-eth0.info"});
    EXPECT_OUTCOME(list(kV4, true), {.result = 1});
    EXPECT_EQ(texts{"eth0"}, names);
    EXPECT_TRUE(is_replaced);
}

TEST_F(dhcp_interface_list_get, DHCPInterfaceListGet_otherForms_areListedByTheirSecondToken) {
    make_files({"dhcpd-eth0.10.info", "dhcpd-eth0-subnet0.info", "dhcpd-eth0-lan.info", "dhcpd-a-b.info",
                "dhcpd--.info", "dhcpd-.info", "dhcpd-eth0.info0.info"});
    EXPECT_OUTCOME(list(kV4), {.result = 0});
    make_files({"dhcpd-pxe.info", "dhcpd-%s%n.info", "dhcpd-my eth.info", "dhcpd-x.info.info", "dhcpd--y.info"});
    EXPECT_OUTCOME(list(kV4), {.result = 5});
    EXPECT_EQ((texts{"%s%n", "y", "my eth", "pxe", "x"}), names);
    EXPECT_OUTCOME(list(kV6), {.result = 0});
}

TEST_F(dhcp_interface_list_get, DHCPInterfaceListGet_badArguments_areRefused) {
    make_files({"dhcpd-eth0.info"});
    EXPECT_OUTCOME(rig.observe([] { return DHCPInterfaceListGet(nullptr, kV4); }),
                   {.result = -1, .log = {"ERR dhcp_interface_list_get:N Parameter error"}});
    for (const int type : {-1, 2, INT32_MAX}) {
        EXPECT_OUTCOME(list(type, true), {.result = -1, .log = {"ERR dhcp_interface_list_get:N Wrong DHCPD ip type"}});
        EXPECT_EQ(texts{"old"}, names);
    }
}

TEST_F(dhcp_interface_list_get, DHCPInterfaceListGet_failedSearch_fails) {
    make_files({"dhcpd-eth0.info"});
    rig.fail("KLIBCFileEnumDir");
    EXPECT_OUTCOME(
        list(kV4, true),
        {.result = -1, .code = 0x900, .unit = "platform", .log = {"ERR dhcp_interface_list_get:N glob() error"}});
    EXPECT_EQ(texts{"old"}, names);
}

TEST_F(dhcp_interface_list_get, DHCPInterfaceListGet_noList_fails) {
    make_files({"dhcpd-eth0.info"});
    rig.fail("KLIBCSzListAlloc", 2); // the first is the test's own
    EXPECT_OUTCOME(list(kV4, true), {.result = -1,
                                     .code = 0x200,
                                     .unit = "platform",
                                     .log = {"ERR dhcp_interface_list_get:N Allocate interface list failed"}});
    EXPECT_EQ(texts{"old"}, names);
}

TEST_F(dhcp_interface_list_get, DHCPInterfaceListGet_failedPush_failsAndKeepsTheOldList) {
    make_files({"dhcpd-eth0.info", "dhcpd-eth1.info"});
    rig.fail("KLIBCSzListPush", 3);
    EXPECT_OUTCOME(list(kV4, true),
                   {.result = -1,
                    .code = 0x200,
                    .unit = "platform",
                    .log = {"ERR dhcp_interface_list_get:N Failed to push [eth1] into interface list"}});
    EXPECT_EQ(texts{"old"}, names);
}

TEST_F(dhcp_interface_list_get, DHCPInterfaceListGet_noMemoryForAPath_skipsIt) {
    NEEDS_OWN_ALLOCATOR();
    make_files({"dhcpd-eth0.info", "dhcpd-eth1.info"});
    rig.fail("calloc", 4); // the first are of three lists
    EXPECT_OUTCOME(list(kV4), {.result = 1, .log = {"ERR dhcp_interface_list_get:N calloc() failed"}});
    EXPECT_EQ(texts{"eth1"}, names);
}
