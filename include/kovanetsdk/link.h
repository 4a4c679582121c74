/**
 * @file
 * VLANs, link aggregation and MTU.
 */
#ifndef KOVANETSDK_LINK_H
#define KOVANETSDK_LINK_H

#include <kova/core.h>
#include <kovanetsdk/iface.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/** Bond modes. */
typedef enum KOVA_LINK_AGGR_MODE {
    KOVA_LINK_AGGR_UNKNOWN = 0,
    KOVA_LINK_AGGR_BALANCE_ALB = 1,
    KOVA_LINK_AGGR_8023AD = 2,
    KOVA_LINK_AGGR_BALANCE_XOR = 3,
    KOVA_LINK_AGGR_ACTIVE_BACKUP = 4,
    KOVA_LINK_AGGR_BALANCE_RR = 5,
    KOVA_LINK_AGGR_OVS_ACTIVE_BACKUP = 6,
    KOVA_LINK_AGGR_BALANCE_SLB = 7,
    KOVA_LINK_AGGR_BALANCE_TCP = 8
} KOVA_LINK_AGGR_MODE;

enum { KOVA_LINK_AGGR_MODES = 9, KOVA_LINK_AGGR_MAX_SLAVES = 32 };

/** A bond mode of the kernel. */
typedef struct KOVABONDDESC {
    const char *szKernelMode; /**< the kernel's number as text, "4" */
    const char *szName;       /**< "802.3ad" */
    const char *szOptions;    /**< value of BONDING_OPTS, with its double quotes */
} KOVABONDDESC;
/** By KOVA_LINK_AGGR_MODE; the entries of no mode and of the virtual switch's modes hold "". */
/* NOLINTNEXTLINE(bugprone-dynamic-static-initializers): a constant table, declared for C */
extern const KOVABONDDESC grgBondDesc[KOVA_LINK_AGGR_MODES];

/** A bond; compared bytewise, so bytes that hold no value are zero. */
typedef struct KOVALINKAGGROPT {
    char szName[16];        /**< bond device */
    int32_t mode;           /**< KOVA_LINK_AGGR_MODE; 0 no bond */
    int32_t blNoPartner;    /**< 802.3ad only: 1 when no partner was found */
    int32_t cSlaves;        /**< members, at most 32 */
    char aszSlaves[32][16]; /**< member names, sorted by strcmp */
} KOVALINKAGGROPT;

/** @return the mode whose name the text begins with ("802.3ad", "balance-slb" ...); 0 for none, with 0xD00 for NULL */
KOVA_LINK_AGGR_MODE KOVANetLinkAggrStringToMode(const char *szMode);
/**
 * Appends the members of a kernel bond to a list.
 * @param szBond   bond
 * @param pSlaves  list of the caller
 * @return their number; -1 with 0xD00, 0x900 (no bond), 0xA00 (nothing to read) or 0x200; only bad arguments are logged
 */
int KOVANetLinkAggrPhyGet(const char *szBond, KLIBSZLIST *pSlaves);
/**
 * Inserts a member in its sorted place.
 * @param pOpt     bond
 * @param szSlave  name, cut to 15 characters
 * @return 0 (and 0xBC00 in the register: it was not there before); -1 with 0xD00, 0xBD00 (32 members) or 0xBB00 (is
 *         there already)
 */
int KOVANetLinkAggrOptSlsaveAdd(KOVALINKAGGROPT *pOpt, const char *szSlave);
/**
 * Reads a bond: of the kernel from /sys/class/net/<name>/bonding and /proc/net/bonding, of the virtual switch from the
 * keys SLAVE_LIST and BOND_MODE of its interface file, members that are not there left out.
 * @param szName  bond
 * @param pOpt    receives the record; mode 0 and no members for what is no bond, or one without members
 * @return 0; -1 with 0xD00, 0x200, 0x900, 0xA00 (mode cannot be read), 0xBB00 or 0xBD00 (members); 1 when a bond of the
 *         virtual switch cannot be read (a key is missing, memory, members): test for != 0. 0xBC00 beside 0: a member
 * was added, or an aggregation without status counts as one without partner
 */
int KOVANetLinkAggrGet(const char *szName, KOVALINKAGGROPT *pOpt);
/** @return name of a mode, "unknown" for none and for any other number; never NULL */
const char *KOVANetLinkAggrModeToString(int mode);
/** @return 1 when the kernel has bonds (/sys/class/net/bonding_masters); 0; -1 with 0xA00 */
int KOVANetLinkAggrExist(void);
/**
 * Appends the kernel's bonds that have members to a list.
 * @param pBonds  list of the caller
 * @return number of all bonds, those without members included; 0 without the driver; -1 with 0xD00, 0x200 or 0xA00
 */
