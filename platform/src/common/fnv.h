/** @file FNV-1a, 64 bits wide: for tables and for names derived from a path. */
#ifndef KOVA_PLATFORM_FNV_H
#define KOVA_PLATFORM_FNV_H

#include <cstdint>

namespace kova {

inline uint64_t fnv1a(const char *text) {
    uint64_t hash = 0xcbf29ce484222325U;
    for (; *text != '\0'; text++)
        hash = (hash ^ static_cast<unsigned char>(*text)) * 0x100000001b3U;
    return hash;
}

} // namespace kova

#endif
