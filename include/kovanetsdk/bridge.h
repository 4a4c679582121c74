/**
 * @file
 * Bridges: role of an interface in the kernel, in its file, and in the appliance's topologies.
 *
 * No call here takes a lock. Bridges with "gbr" in their name are the system's own and never listed.
 */
#ifndef KOVANETSDK_BRIDGE_H
#define KOVANETSDK_BRIDGE_H

#include <kova/core.h>
#include <kovanetsdk/iface.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/** Roles of an interface. */
enum {
    KLIB_BRIDGE_NONE = 1,      /**< neither bridge nor port */
    KLIB_BRIDGE_MASTER = 2,    /**< bridge, not the local LAN's: TYPE=bridge */
    KLIB_BRIDGE_LOCAL_LAN = 3, /**< bridge of the local LAN: TYPE=bridge, LOCAL_LAN=yes */
    KLIB_BRIDGE_SLAVE = 4      /**< port of a bridge: BRIDGE=<bridge> */
};

/** An interface as part of a bridge. */
typedef struct BRIDGEINFO {
    int32_t nType;     /**< a role; 0 not known */
    char szIfname[16]; /**< interface */
    char szPeer[16];   /**< of a bridge its first port (PRIMARY), of a port its bridge (BRIDGE), otherwise "" */
} BRIDGEINFO;

enum { KLIB_TOPOLOGY_ROWS = 4, KLIB_TOPOLOGY_IFS = 4 };
/**
 * The roles that each topology prescribes: 1 client, 2 wired and wireless in one bridge, 3 router with a bridge of its
 * own for the local LAN. Row 0 is empty; a row ends at the first entry without a name.
 */
/* NOLINTNEXTLINE(bugprone-dynamic-static-initializers): a constant table, declared for C */
extern const BRIDGEINFO grgTopologyIFInfo[KLIB_TOPOLOGY_ROWS][KLIB_TOPOLOGY_IFS];

/**
 * @param szIfname  interface
 * @return 1 when it is a bridge (/sys/class/net/<name>/bridge/); else 0, with 0xD00 for a bad name
 */
int KLIBNetBridgeIfIsMaster(const char *szIfname);
/**
 * @param szIfname  interface
 * @return 1 when it is a port of a bridge (/sys/class/net/<name>/brport); else 0, with 0xD00 for a bad name
 */
int KLIBNetBridgeIfIsSlave(const char *szIfname);
/**
 * Appends the ports of a bridge to a list (/sys/class/net/<name>/brif/).
 * @param szBridge  bridge
 * @param pMembers  list of the caller
 * @return number of ports; -1, logged, with 0xD00 for a missing argument or bad name, without a code for what is no
 *         bridge; below 0 with 0x900 or 0x200
 */
int KLIBNetBridgeSlaveEnum(const char *szBridge, KLIBSZLIST *pMembers);
/**
 * Bridges among the first 32 interfaces of KLIBNetStatGetAll, in its order.
 * @param pList  list of the caller the names are appended to, or NULL to count only
 * @param nKind  KLIB_BRIDGE_MASTER those that are not the local LAN's, KLIB_BRIDGE_LOCAL_LAN those that are; any other
 *               kind has none
 * @return their number; -1 with 0x200, or the codes of KLIBNetStatGetAll
 */
int KLIBNetEnumBridge(KLIBSZLIST *pList, int nKind);
/**
 * Role of an interface that is up, from the kernel; the other side from its interface file.
 * @param szIfname  interface
 * @param pInfo     receives role, name and peer (a missing peer is logged and ""), or NULL; untouched beside 0
 * @return the role; 0 when the interface is not up, with 0xD00 for a bad name
 */
int KLIBNETGetBridgeInfo(const char *szIfname, BRIDGEINFO *pInfo);
/**
 * Role that a topology prescribes for an interface.
 * @param szIfname  interface
 * @param pInfo     receives the entry of grgTopologyIFInfo, or NULL; untouched beside 0
 * @param nRow      row of the table, 1 to 3
 * @return the role; 0 for another row or an interface that is not in it, with 0xD00 without a name
 */
int KLIBNETGetBridgeInfoByTopology(const char *szIfname, BRIDGEINFO *pInfo, int nRow);
/**
 * Role and IPv4 configuration of an interface from its file (TYPE, LOCAL_LAN, PRIMARY, BRIDGE; ONBOOT, BOOTPROTO,
 * IPADDR, NETMASK).
 * @param szIfname  interface
 * @param pNetInfo  receives the name, in blLinkUp whether it is brought up at boot, in nIPSource whether it is static,
 *                  and if so address and mask; its other fields stay. Or NULL
 * @param pBridge   receives the role, or NULL
 * @return 0, also when a key is missing (logged); -1, logged, with 0xD00 without both records or for a bad name,
 * without a code when there is no file
 */
int KOVANetGetBridgeConfig(const char *szIfname, NETINFO *pNetInfo, BRIDGEINFO *pBridge);
/**
 * Writes role and IPv4 configuration of an interface into its file, which is made when it is missing; the old one is
 * copied to "<file>.saved" by /bin/cp before. The kernel is left alone.
 * @param pNetInfo  blLinkUp non-zero to bring it up at boot; nIPSource non-zero for szIP and szMask, zero for DHCP. Or
 *                  NULL to leave these keys as they are
 * @param pBridge   szIfname, nType and szPeer
 * @return 0; -1 with 0xD00 (no record, bad name), 0x200, the code of the rewrite, or without a code for another role
 *         (logged)
 */
int KOVANetSetBridgeConfig(const NETINFO *pNetInfo, const BRIDGEINFO *pBridge);
/**
 * @param szIfname  interface
 * @param nType     role
 * @return 1 when its file gives it that role; else 0, logged when the file cannot be read, with 0xD00 for a bad name
 */
int KOVANetIsIfBridgeType(const char *szIfname, int nType);
/**
 * Makes the file of a former port one of an interface of its own, that is brought up at boot; the old one is copied to
 * "<file>.saved" before.
 * @param pNetInfo  szIfname; nIPSource non-zero for szIP and szMask, zero for DHCP
 * @return 0; -1 with 0xD00, 0x200 or the code of the rewrite
 */
int KOVANetDisableBridgeSlave(const NETINFO *pNetInfo);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
