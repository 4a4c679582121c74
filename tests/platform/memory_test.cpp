#include "platform_test.h"

#include <cstdint>
#include <cstdlib>
#include <cstring>

TEST(memory, reallocf_largerBlock_keepsTheBytes) {
    char *block = static_cast<char *>(reallocf(nullptr, 4));
    ASSERT_NE(block, nullptr);
    strcpy(block, "abc");
    block = static_cast<char *>(reallocf(block, 100000));
    ASSERT_NE(block, nullptr);
    EXPECT_STREQ(block, "abc");
    free(block);
}

// the leak checker of a sanitizer build sees whether the old block is freed
TEST(memory, reallocf_noRoom_freesTheOldBlock) {
    void *block = malloc(100);
    ASSERT_NE(block, nullptr);
    volatile size_t too_much = SIZE_MAX / 2;
    EXPECT_EQ(reallocf(block, too_much), nullptr);
}

TEST(memory, reallocf_size0_frees) {
    EXPECT_EQ(reallocf(malloc(100), 0), nullptr);
    EXPECT_EQ(reallocf(nullptr, 0), nullptr);
}
