#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class is_v6_ip_addr_valid : public unit_test {
protected:
    outcome ask(const std::string &text) {
        return rig.observe([&] { return BlKLIBIsv6IpAddrValid(text.c_str()); });
    }

    void expect_refused(const texts &refused) {
        for (const std::string &text : refused) {
            SCOPED_TRACE(text);
            EXPECT_OUTCOME(ask(text), {.result = 0, .code = 0x1000, .unit = "is_v6_ip_addr_valid"});
        }
    }
};

TEST_F(is_v6_ip_addr_valid, BlKLIBIsv6IpAddrValid_address_isAccepted) {
    for (const char *text : {"::", "::1", "fe80::1", "2001:db8:0:1:2:3:4:5", "::ffff:10.0.0.1", "FE80::ABCD",
                             "ffff:ffff:ffff:ffff:ffff:ffff:255.255.255.255"}) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = 1});
        EXPECT_OUTCOME(ask(std::string(text) + "/64"), {.result = 1});
    }
}

TEST_F(is_v6_ip_addr_valid, BlKLIBIsv6IpAddrValid_prefixLength_is0To128) {
    for (const char *prefix : {"0", "1", "64", "128", "000", "007", "064"}) {
        SCOPED_TRACE(prefix);
        EXPECT_OUTCOME(ask(std::string("fe80::1/") + prefix), {.result = 1});
    }
    expect_refused({"fe80::1/", "fe80::1/129", "fe80::1/999", "fe80::1/0064", "fe80::1/-1", "fe80::1/+1", "fe80::1/ 1",
                    "fe80::1/6x", "fe80::1/64 ", "fe80::1/64\n", "fe80::1/0x4", "fe80::1/64/64", "fe80::1//64",
                    "fe80::1/" + long_text(4096, '1')});
}

TEST_F(is_v6_ip_addr_valid, BlKLIBIsv6IpAddrValid_noAddress_isRefused) {
    expect_refused(bad_names());
    expect_refused({"", "/", "/64", "10.0.0.1", "10.0.0.1/24", "fe80:::1", "fe80::1::2", "fe80::1%lo", "fe80::1 ",
                    " fe80::1", "12345::", "1:2:3:4:5:6:7", "1:2:3:4:5:6:7:8:9"});
}

TEST_F(is_v6_ip_addr_valid, BlKLIBIsv6IpAddrValid_overLongText_isRefused) {
    for (const size_t length : {15, 16, 17, 45, 46, 47, 63, 64, 4096}) {
        expect_refused({long_text(length, ':'), long_text(length, 'f'), long_text(length, 'f') + "/64"});
    }
}

TEST_F(is_v6_ip_addr_valid, BlKLIBIsv6IpAddrValid_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return BlKLIBIsv6IpAddrValid(nullptr); }),
                   refusal("is_v6_ip_addr_valid", "((void *)0) != szV6IPAddr", 0));
}

} // namespace
