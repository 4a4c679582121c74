#include "support/fake_kernel.h"

#include <cstring>
#include <kova/core.h>
#include <kovanetsdk/dhcp.h>
#include <kovanetsdk/iface.h>
#include <sys/wait.h>
#include <unistd.h>

using namespace kova_test;

namespace {

const std::string kBefore = "DEVICE=eth0\nBOOTPROTO=none\nMASTER=bond0\nSLAVE=yes\nIPADDR=1.2.3.4\nNETMASK=255.0.0.0\n"
                            "LOCAL_LAN=\"yes\"\n";
const std::string kDhcp = "DEVICE=eth0\nBOOTPROTO=dhcp\nLOCAL_LAN=\"yes\"\nONBOOT=yes\n";
const std::string kStatic = "DEVICE=eth0\nBOOTPROTO=static\nIPADDR=10.1.2.3\nNETMASK=255.255.255.0\n"
                            "LOCAL_LAN=\"yes\"\nONBOOT=yes\n";
const std::string kCopy = "/bin/cp -f /etc/sysconfig/network-scripts/ifcfg-eth0 "
                          "/etc/sysconfig/network-scripts/ifcfg-eth0.tmp1700000000";
const std::string kStop = "/sbin/stop dhcp-client IFACE=eth0";
const std::string kStart = "/sbin/start dhcp-client IFACE=eth0";
const std::string kTakeDown = "/sbin/ifconfig eth0 0.0.0.0";
const std::string kSetNew = "/sbin/ifconfig eth0 10.1.2.3 netmask 255.255.255.0";
const std::string kReload = "/usr/kova/service/ddns reload";
const std::string kEvent = "net/ipv4_change 4 IFNAME=eth0 ORIGIN_ADDRESS=192.168.1.10 NEW_ADDRESS=10.1.2.3 "
                           "PREFIX_LENGTH=-1 IS_LINK=true";
const texts kLocked{"+0x106", "-0x100"};

NETINFO card(const std::string &ip, const std::string &mask = "255.255.255.0", const std::string &ifname = "eth0") {
    NETINFO info = {};
    info.nIPSource = 1;
    snprintf(info.szIfname, sizeof info.szIfname, "%s", ifname.c_str());
    snprintf(info.szIP, sizeof info.szIP, "%s", ip.c_str());
    snprintf(info.szMask, sizeof info.szMask, "%s", mask.c_str());
    return info;
}

NETINFO dhcp_card(const std::string &ifname = "eth0") {
    NETINFO info = card("", "", ifname);
    info.nIPSource = 0;
    return info;
}

} // namespace

class net_set_card1 : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        write_file(ifcfg("eth0"), kBefore);
        write_file("/usr/kova/service/ddns", "");
        write_file("/etc/ppp/old_gateway.bak", "left");
        write_file("/etc/resolv.conf.bak", "left");
        kernel.add("eth0", {.ip = "192.168.1.10"});
    }
    outcome set(NETINFO wanted, const NETINFO *pOld = nullptr) {
        return rig.observe([&] {
            NETINFO old = pOld != nullptr ? *pOld : NETINFO{};
            return KOVANetSetCard1(&wanted, pOld != nullptr ? &old : nullptr);
        });
    }
    void expect_file(const std::string &content) {
        EXPECT_EQ(content, read_file(ifcfg("eth0")));
        EXPECT_EQ(texts{"ifcfg-eth0"}, list_dir("/etc/sysconfig/network-scripts"));
    }
    void expect_leftovers(const std::string &content) {
        EXPECT_EQ(content, read_file("/etc/ppp/old_gateway.bak"));
        EXPECT_EQ(content, read_file("/etc/resolv.conf.bak"));
    }

    fake_kernel kernel{rig};
};

TEST_F(net_set_card1, KOVANetSetCard1_without_record_is_refused) {
    NETINFO old = card("10.1.2.3");
    EXPECT_OUTCOME(rig.observe([] { return KOVANetSetCard1(nullptr, nullptr); }),
                   refusal("net_set_card1", "NULL != pNew"));
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetSetCard1(nullptr, &old); }),
                   refusal("net_set_card1", "NULL != pNew"));
}

