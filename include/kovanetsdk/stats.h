/**
 * @file
 * Traffic counters of the interfaces, and with them the cheapest list of the interfaces there are. The topology that
 * the appliance's interfaces are used in. Whether a host can be reached.
 */
#ifndef KOVANETSDK_STATS_H
#define KOVANETSDK_STATS_H

#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/** Counters of one interface. */
typedef struct NETSTAT {
    uint32_t blValid;   /**< 1 */
    char szIfname[16];  /**< name, cut to 15 characters */
    int64_t nRxBytes;   /**< received bytes */
    int64_t nTxBytes;   /**< transmitted bytes */
    int64_t nRxPackets; /**< received packets */
    int64_t nTxPackets; /**< transmitted packets */
} NETSTAT;

/**
 * Makes an array of records that are zero but for blValid, which is 1.
 * @param nItem  number of records, above 0
 * @return the array, for KLIBNetStatFree; NULL with NET_ERR_BAD_PARAMETER (logged) or NET_ERR_OUT_OF_MEMORY
 */
NETSTAT *KLIBNetStatInit(int nItem);

/** Releases an array of KLIBNetStatInit; NULL is allowed. */
void KLIBNetStatFree(NETSTAT *pStat);

/**
 * Reads the counters of the interfaces from /proc/net/dev, leaving out monitor ("mon." in the name), "tap", "docker"
 * and "dhmx" devices. When there are more than nItem, the first in the kernel's order are taken. They are sorted by
 * name, numbers by value (eth2 before eth10), unless a line that is no interface's ends the list. A counter that a line
 * does not hold is 0, one beyond 64 signed bits the nearest that fits.
 * @param pStat  receives the records; those behind the returned number are left as they were
 * @param nItem  room in pStat, above 0
 * @return number of records filled; -1 with NET_ERR_BAD_PARAMETER (logged), NET_ERR_FILE_OPEN, NET_ERR_PARSE (the file
 *         cannot be read) or NET_ERR_OUT_OF_MEMORY; pStat may hold records with the last two
 */
int KLIBNetStatGetAll(NETSTAT *pStat, int nItem);

/**
 * Reads the counters of one interface among the first 64 of KLIBNetStatGetAll.
 * @param szIfname  its name as the records hold it: one of more than 15 characters is never found
 * @param pStat     receives the record
 * @return 0; -1 with NET_ERR_BAD_PARAMETER (logged), NET_ERR_OUT_OF_MEMORY, the codes of KLIBNetStatGetAll, or no code
 *         when there is no such interface; pStat is left as it was
 */
int KLIBNetStatGetSingle(const char *szIfname, NETSTAT *pStat);

/* ---- topology ------------------------------------------------------------------------------------------------- */

/** Topologies. */
enum {
    KLIB_TOPOLOGY_UNKNOWN = 0, /**< none stored, or a model without the choice */
    KLIB_TOPOLOGY_CLIENT = 1,  /**< wired and wireless each for itself */
    KLIB_TOPOLOGY_BRIDGE = 2,  /**< wired and wireless in one bridge */
    KLIB_TOPOLOGY_ROUTER = 3,  /**< wired to the outside, wireless in a bridge of its own for the local LAN */
    KLIB_TOPOLOGY_COUNT = 4
};

/** Description of a topology. */
typedef struct TOPOLOGYINFO {
    int nTopology;     /**< a topology, index of gTopologyInfo */
    char szName[64];   /**< its name in /etc/kovainfo.conf */
    char szIfname[16]; /**< interface that has the appliance's address */
    int blClient;      /**< 1 the client topology, else 0 */
    int nIFInfoRow;    /**< row of grgTopologyIFInfo (bridge.h) with the roles of the interfaces */
} TOPOLOGYINFO;

/** The descriptions, as they are without VLANs. */
/* NOLINTNEXTLINE(bugprone-dynamic-static-initializers): a constant table, declared for C */
extern const TOPOLOGYINFO gTopologyInfo[KLIB_TOPOLOGY_COUNT];

/**
 * Tells the topology: the one whose name, in any case, is "net_topology" of /etc/kovainfo.conf, on models that have
 * "support_net_topology" = "yes" there. Takes no lock.
 * @param pInfo  in: nTopology 1 to 3 asks for the description of that topology, anything else for that of the current
 *               one. Receives the description, with the name of the first VLAN (/proc/net/vlan/config) that is on
 *               szIfname in its place; VLANs that cannot be read count as none. Untouched on a model without the
 * choice. Or NULL
 * @return the topology described, or with NULL the current one; 0 when there is none, which is logged when the key is
 *         missing. Sets no code of its own
 */
int KLIBNetTopologyGet(TOPOLOGYINFO *pInfo);
/**
 * Stores a topology for KLIBNetTopologyGet: "net_topology" of /etc/kovainfo.conf. Nothing of the network changes.
 * Takes no lock beyond that of the rewrite.
 * @param pInfo  its szName is stored, whether a topology has it or not
 * @return 0; -1 with 0xD00, logged, without a record, or as KLIBCINFOSetKeyValue
 */
int KLIBNETSetTopologyConfigs(const TOPOLOGYINFO *pInfo);

/* ---- reachability --------------------------------------------------------------------------------------------- */

/**
 * Whether a TCP connection to a host can be opened. Its addresses from getaddrinfo are tried one after the other; when
 * none answers, those that /usr/bin/nmblookup tells for the name. A connection that opens gets one zero byte and is
 * closed. Signals do not end the wait, and no SIGPIPE is raised.
 * @param szHost   name or address, IPv4 or IPv6
 * @param nPort    1 to 65535
 * @param nTimeout seconds to wait for each address, 0 or more: all of it takes up to as many times that as there are
 *                 addresses, and the time that the resolver and nmblookup take
 * @return 1; else 0, with 0xD00, logged, for a bad argument (NULL, an empty host among them), and with 0x2A00 or 0x200,
 *         logged, when /usr/bin/nmblookup cannot be run or its output not be read; a host of more than 68 characters,
 * or one that begins with "-", is not asked for with it
 */
int BlKLIBIsConnected(const char *szHost, int nPort, int nTimeout);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
