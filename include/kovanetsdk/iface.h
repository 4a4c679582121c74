/**
 * @file
 * Network interfaces: which there are, what they are, their IPv4 addresses and their state.
 */
#ifndef KOVANETSDK_IFACE_H
#define KOVANETSDK_IFACE_H

#include <stddef.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/* ---- records -------------------------------------------------------------------------------------------------- */

/** A card's address record. */
typedef struct NETINFO {
    uint32_t nIPSource;     /**< 0 the address comes from DHCP, 1 static */
    uint32_t blLinkUp;      /**< 1 when the interface has carrier, else 0 */
    char szIfname[16];      /**< interface name */
    unsigned char abMac[6]; /**< hardware address */
    char szIP[20];          /**< IPv4 address in dotted text, "" when none */
    char szMask[20];        /**< IPv4 netmask in dotted text, "" when none */
} NETINFO;

/** What the kernel says of an interface. */
typedef struct IFINFO {
    char szIfname[16];      /**< interface name */
    unsigned char abMac[6]; /**< hardware address */
    char szIP[64];          /**< IPv4 address in dotted text; the cluster's where asked for */
    uint32_t nLink;         /**< 2 when the interface has carrier, 0 otherwise */
    uint32_t nFlags;        /**< kernel interface flags */
    char szMask[20];        /**< IPv4 netmask in dotted text; the cluster's where asked for */
} IFINFO;

/** The Ethernet link of an interface. */
typedef struct ETHINFO {
    int32_t nSpeed;      /**< current speed in Mb/s, -1 unknown or no link */
    int32_t nDuplex;     /**< 0 half, 1 full, -1 unknown */
    int32_t nMTU;        /**< MTU in bytes, -1 unknown */
    uint32_t nSupported; /**< supported link modes, the kernel's "supported" bit layout */
    int32_t nBestSpeed;  /**< best supported speed in Mb/s, -1 unknown */
    int32_t nBestDuplex; /**< best supported duplex, -1 unknown */
    char szBestMode[16]; /**< name of the best supported mode, "baseT" ..., "" unknown */
} ETHINFO;

/* ---- which interfaces there are ------------------------------------------------------------------------------- */

/**
 * Lists the interfaces of a kind. Only interfaces that are up count, and no members of a bridge or of a bond of the
 * virtual switch. Not safe to call from two threads at once: the list of interfaces is kept for the process.
 *
 * @param pInfo     receives the records, or NULL to count only (the interfaces below VLANs are counted then, too)
 * @param capacity  records there is room for, 0 or more; at most 32 interfaces are looked at
 * @param kind      selector 1 physical cards, bond members included, no VLANs; 2 logical interfaces: bonds instead of
 *                  their members, VLANs instead of the interface below them (moved last records fill the gaps); 8 as 2
 *                  with point-to-point links and with the interfaces below VLANs; any other value but 0: all but
 *                  loopback and point-to-point. Plus 0x04 to keep the cluster's heartbeat interface, which a running
 *                  cluster hides, plus 0x10 to show a running cluster's address and mask instead of the kernel's and
 *                  to leave out interfaces without one
 * @return number of interfaces; -1 with 0xD00 (capacity, selector 0), 0x200 (memory), 0x900 or 0x4000 (list of modules
 *         or of interfaces), 0x3400 (no socket). 0xD00 beside a count: more VLANs than interfaces, none was replaced
 */
int KLIBNetGetInterfaceInfo(IFINFO *pInfo, int capacity, int kind);
/** Counts the interfaces of a kind: KLIBNetGetInterfaceInfo without records. @return as there */
int KOVANetEnumCard(int kind);
/**
 * Lists the interfaces that are up, without loopback, bond members, members of a bridge or of a bond of the virtual
 * switch. Link is the kernel's running flag.
 * @param pInfo     receives the records, or NULL to count only
 * @param capacity  records there is room for, 0 or more; at most 32 interfaces are looked at
 * @param kind      0 all, 1 all but the internal LAN's (KLIBNetIFIsLocalLan), 2 only those; plus the bits 0x04 and 0x10
 * of KLIBNetGetInterfaceInfo
 * @return number of interfaces; -1 with 0xD00 (capacity, kind), 0x200, 0x900, 0x4000 or 0x3400
 */
