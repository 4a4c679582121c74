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

KOVA_LINK_AGGR_MODE KOVANetLinkAggrStringToMode(const char *szMode);
int KOVANetLinkAggrPhyGet(const char *szBond, KLIBSZLIST *pSlaves);
int KOVANetLinkAggrOptSlsaveAdd(KOVALINKAGGROPT *pOpt, const char *szSlave);
int KOVANetLinkAggrGet(const char *szName, KOVALINKAGGROPT *pOpt);
int KOVAGetMTU(const char *szIfname);
int KOVAGetMTUSetting(const char *szIfname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
