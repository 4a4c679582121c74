/**
 * @file
 * DHCP: the boot protocol of an interface, and the server's settings.
 *
 * The DHCP and router-advertisement server reads fragments below /etc/dhcpd. Beside each stands an info file whose key
 * `enable` is "yes" or "no"; only "yes" counts. Fragments are truncated and written in place, keys of info files are
 * rewritten with the guarantees of KLIBCFileSetKeyValue. Unless said otherwise a call here takes no lock, logs what
 * fails, sets no code of its own (that of a platform call may stay in the register) and does not restart the server.
 *
 * Interface names go into paths: one that is "." or "..", that is longer than 235 bytes, or that holds "/", a blank or
 * a control character, or is empty, is refused, with 0xD00 unless said otherwise. `type` is the family: 0 IPv4, 1 IPv6.
 */
#ifndef KOVANETSDK_DHCP_H
#define KOVANETSDK_DHCP_H

#include <kova/core.h>
#include <kovanetsdk/iface.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/* ---- records -------------------------------------------------------------------------------------------------- */

struct DHCP_OPTION;

/** A served subnet. Texts are terminated; none that is written to a fragment holds a control character. */
typedef struct DHCP_TAG_CONF {
    int32_t enabled;             /**< 1 when the subnet is served */
    int32_t reserved;            /**< not used */
    int32_t lease_time;          /**< seconds */
    char start_ip[46];           /**< first address of the range */
    char end_ip[46];             /**< last address of the range */
    char ifname[16];             /**< interface that is served */
    char domain[4096];           /**< search and local domain, "" none */
    char dns1[46];               /**< first name server, "" none */
    char dns2[46];               /**< second name server, "" none */
    char dns_more[4096];         /**< further name servers, joined by "," */
    char netmask[46];            /**< IPv4: mask of the range */
    char router[46];             /**< IPv4: router */
    char reserved_text[4096];    /**< not used */
    char tag[20];                /**< tag of the subnet, part of the name of single-subnet files */
    char v6_mode[20];            /**< IPv6: "off", "ra-only", "ra-stateless" or "stateful" */
    struct DHCP_OPTION *options; /**< further options, owned by the holder of the record */
} DHCP_TAG_CONF;

/** An IPv4 range, and the next one. */
typedef struct DHCP_RANGE {
    char start[16];          /**< first address */
    char end[16];            /**< last address */
    char netmask[16];        /**< mask of the subnet, as the fragment says it, cut to 15 characters */
    struct DHCP_RANGE *next; /**< next range or NULL */
} DHCP_RANGE;

/* ---- the server ----------------------------------------------------------------------------------------------- */

/** Whether the DHCP service is on: `enable` of /etc/dhcpd/dhcpd.info. @return 1; 0, also without file or key */
int DHCPIsEnabled(void);

/**
 * Starts the server: runs "/etc/rc.network nat-start-dhcp".
 * @return 1 when the script ends with status 1; 0 for any other status, also when it cannot be run
 */
int DHCPServerStart(void);
/** Restarts the server: runs "/etc/rc.network nat-restart-dhcp". @return as DHCPServerStart */
int DHCPServerRestart(void);
/** The same command, judged strictly; nothing is logged. @return 0 for status 0, else -1 */
int KLIBNetDHCPServerRestart(void);

/* ---- switches of the interfaces -------------------------------------------------------------------------------- */

/**
 * Whether an interface is served: `enable` of /etc/dhcpd/dhcpd-<ifname>.info, or dhcpd6-<ifname>.info.
 * @param ifname  interface
 * @param type    family
 * @return 1; 0, also without file or key; -1 for a bad name or type
 */
int DHCPInterfaceIsEnabled(const char *ifname, int type);
/**
 * Sets that switch; makes /etc/dhcpd (by /bin/mkdir -p) and the file when absent.
 * @param ifname  interface
 * @param type    family
 * @param enable  1 on, anything else off
 * @return 0, also when the file cannot be written, which is logged; -1 for a bad name or type, or no directory
 */
int DHCPInterfaceSetEnabled(const char *ifname, int type, int enable);
/**
 * The interfaces that have an info file, in the order of the files' names. The name is what stands between "-" and
 * ".info": names that themselves hold "-" or "." are not listed, and of IPv4 "pxe" is when dhcpd-pxe.info exists.
 * @param list_inout  receives a new list when there is at least one; the list it held, if any, is freed then
 * @param type        family
 * @return their number; -1 for bad arguments, no memory for the lists or a directory that cannot be searched,
 *         *list_inout untouched. A file whose name cannot be taken apart for lack of memory is logged and left out
 */