int KLIBNetInterfaceEnum(IFINFO *pInfo, int capacity, int kind);
/**
 * @param szIfname  interface
 * @param kind      as for KLIBNetGetInterfaceInfo
 * @return 1 when the interface is of the kind; 0 with 0xBC00 when not, with 0xD00 for no name, or with the code of the
 *         enumeration that failed
 */
int KOVANetIsDevTypeMatch(const char *szIfname, int kind);
/**
 * Number of internal LAN ports: /proc/sys/kernel/kova_internal_netif_num, and when that holds no number above 0, the
 * key maxlanport of /etc.defaults/kovainfo.conf, else 1.
 * @return the number; -1 with 0x900 when the kernel's file is missing
 */
int KOVANetInternalLanNumGet(void);
/**
 * The internal LAN's interfaces: key local_lan of /etc.defaults/kovainfo.conf, blank-separated. Read once per process;
 * a failed read is tried again at the next call.
 * @param names   receives the names, each cut to 15 characters, unused entries ""
 * @param pCount  receives their number, 0 without the key, -1 on failure
 * @return 0; -1 with 0xD00, or 0x100 (the file cannot be read, more than 32 names)
 */
int KLIBNetGetLocalLanConfig(char names[32][16], int *pCount);
/**
 * Takes no lock: the answer is one key of the interface's file, which is replaced whole.
 * @param szIfname  interface
 * @return 1 when LOCAL_LAN of its file is exactly "yes"; else 0, also without a file (0x900) and for a bad name (0xD00)
 */
int KLIBNetIFIsLocalLan(const char *szIfname);
/**
 * Role of an interface in the virtual switch, by its name and /sys/devices/virtual/net.
 * @return 0 none (0xD00 for a bad name); 1 a bridge over one port ("ovs_eth0"); 2 a bond ("ovs_bond0")
 */
int KLIBNetOVSIfIsMaster(const char *szIfname);
/**
 * Name of the interface behind one of the virtual switch: the name without its "ovs_".
 * @param szIfname  a name that begins with "ovs_"
 * @param szOut     receives the rest
 * @param size      size of szOut, longer than the rest
 * @return 0; -1 with 0xD00
 */
int KLIBNetOVSGetOriginalIf(const char *szIfname, char *szOut, int size);
/**
 * Whether an interface is a member of a bond of the virtual switch, listed in /sys/class/net/kova_ovs_bonds; one with a
 * switch port of its own is none.
 * @return 1, 0; 0 with 0xD00 (name), 0x900 (the list cannot be opened) or 0x200
 */
int KLIBNetOVSIfIsSlave(const char *szIfname);
/**
 * Whether an interface is a member of a bond: of a kernel's, by its flags, or of the virtual switch's.
 * @return 1, 0; 0 with 0xD00 (name), 0x3400 (no socket), 0x900 (the list cannot be opened) or 0x200
 */
int KOVANetIfIsBondingPassive(const char *szIfname);

/* ---- records of one card -------------------------------------------------------------------------------------- */

/**
 * The record of a card, by its number or its address. Cards are the interfaces of kind 2 (KLIBNetGetInterfaceInfo).
 * Holds the lock 0x105.
 * @param index     number of the card, from 0. With an address it only has to be below the number of cards
 * @param szIP      current IPv4 address of the card in dotted text, or NULL to take the index, 0 to 31, alone
 * @param pNetInfo  receives the record: name, hardware address and link from the kernel, the rest from
 *                  KOVANetIFGetIPConfig; untouched when there is no such card
 * @return 1 found; 0 no such card; -1 with 0xD00, 0x400 (lock), 0x200, the code of the enumeration, or as
 *         KOVANetIFGetIPConfig
 */
int KOVANetGetCard1(int index, const char *szIP, NETINFO *pNetInfo);
/**
 * KOVANetGetCard1 among the interfaces of any kind. With the bit 0x10 and a running cluster, szIP is compared with the
 * cluster's addresses, and the record shows the cluster's address and mask.
 * @param kind  as for KLIBNetGetInterfaceInfo
 * @return as KOVANetGetCard1
 */
int KOVANetGetCard1Ex(int index, const char *szIP, int kind, NETINFO *pNetInfo);
/**
 * What there is to know of one interface, up or not.
 * @param szIfname  interface
 * @param pInfo     receives what the kernel says, or NULL
 * @param pNetInfo  receives the card's record as KOVANetGetCard1 fills it, or NULL. With both NULL the call says
 * whether the interface is there
 * @return 0; -1 with 0xD00, 0x3400 (no socket), 0x3600 (unknown interface, failed request), or as KOVANetIFGetIPConfig
 */
