/**
 * @file
 * Validation and arithmetic of addresses, masks, prefixes and names.
 */
#ifndef KOVANETSDK_ADDR_H
#define KOVANETSDK_ADDR_H

#include <stddef.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

int cKLIBISepIP(const char *szIP, uint32_t rgPart[4]);
int BlKLIBIsIpAddr(const char *szIP);
int cKLIBICalMask(const uint32_t rgPart[4]);
int BlKLIBIsIpMask(char *szMask);
int BlKLIBIsValidIpMask(const char *szIP, const char *szMask);
int KOVANetNetmaskToPrefix(const char *szMask);
int ErrKLIBSubnetToIpMask(char *szSubnet, char *szIpMask);
int ErrKLIBIpMaskToSubnet(char *szIpMask, char *szSubnet);
int KOVANetCalNetwork(const char *szSubnet, char *szNetwork, int cbNetwork);
int KOVANetCalBroadcast(const char *szSubnet, char *szBroadcast, int cbBroadcast);
int KOVANetIsSameSubnet(const char *szIP1, const char *szIP2, const char *szMask);
int KLIBIsIpInRange(const char *szIP, const char *szBound1, const char *szBound2, int nFamily);
int KOVANetIsPrivateIP(const char *szIP);
const char *KOVANetNtoa(uint32_t nIP);
int KOVANetGetAddrType(const char *szIP);
int BlKLIBIsAtom(const char *szAtom);
int BlKLIBIsDomain(const char *szDomain);
int BlKLIBIsHostname(const char *szHostname);
int BlKLIBIsv6IpAddrValid(const char *szV6IPAddr);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
