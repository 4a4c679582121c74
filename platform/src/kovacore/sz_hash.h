/** @file The inside of KLIBSZHASH, for units that walk its entries in order. */
#ifndef KOVA_PLATFORM_SZ_HASH_H
#define KOVA_PLATFORM_SZ_HASH_H

#include <span>

#include "kova/core.h"

namespace kova {

struct hash_entry {
    char *key;
    char *value;
};

/** @return the entries in the order in which their keys were first set; nothing for NULL */
std::span<const hash_entry> hash_entries(const KLIBSZHASH *hash);

} // namespace kova

#endif