int KOVANetIFGetInfo(const char *szIfname, IFINFO *pInfo, NETINFO *pNetInfo);
/**
 * The same; with the bit 0x10 in kind and a running cluster, both records show the cluster's address and mask.
 * @return as KOVANetIFGetInfo; -1 with 0x200 when the cluster has no address for the interface yet
 */
int KOVANetIFGetInfoEx(const char *szIfname, int kind, IFINFO *pInfo, NETINFO *pNetInfo);
/**
 * Reads the configured IPv4 address: keys IPADDR and NETMASK of the interface's file, or with DHCP (BlKOVALnxIsDHCP) of
 * /etc/dhclient/ipv4/dhcpcd-<name>.info. Holds the lock 0x105.
 * @param szIfname  interface
 * @param pNetInfo  nIPSource, szIP and szMask are set; the other fields stay
 * @return 0 both were read, or a DHCP interface has no lease (both ""); -1 with 0xD00, 0x400 (lock), or without a code
 * of its own when a key is missing
 */
int KOVANetIFGetIPConfig(const char *szIfname, NETINFO *pNetInfo);
/**
 * Holds the lock 0x105.
 * @return 1 when BOOTPROTO of the interface's file is exactly "static"; else 0, also without a file, and with 0xD00
 *         (name) or 0x400 (lock)
 */
int KOVANetIfIsStaticIP(const char *szIfname);
/**
 * The Ethernet link of an interface; for a port of the virtual switch that of the interface behind it. Of a bond of the
 * virtual switch only the duplex, of the first member that answers, and the MTU (KOVAGetMTUSetting) are known.
 * @param pEthInfo  receives the record; what is not known is -1 (nSupported 0xFFFFFFFF, szBestMode "")
 * @param szIfname  interface, at most 16 characters
 * @return 0; -1 with 0xD00, 0x3400 (no socket, unknown interface), 0x3600 (failed request), or the code of the bond or
 *         MTU query; what is known by then is in the record
 */
int KOVANetGetEthInfo(ETHINFO *pEthInfo, const char *szIfname);
/**
 * Reads any key of an interface's file. Holds the lock 0x105.
 * @param szIfname  interface
 * @param szConf    key
 * @param szValue   receives the value without its quotes, cut to the buffer, "" when there is none
 * @param cbValue   size of szValue, above 0
 * @return 1 found; 0 no such key; -1 with 0xD00, 0x400 (lock) or 0x900 (no file)
 */
int KLIBNetGetIfCfg(const char *szIfname, const char *szConf, char *szValue, int cbValue);
/**
 * Sets any key of an interface's file, quoted; a missing file is made. Holds the lock 0x106.
 * @param szIfname  interface
 * @param szConf    key
 * @param szValue   value without newline; may be ""
 * @return 0; -1 with 0xD00, 0x400 (lock) or the code of the rewrite (0x900, 0xB00, 0x2800)
 */
int KLIBNetSetIfCfg(const char *szIfname, const char *szConf, const char *szValue);
/**
 * Hardware address of a card: the cluster's for that number if there is one, else the card's own.
 * @param index  number of the card as for KOVANetGetCard1, 0 to 31
 * @param szMac  receives "aa:bb:cc:dd:ee:ff"
 * @param cbMac  size of szMac, at least 18
 * @return 0; -1 with 0xD00, 0xBC00 (no such card) or the code of the enumeration
 */
int KLIBNetGetMacAddr(int index, char *szMac, int cbMac);
/**
 * Hardware address of an interface, up or not.
 * @param szMac  receives "aa:bb:cc:dd:ee:ff"
 * @param cbMac  size of szMac, at least 18
 * @return 0; -1 with 0xD00, 0x3400 (no socket, unknown interface) or 0x3600 (failed request)
 */
int KLIBNetGetMacAddrByInterface(const char *szIfname, char *szMac, int cbMac);
/**
 * Current IPv4 address of an interface.
 * @param szIP  receives the dotted address, "" when there is none or on failure
 * @param cbIP  size of szIP; an address that does not fit is refused whole
 * @return 0, also without an address; -1 with 0xD00, 0x3400 (no socket, unknown interface) or 0x3600 (failed request)
 */
