#include "platform_test.h"

#include <climits>

using namespace kova_test;

namespace {

using cutter = char *(*)(char *, const char *, char **);

std::vector<std::string> cut(cutter function, std::string text, const char *separators) {
    std::vector<std::string> parts;
    char *save = nullptr;
    for (char *part = function(text.data(), separators, &save); part != nullptr;
         part = function(nullptr, separators, &save))
        parts.emplace_back(part);
    // asked once more it stays at the end
    EXPECT_EQ(function(nullptr, separators, &save), nullptr);
    return parts;
}

using texts = std::vector<std::string>;

} // namespace

TEST(strings, KLIBCStrTok_runsOfDelimiters_areOne) {
    EXPECT_EQ(cut(KLIBCStrTok, "  a b\t\nc ", " \t\n"), (texts{"a", "b", "c"}));
    EXPECT_EQ(cut(KLIBCStrTok, "abc", " "), texts{"abc"});
    EXPECT_EQ(cut(KLIBCStrTok, "", " "), texts{});
    EXPECT_EQ(cut(KLIBCStrTok, "   ", " "), texts{});
}

TEST(strings, KLIBCStrSep_emptyFields_areKept) {
    EXPECT_EQ(cut(KLIBCStrSep, "a,,b,", ","), (texts{"a", "", "b", ""}));
    EXPECT_EQ(cut(KLIBCStrSep, ",a", ","), (texts{"", "a"}));
    EXPECT_EQ(cut(KLIBCStrSep, "", ","), texts{""});
    EXPECT_EQ(cut(KLIBCStrSep, "a b,c", " ,"), (texts{"a", "b", "c"}));
}

TEST(strings, KLIBCStrTok_nothingToContinue_isNull) {
    char *save = nullptr;
    EXPECT_WORKS(KLIBCStrTok(nullptr, " ", &save), nullptr);
    EXPECT_WORKS(KLIBCStrSep(nullptr, " ", &save), nullptr);
    char text[] = "a";
    EXPECT_FAILS(KLIBCStrTok(text, nullptr, &save), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCStrTok(text, " ", nullptr), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCStrSep(text, nullptr, &save), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCStrSep(text, " ", nullptr), nullptr, 0xD00);
}

TEST(strings, KLIBCStrTokIndex_index_givesTheToken) {
    const auto token = [](std::string text, int index) {
        const char *found = KLIBCStrTokIndex(text.data(), index);
        return std::string{found != nullptr ? found : "(none)"};
    };
    EXPECT_EQ(token("  eth0:  12\t34\n", 0), "eth0:");
    EXPECT_EQ(token("  eth0:  12\t34\n", 1), "12");
    EXPECT_EQ(token("  eth0:  12\t34\n", 2), "34");
    EXPECT_EQ(token("  eth0:  12\t34\n", 3), "(none)");
    EXPECT_EQ(token("", 0), "(none)");
    EXPECT_EQ(token(" ", INT_MAX), "(none)");
    char text[] = "a";
    EXPECT_FAILS(KLIBCStrTokIndex(text, -1), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCStrTokIndex(nullptr, 0), nullptr, 0xD00);
    EXPECT_WORKS(KLIBCStrTokIndex(text, 1), nullptr);
}

TEST(strings, KLIBCStrTrimSpace_blanksAround_go) {
    char out[32];
    EXPECT_STREQ(KLIBCStrTrimSpace(" \t a b \r\n", out), "a b");
    EXPECT_STREQ(KLIBCStrTrimSpace("a", out), "a");
    EXPECT_STREQ(KLIBCStrTrimSpace("", out), "");
    EXPECT_STREQ(KLIBCStrTrimSpace(" \n ", out), "");
    char text[] = "  in place ";
    EXPECT_EQ(KLIBCStrTrimSpace(text, text), text);
    EXPECT_STREQ(text, "in place");
    EXPECT_FAILS(KLIBCStrTrimSpace(nullptr, out), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCStrTrimSpace("a", nullptr), nullptr, 0xD00);
}
