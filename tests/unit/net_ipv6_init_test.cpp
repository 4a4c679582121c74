#include "support/fake_kernel.h"
#include "support/memory.h"

#include <kovanetsdk/ipv6.h>

using namespace kova_test;

namespace {

const std::string kUnit = "net_ipv6_init";

std::string shown_of(const std::string &ifname) {
    return "/tmp/accept_ra-" + ifname;
}

} // namespace

class net_ipv6_init : public unit_test {
protected:
    void TearDown() override {
        for (const std::string &path : shown) {
            unlink(path.c_str());
        }
        unit_test::TearDown();
    }
    /** An interface with a file and a switch that nobody has set. */
    void add(const std::string &ifname, const std::string &content, const fake_interface &device = {}) {
        kernel.add(ifname, device);
        write_file(ifcfg(ifname), content);
        add_switch(ifname);
    }
    void add_switch(const std::string &ifname) {
        shown.push_back(shown_of(ifname));
        write_file(shown.back(), "unset");
        rig.redirect("/proc/sys/net/ipv6/conf/" + ifname + "/accept_ra", shown.back());
    }
    outcome init() {
        return rig.observe([] { return KOVANetIpv6Init(); });
    }
    static std::string switch_of(const std::string &ifname) { return read_file(shown_of(ifname)); }

    fake_kernel kernel{rig};
    texts shown;
};

TEST_F(net_ipv6_init, KOVANetIpv6Init_follows_the_files) {
    const std::vector<std::pair<std::string, std::string>> files{{"IPV6_ACCEPT_RA=\"1\"\nIPV6INIT=static\n", "2"},
                                                                 {"IPV6_ACCEPT_RA=0\nIPV6INIT=auto\n", "0"},
                                                                 {"IPV6_ACCEPT_RA=no\nIPV6INIT=static\n", "2"},
                                                                 {"IPV6_ACCEPT_RA=00\n", "2"},
                                                                 {"IPV6_ACCEPT_RA=\n", "2"},
                                                                 {"IPV6INIT=static\n", "0"},
                                                                 {"IPV6INIT=\"STATIC\"\n", "0"},
                                                                 {"IPV6INIT=statics\n", "2"},
                                                                 {"IPV6INIT=off\n", "2"},
                                                                 {"IPV6INIT=auto\n", "2"},
                                                                 {"DEVICE=eth0\n", "2"},
                                                                 {"", "2"}};
    for (size_t i = 0; i < files.size(); ++i) {
        add("eth" + std::to_string(i), files[i].first);
    }
    EXPECT_OUTCOME(init(), {.result = 0});
    for (size_t i = 0; i < files.size(); ++i) {
        EXPECT_EQ(files[i].second, switch_of("eth" + std::to_string(i))) << files[i].first;
    }
}

TEST_F(net_ipv6_init, KOVANetIpv6Init_leaves_alone_what_has_no_ipv6_of_its_own) {
    add("lo", "IPV6INIT=auto\n", {.flags = IFF_UP | IFF_LOOPBACK});
    add("eth1", "IPV6INIT=auto\n", {.flags = IFF_UP | IFF_SLAVE});
    add("eth2", "IPV6INIT=auto\n");
    rig.replace_file("/sys/class/net/eth2/brport", "");
    add("eth3", "IPV6INIT=auto\n");
    rig.replace_file("/sys/class/net/kova_ovs_bonds", "ovs_bond0 eth3\n");
    add("eth4", "IPV6INIT=auto\n", {.failing = {{SIOCGIFFLAGS, ENODEV}}});
    kernel.add("eth5");
    add_switch("eth5");
    add("eth6", "IPV6INIT=static\n", {.flags = 0});
    add("ppp0", "IPV6INIT=static\n", {.flags = IFF_UP | IFF_POINTOPOINT});
    EXPECT_OUTCOME(init(), {.result = 0});
    for (const char *ifname : {"lo", "eth1", "eth2", "eth3", "eth4", "eth5"}) {
        EXPECT_EQ("unset", switch_of(ifname)) << ifname;
    }
    EXPECT_EQ("0", switch_of("eth6")); // what is down comes up later
    EXPECT_EQ("0", switch_of("ppp0"));
}

TEST_F(net_ipv6_init, KOVANetIpv6Init_name_that_leaves_its_directory_is_left_alone) {
    kernel.add("..");
    kernel.add("a/b");
    EXPECT_OUTCOME(init(), {.result = 0});
}

TEST_F(net_ipv6_init, KOVANetIpv6Init_file_that_cannot_be_read_is_skipped) {
    for (const auto &[nth, key] : std::vector<std::pair<int, std::string>>{{1, "IPV6_ACCEPT_RA"}, {2, "IPV6INIT"}}) {
        add("eth0", "DEVICE=eth0\n");
        add("eth1", "IPV6INIT=static\n");
        rig.fail("KLIBCFileGetKeyValue", nth);
        const outcome got = init();
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{"WARNING net_ipv6_init:N Failed to get key " + key + " in " + ifcfg("eth0")}, got.log);
        EXPECT_EQ("unset", switch_of("eth0"));
        EXPECT_EQ("0", switch_of("eth1"));
    }
}

TEST_F(net_ipv6_init, KOVANetIpv6Init_switch_that_cannot_be_set_ends_it) {
    for (const auto &[path, code] :
         std::vector<std::pair<std::string, unsigned>>{{"/tmp/no/such/directory", 0x900}, {"/dev/full", 0xB00}}) {
        add("eth0", "IPV6INIT=static\n");
        add("eth1", "IPV6INIT=static\n");
        add("eth2", "IPV6INIT=static\n");
        rig.redirect("/proc/sys/net/ipv6/conf/eth1/accept_ra", path);
        EXPECT_OUTCOME(
            init(),
            {.result = -1, .code = code, .unit = kUnit, .log = {"ERR net_ipv6_init:N Failed to set ipv6 accept_ra."}});
        EXPECT_EQ("0", switch_of("eth0"));
        EXPECT_EQ("unset", switch_of("eth2"));
    }
}

TEST_F(net_ipv6_init, KOVANetIpv6Init_looks_at_thirty_two_interfaces) {
    for (int i = 0; i < 33; ++i) {
        add("eth" + std::to_string(i), "IPV6INIT=static\n");
    }
    EXPECT_OUTCOME(init(), {.result = 0});
    size_t set = 0;
    for (int i = 0; i < 33; ++i) {
        set += switch_of("eth" + std::to_string(i)) == "0" ? 1 : 0;
    }
    EXPECT_EQ(32U, set);
}

TEST_F(net_ipv6_init, KOVANetIpv6Init_without_list_or_socket_fails) {
    add("eth0", "IPV6INIT=static\n");
    rig.fail("socket");
    const outcome got = init();
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(0x3400U, got.code);
    EXPECT_EQ(kUnit, got.unit);
    rig.hide("/proc/net/dev");
    EXPECT_OUTCOME(init(), {.result = -1, .code = 0x900, .unit = "net_stat_init"});
    EXPECT_EQ("unset", switch_of("eth0"));
}

TEST_F(net_ipv6_init, KOVANetIpv6Init_without_memory_fails) {
    NEEDS_OWN_ALLOCATOR();
    rig.fail("calloc");
    EXPECT_OUTCOME(init(), {.result = -1, .code = 0x200, .unit = kUnit});
}
