#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class is_ip_mask : public unit_test {
protected:
    /** Asks about a text in a block of exactly its size, so that a byte too many is seen by the checkers of memory. */
    outcome ask(const std::string &text) {
        std::vector<char> mask(text.c_str(), text.c_str() + text.size() + 1);
        const outcome got = rig.observe([&] { return BlKLIBIsIpMask(mask.data()); });
        left = mask.data();
        return got;
    }

    std::string left; ///< the text after the call
};

TEST_F(is_ip_mask, BlKLIBIsIpMask_mask_isAcceptedAndNormalised) {
    const std::map<std::string, std::string> masks{{"255.255.255.0", "255.255.255.0"},
                                                   {"255.255.255.255", "255.255.255.255"},
                                                   {"128.0.0.0", "128.0.0.0"},
                                                   {"0xff.255.255.0", "255.255.255.0"},
                                                   {"0377.0xFE.0.0", "255.254.0.0"},
                                                   {" 255.255.+0.-0", "255.255.0.0"},
                                                   {"0000000000000000377.255.255.252", "255.255.255.252"}};
    for (const auto &[text, normal] : masks) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = 1});
        EXPECT_EQ(normal, left);
    }
}

TEST_F(is_ip_mask, BlKLIBIsIpMask_noMask_isRefusedAndLeft) {
    texts bad = bad_names();
    for (const char *text : {"", "0.0.0.0", "255.0.255.0", "255.255.255.256", "255.255.255.-1", "255.255.255",
                             "255.255.255.", "255.255.255.0.0", "255.255.255.0 ", "24", "10.0.0.1", ".0.0.0"}) {
        bad.emplace_back(text);
    }
    for (const std::string &text : bad) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(text), {.result = 0, .code = 0x1000, .unit = "is_ip_mask"});
        EXPECT_EQ(text, left);
    }
}

TEST_F(is_ip_mask, BlKLIBIsIpMask_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return BlKLIBIsIpMask(nullptr); }),
                   refusal("is_ip_mask", "((void *)0) != szMask", 0));
}

} // namespace
