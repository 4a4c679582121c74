/**
 * @file
 * Traffic counters of the interfaces, and with them the cheapest list of the interfaces there are.
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

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
