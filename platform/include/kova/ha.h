/**
 * @file
 * High-availability queries, answered from /etc/kova/platform.conf so that a machine can be made a cluster node:
 * ha_running, ha_active ("yes"), ha_heartbeat_if (name), ha_ip_<if>, ha_mask_<if> (cluster address of an interface),
 * ha_mac_<index> (cluster hardware address of the index-th card). A missing file is a machine without a cluster.
 */
#ifndef KOVA_HA_H
#define KOVA_HA_H

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/** @return 1 when the cluster runs, else 0 */
int KOVAHAIsRunning(void);
/** @return 1 when this node is the active one, else 0 */
int KOVAHAIsActive(void);
/** Copies the heartbeat interface's name. @param cb at least 16. @return 0; -1 with 0xD00, or 0xBC00 when there is none
 */
int KOVAHAGetHeartbeatIF(char *szIfname, int cb);
/**
 * Copies the cluster address and mask of an interface.
 * @param szIP    20 bytes
 * @param szMask  20 bytes
 * @return 1 when it has one, 0 when not (both texts "")
 */
int KOVAHAGetRelatedIFInfo(const char *szIfname, char *szIP, char *szMask);
/**
 * Copies the cluster hardware address of a card as "aa:bb:cc:dd:ee:ff".
 * @return 0; -1 with 0xD00, or 0xBC00 when there is none
 */
int KOVAHAGetMac(int index, char *szMac, int cb);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
