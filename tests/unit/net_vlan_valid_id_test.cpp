#include "support/fake_kernel.h"

#include <kovanetsdk/link.h>

using namespace kova_test;

class net_vlan_valid_id : public unit_test {
protected:
    fake_kernel kernel{rig};
};

TEST_F(net_vlan_valid_id, KLIBNetVlanValidId_idsOfTheStandard_areValid) {
    for (const int id : {1, 2, 10, 4093, 4094}) {
        EXPECT_OUTCOME(rig.observe([=] { return KLIBNetVlanValidId(id); }), {.result = 0});
    }
}

TEST_F(net_vlan_valid_id, KLIBNetVlanValidId_otherNumbers_areNotAndLeaveTheRegister) {
    for (const int id : {0, -1, 4095, 4096, 65546, 2147483647, -2147483647 - 1}) {
        EXPECT_OUTCOME(rig.observe([=] { return KLIBNetVlanValidId(id); }), {.result = -1});
    }
}

TEST_F(net_vlan_valid_id, KLIBNetVlanExist_saysWhetherTheKernelHasVlans_whateverTheName) {
    for (const char *name : {"eth0.10", "", static_cast<const char *>(nullptr)}) {
        EXPECT_OUTCOME(rig.observe([=] { return KLIBNetVlanExist(name); }), {.result = 0});
    }
    write_file("/tmp/proc-vlan/config", "");
    rig.redirect("/proc/net/vlan", "/tmp/proc-vlan");
    for (const char *name : {"eth0.10", "no such", "", static_cast<const char *>(nullptr)}) {
        EXPECT_OUTCOME(rig.observe([=] { return KLIBNetVlanExist(name); }), {.result = 1});
    }
}