int DHCPInterfaceListGet(KLIBSZLIST **list_inout, int type);

/* ---- one subnet by its tag ------------------------------------------------------------------------------------- */

/**
 * Writes the single-subnet files /etc/dhcpd/dhcpd-<ifname>-<tag>.info and, when on, .conf with the lines of interface,
 * range, router, search domain (unless "") and name servers; makes the directory by /bin/mkdir -p.
 * @param conf    the subnet: ifname, tag, and when on start_ip, end_ip, netmask, lease_time, router, domain, dns1, dns2
 * @param enable  not 0: on; 0: off, .conf stays as it is
 * @return 1; 0, without a code, when nothing was written for a bad record (NULL, names as above, a text without its end
 * or with a control character, "," in a name or the range, a domain that makes its line longer than 1023 bytes), or
 * when directory or a file cannot be made: .info may be written already then
 */
int KOVANetSetDhcpServerConfigFiles(const DHCP_TAG_CONF *conf, int enable);
/**
 * Reads them back. Addresses and the domain come cut to 19 characters; a line of name servers with more than two leaves
 * dns1 and dns2 empty. The names may be fields of the record itself.
 * @param tag       tag, no more than one part of a file's name, like an interface's
 * @param ifname    interface
 * @param conf_out  receives enabled, start_ip, end_ip, netmask, lease_time, dns1, dns2, router, ifname, domain and tag;
 *                  all else is zero. Partly filled on failure
 * @return 1; 0 for NULL (silent), bad names, no .conf, one without range, name servers, router or interface, or one
 *         that cannot be read
 */
int KOVANetGetDhcpServerConf(const char *tag, const char *ifname, DHCP_TAG_CONF *conf_out);

/* ---- numbered subnets ------------------------------------------------------------------------------------------ */

/**
 * Writes a subnet: its switch as DHCPTagConfSetEnable, then its fragment as DHCPTagConfSetConfig.
 * @param ifname  interface
 * @param subnet  number of the subnet
 * @param type    family
 * @param conf    "enabled" and what DHCPTagConfSetConfig takes
 * @return 0; -1. Nothing is written for bad arguments; with an unknown mode or an option that is not valid the switch
 * is
 */
int DHCPTagConfSet(const char *ifname, unsigned int subnet, int type, const DHCP_TAG_CONF *conf);
/**
 * Writes the switch of a subnet, /etc/dhcpd/dhcpd-<ifname>-subnet<N>.info or dhcpd6-<ifname>-subnet<N>.info, whole;
 * makes the directory by /bin/mkdir -p.
 * @param enable  1 on, anything else off
 * @return 0; -1 for a bad name or type, or when directory or file cannot be made or written
 */
int DHCPTagConfSetEnable(const char *ifname, unsigned int subnet, int type, int enable);
/**
 * Writes the fragment of a subnet, the same path with ".conf", for the clients with the tag <ifname><N> or, of IPv6,
 * <ifname>v6<N>; makes the directory by /bin/mkdir -p.
 * @param ifname  interface, without ","
 * @param conf    IPv4: start_ip, end_ip, netmask, lease_time, router, domain, dns1, dns2, dns_more and options, whose
 *                masks are put in plain decimal. IPv6: v6_mode; with "off" nothing is written; else lease_time, dns1,
 *                dns2, dns_more (each in brackets) and, when "stateful", start_ip and end_ip. Addresses and names are
 *                written as they are, but no text makes its line longer than 1023 bytes, and none of the range holds
 * ","
 * @return 0; -1 when nothing was written for bad arguments or an unknown mode; -1 as well when directory or file cannot
 *         be made or written, or an option is not valid: the lines before it are written
 */
int DHCPTagConfSetConfig(const char *ifname, unsigned int subnet, int type, const DHCP_TAG_CONF *conf);
/**
 * Reads the switch of a subnet.
 * @param enabled  receives 1 or 0
 * @return 1 when it has one; 0 when not; -1 for bad arguments
 */
