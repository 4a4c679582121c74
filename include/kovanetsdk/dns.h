/**
 * @file
 * DNS resolver: where "/etc/resolv.conf" comes from, and what is in it.
 *
 * The file is never edited, it is made again from the source that the mode names: the key dns_mode of
 * "/etc/kovainfo.conf" is "static" for the administrator's list in "/etc/resolv.conf.static", anything else (or
 * nothing) for the servers that the address clients learnt, "/etc/iproute2/config/resolv4.conf" and then "resolv6.conf"
 * beside it. A line "domain<TAB>NAME" of "/etc/resolv.conf.option" is added behind the servers.
 *
 * Every file is written beside the old one (".XXXXXX", made unique), synced and renamed: a reader finds the old or the
 * new one, whole. Lists are KLIBSZLIST of kova/core.h; calls that fill one append to it. All return 0 or -1 unless said
 * otherwise; what a caller got wrong is logged and sets NET_ERR_BAD_PARAMETER, and nothing is touched then. An event
 * that cannot be announced is logged by the call that announces it and changes no result.
 */
#ifndef KOVANETSDK_DNS_H
#define KOVANETSDK_DNS_H

#include <kova/core.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/**
 * Makes one server the only configured one; see KOVANetDNSListSet for all it does.
 * @param szServer  IPv4 or IPv6 address as text
 * @return 0; -1 with 0xD00 (no address), 0x200 (memory), or as KOVANetDNSListSet
 */
int KOVANetDNSSet(const char *szServer);

/**
 * Configures servers: announces "net/dns_config_change" (interface ""), writes "/etc/resolv.conf.static" (0644, one
 * line "nameserver<TAB>ADDRESS" per server), switches the mode to "static", which makes "/etc/resolv.conf" again
 * (KOVANetDNSModeSet), and announces the event a second time. Takes no lock around the whole.
 * @param pServers  IPv4 or IPv6 addresses in the order in which they are to be asked, at least one; each is checked
 *                  before anything is touched
 * @return 0; -1 with 0xD00, 0x900 (no temporary file), 0xB00 (write), 0x2800 (rename), or as KOVANetDNSModeSet: the
 * list stays written then. A failure leaves out the second event
 */
int KOVANetDNSListSet(KLIBSZLIST *pServers);

/**
 * Stores the mode in "/etc/kovainfo.conf" (dns_mode) and makes "/etc/resolv.conf" again.
 * @param szMode  exactly "static" or "auto"
 * @return 0; -1 with 0xD00, the code of KLIBCINFOSetKeyValue, or as KOVANetDNSUpdate: the mode stays stored then
 */
int KOVANetDNSModeSet(const char *szMode);

/**
 * Appends the configured servers, those of "/etc/resolv.conf.static", to a list. Takes no lock. A line counts when it
 * begins with "nameserver" and has a blank, a tab or a newline behind its first word; its second word, which may be
 * empty, is the server. Lines are read in pieces of 511 bytes.
 * @param ppServers  address of the caller's list handle
 * @return 0, also when the file cannot be opened, which is logged; -1 with 0xD00, or 0x200 (logged; the list may have
 *         grown)
 */
int KOVANetStaticDNSListGet(KLIBSZLIST **ppServers);

/**
 * Appends the servers in use, those of "/etc/resolv.conf", to a list, as KOVANetStaticDNSListGet. Holds the lock 0x105
 * and gives it back on every return, also after a bad argument, where it was not taken: a caller that holds this lock
 * itself loses one of its counts by such a call.
 * @param ppServers  address of the caller's list handle
 * @return 0; -1 with 0xD00, 0x400 (lock) or 0x200
 */
int KOVANetDNSListGet(KLIBSZLIST **ppServers);

/**
 * The first server in use. Holds the lock 0x105.
 * @param szBuf  receives the server, cut to size - 1 characters; "" when there is none. All of it is cleared first
 * @param size   its size in bytes, above 0
 * @return 0; -1 with 0xD00, 0x200, or as KOVANetDNSListGet
 */
int KOVANetDNSGet(char *szBuf, int size);

/**
 * Writes "/etc/resolv.conf" (0644) and announces "net/dns_change" before the new file takes the old one's place and
 * after. Takes no lock.
 * @param pServers     servers in order, written as they are
 * @param pExtraLines  lines behind them, without newline; may be NULL or empty
 * @return 0; -1 without log and code for no list or an empty one; -1 with 0xD00 (an entry that is NULL or holds a
 *         newline), 0x900 (no temporary file), 0xB00 (write), 0x2800 (rename; there is no second event then)
 */
int KOVANetDNSFileSet(KLIBSZLIST *pServers, KLIBSZLIST *pExtraLines);

/**
 * Makes "/etc/resolv.conf" again from the source of the mode, and on success reloads the service "ddns", and
 * "kovarelayd" if it runs; neither is waited for, and their results are not looked at. For everyone who writes an
 * automatic source. Holds the lock 0x106.
 *
 * A source has lines "nameserver<TAB>ADDRESS", which are cut at 1023 bytes. A line of another kind repeats the server
 * before it ("" in front of the first). A source that does not exist has no lines; without any server
 * "/etc/resolv.conf" stays as it is.
 * @return 0; -1, logged, with 0x200 (memory), 0x400 (lock) or 0x900 (a source that cannot be read), or as
 *         KOVANetDNSFileSet; "/etc/resolv.conf" stays as it is then
 */
int KOVANetDNSUpdate(void);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
