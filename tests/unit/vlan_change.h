/**
 * @file
 * What moves an interface's configuration does the same way whether it goes to a VLAN or comes back from one: what is
 * run and announced, and what is left of it when a step fails.
 */
#pragma once

#include "support/fake_kernel.h"

#include <optional>

namespace kova_test {

class vlan_change : public unit_test {
protected:
    vlan_change(std::string unit, const std::string &from, const std::string &to, const texts &networks, texts locks)
        : unit_{std::move(unit)}, from_{from}, to_{to}, locks_{std::move(locks)},
          commands_{networks[0],
                    networks[1],
                    "/usr/kova/bin/kovafirewall --change-adapter " + from + " " + to,
                    "/usr/kova/bin/kovafirewall --change-security-adapter " + from + " " + to,
                    "/usr/kova/bin/tctool -change_interface " + from + " " + to,
                    "/etc/rc.network nat-restart-dhcp"} {}

    /** How far a change came: nothing, the MTU's key, the row device's file, all of it. */
    enum progress { kNothing, kMtu, kRow, kAll };

    /** An appliance before the change. */
    virtual void begin() = 0;
    virtual outcome change() = 0;
    virtual void expect_files(progress reached) = 0;

    void SetUp() override { begin(); }

    std::string arguments(int result) const {
        return " ORIGIN_IFNAME=[" + from_ + "] IFNAME=[" + to_ + "] RESULT=" + std::to_string(result);
    }
    texts events(int result) const {
        return {"net/ifname_change 4" + arguments(0), "net/ifname_change 5" + arguments(0) + arguments(result)};
    }
    static texts first(const texts &all, size_t number) {
        return {all.begin(), all.begin() + static_cast<long>(number)};
    }
    outcome done(texts log = {}) const {
        return {.log = std::move(log), .commands = commands_, .events = events(0), .locks = locks_, .sleeps = {2000}};
    }
    std::string event_failure(const char *phase, const char *code) const {
        return "ERR " + unit_ + ":N Fail to execute net plugin (" + phase + ") [" + code + " platform:N]";
    }

    /** A step of a change, how it is made to fail, and what the call did then. */
    struct step {
        const char *name;
        std::function<void()> arrange;
        unsigned code;
        std::string unit;
        texts log;
        progress reached;
        size_t commands;
        std::optional<size_t> locks{};
        std::string last_command{}; ///< beyond those of every call
        std::string server_file{};  ///< the only one of the DHCP server that is there then
    };

    void fail_tool(size_t number) { rig.answer(commands_[number], 1); }

    /** The steps that follow when both files are in their places; the server's switch takes the nth rename. */
    std::vector<step> steps_after_files(int rename) {
        const std::string no_tool = "ERR " + unit_ + ":N Failed to /usr/kova/bin/";
        const std::string renamed = " -change_interface " + from_ + " " + to_;
        const std::string moved = "from [" + from_ + "] to [" + to_ + "]";
        const std::string files = "/etc/dhcpd/dhcpd-";
        const std::string server = "ERR dhcpd_conf_change_interface:N ";
        const std::string replace = "/bin/sed -i s/" + from_ + "/" + to_ + "/g " + files + to_ + "-subnet0.conf";
        return {
            {"firewall", [this] { fail_tool(2); }, 0, "", {no_tool + "kovafirewall" + renamed}, kAll, 3},
            {"firewall's rules", [this] { fail_tool(3); }, 0, "", {no_tool + "kovafirewall" + renamed}, kAll, 4},
            {"traffic control", [this] { fail_tool(4); }, 0, "", {no_tool + "tctool" + renamed}, kAll, 5},
            {"DHCP server's files",
             [this] {
                 shell("mkdir /etc/dhcpd");
                 rig.fail("KLIBCFileEnumDir");
             },
             0x900,
             "platform",
             {server + "bad enum [dhcpd-" + from_ + "-subnet] in [/etc/dhcpd]",
              server + "Failed to move DHCP tag conf " + moved},
             kAll,
             5},
            {"DHCP server's switch",
             [this, rename, files] {
                 write_file(files + from_ + ".info", "enable=yes\n");
                 rig.fail("rename", rename);
             },
             0,
             "",
             {server + "Failed to rename [" + files + from_ + ".info][" + files + to_ + ".info]",
              server + "Failed to move interface global setting " + moved},
             kAll,
             5,
             {},
             "",
             "dhcpd-" + from_ + ".info"},
            {"DHCP server's subnets",
             [this, files] {
                 write_file(files + from_ + "-subnet0.conf", "interface=" + from_ + "\n");
                 rig.answer("/bin/sed", 1);
             },
             0,
             "",
             {server + "Failed to sed [" + replace + "]",
              server + "Failed to replace tag in [" + files + to_ + "-subnet0.conf]",
              server + "Failed to move DHCP tag conf " + moved},
             kAll,
             5,
             {},
             replace,
             "dhcpd-" + to_ + "-subnet0.conf"},
            {"DHCP server", [this] { fail_tool(5); }, 0, "", {}, kAll, 6},
        };
    }