int DHCPTagConfGetEnable(const char *ifname, unsigned int subnet, int type, int *enabled);
/**
 * Reads a subnet back. The name may be a field of the record itself.
 * @param conf  is emptied, then receives enabled, lease_time, dns1, dns2 and
 *              IPv4: ifname, start_ip, end_ip, netmask and router cut to 19 characters, domain (the last one of a list)
 *              to 254, and options, to be freed by DHCPOptionFree: those that are no valid option are logged and left
 *              out. IPv6: v6_mode, start_ip, end_ip; a lease time that is no number is 3600. What the record held in
 *              "options" is not freed
 * @return 1; 0 without a fragment; -1 for bad arguments, no memory, or a fragment without range, name servers or, of
 *         IPv4, interface or router: the record is partly filled then, without options
 */
int DHCPTagConfGet(const char *ifname, unsigned int subnet, int type, DHCP_TAG_CONF *conf);

/**
 * Hands the switches of the interfaces on when a bond is made or taken apart, then restarts the server. In the info
 * files that are there, of both families, the interfaces that lose their address keep `enable` as
 * `bonding_backup_enable` and are switched off; those that get one take back what they kept, if anything.
 * @param op      1: interfaces went into the bond; anything else: the bond is gone
 * @param bond    the bond
 * @param slaves  names of its interfaces
 * @return 0, also when the server does not restart; -1 for bad arguments (0xD00 but for a NULL bond) with nothing
 *         changed, or for a file without `enable`, or that cannot be changed: those before it stay changed
 */
int DHCPDLinkAggrSet(int op, const char *bond, const KLIBSZLIST *slaves);

/* ---- IPv4 ranges ----------------------------------------------------------------------------------------------- */

/**
 * Reads the ranges of an interface from /etc/dhcpd/dhcpd-<ifname>-subnet<N>.conf, N from 0 to the first that is absent.
 * @param ifname  interface; a bad name is refused without a code
 * @param head    receives the ranges when there is at least one, to be freed by DHCPRangeFree; NULL on entry
 * @return their number; -1 for bad arguments, a fragment without a proper range, or no memory: *head stays NULL
 */
int DHCPGetInterfaceRanges(const char *ifname, DHCP_RANGE **head);
/** Frees a list of ranges; NULL is allowed. */
void DHCPRangeFree(DHCP_RANGE *head);
/**
 * Whether an IPv4 subnet overlaps one that is served on another interface: one of the two contains the other. Only the
 * masked start addresses count, not where the ranges end.
 * @param ifname       interface the subnet is meant for; its own subnets are not looked at
 * @param start        first address
 * @param end          last address; not looked at, but not empty
 * @param netmask      mask
 * @param conflict_if  receives the other interface's name, cut to the buffer, "" without a conflict; or NULL
 * @param size         size of conflict_if, above 0
 * @return 1, 0; -1 for bad arguments or when the interfaces or their ranges cannot be read. A subnet that is no
 *         address and mask is logged and conflicts with nothing
 */
int DHCPIsRangeConflict(const char *ifname, const char *start, const char *end, const char *netmask, char *conflict_if,
                        unsigned int size);

/* ---- renames and the client -------------------------------------------------------------------------------------- */

/**
 * Moves the server's files of an interface that changes its name: dhcpd-<if>.info, dhcpd-<if>-subnet*, the static
 * leases dhcpd-<if>-static.conf and wpad-<if>.conf and .info. In the subnets' and the wpad fragment every occurrence of
 * the old name is replaced, by /bin/sed -i with the names as they are (a "." matches any character). Files of IPv6
 * (dhcpd6-) stay. What is moved stays moved when a later step fails.
 * @param old_if  name so far; no "\" in it
 * @param new_if  new name; no "\" in it
 * @return 0, also when there is nothing to move; -1 for bad names (0xD00) or a step that failed
 */
int DHCPDConfChangeInterface(const char *old_if, const char *new_if);

/**
 * Asks the network's DHCP server what it would give an interface: runs /usr/sbin/dhclient -q --kova_test with the
 * script /tmp/dhclient-script (copied there by /bin/cp when absent), the leases /tmp/dhcpv4.leases.<if> and the pid
 * file /etc/dhclient/ipv4/dhcpcd-<if>.pid, then reads IPADDR and NETMASK of /etc/dhclient/ipv4/dhcpcd-<if>.info.
 * @param info  szIfname: the interface, not beginning with "-"; receives szIP and szMask, each cut to 19 characters
 * @return 0; -1 with 0xD00, 0x2A00 (the client failed), 0x900 (no info file), or without a code of its own when the
 *         script cannot be copied or a key is missing
 */
int KOVAIGetDHCPTestNetInfo(NETINFO *info);

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
 * @param conf  boot file and address are neither empty nor hold ",", double quotes or control characters, and make no
 * line longer than 1023 bytes
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