int KOVAILnxGetIP(const char *szIfname, char *szIP, int cbIP);
/**
 * Configured IPv4 address: key IPADDR of the interface's file. Holds the lock 0x105.
 * @param szIP  receives the value, cut to the buffer, "" without the key
 * @param cbIP  size of szIP, above 0
 * @return 0, also without the key; -1 with 0xD00, 0x400 (lock) or 0x900 (no file)
 */
int KOVAILnxGetIPFromCfg(const char *szIfname, char *szIP, int cbIP);
/**
 * The interface that has an IPv4 address now, among those of KLIBNetInterfaceEnum(..., 0).
 * @param szIP      dotted address
 * @param szIfname  receives the name, "" when there is none
 * @param cbIfname  size of szIfname; a name that does not fit is refused whole
 * @return 1 found; 0 no interface has it; -1 with 0xD00, 0x1000 (no address) or the code of the enumeration
 */
int KOVANetIP2If(const char *szIP, char *szIfname, int cbIfname);

/* ---- IPv4 address assignment ---------------------------------------------------------------------------------- */

/**
 * Makes a card static or hands it to the DHCP client, in its file and in the running kernel.
 *
 * Static: KOVAILnxSetIPNetmask with the record's name, address and mask; then /etc/ppp/old_gateway.bak and
 * /etc/resolv.conf.bak are deleted and the service "ddns" is reloaded unless pOld holds the same address and mask.
 * DHCP: the job "dhcp-client" of the interface is stopped (a failure is only logged) and started, and its file gets
 * DEVICE, ONBOOT and BOOTPROTO=dhcp and loses IPADDR, NETMASK, MASTER and SLAVE.
 *
 * Holds the lock 0x106 throughout; what the commands start must not wait for it.
 *
 * @param pNew  the wanted settings: nIPSource (0 DHCP, else static) and szIfname, for a static card szIP and szMask
 *              (dotted texts). Fields need not be terminated
 * @param pOld  the settings before, or NULL
 * @return 0; -1 (0xD00 no record or no usable name, 0x1000 the address and mask do not fit, 0x2A00 the DHCP client does
 *         not start, or as KOVAILnxSetIPNetmask); -2 the DHCP client was started, only the file could not be written;
 *         the lock call's result with 0x400 when the lock could not be had
 */
int KOVANetSetCard1(NETINFO *pNew, NETINFO *pOld);

/**
 * Sets a static IPv4 address: rewrites the interface's file (DEVICE, ONBOOT, IPADDR, NETMASK, BOOTPROTO=static, without
 * MASTER and SLAVE), stops its DHCP client (a failure is only logged) and sets the address with KOVANetSetIP. The file
 * is backed up as "<file>.tmp<seconds>" and moved back when a step fails; one that cannot be backed up changes all the
 * same. Only the file is put back: a DHCP client that was stopped stays so. Takes no lock: the caller holds 0x106.
 * @param szIfname  interface
 * @param szIP      dotted address
 * @param szMask    dotted mask
 * @return 0; -1 with 0xD00 (an argument), 0x200 (memory), or the code of the step that failed
 */
int KOVAILnxSetIPNetmask(const char *szIfname, const char *szIP, const char *szMask);

/**
 * Adds or deletes an address of an interface in the running kernel, or flushes all of one family. Takes no lock: the
 * caller holds 0x106.
 *
 * Adding raises "net/ipv4_change" or "net/ipv6_change" first when the interface does not have the address yet. Adding
 * an IPv4 address replaces the one there is (/sbin/ifconfig IF 0.0.0.0, then the new one: a failure in between leaves
 * none); an unchanged one refreshes the static route rules (/usr/kova/sbin/kovanetdtool), and without link the subnet's
 * route is deleted again. The rest is done by /sbin/ip.
 *
 * @param szFamily  "-4" or "-6"
 * @param szIfname  interface
 * @param szIP      address; not looked at by "flush"
 * @param prefix    prefix length, 0 to 32 or 0 to 128; not looked at by "flush"
 * @param szAction  "add", "del" or "flush"
 * @return 0; -1, logged, with 0xD00 for a missing argument or an unusable interface name and else no code of its own
 */
int KOVANetSetIP(const char *szFamily, const char *szIfname, const char *szIP, int prefix, const char *szAction);

