/**
 * @file
 * Change events: what the library announces to the rest of the appliance.
 */
#ifndef KOVANETSDK_EVENTS_H
#define KOVANETSDK_EVENTS_H

#include <kova/core.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

int KOVANetDnsConfigChangeHook(int nPhase, const char *szInterface, KLIBSZLIST *pDnsList);
int KOVANetDNSChangeHook(int nPhase, KLIBSZLIST *pDnsList);
int KOVANetMTUChangeHook(const char *szIfname, const char *szMTU);
int KOVANetIPChangePreHook(int nFamily, const char *szIfname, const char *szOriginAddress, const char *szNewAddress,
                           int nPrefixLength);
int KOVANetGatewayConfigChangeHook(int nPhase, const char *szType, const char *szInterface, const char *szGatewayOld,
                                   const char *szGatewayNew);
int KOVANetHostnameChangeHook(const char *szHostname);
int KLIBNetIFChgPluginSetArgs(uint64_t hPlugin, const char *const *rgszOrigin, int cOrigin, const char *const *rgszNew,
                              int cNew, int nResult);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