    /** Each step fails in turn, and the change stops there. */
    void fail_each(const std::vector<step> &steps) {
        for (const step &one : steps) {
            SCOPED_TRACE(one.name);
            begin();
            one.arrange();
            const outcome got = change();
            outcome expected{.result = -1,
                             .code = one.code,
                             .unit = one.unit,
                             .log = one.log,
                             .commands = first(commands_, one.commands),
                             .events = events(-1),
                             .locks = first(locks_, one.locks.value_or(locks_.size()))};
            if (!one.last_command.empty()) {
                expected.commands.push_back(one.last_command);
            }
            if (one.commands > 1) {
                expected.sleeps = {2000};
            }
            EXPECT_OUTCOME(got, expected);
            expect_files(one.reached);
            if (!one.server_file.empty()) {
                EXPECT_EQ(texts{one.server_file}, list_dir("/etc/dhcpd"));
            }
        }
    }

    /** Nothing can be written where the interface files are. */
    void disk_that_takes_nothing() {
        const std::string folder = "/etc/sysconfig/network-scripts";
        shell("cp -a " + folder + " /tmp/scripts && mount -t tmpfs tmpfs " + folder + " && cp -a /tmp/scripts/. " +
              folder + " && mount -o remount,ro " + folder);
        const outcome got = change();
        EXPECT_EQ(-1, got.result);
        EXPECT_EQ(0x900U, got.code);
        EXPECT_EQ(texts{}, got.commands);
        EXPECT_EQ(events(-1), got.events);
        expect_files(kMtu);
        shell("umount " + folder + " && rm -r /tmp/scripts");
    }

    // ---- events

    void event_that_cannot_be_opened() {
        rig.fail("KLIBPluginSDKInit");
        EXPECT_OUTCOME(change(), {.result = -1,
                                  .code = 0x200,
                                  .unit = "platform",
                                  .log = {"ERR " + unit_ + ":N Fail to init plugin) [0x0200 platform:N]"}});
        expect_files(kNothing);
    }
    void events_that_fail() {
        for (const int nth : {1, 2}) {
            begin();
            rig.fail("KLIBPluginAction", nth);
            outcome expected = done({event_failure(nth == 1 ? "PRE" : "POST", "0x2A00")});
            expected.code = 0x2A00;
            expected.unit = "platform";
            EXPECT_OUTCOME(change(), expected);
            expect_files(kAll);
        }
    }
    void events_that_are_not_open() {
        for (const int nth : {1, 2}) {
            begin();
            rig.fail("KLIBPluginHasInit", nth);
            const outcome got = change();
            EXPECT_EQ(0, got.result);
            EXPECT_EQ(texts{}, got.log);
            EXPECT_EQ(nth == 1 ? texts{"net/ifname_change 5" + arguments(0)} : first(events(0), 1), got.events);
            expect_files(kAll);
        }
    }
    /** The nth of the calls that set arguments fails; those that were set before the change stay for the event after
     * it. */
    void event_arguments_that_cannot_be_set_before(const std::string &call, int nth, const std::string &stay) {
        rig.fail(call, nth);
        expect_one_event("PRE", "net/ifname_change 5" + stay + arguments(0));
    }
    void event_arguments_that_cannot_be_set_after(const std::string &call, int nth) {
        begin();
        rig.fail(call, nth);
        expect_one_event("POST", events(0)[0]);
    }
    void expect_one_event(const char *failed, const std::string &event) {
        const outcome got = change();
        EXPECT_EQ(0, got.result);
        EXPECT_EQ(texts{event_failure(failed, "0x0200")}, got.log);
        EXPECT_EQ(texts{event}, got.events);
        expect_files(kAll);
    }

    const std::string unit_, from_, to_;
    const texts locks_, commands_;
    std::optional<fake_kernel> kernel;
};

} // namespace kova_test
