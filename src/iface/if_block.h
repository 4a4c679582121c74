/**
 * @file
 * The reasons that block changes of an interface: the bits of the calls, and their keys in the interface file.
 */
#pragma once

#include <cstring>

namespace kova {

inline constexpr char kBlockCount[] = "BLOCK_CNT";

struct block_reason {
    unsigned bit;
    const char *key;
};

inline constexpr block_reason kBlockReasons[] = {
    {1, "BLOCK_HA"},
    {2, "BLOCK_AHA"},
    {4, "BLOCK_VIRTUAL"},
    {8, "BLOCK_ORLENA"},
};

/** Room for "yes", "no" or a count. */
using block_value = char[16];

/** Whether a reason's value says that it holds. */
inline bool is_set(const block_value &value) {
    return strncmp(value, "yes", 3) == 0;
}

} // namespace kova
