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

/**
 * What the DHCP server answers to clients that boot from the network. The calls about it take no lock, set no code of
 * their own and do not restart the server; /etc/dhcpd/dhcpd-pxe-setting keeps the settings, dhcpd-pxe.info the switch,
 * dhcpd-pxe.conf is what the server reads.
 */
typedef struct DHCP_PXE_CONF {
    int32_t enabled;                /**< 1 clients are answered */
    int32_t is_remote_tftp;         /**< 1 they boot from another server */
    char local_bootloader[4096];    /**< name of the boot file on this machine */
    char remote_bootloader[4096];   /**< name of the boot file on the other server */
    char remote_tftp_server_ip[20]; /**< address of the other server */
} DHCP_PXE_CONF;

/**
 * Fills in "enabled" and nothing else.
 * @return 0; "enabled" is 1 or 0, or below 0 when there are no settings or they cannot be read. -1 for NULL, logged
 */
int DHCPPXEConfGetEnable(DHCP_PXE_CONF *conf);

/**
 * Reads the settings; what is not set is left empty.
 * @return 0, also without settings ("enabled" is below 0 then); -1, logged, for NULL or settings that cannot be read
 */
int DHCPPXEConfGet(DHCP_PXE_CONF *conf);

/**
 * Switches the answers on or off, in the settings and then for the server. Runs /bin/mkdir.
 * @param enable  1 on, anything else off
 * @return 0; -1 with the code of the rewrite that failed, or logged when the directory cannot be made
 */
int DHCPPXEConfSetEnable(int enable);

/**
 * Switches the answers on or off and, when on, stores the boot file and server of the chosen kind and writes the
 * server's lines. The settings of the other kind, and all of them when off, stay as they are.
 * @param conf  boot file and address are neither empty nor hold ",", double quotes or control characters
 * @return 0; -1, logged: the switch is set already then, and keys before the one that failed
 */
int DHCPPXEConfSet(const DHCP_PXE_CONF *conf);

/* Options for the clients of one vendor class. /etc/dhcpd/dhcpd-vendor.conf holds a line for each vendor and option, at
 * most 1023 characters long. Vendor classes and values are not empty and hold no control character; a vendor class
 * holds no ",", and a value with one cannot be read back. The calls take no lock and do not restart the server; every
 * failure is logged, and has the code of the file operation that failed, if one did. */

/** Whether a text is the number of an option: decimal digits, 1 to 254. @return 1; 0, also for NULL */
int DHCPVendorCheckOptNum(const char *text);

/**
 * Adds the options of a vendor class to a map from number to value, both texts.
 * @param options  handle of the map; NULL, or a NULL vendor, is logged and finds nothing to add to
 * @return 0, also without the file; -1 for a file or line that cannot be read, or a map that cannot take more
 */
int DHCPVendorGetVendor(const char *vendor, KLIBSZHASH **options);

/**
 * Reads one option of a vendor class.
 * @param number  1 to 254
 * @param value   receives the value, cut to size (above 0)
 * @return 1; 0 not there; -1 for a bad argument or a file or line that cannot be read
 */
int DHCPVendorGetVendorOpt(const char *vendor, int number, char *value, unsigned int size);

/**
 * Replaces all options of a vendor class. The old ones go first: a key that is no number of an option leaves the
 * options before it. Runs /bin/mkdir.
 * @param options  map from number to value
 * @return 0; below 0, with nothing changed for a vendor class or value that cannot be stored
 */
int DHCPVendorSetVendor(const char *vendor, KLIBSZHASH *options);

/**
 * Replaces one option of a vendor class. A missing or empty text and a number out of range are logged and written all
 * the same, NULL as "". Runs /bin/mkdir.
 * @return 0; below 0, with nothing changed for a vendor class or value that cannot be stored
 */
int DHCPVendorSetVendorOpt(const char *vendor, int number, const char *value);

/**
 * Adds the vendor classes that have options to a list, each once, in the order of the file.
 * @param vendors  handle of the list
 * @return 0, also without the file; -1 for a bad argument, an unreadable file or no memory
 */
int DHCPVendorEnum(KLIBSZLIST **vendors);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
