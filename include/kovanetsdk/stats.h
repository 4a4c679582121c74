/**
 * @file
 * Traffic counters of the interfaces.
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

NETSTAT *KLIBNetStatInit(int nItem);
void KLIBNetStatFree(NETSTAT *pStat);
int KLIBNetStatGetAll(NETSTAT *pStat, int nItem);
int KLIBNetStatGetSingle(const char *szIfname, NETSTAT *pStat);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
