#include "support/fake_kernel.h"

#include <csignal>
#include <cstring>
#include <filesystem>
#include <kovanetsdk/ipv6.h>
#include <sched.h>
#include <sys/wait.h>

using namespace kova_test;

namespace {

constexpr int kAuto = 0, kOff = 1, kDhcp = 2, kStatic = 3, kAutoDhcp = 4;
const std::string kUnit = "net_ipv6_conf_set";
const std::string kErr = "ERR net_ipv6_conf_set:N ";
const std::string kInfo = "INFO net_ipv6_conf_set:N ";
const std::string kPath = "/etc/sysconfig/network-scripts/ifcfg-eth0";
const std::string kDisable = "/proc/sys/net/ipv6/conf/eth0/disable_ipv6";
const std::string kAcceptRa = "/proc/sys/net/ipv6/conf/eth0/accept_ra";
const std::string kShownDisable = "/tmp/disable_ipv6", kShownAcceptRa = "/tmp/accept_ra"; ///< stand for them
const std::string kClient = "/tmp/dhclient";                                              ///< stands for the client

const std::string kSettled = "fe80000000000000000000000000000a 02 40 20 80     eth0\n";
const std::string kDuplicate = "20010db8000000000000000000000005 02 40 00 88     eth0\n";
const std::string kDuplicate2 = "20010db8000000000000000000000006 02 40 00 88     eth0\n";
const std::string kStored = "DEVICE=eth0\nIPV6INIT=\"static\"\nIPV6ADDR=\"2001:db8::9\"\nIPV6PREFIXLENG=\"48\"\n"
                            "IPV6_DEFAULTGW=\"fe80::9\"\nIPV6_ACCEPT_RA=\"0\"\n";

const std::string kStop = "/sbin/stop dhcp-client6 IFACE=eth0 ACTION=";
const std::string kStart = "/sbin/start dhcp-client6 IFACE=eth0 ACTION=";
const std::string kAddAddress = "/sbin/ip -6 address add 2001:db8::5/64 dev eth0";
const std::string kDropStored = "/sbin/ip -6 address del 2001:db8::9/48 dev eth0";
const std::string kAddRoute = "/sbin/ip -6 route add default via ";
const std::string kEvent = "net/ipv6_change 4 IFNAME=eth0 ORIGIN_ADDRESS=fe80::a NEW_ADDRESS=2001:db8::5 "
                           "PREFIX_LENGTH=64 IS_LINK=true";

std::string pid_file(const std::string &kind) {
    return "/tmp/dhclient6-eth0-" + kind + ".pid";
}

} // namespace

class net_ipv6_conf_set : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        kernel.add("eth0");
        rig.redirect(kDisable, kShownDisable);
        rig.redirect(kAcceptRa, kShownAcceptRa);
        rig.replace_file("/proc/net/if_inet6", kSettled);
        for (const std::string &kind : texts{"client", "info"}) {
            rig.answer(kStart + kind, 0, "", [this, kind] { note_client(kind); });
            rig.answer(kStop + kind, 0, "", [kind] { unlink(pid_file(kind).c_str()); });
        }
        lay_out("DEVICE=eth0\nIPV6INIT=auto\n");
    }
    void TearDown() override {
        if (client > 0) {
            kill(client, SIGKILL);
            waitpid(client, nullptr, 0);
        }
        for (const std::string &path : {kShownDisable, kShownAcceptRa, kClient, pid_file("client"), pid_file("info")}) {
            unlink(path.c_str());
        }
        unit_test::TearDown();
    }
    void lay_out(const std::string &content) {
        write_file(ifcfg("eth0"), content);
        write_file(kShownDisable, "unset");
        write_file(kShownAcceptRa, "unset");
    }
    /** A process that goes by the client's name, noted as one of a kind. */
    void note_client(const std::string &kind, const char *name = "/tmp/dhclient") {
        if (client <= 0) {
            std::filesystem::copy_file("/bin/sleep", name, std::filesystem::copy_options::overwrite_existing);
            client = fork();
            if (client == 0) {
                execl(name, name, "1000", static_cast<char *>(nullptr));
                _exit(127);
            }
            const std::string exe = "/proc/" + std::to_string(client) + "/exe";
            for (std::error_code error; std::filesystem::read_symlink(exe, error) != name;) {
                sched_yield(); // not a sleep that would be noted
            }
        }
        write_file(pid_file(kind), std::to_string(client) + "\n");
    }
    outcome set(int mode, const char *szIP = nullptr, int prefix = 0, const char *szGateway = nullptr,
                const char *szIfname = "eth0") {
        return rig.observe([=] { return KOVANetIPv6ConfSet(mode, szIfname, szIP, prefix, szGateway); });
    }
    static std::string stored() { return read_file(ifcfg("eth0")); }
    static std::string switches() { return read_file(kShownDisable) + read_file(kShownAcceptRa); }
    void expect_untouched(const std::string &content) {
        EXPECT_EQ(content, stored());
        EXPECT_EQ("unsetunset", switches());
    }
    static outcome no_such_interface() { return {.result = -1, .code = 0xBC00, .unit = "net_is_dev_type_match"}; }

    fake_kernel kernel{rig};
    pid_t client = 0;
};

