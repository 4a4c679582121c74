#include "support/rig.h"

#include <array>
#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

using parts = std::array<uint32_t, 4>;
constexpr uint32_t kKept = 0xEEEEEEEE; ///< a slot that the call has not written

struct sep_case {
    std::string text;
    long result;
    unsigned code;
    parts expected;
};

class net_sep_ip : public unit_test {
protected:
    void expect(const std::vector<sep_case> &cases) {
        for (const sep_case &one : cases) {
            SCOPED_TRACE("text: " + one.text);
            parts got{kKept, kKept, kKept, kKept};
            EXPECT_OUTCOME(rig.observe([&] { return cKLIBISepIP(one.text.c_str(), got.data()); }),
                           {.result = one.result, .code = one.code, .unit = one.code != 0 ? "net_sep_ip" : ""});
            EXPECT_EQ(one.expected, got);
        }
    }
};

TEST_F(net_sep_ip, cKLIBISepIP_fourParts_gives4) {
    expect({{"1.2.3.4", 4, 0, {1, 2, 3, 4}},
            {"0.0.0.0", 4, 0, {0, 0, 0, 0}},
            {"999.256.4294967295.300", 4, 0, {999, 256, 4294967295, 300}},
            {"999999999.1000000000.000.00", 4, 0, {999999999, 1000000000, 0, 0}}});
}

TEST_F(net_sep_ip, cKLIBISepIP_hexadecimalAndOctalParts_areNumbers) {
    expect({{"0x0a.012.0XFF.0", 4, 0, {10, 10, 255, 0}},
            {"08.1.1.1", 0, 0x1000, {0, kKept, kKept, kKept}},
            {"1.0x.2.3", 1, 0x1000, {1, 0, kKept, kKept}},
            {"1.2.3.0xg", 3, 0x1000, {1, 2, 3, 0}}});
}

TEST_F(net_sep_ip, cKLIBISepIP_textStopsEarly_givesDotsPassedAndSetsCode) {
    expect({{"", 0, 0x1000, {0, kKept, kKept, kKept}},
            {"abc", 0, 0x1000, {0, kKept, kKept, kKept}},
            {"1", 0, 0x1000, {1, kKept, kKept, kKept}},
            {"1.x", 1, 0x1000, {1, 0, kKept, kKept}},
            {"1.", 1, 0x1000, {1, 0, kKept, kKept}},
            {"1.2", 1, 0x1000, {1, 2, kKept, kKept}},
            {"1.2.3", 2, 0x1000, {1, 2, 3, kKept}},
            {"1.2.3x.4", 2, 0x1000, {1, 2, 3, kKept}}});
}

TEST_F(net_sep_ip, cKLIBISepIP_twoDotsInARow_stopsBeforeThem) {
    expect({{"1..2", 0, 0x1000, {1, kKept, kKept, kKept}},
            {"1.2..3", 1, 0x1000, {1, 2, kKept, kKept}},
            {"1.2.3..", 2, 0x1000, {1, 2, 3, kKept}},
            {"..", 0, 0x1000, {0, kKept, kKept, kKept}}});
}

TEST_F(net_sep_ip, cKLIBISepIP_endsAfterThirdDot_gives3WithoutCode) {
    expect({{"1.2.3.", 3, 0, {1, 2, 3, kKept}}});
}

TEST_F(net_sep_ip, cKLIBISepIP_moreAfterFourthPart_gives3AndSetsCode) {
    expect({{"1.2.3.4.5", 3, 0x1000, {1, 2, 3, 4}},
            {"1.2.3.4.", 3, 0x1000, {1, 2, 3, 4}},
            {"1.2.3.4..", 3, 0x1000, {1, 2, 3, 4}},
            {"1.2.3.4 ", 3, 0x1000, {1, 2, 3, 4}},
            {"1.2.3.4\n", 3, 0x1000, {1, 2, 3, 4}},
            {"1.2.3.4/24", 3, 0x1000, {1, 2, 3, 4}},
            {"1.2.3.x", 3, 0x1000, {1, 2, 3, 0}}});
}

TEST_F(net_sep_ip, cKLIBISepIP_blanksSignsAndAnEmptyFirstPart_areReadAsTheNumberReaderDoes) {
    expect({{" 1.2.3.4", 4, 0, {1, 2, 3, 4}},
            {"\t1.\n2.3. 4", 4, 0, {1, 2, 3, 4}},
            {"+1.2.3.4", 4, 0, {1, 2, 3, 4}},
            {".1.2.3", 4, 0, {0, 1, 2, 3}},
            {"1 .2.3.4", 0, 0x1000, {1, kKept, kKept, kKept}}});
}

TEST_F(net_sep_ip, cKLIBISepIP_partBeyond32Bits_becomesTheLargest) {
    expect({{"1.2.3.-1", 4, 0, {1, 2, 3, 0xFFFFFFFF}},
            {"-4294967286.0.0.1", 4, 0, {0xFFFFFFFF, 0, 0, 1}},
            {"4294967306.0.0.1", 4, 0, {0xFFFFFFFF, 0, 0, 1}},
            {"99999999999999999999.0.0.1", 4, 0, {0xFFFFFFFF, 0, 0, 1}},
            {"-99999999999999999999.0.0.1", 4, 0, {0xFFFFFFFF, 0, 0, 1}}});
}

TEST_F(net_sep_ip, cKLIBISepIP_overLongText_looksAt31Characters) {
    const std::string zeros = long_text(24, '0');
    expect({{zeros + "1.2.3.4", 4, 0, {1, 2, 3, 4}},
            {zeros + "1.2.3.4.5", 4, 0, {1, 2, 3, 4}},
            {zeros + "01.2.3.4", 3, 0, {1, 2, 3, kKept}},
            {long_text(4096, '1'), 0, 0x1000, {0xFFFFFFFF, kKept, kKept, kKept}},
            {long_text(4096, '.'), 0, 0x1000, {0, kKept, kKept, kKept}},
            {long_text(4096), 0, 0x1000, {0, kKept, kKept, kKept}}});
}

TEST_F(net_sep_ip, cKLIBISepIP_nullArgument_isRefused) {
    uint32_t part[4];
    EXPECT_OUTCOME(rig.observe([&] { return cKLIBISepIP(nullptr, part); }),
                   refusal("net_sep_ip", "((void *)0) != szIP", 0));
    EXPECT_OUTCOME(rig.observe([&] { return cKLIBISepIP("1.2.3.4", nullptr); }),
                   refusal("net_sep_ip", "NULL != rgPart", 0));
}

} // namespace
