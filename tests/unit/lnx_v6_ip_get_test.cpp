#include "support/rig.h"

#include <cerrno>
#include <cstring>
#include <kovanetsdk/ipv6.h>

using namespace kova_test;

namespace {

/** What a record says, for one comparison. */
std::string text(const KOVAV6IP &address) {
    char line[128];
    snprintf(line, sizeof line, "%s/%u scope %x flags %x", address.szIP, address.nPrefixLength, address.nScope,
             address.nFlags);
    return line;
}

} // namespace

class lnx_v6_ip_get : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        memset(records, 'x', sizeof records);
    }
    outcome get(const std::string &list, int room = 4, const char *szIfname = "eth0") {
        rig.replace_file("/proc/net/if_inet6", list);
        return rig.observe([=, this] {
            errno = 0;
            return KOVALnxV6IPGet(szIfname, records, room);
        });
    }

    KOVAV6IP records[32];
};

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_bad_argument_is_refused) {
    EXPECT_OUTCOME(rig.observe([&] { return KOVALnxV6IPGet(nullptr, records, 1); }),
                   refusal("lnx_v6_ip_get", "((void *)0) != szIfname"));
    EXPECT_OUTCOME(rig.observe([&] { return KOVALnxV6IPGet("", records, 1); }),
                   refusal("lnx_v6_ip_get", "'\\0' != *szIfname"));
    EXPECT_OUTCOME(rig.observe([] { return KOVALnxV6IPGet("eth0", nullptr, 1); }),
                   refusal("lnx_v6_ip_get", "NULL != rgV6IP"));
    for (const int room : {0, -1, -2147483647 - 1}) {
        EXPECT_OUTCOME(rig.observe([&] { return KOVALnxV6IPGet("eth0", records, room); }),
                       refusal("lnx_v6_ip_get", "0 < cMax"));
    }
    EXPECT_EQ('x', records[0].szIP[0]);
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_list_that_cannot_be_opened_fails_with_zeroed_records) {
    rig.hide("/proc/net/if_inet6");
    EXPECT_OUTCOME(
        rig.observe([&] { return KOVALnxV6IPGet("eth0", records, 2); }),
        {.result = -1,
         .code = 0x900,
         .unit = "lnx_v6_ip_get",
         .log = {"ERR lnx_v6_ip_get:N Fail to open [/proc/net/if_inet6], errno=[2/No such file or directory]"}});
    const KOVAV6IP zero = {};
    EXPECT_EQ(0, memcmp(&zero, &records[0], sizeof zero));
    EXPECT_EQ(0, memcmp(&zero, &records[1], sizeof zero));
    EXPECT_EQ('x', records[2].szIP[0]);
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_addresses_of_the_interface_are_read) {
    EXPECT_OUTCOME(get("00000000000000000000000000000001 01 80 10 80       lo\n"
                       "fe80000000000000000000fffe000001 02 40 20 c0     eth0\n"
                       "20010db800000000000000000000abcd 03 40 00 80    eth01\n"
                       "20010DB8000000000000000000000001 02 7f 00 08     eth0\n"),
                   {.result = 2});
    EXPECT_EQ("fe80::ff:fe00:1/64 scope 20 flags c0", text(records[0]));
    EXPECT_EQ("2001:db8::1/127 scope 0 flags 8", text(records[1]));
    const KOVAV6IP zero = {};
    EXPECT_EQ(0, memcmp(&zero, &records[2], sizeof zero));
    EXPECT_EQ(0, memcmp(&zero, &records[3], sizeof zero));
    EXPECT_EQ('x', records[4].szIP[0]);
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_empty_list_is_none) {
    EXPECT_OUTCOME(get(""), {.result = 0});
    EXPECT_OUTCOME(get("\n\n"), {.result = 0});
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_interface_index_of_any_width_is_skipped) {
    for (const char *index : {"2", "02", "1a2", "1234", "ffffffff", "12345678"}) {
        EXPECT_OUTCOME(get("fe80000000000000000000000000000a " + std::string(index) + " 40 20 80     eth0\n"),
                       {.result = 1});
        EXPECT_EQ("fe80::a/64 scope 20 flags 80", text(records[0])) << index;
    }
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_more_than_room_is_counted) {
    std::string list;
    for (int i = 0; i < 20; ++i) {
        char line[80];
        snprintf(line, sizeof line, "20010db80000000000000000000000%02x 02 40 00 80     eth0\n", i + 1);
        list += line;
    }
    EXPECT_OUTCOME(get(list, 16), {.result = 20});
    EXPECT_EQ("2001:db8::1/64 scope 0 flags 80", text(records[0]));
    EXPECT_EQ("2001:db8::10/64 scope 0 flags 80", text(records[15]));
    EXPECT_EQ('x', records[16].szIP[0]);
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_longest_address_fits) {
    EXPECT_OUTCOME(get("ffffffffffffffffffffffffffffffff ffff 80 20 ffff     eth0\n"), {.result = 1});
    EXPECT_EQ("ffff:ffff:ffff:ffff:ffff:ffff:ffff:ffff/128 scope 20 flags ffff", text(records[0]));
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_digits_that_are_none_are_told_and_the_line_is_used) {
    EXPECT_OUTCOME(get("fe8000000000000000000000000000xy 02 40 20 80     eth0\n"),
                   {.result = 1, .log = {"INFO lnx_v6_ip_get:N inet_pton failed. Success"}});
    EXPECT_EQ("::/64 scope 20 flags 80", text(records[0]));
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_lines_that_are_none_are_passed_over) {
    const std::string good = "fe80000000000000000000000000000a 02 40 20 80     eth0\n";
    const texts lines{"eth0",
                      "fe80000000000000000000000000000",
                      "fe80000000000000000000000000000a",
                      "fe80000000000000000000000000000a ",
                      "fe80000000000000000000000000000a 02 40 20",
                      "fe80000000000000000000000000000a 02 40 20 80",
                      "fe80000000000000000000000000000a 02 zz 20 80 eth0",
                      "fe80000000000000000000000000000a 02 40 20 80 eth0" + long_text(300),
                      std::string("fe80\0", 5) + good,
                      std::string(100, '\0')};
    for (const std::string &line : lines) {
        EXPECT_OUTCOME(get(line + "\n" + good), {.result = 1});
        EXPECT_EQ("fe80::a/64 scope 20 flags 80", text(records[0]));
        EXPECT_OUTCOME(get(good + line), {.result = 1}); // the last line, without its end
    }
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_line_of_any_length_is_one_line) {
    const std::string good = "fe80000000000000000000000000000a 02 40 20 80     eth0\n";
    for (const size_t length : {62U, 63U, 64U, 255U, 256U, 257U, 1U << 20}) {
        EXPECT_OUTCOME(get(long_text(length, 'f') + "\n" + good), {.result = 1});
        EXPECT_EQ("fe80::a/64 scope 20 flags 80", text(records[0])) << length;
        EXPECT_OUTCOME(get(good + std::string(length, '\xff')),
                       {.result = 1, .log = {"INFO lnx_v6_ip_get:N inet_pton failed. Success"}});
    }
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_unknown_names_have_no_addresses) {
    const std::string good = "fe80000000000000000000000000000a 02 40 20 80     eth0\n";
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(get(good, 4, name.c_str()), {.result = 0});
    }
}

TEST_F(lnx_v6_ip_get, KOVALnxV6IPGet_reads_the_kernels_list) {
    test_rig real;
    EXPECT_OUTCOME(real.observe([&] { return KOVALnxV6IPGet("lo", records, 4); }), {.result = 1});
    EXPECT_EQ("::1/128 scope 10 flags 80", text(records[0]));
}
