#include "support/rig.h"

#include <array>
#include <kovanetsdk/addr.h>

using namespace kova_test;

namespace {

using parts = std::array<uint32_t, 4>;

class cal_mask : public unit_test {
protected:
    outcome count(const parts &part) {
        return rig.observe([&] { return cKLIBICalMask(part.data()); });
    }
};

TEST_F(cal_mask, cKLIBICalMask_contiguousMask_givesItsBits) {
    for (int bits = 1; bits <= 32; ++bits) {
        SCOPED_TRACE(bits);
        const uint32_t mask = ~0U << (32 - bits);
        EXPECT_OUTCOME(count({mask >> 24, mask >> 16 & 255, mask >> 8 & 255, mask & 255}), {.result = bits});
    }
}

TEST_F(cal_mask, cKLIBICalMask_noBits_gives0WithoutCode) {
    EXPECT_OUTCOME(count({0, 0, 0, 0}), {.result = 0});
}

TEST_F(cal_mask, cKLIBICalMask_gapOrPartAbove255_setsCode) {
    for (const parts &part : {parts{255, 0, 255, 0},
                              {0, 255, 255, 255},
                              {255, 255, 255, 1},
                              {127, 0, 0, 0},
                              {256, 0, 0, 0},
                              {255, 256, 0, 0},
                              {255, 255, 256, 0},
                              {255, 255, 255, 256},
                              {0xFFFFFFFF, 0xFFFFFFFF, 0xFFFFFFFF, 0xFFFFFFFF}}) {
        SCOPED_TRACE(::testing::PrintToString(part));
        EXPECT_OUTCOME(count(part), {.result = 0, .code = 0x1000, .unit = "cal_mask"});
    }
}

TEST_F(cal_mask, cKLIBICalMask_null_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return cKLIBICalMask(nullptr); }), refusal("cal_mask", "NULL != rgPart", 0));
}

} // namespace
