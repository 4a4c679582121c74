/**
 * @file
 * IPv4 default gateway, as the kernel uses it and as it is configured, and the route of each interface's own subnet.
 *
 * Only NetRoutetableCheck works under a lock: whoever changes something holds 0x106 around it. A failure is logged and,
 * unless a call says otherwise, leaves in the register what the step that failed has left there.
 */
#ifndef KOVANETSDK_ROUTING_H
#define KOVANETSDK_ROUTING_H

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/* ---- default gateway ------------------------------------------------------------------------------------------ */

/**
 * The default route in use: the first in /proc/net/route that is up and leads to a gateway. Of several, with different
 * metrics, the kernel's order decides.
 * @param szGateway  receives the gateway's dotted address, cut to the buffer, or NULL
 * @param cbGateway  size of szGateway; below 1 nothing is written
 * @param szIfname   receives the name of the interface that leads to it, cut to the buffer, or NULL
 * @param cbIfname   size of szIfname; below 1 nothing is written
 * @return 0, also without a default route (both buffers are untouched then); -1 when the table cannot be read, or when
 * a line before the route does not have its 11 fields within 255 characters. No code is set
 */
int DefaultGatewayGet(char *szGateway, int cbGateway, char *szIfname, int cbIfname);
/** The gateway of DefaultGatewayGet alone. @return as there */
int KOVANetDefaultGatewayGet(char *szGateway, int cbGateway);
/** The interface of DefaultGatewayGet alone. @return as there */
int KOVANetDefaultGatewayInterfaceGet(char *szIfname, int cbIfname);

/**
 * The configured gateway: key GATEWAY of /etc/sysconfig/network.
 * @param szGateway  receives the value as it is written there, cut to the buffer, "" without the key
 * @param cbGateway  size of szGateway, above 0
 * @return 0, also without the key; -1 for no buffer (no code is set) or a file that cannot be read (0x900)
 */
int KOVANetDefaultGatewayGetConf(char *szGateway, int cbGateway);
/**
 * Stores the gateway as key GATEWAY of /etc/sysconfig/network, which is made when it is missing. The running kernel is
 * not touched. Nothing is logged.
 * @param szGateway  the gateway's address, stored unchecked; NULL or "" removes the key
 * @return 0; -1 with the code of the rewrite (0xD00 for a value with a newline, 0x900, 0xB00, 0x2800)
 */
int KOVANetDefaultGatewaySetConf(const char *szGateway);
/**
 * Replaces the kernel's default route with /sbin/route: "delete default", whose result is not looked at, then "add
 * default gw". When the second fails the old route is gone. The configuration is not touched.
 * @param szGateway  address of a host on a subnet of this machine; NULL or "" only removes the default route
 * @return 0; -1 with 0xD00, nothing changed, for a text that begins with "-", or with 0x2A00 when the route cannot be
 *         added
 */
int KOVANetDefaultGatewaySet(const char *szGateway);

/* ---- subnet routes -------------------------------------------------------------------------------------------- */

/** What is done to a subnet route. */
enum { NET_ROUTE_ADD = 0, NET_ROUTE_DELETE = 1 };

/**
 * Adds or deletes the route to an address's subnet over an interface, with the address as source: /sbin/ip, and what it
 * refuses /sbin/route. The network is the address under the mask; its prefix length is the number of bits of the mask,
 * wherever they are. An old route of the subnet is deleted before one is added.
 * @param type       NET_ROUTE_ADD or NET_ROUTE_DELETE
 * @param szIP       dotted address of the interface
 * @param szNetmask  dotted mask
 * @param szIfname   interface
 * @return 0, also when the tools refuse (noted in the log); -1 for a missing argument, a text that can name no
 *         interface, another type, or a text that is no address. No code is set
 */
int NetRoutetableEdit(int type, const char *szIP, const char *szNetmask, const char *szIfname);
/**
 * NetRoutetableEdit with the configured address of an interface: keys IPADDR and NETMASK of its file, or with DHCP
 * (BlKOVALnxIsDHCP, which holds 0x105 while it asks and repairs the file) of its lease
 * /etc/dhclient/ipv4/dhcpcd-<name>.info. A member of the virtual switch's bonds named "eth..." stands for its switch
 * port "ovs_eth...".
 *
 * Does nothing for an interface that is not of kind 2 (KLIBNetGetInterfaceInfo: up, no member of a bond or bridge ...),
 * for any other type, and adds nothing to an interface with DHCP, in a bridge or in a bond.
 *
 * @param type      NET_ROUTE_ADD or NET_ROUTE_DELETE
 * @param szIfname  interface
 * @return 0, also when there was nothing to do or the edit failed; -1 with 0xD00 for the name, or when an interface
 * with DHCP has no lease, whatever the type, or when a key cannot be read
 */
int NetRoutetableHandler(int type, const char *szIfname);
/**
 * Deletes the subnet route of every interface of KLIBNetInterfaceEnum(..., 0) without link (NetRoutetableHandler), so
 * that its subnet is reached over those that have one. A single interface is left alone. Holds the lock 0x105.
 * @return 0; -1 without any interface, when memory runs out (no code is set), with the code of the enumeration, or when
 *         an interface's address is not to be had (the interfaces after it keep their routes then); the lock call's
 *         result with 0x400 when the lock could not be had
 */
int NetRoutetableCheck(void);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
