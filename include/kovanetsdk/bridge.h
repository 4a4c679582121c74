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

int KLIBNetBridgeIfIsSlave(const char *szIfname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
