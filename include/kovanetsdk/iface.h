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

int KOVANetSetCard1(NETINFO *pNew, NETINFO *pOld);
int KOVAILnxSetIPNetmask(const char *szIfname, const char *szIP, const char *szMask);
int KOVANetSetIP(const char *szFamily, const char *szIfname, const char *szIP, int prefix, const char *szAction);
int KOVANetFlushIP(const char *szFamily, const char *szIfname);
int KOVAExternalIPGet(char *szIP, int cbIP);

/* ---- state, blocks, names and link events --------------------------------------------------------------------- */

int KLIBNetISetIfFlags(const char *szIfname, unsigned flags, int on);
int KLIBNetIfUp(const char *szIfname);
int KLIBNetIfDown(const char *szIfname);
int KLIBNetReInitIf(const char *szIfname);
int KOVANetIsIFUp(const char *szIfname);
int KOVANetIfIsLink(const char *szIfname);
int KOVANetRenameEth(const char *szOld, const char *szNew);
int KOVANetSetIfBlock(const char *szIfname, unsigned mask, int on);
int KOVANetGetIfBlock(const char *szIfname, int *pMask);
int KLIBNetIfLinkUpEvent(const char *szIfname);
int KLIBNetIfLinkDownEvent(const char *szIfname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
