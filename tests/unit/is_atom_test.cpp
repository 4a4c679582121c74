#include "support/rig.h"

#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

class is_atom : public unit_test {
protected:
    outcome ask(int (*function)(const char *), const std::string &text) {
        return rig.observe([&] { return function(text.c_str()); });
    }
};

TEST_F(is_atom, BlKLIBIsAtom_everyByte_isAllowedOrNot) {
    const std::string forbidden = "\"(),.:;<>[\\]@";
    for (int byte = 1; byte < 256; ++byte) {
        SCOPED_TRACE(byte);
        const std::string text{'a', static_cast<char>(byte), 'b'};
        const bool is_allowed = byte >= 33 && forbidden.find(static_cast<char>(byte)) == std::string::npos;
        EXPECT_OUTCOME(ask(BlKLIBIsAtom, text), {.result = is_allowed ? 1 : 0});
        EXPECT_OUTCOME(ask(BlKLIBIsAtom, text.substr(1, 1)), {.result = is_allowed ? 1 : 0});
    }
}

TEST_F(is_atom, BlKLIBIsAtom_emptyAndLongTexts) {
    EXPECT_OUTCOME(ask(BlKLIBIsAtom, ""), {.result = 0});
    EXPECT_OUTCOME(ask(BlKLIBIsAtom, long_text(4096)), {.result = 1});
    EXPECT_OUTCOME(ask(BlKLIBIsAtom, long_text(4096) + "\n"), {.result = 0});
}

TEST_F(is_atom, BlKLIBIsAtom_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return BlKLIBIsAtom(nullptr); }), refusal("is_atom", "((void *)0) != szAtom", 0));
}

TEST_F(is_atom, BlKLIBIsDomain_everyLabelAnAtom_isAccepted) {
    for (const char *text : {"a", "a.b", "www.example.com", "1.2.3.4", "_x-y.z", "\xc3\xa4.de"}) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(BlKLIBIsDomain, text), {.result = 1});
    }
}

TEST_F(is_atom, BlKLIBIsDomain_emptyOrForbiddenLabel_isRefused) {
    for (const char *text :
         {"", ".", "..", "a..b", ".a", "a.", "a b.c", "a.b c", "a.b\n", "a@b.c", "a.b:1", "a.(b)", "a\t.b", "a.b,c"}) {
        SCOPED_TRACE(text);
        EXPECT_OUTCOME(ask(BlKLIBIsDomain, text), {.result = 0});
    }
}

TEST_F(is_atom, BlKLIBIsDomain_overLongText_looksAt511Characters) {
    EXPECT_OUTCOME(ask(BlKLIBIsDomain, long_text(4096)), {.result = 1});
    EXPECT_OUTCOME(ask(BlKLIBIsDomain, long_text(511) + " @"), {.result = 1});
    EXPECT_OUTCOME(ask(BlKLIBIsDomain, long_text(510) + " "), {.result = 0});
    EXPECT_OUTCOME(ask(BlKLIBIsDomain, long_text(510) + ".b"), {.result = 0});
    EXPECT_OUTCOME(ask(BlKLIBIsDomain, long_text(509) + ".b..c"), {.result = 1});
}

TEST_F(is_atom, BlKLIBIsDomain_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return BlKLIBIsDomain(nullptr); }),
                   refusal("is_atom", "((void *)0) != szDomain", 0));
}

} // namespace
