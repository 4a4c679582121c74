#include "support/fake_kernel.h"

#include <cstring>
#include <kovanetsdk/link.h>

using namespace kova_test;

class net_vlan_get : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        kernel.add("eth0");
        kernel.add("eth0.10", {.row_device = "eth0", .vlan_id = 10});
    }
    outcome get(const char *ifname) {
        memset(&vlan, 'u', sizeof vlan);
        return rig.observe([&] { return KLIBNetVlanGet(ifname, &vlan); });
    }
    outcome get_by_row(const char *row, int id) {
        memset(&vlan, 'u', sizeof vlan);
        return rig.observe([&] { return KLIBNetVlanGetByRowDev(row, id, &vlan); });
    }
    /** The record's bytes beyond its values. */
    void expect_record(const std::string &name, const std::string &row, uint32_t id) {
        VLANINFO expected = {};
        memcpy(expected.szIfname, name.c_str(), name.size());
        memcpy(expected.szRowDevice, row.c_str(), row.size());
        expected.vlanId = id;
        EXPECT_EQ(0, memcmp(&expected, &vlan, sizeof vlan))
            << vlan.szIfname << " " << vlan.szRowDevice << " " << vlan.vlanId;
    }

    fake_kernel kernel{rig};
    VLANINFO vlan;
};

TEST_F(net_vlan_get, KLIBNetVlanGet_vlan_isOneWithItsRecord) {
    EXPECT_OUTCOME(get("eth0.10"), {.result = 1});
    expect_record("eth0.10", "eth0", 10);
}

TEST_F(net_vlan_get, KLIBNetVlanGet_noVlan_isZeroWithItsName) {
    for (const std::string name : {"eth0", "gone0", "a/b"}) {
        EXPECT_OUTCOME(get(name.c_str()), {.result = 0});
        expect_record(name, "", 0);
    }
}

TEST_F(net_vlan_get, KLIBNetVlanGet_idThatCannotBeAskedFor_isZero) {
    kernel.add("odd0", {.row_device = "eth0"});
    EXPECT_OUTCOME(get("odd0"), {.result = 0});
    expect_record("odd0", "eth0", 0);
}

TEST_F(net_vlan_get, KLIBNetVlanGet_longNames_areCutInTheRecordAlone) {
    kernel.add(long_text(15), {.row_device = "abcdefghijklmno", .vlan_id = 4094});
    EXPECT_OUTCOME(get(long_text(15).c_str()), {.result = 1});
    expect_record(long_text(15), "abcdefghijklmno", 4094);
    for (const size_t length : {16, 17, 64, 4096}) { // what the kernel cannot have is no VLAN, the cut name's or not
        EXPECT_OUTCOME(get(long_text(length).c_str()), {.result = 0});
        expect_record(long_text(15), "", 0);
    }
}

TEST_F(net_vlan_get, KLIBNetVlanGet_noSocket_is3400) {
    rig.fail("socket");
    EXPECT_OUTCOME(get("eth0.10"), {.result = -1,
                                    .code = 0x3400,
                                    .unit = "net_vlan_get",
                                    .log = {"ERR net_vlan_get:N Cannot open control socket"}});
}

TEST_F(net_vlan_get, KLIBNetVlanGet_badArguments_areRefused) {
    EXPECT_OUTCOME(get(nullptr), refusal("net_vlan_get", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(get(""), refusal("net_vlan_get", "'\\0' != *szIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetVlanGet("eth0.10", nullptr); }),
                   refusal("net_vlan_get", "NULL != pVlan"));
}

TEST_F(net_vlan_get, KLIBNetVlanGetByRowDev_vlan_isOneWithItsRecord) {
    EXPECT_OUTCOME(get_by_row("eth0", 10), {.result = 1});
    expect_record("eth0.10", "eth0", 10);
    EXPECT_OUTCOME(get_by_row("eth0", 11), {.result = 0});
    expect_record("eth0.11", "", 0);
    EXPECT_OUTCOME(get_by_row("eth1", 10), {.result = 0});
}

TEST_F(net_vlan_get, KLIBNetVlanGetByRowDev_longName_isCut) {
    kernel.add("abcdefghijklm.4", {.row_device = "abcdefghijklm", .vlan_id = 4094});
    EXPECT_OUTCOME(get_by_row("abcdefghijklm", 4094), {.result = 1});
    expect_record("abcdefghijklm.4", "abcdefghijklm", 4094);
    for (const size_t length : {15, 16, 17, 4096}) {
        EXPECT_OUTCOME(get_by_row(long_text(length).c_str(), 1), {.result = 0});
        expect_record(long_text(15), "", 0);
    }
}

TEST_F(net_vlan_get, KLIBNetVlanGetByRowDev_badArguments_areRefused) {
    EXPECT_OUTCOME(get_by_row(nullptr, 10), refusal("net_vlan_get", "((void *)0) != szRowDevice"));
    EXPECT_OUTCOME(get_by_row("", 10), refusal("net_vlan_get", "'\\0' != *szRowDevice"));
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetVlanGetByRowDev("eth0", 10, nullptr); }),
                   refusal("net_vlan_get", "NULL != pVlan"));
    for (const int id : {0, -1, 4095, 2147483647, -2147483647 - 1}) {
        EXPECT_OUTCOME(get_by_row("eth0", id), refusal("net_vlan_get", "0 == KLIBNetVlanValidId(nId)"));
    }
}
