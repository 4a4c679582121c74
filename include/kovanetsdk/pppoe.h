/**
 * @file
 * PPPoE client: settings and secret, start and stop, the interface of the connection. PPPoE relay: settings of each
 * bridge that is relayed, and the relay processes they ask for.
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
 * @param pConf  receives them; what is not there is "" (without a user also MTU and password), what is too long is cut,
 *               and blanks at the ends of a password are not part of it
 * @return 0, also without a password for the user; -1, logged, with 0xD00 without record, or when /etc/ppp/pppoe.conf
 * or /etc/ppp/pap-secrets cannot be read
 */
int PPPoEConfigGet(PPPOE_CONF *pConf);
/**
 * Starts or stops the connection with /usr/sbin/pppoe-start or pppoe-stop, waiting for it, and notes in pppoe_enable of
 * /etc/kovainfo.conf whether it is meant to be up: "yes" before a start, back to "no" when that fails. Takes no lock.
 * @param nOp  1 start, 0 stop
 * @return 0; 19 when the start script ended with it: the other side refuses user or password; -1 with 0xD00, the code
 * of a key that could not be written, or when the start failed otherwise. Whether the stop script succeeds is not
 * looked at
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

/** Settings of the relay of one bridge. */
typedef struct PPPOE_RELAY_CONF {
    uint32_t blEnabled; /**< 1: relay */
    char szServer[16];  /**< interface towards the PPPoE server, or "" */
} PPPOE_RELAY_CONF;

/**
 * Reads the relay settings of an interface from "enable" and "server" of /etc/sysconfig/pppoe-relay/<name>. A directory
 * (mode 0755) or file that is missing is made, the file empty. Takes no lock.
 * @param szIfname  interface whose clients are relayed; the file has the first 16 characters of its name
 * @param pConf     receives the settings: blEnabled 1 when "enable" is exactly "yes", else 0; szServer cut to 15
 *                  characters, "" without the key
 * @return 0; -1, logged, with 0xD00 for a missing argument or a name that cannot be a file's, or when directory or file
 *         cannot be made or read (0x900 or as KLIBCFileTouch)
 */
int KOVANetGetPPPoERelayConfig(const char *szIfname, PPPOE_RELAY_CONF *pConf);
/**
 * Stores the relay settings of an interface in one rewrite of its file, which is made like its directory when it is
 * missing. A relay that runs is left alone. Takes no lock.
 * @param szIfname  as KOVANetGetPPPoERelayConfig
 * @param pConf     the settings: blEnabled 1 stores "yes", anything else "no"; szServer is "" or a text, terminated
 *                  within its field, that can be an interface's name (else 0xD00 before anything is made)
 * @return 0; -1, logged, with 0xD00 without settings or for a bad name, or when directory or file cannot be made (0x900
 *         or as KLIBCFileTouch); -1 with 0x200, or as KLIBCFileSetKeys
 */
int KOVANetSetPPPoERelayConfig(const char *szIfname, const PPPOE_RELAY_CONF *pConf);
/**
 * Whether two settings are the same.
 * @param pConf, pOther  the settings
 * @return 1 both flags and both servers are equal; else 0, with 0xD00, logged, without a record
 */
int KOVANetIsSamePPPoERelayConfig(const PPPOE_RELAY_CONF *pConf, const PPPOE_RELAY_CONF *pOther);
/**
 * Brings the relay process of an interface into step with its settings. It is to run when the interface is a bridge of
 * the local LAN by its file, up, and enabled: then "/usr/sbin/pppoe-relay -C <name> -S <server>" is started unless it
 * runs with that server. One with another server, or that is not to run, is sent SIGTERM, and its end is waited for, at
 * most a second. The start is waited for; the relay goes to the background by itself. Takes no lock: of two calls at
 * the same moment each may start a relay.
 * @param szIfname  interface
 * @return 0; -1, logged, with 0xD00 without a name, as KOVANetGetPPPoERelayConfig, when the relay cannot be stopped (as
 *         KLIBCKill) or its start fails (0x2A00)
 */
int KOVANetApplyPPPoERelayConfig(const char *szIfname);
/**
 * The same for every interface that has a file in /etc/sysconfig/pppoe-relay/, 128 at most, in the order of their
 * names; the first failure is the end. A missing directory is made with mode 0754. Takes no lock.
 * @return 0; -1, logged, when the directory cannot be made or listed (0x900 or 0x200), or as
 *         KOVANetApplyPPPoERelayConfig
 */
int KOVANetApplyPPPoERelayConfigAll(void);
/**
 * Deletes the settings of all interfaces; what cannot be deleted is logged and stays. Relays that run are left alone.
 * Takes no lock.
 * @return 0, also without the directory; -1, logged, with 0x200 or when its path is no directory that can be listed
 *         (0x900)
 */
int KOVANetClearPPPoERelayConfigAll(void);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
