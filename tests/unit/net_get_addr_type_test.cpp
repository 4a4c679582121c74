#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class net_get_addr_type : public unit_test {
protected:
    outcome ask(const std::string &text) {
        return rig.observe([&] { return KOVANetGetAddrType(text.c_str()); });
    }
};

TEST_F(net_get_addr_type, KOVANetGetAddrType_address_givesItsFamily) {
    const std::map<std::string, long> families{{"10.0.0.1", 2},        {"0.0.0.0", 2}, {"255.255.255.255", 2},
                                               {"127.0.0.1", 2},       {"::", 10},     {"fe80::1", 10},
                                               {"::ffff:10.0.0.1", 10}};
    for (const auto &[text, family] : families) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = family});
    }
}

TEST_F(net_get_addr_type, KOVANetGetAddrType_neither_gives0WithoutCode) {
    texts bad = bad_names();
    for (const char *text : {"", "10.0.0", "012.0.0.1", "10.0.0.1 ", " ::1", "fe80::1/64", "fe80::1%lo", "1::2::3"}) {
        bad.emplace_back(text);
    }
    for (const std::string &text : bad) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = 0});
    }
}

TEST_F(net_get_addr_type, KOVANetGetAddrType_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KOVANetGetAddrType(nullptr); }),
                   refusal("net_get_addr_type", "((void *)0) != szIP", 0));
}

} // namespace
