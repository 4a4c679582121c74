#include "support/fake_kernel.h"
#include "support/memory.h"

#include <kovanetsdk/link.h>

using namespace kova_test;

namespace {

const std::string kHeader = "VLAN Dev name    | VLAN ID\nName-Type: VLAN_NAME_TYPE_RAW_PLUS_VID_NO_PAD\n";

outcome wrong_format(const std::string &line) {
    return {.result = -1,
            .code = 0x4000,
            .unit = "net_vlan_enum",
            .log = {"ERR net_vlan_enum:N Get wrong format from /proc/net/vlan/config: " + line}};
}

} // namespace

class net_vlan_enum : public unit_test {
protected:
    void TearDown() override {
        free(vlans);
        unit_test::TearDown();
    }
    void write_config(const std::string &content) {
        write_file("/tmp/proc-vlan/config", content);
        rig.redirect("/proc/net/vlan", "/tmp/proc-vlan");
    }
    outcome list() {
        free(vlans);
        vlans = untouched;
        count = 77;
        const outcome got = rig.observe([&] { return KLIBNetVlanEnum(&vlans, &count); });
        EXPECT_NE(untouched, vlans);
        vlans = vlans == untouched ? nullptr : vlans;
        return got;
    }
    std::string shown() const {
        std::string text;
        for (int i = 0; i < count; ++i) {
            text += std::string(vlans[i].szIfname) + " " + std::to_string(vlans[i].vlanId) + " " +
                    vlans[i].szRowDevice + "\n";
        }
        return text;
    }

    fake_kernel kernel{rig};
    VLANINFO *const untouched = reinterpret_cast<VLANINFO *>(&kernel);
    VLANINFO *vlans = nullptr;
    int count = 0;
};

TEST_F(net_vlan_enum, KLIBNetVlanEnum_vlans_areListedInTheirOrder) {
    write_config(kHeader +
                 "eth1.20        | 20  | eth1\neth0.10\t| 10  | eth0\nabcdefghijklm.4| 4094  | abcdefghijklm\n");
    EXPECT_OUTCOME(list(), {.result = 0});
    EXPECT_EQ("eth1.20 20 eth1\neth0.10 10 eth0\nabcdefghijklm.4 4094 abcdefghijklm\n", shown());
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_lastLineWithoutNewline_counts) {
    write_config(kHeader + "eth0.10        | 10  | eth0");
    EXPECT_OUTCOME(list(), {.result = 0});
    EXPECT_EQ("eth0.10 10 eth0\n", shown());
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_noFile_isNone) {
    EXPECT_OUTCOME(list(), {.result = 0});
    EXPECT_EQ(0, count);
    EXPECT_EQ(nullptr, vlans);
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_headerAlone_isAnEmptyBlock) {
    write_config(kHeader);
    EXPECT_OUTCOME(list(), {.result = 0});
    EXPECT_EQ(0, count);
    EXPECT_NE(nullptr, vlans);
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_cutHeader_isNone) {
    for (const char *content : {"", "\n", "VLAN Dev name    | VLAN ID\n", "VLAN"}) {
        write_config(content);
        EXPECT_OUTCOME(list(), {.result = 0});
        EXPECT_EQ(0, count);
        EXPECT_EQ(nullptr, vlans);
    }
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_foreignLine_is4000WithoutAList) {
    for (const std::string &line :
         texts{"", "eth0.10", "eth0.10 | 10", "eth0.10 | ten  | eth0", "eth0.10 10 eth0", "| 10 | eth0",
               "eth0.10 | 10  |", long_text(16) + " | 10  | eth0", long_text(4000)}) {
        write_config(kHeader + "eth1.20        | 20  | eth1\n" + line + "\n");
        EXPECT_OUTCOME(list(), wrong_format(line.substr(0, 16000)));
        EXPECT_EQ(0, count);
        EXPECT_EQ(nullptr, vlans);
    }
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_longRowDevice_isCut) {
    write_config(kHeader + "x.1        | 1  | " + long_text(100) + "\n");
    EXPECT_OUTCOME(list(), {.result = 0});
    EXPECT_EQ("x.1 1 " + long_text(15) + "\n", shown());
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_manyVlans_areAllListed) {
    std::string lines;
    std::string expected;
    for (int id = 1; id <= 4094; ++id) {
        const std::string number = std::to_string(id);
        lines += "e" + number + "." + number + "\t| " + number + "  | e" + number + "\n";
        expected += "e" + number + "." + number + " " + number + " e" + number + "\n";
    }
    write_config(kHeader + lines);
    EXPECT_OUTCOME(list(), {.result = 0});
    EXPECT_EQ(expected, shown());
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_fileThatCannotBeRead_fails) {
    shell("rm -rf /tmp/proc-vlan && mkdir -p /tmp/proc-vlan/config");
    rig.redirect("/proc/net/vlan", "/tmp/proc-vlan");
    EXPECT_OUTCOME(list(), {.result = -1, .code = 0x900, .unit = "plain_file"});
    EXPECT_EQ(0, count);
    EXPECT_EQ(nullptr, vlans);
    shell("rmdir /tmp/proc-vlan/config");
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_noMemory_is200) {
    write_config(kHeader + "eth0.10        | 10  | eth0\n");
    rig.fail("KLIBCSzListAlloc");
    EXPECT_OUTCOME(list(), {.result = -1, .code = 0x200, .unit = "net_vlan_enum"});
    rig.fail("KLIBCFileReadLines");
    EXPECT_OUTCOME(list(), {.result = -1, .code = 0x900, .unit = "platform"});
    EXPECT_EQ(nullptr, vlans);
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_noMemoryForTheRecords_is200) {
    NEEDS_OWN_ALLOCATOR();
    write_config(kHeader + "eth0.10        | 10  | eth0\n");
    rig.fail_from("calloc", 2); // the first is the list's
    EXPECT_OUTCOME(list(), {.result = -1, .code = 0x200, .unit = "net_vlan_enum"});
    EXPECT_EQ(nullptr, vlans);
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_lineThatIsGone_isLogged) {
    write_config(kHeader + "eth0.10        | 10  | eth0\n");
    rig.fail("KLIBCSzListGet");
    EXPECT_OUTCOME(list(), {.result = -1, .log = {"ERR net_vlan_enum:N Get NULL string from /proc/net/vlan/config"}});
    EXPECT_EQ(nullptr, vlans);
}

TEST_F(net_vlan_enum, KLIBNetVlanEnum_badArguments_areRefused) {
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetVlanEnum(nullptr, &count); }),
                   refusal("net_vlan_enum", "NULL != ppVlans"));
    EXPECT_OUTCOME(rig.observe([&] { return KLIBNetVlanEnum(&vlans, nullptr); }),
                   refusal("net_vlan_enum", "NULL != pCount"));
}