TEST_F(net_set_card1, KOVANetSetCard1_lock_held_elsewhere_changes_nothing) {
    const outcome expected{.result = -1,
                           .code = 0x400,
                           .unit = "net_set_card1",
                           .log = {"ERR net_set_card1:N KLIBCFileLock() failed.(400)"}};
    for (const uint32_t word : {0x105U, 0x106U}) {
        const lock_elsewhere held{word};
        for (const NETINFO &wanted : {card("10.1.2.3"), dhcp_card()}) {
            outcome got = set(wanted);
            got.sleeps.clear(); // the lock's own waiting
            EXPECT_OUTCOME(got, expected);
        }
    }
    expect_file(kBefore);
    expect_leftovers("left");
}

TEST_F(net_set_card1, KOVANetSetCard1_static_sets_and_announces) {
    EXPECT_OUTCOME(set(card("10.1.2.3")),
                   {.commands = {kCopy, kStop, kTakeDown, kSetNew, kReload}, .events = {kEvent}, .locks = kLocked});
    expect_file(kStatic);
    expect_leftovers("<absent>");
}

TEST_F(net_set_card1, KOVANetSetCard1_any_source_but_zero_is_static) {
    NETINFO wanted = card("10.1.2.3");
    wanted.nIPSource = 0x80000000;
    EXPECT_EQ(0, set(wanted).result);
    expect_file(kStatic);
}

TEST_F(net_set_card1, KOVANetSetCard1_unchanged_address_does_not_reload_ddns) {
    const NETINFO old = card("10.1.2.3");
    EXPECT_OUTCOME(set(card("10.1.2.3"), &old),
                   {.commands = {kCopy, kStop, kTakeDown, kSetNew}, .events = {kEvent}, .locks = kLocked});
    expect_leftovers("<absent>");
}

TEST_F(net_set_card1, KOVANetSetCard1_changed_address_or_mask_reloads_ddns) {
    for (const NETINFO &old : {card("10.1.2.4"), card("10.1.2.3", "255.255.0.0"), card("10.1.2.33"), card("", "")}) {
        const outcome got = set(card("10.1.2.3"), &old);
        EXPECT_EQ(0, got.result);
        EXPECT_EQ((texts{kCopy, kStop, kTakeDown, kSetNew, kReload}), got.commands);
    }
}

TEST_F(net_set_card1, KOVANetSetCard1_ddns_that_does_not_reload_is_no_failure) {
    rig.answer(kReload, 1);
    EXPECT_EQ(0, set(card("10.1.2.3")).result);
    expect_file(kStatic);
}

TEST_F(net_set_card1, KOVANetSetCard1_no_leftovers_is_no_failure) {
    shell("rm /etc/ppp/old_gateway.bak /etc/resolv.conf.bak");
    const outcome got = set(card("10.1.2.3"));
    EXPECT_EQ(0, got.result);
    EXPECT_EQ(texts{}, got.log);
}

TEST_F(net_set_card1, KOVANetSetCard1_address_that_does_not_fit_changes_nothing) {
    const NETINFO cards[] = {card("10.1.2.255"),   card("127.0.0.1"),           card("", ""),
                             card("10.1.2.3", ""), card("10.1.2.3", "0.0.0.0"), card("10.1.2.3", "255.0.255.0"),
                             card("nonsense"),     card("10.1.2.3\n"),          card("10.1.2.3", "255.255.255.0\n")};
    for (const NETINFO &wanted : cards) {
        const outcome got = set(wanted);
        EXPECT_EQ(-1, got.result) << wanted.szIP;
        EXPECT_EQ(0x1000U, got.code) << wanted.szIP << " " << wanted.szMask;
        EXPECT_EQ(texts{}, got.commands);
        EXPECT_EQ(kLocked, got.locks);
    }
    expect_file(kBefore);
    expect_leftovers("left");
}

TEST_F(net_set_card1, KOVANetSetCard1_failing_static_step_puts_the_file_back) {
    struct step {
        const char *command;
        texts commands;
    };
    const step steps[] = {{"/sbin/ifconfig eth0 0.0.0.0", {kCopy, kStop, kTakeDown}},
                          {"/sbin/ifconfig eth0 10.1.2.3", {kCopy, kStop, kTakeDown, kSetNew}}};
    for (const step &failing : steps) {
        rig.answer(failing.command, 1);
        const outcome got = set(card("10.1.2.3"));
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ(failing.commands, got.commands);
        EXPECT_EQ(kLocked, got.locks);
        expect_file(kBefore);
        expect_leftovers("left");
        rig.answer(failing.command, 0);
    }
}

