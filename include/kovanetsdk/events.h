/**
 * @file
 * Change events: what the library announces to the rest of the appliance, and the event that has its services follow a
 * change.
 *
 * Every hook opens one event of component "net" (kova/plugin.h), sets its arguments in the order given here, runs the
 * plug-ins registered for it and gives the event back, whatever happened. Phase 4 (KLIB_PLUGIN_PRE) is before a change,
 * 5 (KLIB_PLUGIN_POST) after it; a phase from the caller is passed through. All return 0, or -1:
 *  - with NET_ERR_BAD_PARAMETER, logged, for an argument that is NULL or out of range, nothing announced;
 *  - else with the code that the platform left; the first step that fails ends the call. It is logged unless a call
 *    says otherwise.
 *
 * No hook takes a lock. Texts may be empty and are passed through unchanged.
 */
#ifndef KOVANETSDK_EVENTS_H
#define KOVANETSDK_EVENTS_H

#include <kova/core.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/**
 * Announces "net/dns_config_change", a change of the configured DNS servers: INTERFACE, NITEMS (number of servers, in
 * decimal), DNS_1, DNS_2 ...
 * @param nPhase       4 or 5
 * @param szInterface  interface name, "" for all
 * @param pDnsList     addresses of the servers; may be empty
 */
int KOVANetDnsConfigChangeHook(int nPhase, const char *szInterface, const KLIBSZLIST *pDnsList);

/**
 * Announces "net/dns_change", a change of the DNS servers in use: NITEMS, DNS_1, DNS_2 ... An event that cannot be
 * opened is not logged.
 * @param nPhase    4 or 5
 * @param pDnsList  addresses of the servers; may be empty
 */
int KOVANetDNSChangeHook(int nPhase, const KLIBSZLIST *pDnsList);

/**
 * Announces "net/mtu_change" after a change: IFACE, MTU_VALUE.
 * @param szIfname  interface name
 * @param szMTU     the MTU as text
 */
int KOVANetMTUChangeHook(const char *szIfname, const char *szMTU);

/**
 * Announces "net/ipv4_change" or "net/ipv6_change" before a change: IFNAME, ORIGIN_ADDRESS, NEW_ADDRESS, PREFIX_LENGTH
 * (in decimal; always "-1" for IPv4), IS_LINK ("true" or "false", from KOVANetIfIsLink; an interface whose link cannot
 * be told fails the call, with that call's code). Of the announcement itself only an event that cannot be opened is
 * logged.
 * @param nFamily          0 for IPv4, 1 for IPv6
 * @param szIfname         interface name
 * @param szOriginAddress  the address before the change
 * @param szNewAddress     the address after it
 * @param nPrefixLength    0 to 32 for IPv4, 0 to 128 for IPv6
 */
int KOVANetIPChangePreHook(int nFamily, const char *szIfname, const char *szOriginAddress, const char *szNewAddress,
                           int nPrefixLength);

/**
 * Announces "net/gateway_config_change": TYPE, INTERFACE, GATEWAY_OLD, GATEWAY_NEW. For callers that change the default
 * gateway; the library does not raise it by itself.
 * @param nPhase        4 or 5
 * @param szType        kind of the change, as plug-ins expect it
 * @param szInterface   interface name
 * @param szGatewayOld  gateway before the change
 * @param szGatewayNew  gateway after it
 */
int KOVANetGatewayConfigChangeHook(int nPhase, const char *szType, const char *szInterface, const char *szGatewayOld,
                                   const char *szGatewayNew);

/**
 * Announces "net/hostname_change" after a change: HOSTNAME.
 * @param szHostname  the new name
 */
int KOVANetHostnameChangeHook(const char *szHostname);

/**
 * Sets the arguments of an open event "net/ifname_change", which its caller raises and gives back: ORIGIN_IFNAME and
 * IFNAME (arrays), RESULT (integer). A setter that fails is not logged.
 * @param hPlugin              the open event, not 0
 * @param rgszOrigin, cOrigin  interface names before the change and their number
 * @param rgszNew, cNew        interface names after it and their number
 * @param nResult              result of the change so far
 */
int KLIBNetIFChgPluginSetArgs(uint64_t hPlugin, const char *const *rgszOrigin, int cOrigin, const char *const *rgszNew,
                              int cNew, int nResult);

/** What changes or changed; several may be combined. */
enum { KLIB_SERVICE_IP_CHANGE = 0x1, KLIB_SERVICE_HOSTNAME_CHANGE = 0x2, KLIB_SERVICE_MTU_CHANGE = 0x4 };

/**
 * Has the services follow a change: raises the event "service" of component "service", first in phase 4, in which they
 * stop or prepare, then in phase 5, in which they take up the new state. Its arguments, all integers:
 * SERVICE_IP_CHANGE, SERVICE_HOSTNAME_CHANGE, SERVICE_MTU_CHANGE (1 or 0), SERVICE_DAEMON_ACTION, RESULT (0). Both
 * phases run, and the call succeeds, also when a plug-in fails; that is logged for each phase. Holds the lock
 * 0x1000006, so that dispatches do not mix.
 * @param nDaemonAction  what the services are to do, passed through to the plug-ins
 * @param nChangeFlags   KLIB_SERVICE_... bits; others are not looked at
 * @return 0; -1, logged, with NET_ERR_LOCK, or with the platform's code when the event cannot be opened
 */
int KLIBServicePlugin(int nDaemonAction, uint32_t nChangeFlags);

/**
 * Stops what must be down before an address changes: the job "pppoerelay" ("/sbin/stop pppoerelay"), the PPPoE relays.
 * Takes no lock, logs nothing.
 * @return 0, also when it does not run; -1 with the platform's code
 */
int KLIBServiceStopBeforeIPChange(void);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
