/**
 * @file
 * DHCP: the boot protocol of an interface, and the server's settings.
 */
#ifndef KOVANETSDK_DHCP_H
#define KOVANETSDK_DHCP_H

#include <kova/core.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/**
 * Whether an interface gets its IPv4 address by DHCP: BOOTPROTO of its file is "dhcp". A file without the key is
 * repaired, a missing one made: it gets BOOTPROTO=static. Holds the lock 0x105.
 * @param szIfname  interface
 * @return 1; 0, also with 0xD00 (name), 0x400 (lock), or the code of a read or repair that failed
 */
int BlKOVALnxIsDHCP(const char *szIfname);

/**
 * An option that an IPv4 subnet hands out beside router, DNS servers and domain, and the next one. What each number
 * takes, by the name of the option:
 *  - IPv4 address: swap-server 16, router-solicitation 32
 *  - list of IPv4 addresses: log-server 7, lpr-server 9, nis-server 41, ntp-server 42, netbios-ns 44, netbios-dd 45,
 *    x-windows-fs 48, x-windows-dm 49, nis+-server 65, mobile-ip-home 68, smtp-server 69, pop3-server 70,
 *    nntp-server 71, irc-server 74, sip-server 120
 *  - list of address and mask in turn: policy-filter 21
 *  - list of "network/bits" and gateway in turn: classless-static-route 121
 *  - number: boot-file-size 13 (0 to 65536), max-datagram-reassembly 22 (576 to 65536), default-ttl 23 and tcp-ttl 37
 *    (1 to 255), mtu 26 (68 to 65536), arp-timeout 35, tcp-keepalive 38, T1 58, T2 59 (64 bits)
 *  - 0 or 1: ip-forward-enable 19, non-local-source-routing 20, all-subnets-local 27, router-discovery 31,
 *    trailer-encapsulation 34, ethernet-encap 36
 *  - 1, 2, 4 or 8: netbios-nodetype 46
 *  - text, not empty, without "," and control characters: root-path 17, extension-path 18, nis-domain 40,
 *    netbios-scope 47, nis+-domain 64
 */
typedef struct DHCP_OPTION {
    int32_t number;           /**< number of the option */
    char name[52];            /**< its name as above */
    char value[1024];         /**< value of an option with one value */
    KLIBSZLIST *items;        /**< values of an option with a list, at most 1023 characters joined by ","; else NULL */
    struct DHCP_OPTION *next; /**< next option or NULL */
} DHCP_OPTION;

/** Whether an option takes a list of values. @return 1 or 0 */
int DHCPOptionIsListValue(unsigned int number);

/** Frees a list of options and the items in them; NULL is allowed. */
void DHCPOptionFree(DHCP_OPTION *head);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
