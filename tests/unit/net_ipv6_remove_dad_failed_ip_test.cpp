#include "support/memory.h"
#include "support/rig.h"

#include <cstring>
#include <kovanetsdk/ipv6.h>

using namespace kova_test;

namespace {

const std::string kGood = "20010db8000000000000000000000001 02 40 00 80     eth0\n";
const std::string kOther = "20010db80000000000000000000000ff 03 40 00 88     eth1\n";

/** A line of the kernel's list with a duplicate: 2001:db8::NN. */
std::string duplicate(int number) {
    char line[80];
    snprintf(line, sizeof line, "20010db800000000000000000000%04x 02 40 00 88     eth0\n", number);
    return line;
}

std::string removal(int number) {
    char command[96];
    snprintf(command, sizeof command, "/sbin/ip -6 address del 2001:db8::%x/64 dev eth0", number);
    return command;
}

} // namespace

class net_ipv6_remove_dad_failed_ip : public unit_test {
protected:
    outcome remove(const std::string &list, int room = 4) {
        rig.replace_file("/proc/net/if_inet6", list);
        return rig.observe([=, this] {
            memset(removed, 'x', sizeof removed);
            return KOVANetIPv6RemoveDADFailedIP("eth0", removed, room);
        });
    }

    KOVAV6IP removed[8];
};

TEST_F(net_ipv6_remove_dad_failed_ip, KOVANetIPv6RemoveDADFailedIP_bad_name_is_refused) {
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetIPv6RemoveDADFailedIP(nullptr, removed, 4); }),
                   refusal("net_ipv6_remove_dad_failed_ip", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetIPv6RemoveDADFailedIP("", removed, 4); }),
                   refusal("net_ipv6_remove_dad_failed_ip", "'\\0' != *szIfname"));
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(rig.observe([&] { return KOVANetIPv6RemoveDADFailedIP(name.c_str(), removed, 4); }),
                       refusal("net_ipv6_remove_dad_failed_ip", "is_interface_name(szIfname)"));
    }
}

TEST_F(net_ipv6_remove_dad_failed_ip, KOVANetIPv6RemoveDADFailedIP_nothing_found_removes_nothing) {
    EXPECT_OUTCOME(remove(""), {.result = 0});
    EXPECT_OUTCOME(remove(kGood + kOther), {.result = 0});
    EXPECT_EQ('x', removed[0].szIP[0]);
}

TEST_F(net_ipv6_remove_dad_failed_ip, KOVANetIPv6RemoveDADFailedIP_duplicates_are_removed_and_given) {
    EXPECT_OUTCOME(remove(duplicate(2) + kGood + kOther + duplicate(3)),
                   {.result = 2, .commands = {removal(2), removal(3)}});
    EXPECT_STREQ("2001:db8::2", removed[0].szIP);
    EXPECT_EQ(64U, removed[0].nPrefixLength);
    EXPECT_EQ(0x88, removed[0].nFlags);
    EXPECT_STREQ("2001:db8::3", removed[1].szIP);
    EXPECT_EQ('x', removed[2].szIP[0]);
}

TEST_F(net_ipv6_remove_dad_failed_ip, KOVANetIPv6RemoveDADFailedIP_room_bounds_what_is_given) {
    const std::string list = duplicate(2) + duplicate(3) + duplicate(4);
    for (const int room : {-1, 0, 2}) {
        EXPECT_OUTCOME(remove(list, room), {.result = 3, .commands = {removal(2), removal(3), removal(4)}});
        EXPECT_EQ(room > 0 ? '2' : 'x', removed[0].szIP[0]);
        EXPECT_EQ('x', removed[2].szIP[0]);
    }
    EXPECT_OUTCOME(rig.observe([] { return KOVANetIPv6RemoveDADFailedIP("eth0", nullptr, 4); }),
                   {.result = 3, .commands = {removal(2), removal(3), removal(4)}});
}

TEST_F(net_ipv6_remove_dad_failed_ip, KOVANetIPv6RemoveDADFailedIP_sixteen_and_more_are_all_looked_at) {
    for (const int number : {16, 17, 40}) {
        std::string list;
        texts commands;
        for (int i = 1; i <= number; ++i) {
            list += duplicate(i);
            commands.push_back(removal(i));
        }
        EXPECT_OUTCOME(remove(list), {.result = number, .commands = commands});
        EXPECT_STREQ("2001:db8::4", removed[3].szIP);
        EXPECT_EQ('x', removed[4].szIP[0]);
    }
}

TEST_F(net_ipv6_remove_dad_failed_ip, KOVANetIPv6RemoveDADFailedIP_first_failure_ends_the_call) {
    rig.answer(removal(3), 2);
    EXPECT_OUTCOME(
        remove(duplicate(2) + duplicate(3) + duplicate(4)),
        {.result = -1,
         .log = {"ERR net_set_ip:N excute cmd /sbin/ip address del 2001:db8::3/64 dev eth0 failed",
                 "ERR net_ipv6_ip_action:N set IP failed. IP = eth0, Netmask = 2001:db8::3, prefix = 64",
                 "ERR net_ipv6_remove_dad_failed_ip:N Fail to remove DAD fail ipv6 address, eth0:2001:db8::3/64"},
         .commands = {removal(2), removal(3)}});
    EXPECT_STREQ("2001:db8::2", removed[0].szIP);
    EXPECT_EQ('x', removed[1].szIP[0]);
}

TEST_F(net_ipv6_remove_dad_failed_ip, KOVANetIPv6RemoveDADFailedIP_list_that_cannot_be_read_counts_as_empty) {
    const std::string not_open =
        "ERR lnx_v6_ip_get:N Fail to open [/proc/net/if_inet6], errno=[24/Too many open files]";
    rig.fail("fopen");
    EXPECT_OUTCOME(remove(duplicate(2)), {.result = 0, .code = 0x900, .unit = "lnx_v6_ip_get", .log = {not_open}});
    std::string list;
    for (int i = 1; i <= 17; ++i) {
        list += duplicate(i);
    }
    rig.fail("fopen", 2);
    EXPECT_OUTCOME(remove(list), {.result = 0, .code = 0x900, .unit = "lnx_v6_ip_get", .log = {not_open}});
}

TEST_F(net_ipv6_remove_dad_failed_ip, KOVANetIPv6RemoveDADFailedIP_without_memory_for_more_removes_none) {
    NEEDS_OWN_ALLOCATOR();
    std::string list;
    for (int i = 1; i <= 17; ++i) {
        list += duplicate(i);
    }
    rig.fail("calloc");
    EXPECT_OUTCOME(remove(list), {.result = -1, .code = 0x100, .unit = "net_ipv6_remove_dad_failed_ip"});
}
