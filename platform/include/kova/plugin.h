/**
 * @file
 * Change events: a caller opens an event, sets its arguments and fires it; the executables registered for the event
 * run.
 *
 * Registered for event E are the executables in /usr/kova/plugins/E/ (E "net/dns_change" gives
 * /usr/kova/plugins/net/dns_change/), run one after the other in name order; names that begin with a dot are passed
 * over. Each gets PLUGIN_EVENT, PLUGIN_PHASE ("PRE" for phase 4, "POST" for 5) and every argument in its environment,
 * which holds nothing else but PATH, and as key=value lines on its standard input. An array KEY is given as KEY_COUNT
 * and KEY_1, KEY_2 ... Output goes to /dev/null. One that fails makes the action fail and does not stop the others; one
 * that runs for more than 2 seconds is ended with its process group; after 4 seconds in all no further one is started.
 *
 * Keys consist of letters, digits and "_", do not begin with a digit, and are none of PATH, PLUGIN_EVENT and
 * PLUGIN_PHASE; values hold no newline: anything else is a bad argument (0xD00). A handle belongs to one thread.
 */
#ifndef KOVA_PLUGIN_H
#define KOVA_PLUGIN_H

#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/** Phases of KLIBPluginAction. */
enum { KLIB_PLUGIN_PRE = 4, KLIB_PLUGIN_POST = 5 };

/**
 * Opens an event.
 * @param szComponent  "net" or "service"
 * @param szEvent      the event's name, "net/dns_change"; components of letters, digits, "_", "-" and ".", none
 *                     empty or with a dot in front
 * @param pHandle      receives the handle, 0 on failure
 * @return 0; -1 with 0xD00 or 0x200
 */
int KLIBPluginSDKInit(const char *szComponent, const char *szEvent, uint64_t *pHandle);
/** @return 1 for an open handle, else 0 */
int KLIBPluginHasInit(uint64_t handle);
/** Sets a text argument; setting a key again replaces it. @return 0; -1 with 0xD00 (handle, key or value) or 0x200 */
int KLIBPluginSetArg(uint64_t handle, const char *szKey, const char *szValue);
/** Sets an integer argument, given to plug-ins in decimal. @return as KLIBPluginSetArg */
int KLIBPluginSetArgByInt(uint64_t handle, const char *szKey, int value);
/** Sets an array argument; count 0 is an empty array. @return as KLIBPluginSetArg */
int KLIBPluginSetArgByArray(uint64_t handle, const char *szKey, const char *const *ppszValue, int count);
/**
 * Runs the plug-ins of the event.
 * @param phase  KLIB_PLUGIN_PRE or KLIB_PLUGIN_POST
 * @return 0, also when there are none; -1 with 0xD00, 0x200, 0x900 (their directory cannot be read), or 0x2A00 when one
 *         failed or was not started for lack of time
 */
int KLIBPluginAction(int phase, uint64_t handle);
/** Releases a handle; one that is not open is allowed. @return 0 */
int KLIBPluginExit(uint64_t handle);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
