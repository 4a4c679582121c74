/**
 * @file
 * DHCP: the boot protocol of an interface.
 */
#ifndef KOVANETSDK_DHCP_H
#define KOVANETSDK_DHCP_H

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

int BlKOVALnxIsDHCP(const char *szIfname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