// ---- arguments

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_bad_name_is_refused) {
    EXPECT_OUTCOME(set(kAuto, nullptr, 0, nullptr, nullptr), refusal(kUnit, "((void *)0) != szIfname"));
    EXPECT_OUTCOME(set(kAuto, nullptr, 0, nullptr, ""), refusal(kUnit, "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(set(kAuto, nullptr, 0, nullptr, name.c_str()), refusal(kUnit, "is_interface_name(szIfname)"));
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_interface_that_does_not_count_fails) {
    kernel.add("eth0", {.flags = IFF_UP | IFF_SLAVE});
    for (int mode = kAuto; mode <= kAutoDhcp; ++mode) {
        EXPECT_OUTCOME(set(mode, "2001:db8::5", 64), no_such_interface());
    }
    expect_untouched("DEVICE=eth0\nIPV6INIT=auto\n");
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_other_modes_fail_silently) {
    for (const int mode : {5, -1, 99}) {
        EXPECT_OUTCOME(set(mode, "2001:db8::5", 64), {.result = -1});
    }
    lay_out("IPV6INIT=off\n");
    EXPECT_OUTCOME(set(5), {.result = -1});
    expect_untouched("IPV6INIT=off\n");
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_first_configuration_makes_the_file) {
    unlink(ifcfg("eth0").c_str());
    EXPECT_OUTCOME(set(kAuto), {.result = 0,
                                .code = 0x900,
                                .unit = "key_value",
                                .log = {kInfo + "Fail to set key IPV6INIT, " + kPath,
                                        kInfo + "Fail to get key IPV6INIT, " + kPath}});
    EXPECT_EQ("IPV6INIT=\"auto\"\nIPV6_ACCEPT_RA=\"1\"\n", stored());
    EXPECT_EQ("0\n2", switches());
}

// ---- auto

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_auto_switches_on_and_accepts) {
    EXPECT_OUTCOME(set(kAuto), {.result = 0});
    EXPECT_EQ("DEVICE=eth0\nIPV6INIT=\"auto\"\nIPV6_ACCEPT_RA=\"1\"\n", stored());
    EXPECT_EQ("0\n2", switches());
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_auto_drops_the_fixed_address_and_keeps_it_in_the_file) {
    lay_out(kStored);
    EXPECT_OUTCOME(set(kAuto), {.commands = {kDropStored}});
    EXPECT_EQ("DEVICE=eth0\nIPV6INIT=\"auto\"\nIPV6ADDR=\"2001:db8::9\"\nIPV6PREFIXLENG=\"48\"\n"
              "IPV6_DEFAULTGW=\"fe80::9\"\nIPV6_ACCEPT_RA=\"1\"\n",
              stored());
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_address_of_another_mode_is_not_dropped) {
    for (const char *mode : {"auto", "off", "dhcp", "auto_dhcp", "statics", ""}) {
        lay_out(std::string("IPV6INIT=") + mode + "\nIPV6ADDR=2001:db8::9\nIPV6PREFIXLENG=48\n");
        EXPECT_OUTCOME(set(kAuto), {.result = 0});
    }
    lay_out("IPV6ADDR=2001:db8::9\n");
    EXPECT_OUTCOME(set(kAuto), {.result = 0});
    lay_out("IPV6INIT=static\nIPV6PREFIXLENG=48\n");
    EXPECT_OUTCOME(set(kAuto), {.result = 0});
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_prefix_length_of_the_dropped_address_has_any_base) {
    const std::vector<std::pair<std::string, std::string>> lengths{{"", "128"},
                                                                   {"IPV6PREFIXLENG=64\n", "64"},
                                                                   {"IPV6PREFIXLENG=0x40\n", "64"},
                                                                   {"IPV6PREFIXLENG=0100\n", "64"},
                                                                   {"IPV6PREFIXLENG=\n", "0"}};
    for (const auto &[line, length] : lengths) {
        lay_out("IPV6INIT=STATIC\nIPV6ADDR=2001:db8::9\n" + line);
        EXPECT_OUTCOME(set(kAuto), {.commands = {"/sbin/ip -6 address del 2001:db8::9/" + length + " dev eth0"}});
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_address_that_cannot_be_dropped_stops_nothing) {
    lay_out(kStored);
    rig.answer("/sbin/ip -6 address del", 2);
    EXPECT_OUTCOME(set(kAuto),
                   {.log = {"ERR net_set_ip:N excute cmd /sbin/ip address del 2001:db8::9/48 dev eth0 failed",
                            "ERR net_ipv6_ip_action:N set IP failed. IP = eth0, Netmask = 2001:db8::9, prefix = 48",
                            kInfo + "Fail to delete ipv6 address 2001:db8::9, eth0"},
                    .commands = {kDropStored}});
    EXPECT_EQ("0\n2", switches());
    for (const char *length : {"129", "-1", "99999999999999999999"}) {
        lay_out(std::string("IPV6INIT=static\nIPV6ADDR=2001:db8::9\nIPV6PREFIXLENG=") + length + "\n");
        const outcome got = set(kAuto);
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{}, got.commands);
        EXPECT_EQ(kInfo + "Fail to delete ipv6 address 2001:db8::9, eth0", got.log.back());
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_key_that_cannot_be_read_stops_nothing) {
    // one read before each look at the interface tells whether this is a cluster
    const std::vector<std::pair<int, std::string>> reads{{4, "IPV6INIT"}, {5, "IPV6ADDR"}, {6, "IPV6PREFIXLENG"}};
    for (const auto &[nth, key] : reads) {
        lay_out(kStored);
        rig.fail("KLIBCFileGetKeyValue", nth);
        const outcome got = set(kAuto);
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{kInfo + "Fail to get key " + key + ", " + kPath}, got.log);
        EXPECT_EQ(nth == 6 ? texts{"/sbin/ip -6 address del 2001:db8::9/128 dev eth0"} : texts{}, got.commands);
        EXPECT_EQ("0\n2", switches());
    }
    lay_out("IPV6INIT=off\n");
    rig.fail("KLIBCFileGetKeyValue", 2);
    rig.redirect(kAcceptRa, "/tmp/no/such/directory");
    EXPECT_EQ(-1, set(kAuto).result);
    EXPECT_EQ("0\n", read_file(kShownDisable)); // it counts as not off
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_clients_of_both_kinds_are_found_and_stopped) {
    note_client("client");
    note_client("info");
    EXPECT_OUTCOME(set(kAuto), {.commands = {kStop + "client"}}); // one runs at a time: the other is not looked for
    EXPECT_OUTCOME(set(kAuto), {.commands = {kStop + "info"}});
    EXPECT_OUTCOME(set(kAuto), {.result = 0});
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_pid_of_another_process_is_no_client) {
    for (const std::string &content : texts{"", "nonsense\n", "0\n", "-1\n", "999999999\n", std::to_string(getpid())}) {
        write_file(pid_file("client"), content);
        const outcome got = set(kAuto);
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{}, got.commands);
        EXPECT_EQ(texts{}, got.log);
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_pid_file_of_anybody_is_not_believed) {
    note_client("client");
    constexpr uid_t kNobody = 65534;
    ASSERT_EQ(0, chown(pid_file("client").c_str(), kNobody, kNobody));
    EXPECT_OUTCOME(set(kAuto), {.result = 0});
    const std::string other = "/tmp/pid-of-a-client";
    std::filesystem::rename(pid_file("client"), other);
    ASSERT_EQ(0, chown(other.c_str(), 0, 0));
    std::filesystem::create_symlink(other, pid_file("client"));
    EXPECT_OUTCOME(set(kAuto), {.result = 0});
    std::filesystem::rename(other, pid_file("client"));
    EXPECT_OUTCOME(set(kAuto), {.commands = {kStop + "client"}});
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_client_that_does_not_stop_is_told) {
    note_client("info");
    rig.answer(kStop + "info", 1);
    EXPECT_OUTCOME(set(kAuto), {.log = {"WARNING net_ipv6_conf_set:N Failed to stop dhclient on interface [eth0]"},
                                .commands = {kStop + "info"}});
    EXPECT_EQ("0\n2", switches());
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_auto_failures) {
    rig.redirect(kDisable, "/tmp/no/such/directory");
    EXPECT_OUTCOME(set(kAuto), {.result = -1, .log = {"ERR lnx_ipv6_proc_action:N open file " + kDisable + " failed"}});
    EXPECT_EQ("DEVICE=eth0\nIPV6INIT=auto\n", stored());
    rig.redirect(kDisable, kShownDisable);

    rig.fail("KLIBCFileSetKeyValue");
    outcome got = set(kAuto);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(texts{kErr + "Fail to set key IPV6INIT, " + kPath}, got.log);

    rig.fail("KLIBCFileSetKeyValue", 2);
    got = set(kAuto);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ((texts{kErr + "Failed to set key IPV6_ACCEPT_RA in " + kPath, kErr + "Failed to enable ipv6 accept_ra"}),
              got.log);

    rig.redirect(kAcceptRa, "/tmp/no/such/directory");
    EXPECT_OUTCOME(set(kAuto), {.result = -1,
                                .code = 0x900,
                                .unit = kUnit,
                                .log = {kErr + "Failed to open file [" + kAcceptRa + "]",
                                        kErr + "Failed to enable ipv6 accept_ra"}});
    rig.redirect(kAcceptRa, "/dev/full");
    EXPECT_OUTCOME(set(kAuto), {.result = -1,
                                .code = 0xB00,
                                .unit = kUnit,
                                .log = {kErr + "Failed to write file [" + kAcceptRa + "]",
                                        kErr + "Failed to enable ipv6 accept_ra"}});
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_failure_with_ipv6_off_switches_it_off_again) {
    rig.redirect(kAcceptRa, "/tmp/no/such/directory");
    for (const int mode : {kAuto, kDhcp, kStatic, kAutoDhcp}) {
        for (const char *before : {"off", "OFF", "auto"}) {
            lay_out(std::string("IPV6INIT=") + before + "\n");
            EXPECT_EQ(-1, set(mode, "2001:db8::5", 64).result);
            EXPECT_EQ(std::string(before) == "auto" && mode != kStatic ? "0\n" : "1\n", read_file(kShownDisable));
            unlink(pid_file("client").c_str());
            unlink(pid_file("info").c_str());
        }
    }
}

// ---- off

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_off_is_stored_and_switched) {
    lay_out(kStored);
    note_client("info");
    rig.answer(kStop + "info", 0, "", [] { EXPECT_NE(std::string::npos, stored().find("IPV6INIT=\"off\"\n")); });
    EXPECT_OUTCOME(set(kOff), {.commands = {kStop + "info"}});
    EXPECT_EQ("DEVICE=eth0\nIPV6INIT=\"off\"\nIPV6ADDR=\"2001:db8::9\"\nIPV6PREFIXLENG=\"48\"\n"
              "IPV6_DEFAULTGW=\"fe80::9\"\nIPV6_ACCEPT_RA=\"0\"\n",
              stored());
    EXPECT_EQ("1\nunset", switches());
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_off_failures) {
    rig.fail("KLIBCFileSetKeyValue");
    const outcome got = set(kOff);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(texts{kErr + "Fail to set key IPV6INIT, " + kPath}, got.log);
    expect_untouched("DEVICE=eth0\nIPV6INIT=auto\n");
    rig.redirect(kDisable, "/tmp/no/such/directory");
    EXPECT_OUTCOME(set(kOff), {.result = -1, .log = {"ERR lnx_ipv6_proc_action:N open file " + kDisable + " failed"}});
    EXPECT_EQ("DEVICE=eth0\nIPV6INIT=\"off\"\n", stored());
}

