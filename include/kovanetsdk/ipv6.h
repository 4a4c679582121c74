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

/**
 * Lists the IPv6 addresses of an interface (/proc/net/if_inet6).
 * @param szIfname  interface
 * @param rgV6IP    receives the first cMax addresses; all of it is zeroed first
 * @param cMax      records in rgV6IP, above 0
 * @return number of addresses, which may exceed cMax; -1 with 0xD00 (an argument) or 0x900 (the list cannot be opened)
 */
int KOVALnxV6IPGet(const char *szIfname, KOVAV6IP *rgV6IP, int cMax);

/**
 * Adds or deletes an IPv6 address with KOVANetSetIP, or, with a gateway, the IPv6 default route (/sbin/ip -6 route).
 * Takes no lock: the caller holds 0x106.
 * @param nCmd           0 add, 1 delete
 * @param szDevice       interface
 * @param szV6IPAddr     address; also needed with a gateway
 * @param nPrefixLength  0 to 128
 * @param szGateway      default router, or NULL or "" to change the address
 * @return 0; -1 (0xD00 prefix length, address or interface; no code for nCmd or a failed change); with a gateway the
 *         exit status of the route command: test for 0
 */
int KOVANetIPv6IPAction(int nCmd, const char *szDevice, const char *szV6IPAddr, unsigned nPrefixLength,
                        const char *szGateway);

/**
 * Deletes the addresses of an interface that another machine was found to have, too.
 * @param rgRemoved    receives the first cMaxRemoved removed addresses, or NULL
 * @param cMaxRemoved  records in rgRemoved
 * @return number of addresses removed, which may exceed cMaxRemoved, 0 also when they cannot be listed; -1 with 0xD00
 *         (the name), 0x100 (no memory for more than 16), or when one cannot be deleted: those before it are gone
 */
int KOVANetIPv6RemoveDADFailedIP(const char *szIfname, KOVAV6IP *rgRemoved, int cMaxRemoved);

/**
 * Compares the first bits of two IPv6 addresses.
 * @param nPrefixLength  number of bits, 0 to 128
 * @return 1 equal; 0 different, or with 0xD00 for a missing address or a longer prefix; -1 for a text that is no
 * address
 */
int KOVANetIPv6IsSameSubnet(const char *szV6IPAddr1, const char *szV6IPAddr2, unsigned nPrefixLength);

/**
 * Switches IPv6 of a logical interface (one that counts under kind 2) through
 * /proc/sys/net/ipv6/conf/IF/disable_ipv6.
 * @param nSwitch  1 off; 0 on, and waits up to 5 seconds for the link-local address to settle; anything else on, at
 * once
 * @return 0, also when the address did not settle; -1 with 0xD00 (the name), 0xBC00 (no such interface), the code of
 *         the enumeration, 0xB00 (the kernel refuses), or without a code (no switch: the kernel has no IPv6)
 */
int KOVALnxIPv6ProcAction(const char *szIfname, int nSwitch);

/**
 * Drops all IPv6 addresses of an interface: IPv6 is switched off and, unless IPV6INIT in the interface's file is "off"
 * (in any case), on again, which may take 5 seconds.
 * @return 0; -1 with 0xD00 (the name), 0x900 (no file), or as KOVALnxIPv6ProcAction
 */
int KOVALnxIPv6FlushAddr(const char *szIfname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
