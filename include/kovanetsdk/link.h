/**
 * @file
 * Link aggregation and MTU as far as reading interfaces needs them.
 */
#ifndef KOVANETSDK_LINK_H
#define KOVANETSDK_LINK_H

#include <kova/core.h>
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

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