int KOVANetLinkAggrEnum(KLIBSZLIST *pBonds);
/**
 * Makes, changes or deletes a bond, by its files and the network script. /etc/rc.network stops bond and members before
 * and starts them after, whatever came of the files between. A new bond takes over file and DHCP lease of its first
 * member, every member's file is copied to "<file>.saved" by /bin/cp before it changes and put back by /bin/mv when a
 * step fails; copies that earlier changes left are deleted before. A deleted bond's file becomes the first member's;
 * members that had its address, too, are left without one. Raises "net/ifname_change" around making and deleting, from
 * members to bond and back. The DHCP server's switches are DHCPDLinkAggrSet's matter. Takes no lock.
 * @param pOpt  the bond wanted: szName, mode, cSlaves (2 to 32) and aszSlaves, sorted, unused bytes zero, blNoPartner
 *              as read; with fewer members, or an interface named twice, a bond that is there stays. mode 0 deletes it,
 *              and receives its members, whatever stood there. Equal to what is there: nothing is done
 * @return 0; -1 with 0xD00, 0x200, 0x2A00 (a copy), the codes of reading the bond or of the rewrite, or without a code
 *         when the event cannot be opened (nothing done)
 */
int KOVANetLinkAggrSet(KOVALINKAGGROPT *pOpt);
/**
 * Rewrites the file of a member, after a copy to "<file>.saved".
 * @param szSlave    interface
 * @param blEnslave  non-zero it joins (MASTER, SLAVE=yes, USERCTL=no), zero it leaves
 * @param pOpt       the bond it joins, otherwise NULL
 * @return 0; -1 with 0xD00, 0x200 or the code of the rewrite
 */
int KOVANetLinkAggrConfSetSlave(const char *szSlave, int blEnslave, const KOVALINKAGGROPT *pOpt);
/**
 * Rewrites the files so that a bond is no more: its first member gets its file, all leave, its own is deleted. Put back
 * from the ".saved" copies when a step fails; these copies stay otherwise. The first member's is made after it got the
 * bond's file: after a failure it is a member with the bond's settings.
 * @param pOpt  the bond and its members; without any, only the file of a bond (BONDING_OPTS) is deleted
 * @return 0; -1 with 0xD00, 0x2A00 (a copy), 0x200, or the code of the step
 */
int KOVANetLinkAggrConfDel(const KOVALINKAGGROPT *pOpt);
/**
 * What BOOTPROTO the new owner of an interface file needs: "dhcp", with an empty address, unless it is "static" or
 * "dhcp" in any case.
 * @param szPath  the file
 * @param pKeys   receives the keys to set
 * @return 0; -1 with 0xD00 or 0x200
 */
int KOVANetLinkAggrConfUpdateBootProto(const char *szPath, KLIBSZHASH *pKeys);
/**
 * MTU of an interface in the kernel.
 * @param szIfname  interface, at most 16 characters
 * @return the MTU; 0 with 0x3400 (unknown interface) or 0x3600 when the request fails; -1 with 0xD00 or 0x3400 (no
 *         socket)
 */
int KOVAGetMTU(const char *szIfname);
/**
 * The MTU that counts for an interface: of a port of the virtual switch that of the interface behind it, of a bond of
 * the switch the largest of its members (those before the first that cannot be asked).
 * @return as KOVAGetMTU; -1 also for a bond without members or that cannot be read
 */
int KOVAGetMTUSetting(const char *szIfname);

/**
 * MTU that is set for an interface: key <name>_mtu of /etc/kovainfo.conf; for a port of the virtual switch that of the
 * interface behind it. Takes no lock.
 * @param szIfname  interface, at most 16 characters
 * @param szValue   receives the MTU in decimal, "1500" without the key; cut to the buffer
 * @param cbValue   size of szValue, above 0
 * @return 0; -1 with 0xD00, or 0x900 (the file cannot be read)
 */
int KOVAConfGetMTUValue(const char *szIfname, char *szValue, int cbValue);
/**
 * Stores the MTU that is set for an interface; that of a VLAN is its row device's, too. The kernel is left alone. Holds
 * the lock 0x806 over both keys.
 * @param szValue   MTU in decimal, not checked
 * @param szIfname  interface, at most 16 characters
 * @return 0, also, with nothing stored, when the kernel cannot be asked whether it is a VLAN; -1 with 0xD00, 0x400 or
 *         the code of the rewrite; the other key may have been stored
 */
