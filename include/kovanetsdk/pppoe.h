/**
 * @file
 * PPPoE client: settings and secret, start and stop, the interface of the connection.
 */
#ifndef KOVANETSDK_PPPOE_H
#define KOVANETSDK_PPPOE_H

#include <kovanetsdk/core.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/** Settings of the connection. */
typedef struct PPPOE_CONF {
    char szIfname[16];       /**< Ethernet interface to dial on */
    char szUser[256];        /**< user name, without quotes */
    char szPassword[32];     /**< password */
    char szMTU[8];           /**< MTU as decimal text */
    uint32_t blDefaultRoute; /**< non-zero: the connection becomes the default route */
} PPPOE_CONF;

/**
 * Stores the settings: ETH, DEFAULTROUTE, USER and MTU of /etc/ppp/pppoe.conf, and user and password as the only line
 * of /etc/ppp/pap-secrets, which is replaced whole through /etc/ppp/pap-secrets.tmp and readable by its owner alone. In
 * both files the user name is in single quotes, as a shell takes it; one that is longer than 511 bytes with its quotes
 * is cut. The connection is left alone. Takes no lock.
 * @param pConf  the settings; a text that is not terminated within its field or holds a line end is refused (0xD00)
 *               before anything is written
 * @return 0; -1 with 0xD00, or as KLIBCFileSetKeyValue; no code of its own when the secrets cannot be written (logged
 *         with the reason)
 */
int PPPoEConfigSet(const PPPOE_CONF *pConf);
/**
 * Reads the settings back.
 * @param pConf  receives them; what is not there is "" (without a user also MTU and password), what is too long is cut
 * @return 0, also without a password for the user; -1, logged, without record, or when /etc/ppp/pppoe.conf or
 *         /etc/ppp/pap-secrets cannot be read
 */
int PPPoEConfigGet(PPPOE_CONF *pConf);
/**
 * Starts or stops the connection with /usr/sbin/pppoe-start or pppoe-stop, waiting for it, and notes in pppoe_enable of
 * /etc/kovainfo.conf whether it is meant to be up: "yes" before a start, back to "no" when that fails. Takes no lock.
 * @param nOp  1 start, 0 stop
 * @return 0; 19 when the start script ended with it; -1 with 0xD00, the code of a key that could not be written, or
 *         when the start failed otherwise. Whether the stop script succeeds is not looked at
 */
int KOVAPPPoEService(int nOp);
/**
 * Whether the connection is meant to be up (pppoe_enable of /etc/kovainfo.conf) and is (a process "pppoe-connect").
 * One that runs although it is switched off is stopped with /usr/sbin/pppoe-stop. Holds the lock 0x806 when it may fix
 * the switch, else 0x805.
 * @param blFix  non-zero: switch off what does not run
 * @return 1 both; 0; -1 with 0x400, or the code of what could not be read or written
 */
int KOVAPPPoECheckStatus(int blFix);
/**
 * Name of the connection's interface, as long as there is one whose name begins with "ppp": from the file
 * /tmp/kovapppoe.intf, which is believed when it is root's or the caller's own, or else from /usr/sbin/pppoe-status,
 * and then noted in that file. Takes no lock.
 * @param szIfname  receives the name, cut to the buffer
 * @param cbIfname  size of szIfname
 * @return 0; -1 with 0xD00, 0x900, or without a code when there is no such interface, the tool cannot be run, or a line
 *         of /proc/net/dev is none
 */
int KOVAPPPoeIntfGet(char *szIfname, int cbIfname);
/**
 * Address and netmask of the connection's interface, as dotted text. On failure the name noted is forgotten.
 * @param szIP, cbIP      receives the address; it has to be asked for even when only the mask is wanted
 * @param szMask, cbMask  receives the netmask, or NULL and 0
 * @return 0, also when nothing is asked for; -1 as KOVAPPPoeIntfGet, or with 0xD00 (no room), 0x3400 or 0x3600
 */
int KOVAPPPoeNetInfoGet(char *szIP, int cbIP, char *szMask, int cbMask);
/**
 * Stops the connection when it dials over an interface that is about to change.
 * @param szIfname  interface
 * @return 0; -1 as KOVAPPPoECheckStatus, PPPoEConfigGet and KOVAPPPoEService
 */
int KLIBDisablePPPoEOnIf(const char *szIfname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
