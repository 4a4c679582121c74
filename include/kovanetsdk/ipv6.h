/**
 * @file
 * IPv6 addresses and kernel switches of one interface.
 */
#ifndef KOVANETSDK_IPV6_H
#define KOVANETSDK_IPV6_H

#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/** One IPv6 address of an interface, as the kernel lists it. */
typedef struct KOVAV6IP {
    char szIP[46];          /**< address in canonical compressed text */
    uint32_t nPrefixLength; /**< 0 to 128 */
    uint32_t nScope;        /**< kernel scope value, 0x20 link-local */
    uint16_t nFlags;        /**< kernel address flags: 0x08 duplicate found, 0x40 tentative */
} KOVAV6IP;

int KOVALnxV6IPGet(const char *szIfname, KOVAV6IP *rgV6IP, int cMax);
int KOVANetIPv6IPAction(int nCmd, const char *szDevice, const char *szV6IPAddr, unsigned nPrefixLength,
                        const char *szGateway);
int KOVANetIPv6RemoveDADFailedIP(const char *szIfname, KOVAV6IP *rgRemoved, int cMaxRemoved);
int KOVANetIPv6IsSameSubnet(const char *szV6IPAddr1, const char *szV6IPAddr2, unsigned nPrefixLength);
int KOVALnxIPv6ProcAction(const char *szIfname, int nSwitch);
int KOVALnxIPv6FlushAddr(const char *szIfname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