TEST_F(net_set_card1, KOVANetSetCard1_static_name_that_is_none_is_refused) {
    for (const std::string &name : bad_names()) {
        if (name.size() < sizeof NETINFO::szIfname) {
            outcome expected = refusal("net_lnx_set_ip_netmask", "is_interface_name(szIfname)");
            expected.locks = kLocked;
            EXPECT_OUTCOME(set(card("10.1.2.3", "255.255.255.0", name)), expected);
        }
    }
    outcome expected = refusal("net_lnx_set_ip_netmask", "'\\0' != *szIfname");
    expected.locks = kLocked;
    EXPECT_OUTCOME(set(card("10.1.2.3", "255.255.255.0", "")), expected);
    expect_file(kBefore);
}

TEST_F(net_set_card1, KOVANetSetCard1_fields_without_end_are_not_read_further) {
    // what follows each field is filled, too, so that a slip would show in the commands
    NETINFO wanted;
    memset(&wanted, 'x', sizeof wanted);
    memcpy(wanted.szIfname, "abcdefghijklmnop", 16);
    memcpy(wanted.szIP, "010.0000001.02.00003", 20);
    memcpy(wanted.szMask, "255.255.255.0\0xxxxxx", 20);
    kernel.add("abcdefghijklmnop");
    const outcome got = set(wanted);
    EXPECT_EQ(-1, got.result); // the kernel has no name of 16 characters
    EXPECT_EQ(0x3400U, got.code);
    EXPECT_EQ((texts{"/bin/cp -f /etc/sysconfig/network-scripts/ifcfg-abcdefghijklmnop "
                     "/etc/sysconfig/network-scripts/ifcfg-abcdefghijklmnop.tmp1700000000",
                     "/sbin/stop dhcp-client IFACE=abcdefghijklmnop"}),
              got.commands);

    memset(&wanted, 'x', sizeof wanted);
    EXPECT_EQ(0x1000U, set(wanted).code); // no address
    wanted.nIPSource = 0;
    EXPECT_EQ(
        (texts{"/sbin/stop dhcp-client IFACE=xxxxxxxxxxxxxxxx", "/sbin/start dhcp-client IFACE=xxxxxxxxxxxxxxxx"}),
        set(wanted).commands);
}

// ---- DHCP

TEST_F(net_set_card1, KOVANetSetCard1_dhcp_restarts_the_client_and_stores) {
    const NETINFO old = card("10.1.2.3");
    for (const NETINFO *pOld : {static_cast<const NETINFO *>(nullptr), &old}) {
        write_file(ifcfg("eth0"), kBefore);
        EXPECT_OUTCOME(set(dhcp_card(), pOld), {.commands = {kStop, kStart}, .locks = kLocked});
        expect_file(kDhcp);
        expect_leftovers("left");
    }
}

TEST_F(net_set_card1, KOVANetSetCard1_dhcp_without_file_makes_one) {
    shell("rm " + ifcfg("eth0"));
    EXPECT_OUTCOME(set(dhcp_card()), {.commands = {kStop, kStart}, .locks = kLocked});
    expect_file("DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=dhcp\n");
}

TEST_F(net_set_card1, KOVANetSetCard1_dhcp_client_that_does_not_stop_is_only_warned_of) {
    rig.answer("/sbin/stop", 1);
    EXPECT_OUTCOME(set(dhcp_card()), {.log = {"WARNING KOVAILnxSetDHCP(N) unable to stop dhcp-client instance on eth0"},
                                      .commands = {kStop, kStart},
                                      .locks = kLocked});
    expect_file(kDhcp);
}

