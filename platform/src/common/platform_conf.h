/** @file What this machine is: the keys of /etc/kova/platform.conf. */
#ifndef KOVA_PLATFORM_PLATFORM_CONF_H
#define KOVA_PLATFORM_PLATFORM_CONF_H

#include <cstring>

#include "common/report.h"

namespace kova {

constexpr const char *kPlatformFile = "/etc/kova/platform.conf";

/** Reads a key; a missing key or file is an empty text and no error. @return whether there is a value */
inline bool platform_value(const char *key, char *value, int size) {
    const register_keeper keep;
    return KLIBCFileGetKeyValue(kPlatformFile, key, value, size, 0) > 0 && *value != '\0';
}

/** @return whether a key is "yes" */
inline bool platform_says(const char *key) {
    char value[8];
    return platform_value(key, value, sizeof value) && strcmp(value, "yes") == 0;
}

} // namespace kova

#endif
