/**
 * @file
 * Bridges: role of an interface.
 */
#ifndef KOVANETSDK_BRIDGE_H
#define KOVANETSDK_BRIDGE_H

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/**
 * @param szIfname  interface
 * @return 1 when it is a port of a bridge (/sys/class/net/<name>/brport); else 0, with 0xD00 for a bad name
 */
int KLIBNetBridgeIfIsSlave(const char *szIfname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