TEST_F(net_set_card1, KOVANetSetCard1_dhcp_client_that_does_not_start_writes_nothing) {
    for (const int status : {1, 127, -1, 137}) {
        rig.answer("/sbin/start", status);
        EXPECT_OUTCOME(set(dhcp_card()),
                       {.result = -1,
                        .code = 0x2A00,
                        .unit = "net_set_card1",
                        .log = {"ERR KOVAILnxSetDHCP(N) unable to start dhcp-client instance on eth0"},
                        .commands = {kStop, kStart},
                        .locks = kLocked});
        expect_file(kBefore);
    }
}

TEST_F(net_set_card1, KOVANetSetCard1_dhcp_file_not_written_is_minus_two) {
    const outcome expected{.result = -2,
                           .log = {"ERR net_set_card1:N Set /etc/sysconfig/network-scripts/ifcfg-eth0 error."},
                           .commands = {kStop, kStart},
                           .locks = kLocked};
    const std::map<std::string, unsigned> operations{
        {"KLIBCFileSetKeys", 0xB00}, {"KLIBCSzHashAlloc", 0x200}, {"KLIBCSzHashSetValue", 0x200}};
    for (const auto &[operation, code] : operations) {
        rig.fail(operation);
        outcome wanted = expected;
        wanted.code = code;
        wanted.unit = code == 0x200 ? "net_set_card1" : "platform";
        EXPECT_OUTCOME(set(dhcp_card()), wanted);
        expect_file(kBefore);
    }
}

TEST_F(net_set_card1, KOVANetSetCard1_dhcp_on_a_read_only_file_system_is_minus_two) {
    const std::string directory = "/etc/sysconfig/network-scripts";
    shell("mount -t tmpfs -o size=64k tmpfs " + directory);
    write_file(ifcfg("eth0"), kBefore);
    shell("mount -o remount,ro " + directory);
    const outcome got = set(dhcp_card());
    EXPECT_EQ(-2, got.result);
    EXPECT_NE(0U, got.code);
    EXPECT_EQ((texts{kStop, kStart}), got.commands);
    EXPECT_EQ(kLocked, got.locks);
    expect_file(kBefore);
    shell("umount " + directory);
}

TEST_F(net_set_card1, KOVANetSetCard1_dhcp_name_that_is_none_is_refused) {
    outcome expected = refusal("net_set_card1", "'\\0' != *szIfname");
    expected.locks = kLocked;
    EXPECT_OUTCOME(set(dhcp_card("")), expected);
    expected = refusal("net_set_card1", "is_interface_name(szIfname)");
    expected.locks = kLocked;
    for (const std::string &name : bad_names()) {
        if (name.size() < sizeof NETINFO::szIfname) {
            EXPECT_OUTCOME(set(dhcp_card(name)), expected);
        }
    }
    expect_file(kBefore);
}

// ---- the lock

TEST_F(net_set_card1, KOVANetSetCard1_lock_is_held_over_everything) {
    // while the client is started nobody else gets the lock; this process does, and keeps it
    bool is_free_elsewhere = true;
    rig.answer("/sbin/start", 0, "", [&] {
        const pid_t child = fork();
        if (child == 0) {
            _exit(KLIBCFileLock(0x105, 0) == 0 ? 1 : 0);
        }
        int status = 0;
        waitpid(child, &status, 0);
        is_free_elsewhere = WEXITSTATUS(status) != 0;
        EXPECT_EQ(0, KLIBCFileLock(0x105, 0));
        EXPECT_EQ(0, KLIBCFileUnlock(0x100));
    });
    EXPECT_OUTCOME(set(dhcp_card()), {.commands = {kStop, kStart}, .locks = {"+0x106", "+0x105", "-0x100", "-0x100"}});
    EXPECT_FALSE(is_free_elsewhere);
}

TEST_F(net_set_card1, KOVANetSetCard1_under_its_callers_lock_leaves_that_held) {
    const outcome got = rig.observe([] {
        NETINFO wanted = dhcp_card();
        KLIBCFileLock(0x106, 5);
        const int result = KOVANetSetCard1(&wanted, nullptr);
        EXPECT_EQ(1, BlKOVALnxIsDHCP("eth0"));
        KLIBCFileUnlock(0x100);
        return result;
    });
    EXPECT_OUTCOME(
        got, {.commands = {kStop, kStart}, .locks = {"+0x106", "+0x106", "-0x100", "+0x105", "-0x100", "-0x100"}});
}
