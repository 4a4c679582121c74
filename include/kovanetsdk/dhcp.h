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

/**
 * Whether an interface gets its IPv4 address by DHCP: BOOTPROTO of its file is "dhcp". A file without the key is
 * repaired, a missing one made: it gets BOOTPROTO=static. Holds the lock 0x105.
 * @param szIfname  interface
 * @return 1; 0, also with 0xD00 (name), 0x400 (lock), or the code of a read or repair that failed
 */
int BlKOVALnxIsDHCP(const char *szIfname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