int KOVAConfSetMTUValue(const char *szValue, const char *szIfname);
/**
 * Sets an MTU in the kernel. The interface is taken down for it and is up afterwards in any case. A VLAN's row device
 * is set first; for a port of the virtual switch the interface behind it, for a bond of the switch every member, until
 * one fails. What is configured is left alone.
 * @param szValue   MTU in decimal; the kernel decides what it accepts
 * @param szIfname  interface, at most 16 characters
 * @return 0; -1 with 0xD00, 0x3400 (no socket), 0x8100 (refused), or for a bond that cannot be read or has no members
 */
int KOVANetSetMTUEth(const char *szValue, const char *szIfname);
/**
 * Stores an MTU and sets it in the kernel, waits 5 seconds for the link and announces "net/mtu_change". On a link below
 * 1000 Mb/s, or of unknown speed, an MTU of 1500 and more is stored and announced, but not set. For a bond of the
 * virtual switch its members are set, and the event is raised whatever comes of it; the register keeps the failure.
 * @param szValue   MTU in decimal
 * @param szIfname  interface, at most 16 characters
 * @return 0; -1 as KOVAConfSetMTUValue, KOVANetGetEthInfo and KOVANetSetMTUEth; no event then, but for such a bond
 */
int KOVANetSetMTUValue(const char *szValue, const char *szIfname);

/* ---- VLANs ---------------------------------------------------------------------------------------------------- */

/** A VLAN interface. */
typedef struct VLANINFO {
    char szIfname[16];    /**< its name, "eth0.10", cut to 15 characters */
    char szRowDevice[16]; /**< the interface below it */
    uint32_t vlanId;      /**< 1 to 4094 */
} VLANINFO;

/** @return 0 for a VLAN id, 1 to 4094; -1 for another number, without a code */
int KLIBNetVlanValidId(int nId);
/** @param szIfname not looked at. @return 1 when the kernel has VLANs (/proc/net/vlan/config), else 0 */
int KLIBNetVlanExist(const char *szIfname);
/**
 * Asks the kernel about an interface.
 * @param pVlan  receives the record; name alone, or with the row device, for what is no VLAN
 * @return 1 a VLAN; 0 none, or no such interface; -1 with 0xD00 or 0x3400 (no socket)
 */
int KLIBNetVlanGet(const char *szIfname, VLANINFO *pVlan);
/**
 * The same of the VLAN "<row device>.<id>", a name that is cut to 15 characters.
 * @param nId  VLAN id
 * @return as KLIBNetVlanGet; -1 with 0xD00 also for an id that none can have
 */
int KLIBNetVlanGetByRowDev(const char *szRowDevice, int nId, VLANINFO *pVlan);
/**
 * Lists the VLANs of /proc/net/vlan/config.
 * @param ppVlans  receives an array, for free(); NULL without that file or on failure
 * @param pCount   receives the number of records
 * @return 0; -1 with 0xD00, 0x200, 0x900 (the file cannot be read) or 0x4000 (a line that is no VLAN's)
 */
int KLIBNetVlanEnum(VLANINFO **ppVlans, int *pCount);
/**
 * Makes a VLAN on an interface that has none, and moves the interface's configuration to it: IPv4 address as given,
 * IPv6 settings and MTU as they are. PPPoE on the interface is stopped; its file and the VLAN's are written (through
 * DEVICE_XXXXXX and VLAN_XXXXXX beside them), /etc/rc.network stops the interface and starts both, after 2 seconds
 * firewall (/usr/kova/bin/kovafirewall), traffic control (/usr/kova/bin/tctool) and the DHCP server's files learn the
 * new name, and the DHCP server is restarted. Raises "net/ifname_change" before and after. There is no way back: a
 * failure after the stop leaves what was done. Takes no lock beyond those of the calls it makes.
 * @param szRowDevice  interface, at most 13 characters, no VLAN itself
 * @param nId          VLAN id
 * @param pNetInfo     nIPSource non-zero for the static szIP and szMask, zero for DHCP
 * @return 0; -1 with 0xD00, 0xBC00 (no such interface), 0xBB00 (it has a VLAN already), 0x900, 0xB00, the codes of the
 *         steps, or without a code when the event cannot be opened (nothing done) or a tool failed
 */
int KLIBNetVlanCreate(const char *szRowDevice, int nId, const NETINFO *pNetInfo);
/**
 * Removes a VLAN and gives its configuration back to the interface below it, in the same way: the interface's file is
 * written through DEV_XXXXXX, the VLAN's file and MTU key are deleted. There is no way back here either.
 * @param szVlan  VLAN interface
 * @return 0; -1 with 0xD00, without a code for what is no VLAN, otherwise as KLIBNetVlanCreate
 */
int KLIBNetVlanRemove(const char *szVlan);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