// ---- dhcp

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_dhcp_starts_the_client_and_waits) {
    lay_out(kStored);
    note_client("info");
    rig.on_sleep([&](long) {
        EXPECT_EQ((texts{kStop + "info", kStart + "client"}), rig.now.commands);
        EXPECT_EQ(kStored, stored());
        EXPECT_EQ("0\nunset", switches());
    });
    EXPECT_OUTCOME(set(kDhcp), {.commands = {kStop + "info", kStart + "client", kDropStored}, .sleeps = {5000}});
    EXPECT_EQ("DEVICE=eth0\nIPV6INIT=\"dhcp\"\nIPV6ADDR=\"2001:db8::9\"\nIPV6PREFIXLENG=\"48\"\n"
              "IPV6_DEFAULTGW=\"fe80::9\"\nIPV6_ACCEPT_RA=\"1\"\n",
              stored());
    EXPECT_EQ("0\n2", switches());
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_signal_does_not_shorten_the_wait) {
    rig.fail("nanosleep");
    EXPECT_OUTCOME(set(kDhcp), {.commands = {kStart + "client"}, .sleeps = {2500, 2500}});
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_client_that_was_not_stopped_runs_on) {
    for (const auto &[mode, kind] : std::vector<std::pair<int, std::string>>{{kDhcp, "info"}, {kAutoDhcp, "client"}}) {
        lay_out("IPV6INIT=auto\n");
        note_client(kind);
        rig.answer(kStop + kind, 1);
        const outcome got = set(mode);
        EXPECT_EQ(0, got.result);
        EXPECT_EQ((texts{"WARNING net_ipv6_conf_set:N Failed to stop dhclient on interface [eth0]",
                         kInfo + "DHCPv6 already running!"}),
                  got.log);
        EXPECT_EQ(texts{kStop + kind}, got.commands);
        unlink(pid_file(kind).c_str());
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_client_that_does_not_start_fails) {
    for (const auto &[mode, kind] : std::vector<std::pair<int, std::string>>{{kDhcp, "client"}, {kAutoDhcp, "info"}}) {
        for (const int status : {1, 127, -1}) {
            for (const char *before : {"auto", "off"}) {
                lay_out(std::string("IPV6INIT=") + before + "\n");
                rig.answer(kStart + kind, status);
                const outcome got = set(mode);
                EXPECT_EQ(-1, got.result);
                EXPECT_EQ(texts{kStart + kind}, got.commands);
                EXPECT_EQ(std::vector<long>{}, got.sleeps);
                ASSERT_EQ(2U, got.log.size());
                EXPECT_EQ(kErr + "Failed to start dhclient on interface [eth0]", got.log[0]);
                EXPECT_EQ(0U, got.log[1].find(kErr + "Fail to start DHCP:eth0, ")) << got.log[1];
                EXPECT_EQ(std::string("IPV6INIT=") + before + "\n", stored());
                EXPECT_EQ(std::string(before) == "off" ? "1\n" : "0\n", read_file(kShownDisable));
            }
        }
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_client_that_fails_half_way_is_stopped) {
    rig.answer(kStart + "client", 1, "", [this] { note_client("client"); });
    const outcome got = set(kDhcp);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ((texts{kStart + "client", kStop + "client"}), got.commands);
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_dhcp_duplicates_are_removed_and_counted) {
    for (const char *before : {"auto", "off"}) {
        lay_out(std::string("IPV6INIT=") + before + "\n");
        rig.on_sleep([this](long) { rig.replace_file("/proc/net/if_inet6", kSettled + kDuplicate + kDuplicate2); });
        rig.replace_file("/proc/net/if_inet6", kSettled);
        EXPECT_OUTCOME(set(kDhcp), {.result = 2,
                                    .log = {kErr + "ipv6 dad fail, ip:2001:db8::5, pxleng:64"},
                                    .commands = {kStart + "client", "/sbin/ip -6 address del 2001:db8::5/64 dev eth0",
                                                 "/sbin/ip -6 address del 2001:db8::6/64 dev eth0", kStop + "client"},
                                    .sleeps = {5000}});
        EXPECT_EQ(std::string("IPV6INIT=") + before + "\n", stored());
        EXPECT_EQ(std::string(before) == "off" ? "1\nunset" : "0\nunset", switches());
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_dhcp_duplicate_that_cannot_be_removed_fails) {
    rig.replace_file("/proc/net/if_inet6", kSettled + kDuplicate);
    rig.answer("/sbin/ip -6 address del", 2);
    const outcome got = set(kDhcp);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(kErr + "failed to run ipv6 dad failed ip", got.log.back());
    EXPECT_EQ(kStop + "client", got.commands.back());
    EXPECT_EQ("DEVICE=eth0\nIPV6INIT=auto\n", stored());
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_mode_that_cannot_be_stored_stops_the_client) {
    for (const auto &[mode, kind] : std::vector<std::pair<int, std::string>>{{kDhcp, "client"}, {kAutoDhcp, "info"}}) {
        for (const char *before : {"auto", "off"}) {
            lay_out(std::string("IPV6INIT=") + before + "\n");
            rig.fail("KLIBCFileSetKeyValue");
            const outcome got = set(mode);
            EXPECT_EQ(-1, got.result);
            EXPECT_EQ(texts{kErr + "Fail to set key IPV6INIT, " + kPath}, got.log);
            EXPECT_EQ((texts{kStart + kind, kStop + kind}), got.commands);
            EXPECT_EQ(std::string(before) == "off" ? "1\nunset" : "0\nunset", switches());
        }
    }
}

// ---- static

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_sets_checks_and_stores) {
    lay_out(kStored);
    note_client("client");
    rig.answer(kStop + "client", 0, "", [] {
        EXPECT_EQ("unsetunset", switches());
        unlink(pid_file("client").c_str());
    });
    rig.answer("/sbin/ip -6 address add", 0, "", [] { EXPECT_EQ("0\n0", switches()); });
    rig.on_sleep([](long) { EXPECT_NE(std::string::npos, stored().find("IPV6ADDR=\"2001:db8::9\"\n")); });
    EXPECT_OUTCOME(set(kStatic, "2001:db8::5", 64),
                   {.commands = {kStop + "client", kAddAddress}, .events = {kEvent}, .sleeps = {5000}});
    EXPECT_EQ("DEVICE=eth0\nIPV6INIT=\"static\"\nIPV6ADDR=\"2001:db8::5\"\nIPV6PREFIXLENG=\"64\"\n"
              "IPV6_ACCEPT_RA=\"0\"\n",
              stored());
    EXPECT_EQ("0\n0", switches());
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_waits_for_the_link_local_address) {
    rig.replace_file("/proc/net/if_inet6", "");
    rig.on_sleep([this](long) { rig.replace_file("/proc/net/if_inet6", kSettled); });
    const outcome got = set(kStatic, "2001:db8::5", 0, "");
    EXPECT_EQ(0, got.result);
    EXPECT_EQ((std::vector<long>{500, 5000}), got.sleeps);
    EXPECT_NE(std::string::npos, stored().find("IPV6PREFIXLENG=\"0\"\n"));
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_gateways) {
    for (const char *szGateway : {"fe80::1", "febf::1", "2001:db8::1", "2001:db8:0:0:ffff::"}) {
        lay_out("IPV6INIT=auto\n");
        EXPECT_OUTCOME(
            set(kStatic, "2001:db8::5", 64, szGateway),
            {.commands = {kAddAddress, kAddRoute + szGateway + " dev eth0"}, .events = {kEvent}, .sleeps = {5000}});
        EXPECT_EQ(std::string("IPV6INIT=\"static\"\nIPV6_ACCEPT_RA=\"0\"\nIPV6ADDR=\"2001:db8::5\"\n") +
                      "IPV6PREFIXLENG=\"64\"\nIPV6_DEFAULTGW=\"" + szGateway + "\"\n",
                  stored());
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_gateway_elsewhere_is_refused_behind_the_address) {
    for (const char *szGateway : {"2001:db9::1", "2001:db8:0:1::1", "fec0::1"}) {
        for (const char *before : {"auto", "off"}) {
            lay_out(std::string("IPV6INIT=") + before + "\nIPV6_DEFAULTGW=fe80::9\n");
            EXPECT_OUTCOME(set(kStatic, "2001:db8::5", 64, szGateway),
                           {.result = 3,
                            .log = {kErr + "Gateway IP and IPv6 Addr is not the same subnet"},
                            .commands = {kAddAddress},
                            .events = {kEvent},
                            .sleeps = {5000}});
            EXPECT_EQ("IPV6INIT=\"static\"\nIPV6_DEFAULTGW=fe80::9\nIPV6_ACCEPT_RA=\"0\"\nIPV6ADDR=\"2001:db8::5\"\n"
                      "IPV6PREFIXLENG=\"64\"\n",
                      stored());
            EXPECT_EQ(std::string(before) == "off" ? "1\n0" : "0\n0", switches());
        }
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_gateway_that_is_none_fails) {
    for (const std::string &gateway : texts{"nonsense", "fe80::1/64", "192.168.1.1", "::", "ff02::2", long_text(300)}) {
        const outcome got = set(kStatic, "2001:db8::5", 64, gateway.c_str());
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ(0x1000U, got.code);
        EXPECT_EQ(kUnit, got.unit);
        EXPECT_EQ((texts{kErr + "IPv6 router address illegal " + gateway, kErr + "Fail to set IPv6 router"}), got.log);
        EXPECT_EQ(texts{kAddAddress}, got.commands);
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_gateway_failures) {
    for (const int status : {2, 127, -1}) {
        rig.answer("/sbin/ip -6 route", status);
        const outcome got = set(kStatic, "2001:db8::5", 64, "fe80::1");
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ((texts{kErr + "Fail to add ipv6 router fe80::1, v6ip 2001:db8::5, dev eth0",
                         kErr + "Fail to set IPv6 router"}),
                  got.log);
        EXPECT_EQ(std::string::npos, stored().find("IPV6_DEFAULTGW"));
    }
    rig.answer("/sbin/ip -6 route", 0);
    rig.fail("KLIBCFileSetKeyValue", 5);
    const outcome got = set(kStatic, "2001:db8::5", 64, "fe80::1");
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(
        (texts{kErr + "Fail to set key IPV6_DEFAULTGW, " + kPath + " : fe80::1", kErr + "Fail to set IPv6 router"}),
        got.log);
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_link_local_address_is_refused_before_anything) {
    for (const char *before : {"auto", "off", "static"}) {
        const std::string content = std::string("IPV6INIT=") + before + "\n";
        lay_out(content);
        note_client("client");
        for (const char *szIP : {"fe80::5", "FEBF::5"}) {
            EXPECT_OUTCOME(set(kStatic, szIP, 64, "fe80::1"),
                           {.result = 2, .log = {kErr + "Cannot set link local address manually"}});
        }
        expect_untouched(content);
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_address_that_is_none_is_refused_before_anything) {
    lay_out(kStored);
    note_client("client");
    // the tools would refuse the last ones when everything before them is lost
    for (const std::string &text : texts{"", "nonsense", "2001:db8::g", "192.168.1.1", "fe80::1%eth0", long_text(300),
                                         "2001:db8::5/64", "2001:db8::5/", "::", "::1", "ff02::5"}) {
        EXPECT_OUTCOME(set(kStatic, text.c_str(), 64, "fe80::1"),
                       {.result = -1, .code = 0x1000, .unit = kUnit, .log = {kErr + "IPv6 address illegal " + text}});
    }
    EXPECT_OUTCOME(set(kStatic, nullptr, 64),
                   {.result = -1, .code = 0x1000, .unit = kUnit, .log = {kErr + "IPv6 address illegal "}});
    for (const int prefix : {-1, 129, 1000}) {
        EXPECT_OUTCOME(set(kStatic, "2001:db8::5", prefix), refusal(kUnit, "nPrefixLength <= 128"));
    }
    expect_untouched(kStored);
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_duplicate_is_removed_and_not_stored) {
    for (const char *before : {"auto", "off"}) {
        lay_out(std::string("IPV6INIT=") + before + "\n");
        rig.replace_file("/proc/net/if_inet6", kSettled);
        rig.on_sleep([this](long) { rig.replace_file("/proc/net/if_inet6", kSettled + kDuplicate); });
        EXPECT_OUTCOME(set(kStatic, "2001:db8::5", 64, "fe80::1"),
                       {.result = 1,
                        .log = {kErr + "ipv6 dad fail, ip:2001:db8::5, pxleng:64"},
                        .commands = {kAddAddress, "/sbin/ip -6 address del 2001:db8::5/64 dev eth0"},
                        .events = {kEvent},
                        .sleeps = {5000}});
        EXPECT_EQ(std::string("IPV6INIT=") + before + "\nIPV6_ACCEPT_RA=\"0\"\n", stored());
        EXPECT_EQ(std::string(before) == "off" ? "1\n0" : "0\n0", switches());
    }
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_failures) {
    rig.redirect(kAcceptRa, "/tmp/no/such/directory");
    EXPECT_OUTCOME(set(kStatic, "2001:db8::5", 64), {.result = -1,
                                                     .code = 0x900,
                                                     .unit = kUnit,
                                                     .log = {kErr + "Failed to open file [" + kAcceptRa + "]",
                                                             kErr + "Failed to disable ipv6 accept_ra"}});
    EXPECT_EQ("1\n", read_file(kShownDisable));
    rig.redirect(kAcceptRa, kShownAcceptRa);

    rig.answer("/sbin/ip -6 address add", 2);
    outcome got = set(kStatic, "2001:db8::5", 64);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(kErr + "Fail to add ipv6 address 2001:db8::5, eth0", got.log.back());
    EXPECT_EQ(std::vector<long>{}, got.sleeps);
    rig.answer("/sbin/ip -6 address add", 0);

    const std::vector<std::pair<int, std::string>> writes{{2, "IPV6INIT, " + kPath},
                                                          {3, "IPV6ADDR, " + kPath + " : 2001:db8::5"},
                                                          {4, "IPV6PREFIXLENG, " + kPath + " : 64"}};
    for (const auto &[nth, key] : writes) {
        rig.fail("KLIBCFileSetKeyValue", nth);
        got = set(kStatic, "2001:db8::5", 64, "fe80::1");
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ((texts{kErr + "Fail to set key " + key, kErr + "Fail to set ipv6 static key values"}), got.log);
        EXPECT_EQ(texts{kAddAddress}, got.commands);
    }

    rig.fail("KLIBCFileRemoveKey");
    got = set(kStatic, "2001:db8::5", 64);
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(texts{kErr + "Error while removing key IPV6_DEFAULTGW from " + kPath}, got.log);
}

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_static_interface_that_goes_away_meanwhile_fails) {
    note_client("client");
    rig.answer(kStop + "client", 0, "", [this] { kernel.add("eth0", {.flags = 0}); });
    outcome expected = no_such_interface();
    expected.commands = {kStop + "client"};
    EXPECT_OUTCOME(set(kStatic, "2001:db8::5", 64), expected);
    expect_untouched("DEVICE=eth0\nIPV6INIT=auto\n");
}

// ---- auto_dhcp

TEST_F(net_ipv6_conf_set, KOVANetIPv6ConfSet_auto_dhcp_starts_the_client_that_asks_for_no_address) {
    lay_out(kStored);
    note_client("client");
    EXPECT_OUTCOME(set(kAutoDhcp), {.commands = {kStop + "client", kStart + "info", kDropStored}});
    EXPECT_EQ("DEVICE=eth0\nIPV6INIT=\"auto_dhcp\"\nIPV6ADDR=\"2001:db8::9\"\nIPV6PREFIXLENG=\"48\"\n"
              "IPV6_DEFAULTGW=\"fe80::9\"\nIPV6_ACCEPT_RA=\"1\"\n",
              stored());
    EXPECT_EQ("0\n2", switches());
}