/**
 * Removes all addresses of one family from an interface: "-4" with /sbin/ip, "-6" with KOVALnxIPv6FlushAddr.
 * @return 0; -1, logged, with 0xD00 for a missing argument or an unusable interface name and else no code of its own
 */
int KOVANetFlushIP(const char *szFamily, const char *szIfname);

/**
 * Asks the dynamic-DNS daemon (/usr/kova/sbin/ddnsd -e) for the public IPv4 address; it stands in
 * /run/ddns/externalIP.result afterwards, key externalIP.
 * @param szIP  receives the address in dotted text; untouched on failure
 * @param cbIP  size of szIP in bytes, at least 16
 * @return 0; -1 with 0xD00 (an argument), 0x200 (memory), or the platform's code
 */
int KOVAExternalIPGet(char *szIP, int cbIP);

/* ---- state, blocks, names and link events --------------------------------------------------------------------- */

/**
 * Sets or clears kernel flags of an interface; the others stay.
 * @param flags  the flags to change, of the kernel's 16 (IFF_UP ...)
 * @param on     0 clears, anything else sets
 * @return 0; -1 with 0xD00 (an argument), 0x3400 (no socket, or no such interface) or 0x3600 (the kernel refuses)
 */
int KLIBNetISetIfFlags(const char *szIfname, unsigned flags, int on);
/** Brings an interface up. @return as KLIBNetISetIfFlags */
int KLIBNetIfUp(const char *szIfname);
/** Brings an interface down. @return as KLIBNetISetIfFlags */
int KLIBNetIfDown(const char *szIfname);
/** Brings an interface down and up again; stays down when it could not be brought up. @return as KLIBNetISetIfFlags */
int KLIBNetReInitIf(const char *szIfname);
/** @return 1 when /sys/class/net/IF/flags says up; 0 when not, when it cannot be read, or with 0xD00 for the name */
int KOVANetIsIFUp(const char *szIfname);
/**
 * Whether an interface has link: the kernel's running flag. A port of the virtual switch has the link of the interface
 * behind it, a bond of the switch that of its first member that has link or cannot be asked.
 * @return 1 link; 0 none; -1 with 0xD00 (name), 0x3400 (no socket, unknown interface), 0x3600 (failed request), or the
 *         code of the bond query
 */
int KOVANetIfIsLink(const char *szIfname);

/**
 * Renames an interface that is known to the traffic counters and down.
 * @param szOld  name, at most 16 characters (the kernel has none above 15)
 * @param szNew  name, at most 16 characters, without "%" and ":"
 * @return 0; -1 with 0xD00 (a name), 0x200 (memory), 0xBC00 (not there, or up), 0x3400 (no socket, or the kernel cannot
 *         have the name) or 0x3600 (the kernel refuses)
 */
int KOVANetRenameEth(const char *szOld, const char *szNew);

/**
 * Notes reasons that block changes of an interface in its file, and their number in BLOCK_CNT. Holds a lock of the file
 * itself. Reasons are handled in the order of their bits; the first that fails ends the call, earlier ones stay.
 * @param mask  sum of 1 BLOCK_HA, 2 BLOCK_AHA, 4 BLOCK_VIRTUAL, 8 BLOCK_ORLENA; other bits are ignored
 * @param on    1 notes a reason that is not noted ("yes"), 0 takes back one that is ("no"); any other value writes "no"
 *              for a reason that is not noted and counts it
 * @return 0; -1 with 0xD00 (the name), or the platform's code (no file, no lock in 30 seconds, write)
 */
int KOVANetSetIfBlock(const char *szIfname, unsigned mask, int on);
/**
 * Reads the reasons that block changes of an interface. Takes no lock.
 * @param pMask  the bits of KOVANetSetIfBlock are added to it: pass it zeroed; untouched on failure
 * @return 0; -1 with 0xD00 (an argument), or the platform's code (0x900: the interface has no file)
 */
int KOVANetGetIfBlock(const char *szIfname, int *pMask);

/** Raises "net/if_link_up" after the fact, IFNAME the interface. @return 0; -1 with 0xD00 or the platform's code */
int KLIBNetIfLinkUpEvent(const char *szIfname);
/** Raises "net/if_link_down" after the fact, IFNAME the interface. @return 0; -1 with 0xD00 or the platform's code */
int KLIBNetIfLinkDownEvent(const char *szIfname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
