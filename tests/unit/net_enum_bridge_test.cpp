#include "support/fake_kernel.h"
#include "support/memory.h"

#include <kovanetsdk/bridge.h>

using namespace kova_test;

class net_enum_bridge : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        bridges = KLIBCSzListAlloc(4);
        add_bridge("br0");
        add_bridge("br10");
        add_bridge("br2");
        add_bridge("lbr0", "yes");
        add_bridge("lbr1", "YES");
        add_bridge("gbr0");
        add_bridge("xgbr1", "yes");
        kernel.add("eth0");
        write_file(ifcfg("eth0"), "LOCAL_LAN=yes\n");
    }
    void TearDown() override {
        KLIBCSzListFree(bridges);
        unit_test::TearDown();
    }
    void add_bridge(const std::string &name, const std::string &local_lan = "") {
        kernel.add(name);
        shell("mkdir -p /tmp/sys-" + name + "/bridge");
        rig.redirect("/sys/class/net/" + name, "/tmp/sys-" + name);
        write_file(ifcfg(name), local_lan.empty() ? "" : "LOCAL_LAN=" + local_lan + "\n");
    }
    outcome list(int kind) {
        KLIBCSzListRemoveAll(bridges);
        return rig.observe([=, this] { return KLIBNetEnumBridge(bridges, kind); });
    }
    texts names() const {
        texts got;
        for (int i = 0; const char *name = KLIBCSzListGet(bridges, i); ++i) {
            got.emplace_back(name);
        }
        return got;
    }

    fake_kernel kernel{rig};
    KLIBSZLIST *bridges = nullptr;
};

TEST_F(net_enum_bridge, KLIBNetEnumBridge_kinds_areToldApartByTheLocalLan) {
    EXPECT_OUTCOME(list(KLIB_BRIDGE_MASTER), {.result = 4});
    EXPECT_EQ((texts{"br0", "br2", "br10", "lbr1"}), names());
    EXPECT_OUTCOME(list(KLIB_BRIDGE_LOCAL_LAN), {.result = 1});
    EXPECT_EQ(texts{"lbr0"}, names());
}

TEST_F(net_enum_bridge, KLIBNetEnumBridge_otherKinds_haveNone) {
    for (const int kind : {0, 1, 4, 5, -1, 2147483647}) {
        EXPECT_EQ(0, list(kind).result);
        EXPECT_EQ(texts{}, names());
        EXPECT_EQ(texts{}, rig.now.log);
    }
}

TEST_F(net_enum_bridge, KLIBNetEnumBridge_withoutAList_counts) {
    EXPECT_EQ(4, rig.observe([] { return KLIBNetEnumBridge(nullptr, KLIB_BRIDGE_MASTER); }).result);
    EXPECT_EQ(1, rig.observe([] { return KLIBNetEnumBridge(nullptr, KLIB_BRIDGE_LOCAL_LAN); }).result);
}

TEST_F(net_enum_bridge, KLIBNetEnumBridge_missingFile_isNotTheLocalLan) {
    shell("rm " + ifcfg("lbr0"));
    EXPECT_EQ(0, list(KLIB_BRIDGE_LOCAL_LAN).result);
    EXPECT_EQ(5, list(KLIB_BRIDGE_MASTER).result);
}

TEST_F(net_enum_bridge, KLIBNetEnumBridge_interfacesThatCannotBeListed_fail) {
    rig.hide("/proc/net/dev");
    EXPECT_OUTCOME(list(KLIB_BRIDGE_MASTER), {.result = -1, .code = 0x900, .unit = "net_stat_init"});
}

TEST_F(net_enum_bridge, KLIBNetEnumBridge_noMemoryForAName_is200) {
    rig.fail("KLIBCSzListPush", 2);
    EXPECT_OUTCOME(list(KLIB_BRIDGE_MASTER), {.result = -1, .code = 0x200, .unit = "platform"});
}

TEST_F(net_enum_bridge, KLIBNetEnumBridge_noMemory_is200) {
    NEEDS_OWN_ALLOCATOR();
    for (const int nth : {1, 2}) { // the records, and sorting them
        rig.fail("calloc", nth);
        EXPECT_OUTCOME(list(KLIB_BRIDGE_MASTER), {.result = -1, .code = 0x200, .unit = "net_stat_init"});
    }
}
