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

int KLIBNetGetInterfaceInfo(IFINFO *pInfo, int capacity, int kind);
int KOVANetEnumCard(int kind);
int KLIBNetInterfaceEnum(IFINFO *pInfo, int capacity, int kind);
int KOVANetIsDevTypeMatch(const char *szIfname, int kind);
int KOVANetInternalLanNumGet(void);
int KLIBNetGetLocalLanConfig(char names[32][16], int *pCount);
int KLIBNetIFIsLocalLan(const char *szIfname);
int KLIBNetOVSIfIsMaster(const char *szIfname);
int KLIBNetOVSGetOriginalIf(const char *szIfname, char *szOut, int size);
int KLIBNetOVSIfIsSlave(const char *szIfname);
int KOVANetIfIsBondingPassive(const char *szIfname);

/* ---- records of one card -------------------------------------------------------------------------------------- */

int KOVANetGetCard1(int index, const char *szIP, NETINFO *pNetInfo);
int KOVANetGetCard1Ex(int index, const char *szIP, int kind, NETINFO *pNetInfo);
int KOVANetIFGetInfo(const char *szIfname, IFINFO *pInfo, NETINFO *pNetInfo);
int KOVANetIFGetInfoEx(const char *szIfname, int kind, IFINFO *pInfo, NETINFO *pNetInfo);
int KOVANetIFGetIPConfig(const char *szIfname, NETINFO *pNetInfo);
int KOVANetIfIsStaticIP(const char *szIfname);
int KOVANetGetEthInfo(ETHINFO *pEthInfo, const char *szIfname);
int KLIBNetGetIfCfg(const char *szIfname, const char *szConf, char *szValue, int cbValue);
int KLIBNetSetIfCfg(const char *szIfname, const char *szConf, const char *szValue);
int KLIBNetGetMacAddr(int index, char *szMac, int cbMac);
int KLIBNetGetMacAddrByInterface(const char *szIfname, char *szMac, int cbMac);
int KOVAILnxGetIP(const char *szIfname, char *szIP, int cbIP);
int KOVAILnxGetIPFromCfg(const char *szIfname, char *szIP, int cbIP);
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
 * same. Takes no lock: the caller holds 0x106.
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
int KOVANetIfIsLink(const char *szIfname);

/**
 * Renames an interface that is known to the traffic counters and down.
 * @param szOld  name, at most 16 characters (the kernel has none above 15)
 * @param szNew  name, at most 16 characters
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
