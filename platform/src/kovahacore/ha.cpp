#include "kova/ha.h"

#include <cstdio>

#include "common/platform_conf.h"

using namespace kova;

namespace {

constexpr int kAddressSize = 20;
constexpr int kNameSize = 16;

/** Reads "<key><name>". @return whether there is a value */
bool value_of(const char *key, const char *name, char *value, int size) {
    char full_key[64];
    const int length = snprintf(full_key, sizeof full_key, "%s%s", key, name);
    return length < static_cast<int>(sizeof full_key) && platform_value(full_key, value, size);
}

} // namespace

int KOVAHAIsRunning(void) {
    return platform_says("ha_running") ? 1 : 0;
}

int KOVAHAIsActive(void) {
    return platform_says("ha_active") ? 1 : 0;
}

int KOVAHAGetHeartbeatIF(char *szIfname, int cb) {
    if (szIfname == nullptr || cb < kNameSize)
        return fail(HERE, kErrArgument);
    return platform_value("ha_heartbeat_if", szIfname, cb) ? 0 : fail(HERE, kErrNotFound);
}

int KOVAHAGetRelatedIFInfo(const char *szIfname, char *szIP, char *szMask) {
    if (is_empty(szIfname) || szIP == nullptr || szMask == nullptr)
        return fail(HERE, kErrArgument), 0;

    if (value_of("ha_ip_", szIfname, szIP, kAddressSize) && value_of("ha_mask_", szIfname, szMask, kAddressSize))
        return 1;
    szIP[0] = '\0';
    szMask[0] = '\0';
    return 0;
}

int KOVAHAGetMac(int index, char *szMac, int cb) {
    if (index < 0 || szMac == nullptr || cb < 1)
        return fail(HERE, kErrArgument);

    char number[16];
    snprintf(number, sizeof number, "%d", index);
    szMac[0] = '\0';
    return value_of("ha_mac_", number, szMac, cb) ? 0 : fail(HERE, kErrNotFound);
}
