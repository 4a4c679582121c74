/**
 * @file
 * IPv6 addresses and kernel switches of one interface, and how it is configured.
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

/** How IPv6 of an interface is configured: the text of IPV6INIT in its file, which is compared in any case. */
enum {
    NET_IPV6_AUTO = 0,      /**< "auto": addresses made from what routers advertise */
    NET_IPV6_OFF = 1,       /**< "off": no IPv6 */
    NET_IPV6_DHCP = 2,      /**< "dhcp": address and name servers of a DHCPv6 server */
    NET_IPV6_STATIC = 3,    /**< "static": a fixed address, and a gateway if there is one */
    NET_IPV6_AUTO_DHCP = 4, /**< "auto_dhcp": as auto, and name servers of a DHCPv6 server */
};

/**
 * Lists the IPv6 addresses of an interface (/proc/net/if_inet6), in the kernel's order, which means nothing.
 * @param szIfname  interface
 * @param rgV6IP    receives the first cMax addresses; all of it is zeroed first
 * @param cMax      records in rgV6IP, above 0
 * @return number of addresses, which may exceed cMax; -1 with 0xD00 (an argument) or 0x900 (the list cannot be opened)
 */
int KOVALnxV6IPGet(const char *szIfname, KOVAV6IP *rgV6IP, int cMax);

/**
 * Adds or deletes an IPv6 address with KOVANetSetIP, or, with a gateway, the IPv6 default route (/sbin/ip -6 route).
 * Takes no lock and asks for none: callers that change the same interface at once are kept apart only by a lock that
 * they hold themselves.
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

/**
 * Reads how IPv6 of an interface is configured (IPV6INIT, IPV6ADDR, IPV6PREFIXLENG and IPV6_DEFAULTGW in its file).
 * What the file does not say stays empty. Takes no lock.
 * @param szIfname       logical interface (one that counts under kind 2)
 * @param pMode          receives one of NET_IPV6_...
 * @param szV6IPAddr     receives the fixed address, kept also while another mode is used, or ""
 * @param cbV6IPAddr     bytes in szV6IPAddr, at least 46
 * @param pPrefixLength  receives the address's prefix length, or -1
 * @param szGateway      receives the default router, or ""
 * @param cbGateway      bytes in szGateway, at least 46
 * @return 1 read; 0 when IPv6 was never configured, or for no logical interface (0xBC00, the outputs stay as they are);
 *         -1 with 0xD00 (an argument), 0x900 (no file), 0x1000 (a value is no IPv6 address) or 0x4000 (a mode or prefix
 *         length that is none): what was read before is filled in
 */
int KOVANetIPv6ConfGet(const char *szIfname, int *pMode, char *szV6IPAddr, int cbV6IPAddr, int *pPrefixLength,
                       char *szGateway, int cbGateway);

/**
 * Configures IPv6 of an interface: its file, the kernel's switches, the DHCPv6 client (/sbin/start and /sbin/stop
 * dhcp-client6), address and default route (as KOVANetIPv6IPAction). An address that cannot be set is refused before
 * anything is changed. When a change fails later on an interface whose IPv6 was off, IPv6 is switched off again; what
 * else was done stays. Takes no lock. Blocks up to 5 seconds while the link-local address settles, in the modes
 * NET_IPV6_DHCP and NET_IPV6_STATIC 5 more for the kernel to find duplicates of the address.
 * @param nMode          one of NET_IPV6_...
 * @param szIfname       logical interface (one that counts under kind 2)
 * @param szV6IPAddr     NET_IPV6_STATIC: address, without a prefix length; otherwise not looked at
 * @param nPrefixLength  NET_IPV6_STATIC: 0 to 128
 * @param szGateway      NET_IPV6_STATIC: default router, in the address's subnet or link-local; NULL or "" for none
 * @return 0 done;
 *         2 NET_IPV6_STATIC: the address is link-local, nothing was changed;
 *         3 NET_IPV6_STATIC: the gateway is neither link-local nor in the address's subnet; address and mode are set
 * and stored, the gateway is not; above 0, with NET_IPV6_STATIC and NET_IPV6_DHCP: that many addresses were found on
 * another machine, too, and removed; the mode is not stored. Two or three of them give 2 or 3 as well: what is stored
 * (KOVANetIPv6ConfGet) and the log tell which it was; -1 with 0xD00 (the name, or a prefix length above 128), 0xBC00
 * (no such interface), 0x1000 (no IPv6 address, or none that an interface or a router can have), 0x900 or 0xB00 (a
 * switch or the file), the code of the step that failed, or without one (another mode; a program that failed)
 */
int KOVANetIPv6ConfSet(int nMode, const char *szIfname, const char *szV6IPAddr, int nPrefixLength,
                       const char *szGateway);

/**
 * Sets the switch of every interface for router advertisements (/proc/sys/net/ipv6/conf/IF/accept_ra) as its file says:
 * IPV6_ACCEPT_RA, and without it IPV6INIT, where everything but "static" accepts them. For the boot. Loopback, members
 * of bonds and bridges, and interfaces without a file are left alone; one whose file cannot be read is skipped. Looks
 * at 32 interfaces at most. Takes no lock.
 * @return 0; -1 with 0x200 (memory), 0x3400 (no socket), the code of the listing, or 0x900 or 0xB00 when a switch
 * cannot be set: those behind it in the listing are not set either
 */
int KOVANetIpv6Init(void);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
