#include "support/rig.h"

#include <cctype>
#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class is_hostname : public unit_test {
protected:
    outcome ask(const std::string &text) {
        return rig.observe([&] { return BlKLIBIsHostname(text.c_str()); });
    }
};

TEST_F(is_hostname, BlKLIBIsHostname_everyByte_isAllowedOrNot) {
    for (int byte = 1; byte < 256; ++byte) {
        SCOPED_TRACE(byte);
        const bool begins = (byte < 128 && isalpha(byte) != 0) || byte == '_';
        const bool continues = begins || (byte < 128 && isdigit(byte) != 0) || byte == '-';
        const std::string text{static_cast<char>(byte)};
        EXPECT_OUTCOME(ask(text), {.result = begins ? 1 : 0});
        EXPECT_OUTCOME(ask("a" + text), {.result = continues ? 1 : 0});
        EXPECT_OUTCOME(ask("a" + text + "-"), {.result = continues ? 1 : 0});
    }
}

TEST_F(is_hostname, BlKLIBIsHostname_length_isAtMost15) {
    EXPECT_OUTCOME(ask(""), {.result = 0});
    EXPECT_OUTCOME(ask(long_text(1)), {.result = 1});
    EXPECT_OUTCOME(ask(long_text(15)), {.result = 1});
    for (const size_t length : {16, 17, 63, 64, 4096}) {
        EXPECT_OUTCOME(ask(long_text(length)), {.result = 0});
    }
    EXPECT_OUTCOME(ask(long_text(15) + "\n"), {.result = 0});
    EXPECT_OUTCOME(ask(long_text(14) + "."), {.result = 0});
}

TEST_F(is_hostname, BlKLIBIsHostname_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return BlKLIBIsHostname(nullptr); }),
                   refusal("is_hostname", "((void *)0) != szHostname", 0));
}

} // namespace
