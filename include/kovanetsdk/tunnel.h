/**
 * @file
 * IPv6 tunnel client: account at a tunnel broker, start and stop.
 */
#ifndef KOVANETSDK_TUNNEL_H
#define KOVANETSDK_TUNNEL_H

#include <kovanetsdk/core.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/** The account. */
typedef struct TUNNEL_CONF {
    uint8_t blAnonymous; /**< non-zero: login without user and password; read as 1 or 0 */
    char szServer[256];  /**< tunnel broker, as entered */
    char szUserId[256];  /**< user name */
    char szPassword[32]; /**< password */
} TUNNEL_CONF;

/** What KOVATunnelExecute does. */
enum {
    KOVA_TUNNEL_START = 0,
    KOVA_TUNNEL_STOP = 1,
    KOVA_TUNNEL_RESTART = 2,
};

/**
 * Reads the account and whether the service "kovatunnel" is configured to run (KLIBServicecfgRunKeyGet): LOGIN, SERVER
 * and USERID of /etc/sysconfig/network-scripts/ifcfg-tun, and the password, deciphered with the machine's own key
 * (KLIBCCryptBufCrypt), of /etc/gogoc/.tunnel_passwd. Takes no lock.
 * @param pConf  receives the account: what is not there is "", and without LOGIN, or the file, it is an anonymous one,
 *               which has neither user nor password; empty after a failure
 * @return 1 enabled; 0 disabled; -1, logged, with
 *  - NET_ERR_BAD_PARAMETER for NULL
 *  - the platform's code: the state or the settings cannot be read, the password cannot be deciphered
 *  - NET_ERR_FILE_OPEN, NET_ERR_FILE_READ: the password cannot be read (without a file it is empty)
 *  - no code: the stored password has more than 31 bytes
 */
int KOVATunnelConfigGet(TUNNEL_CONF *pConf);

/**
 * Stores the account where KOVATunnelConfigGet reads it: only what differs, and nothing when all is the same. An empty
 * server leaves the stored one. The password is stored for a login with a user alone: /etc/gogoc/.tunnel_passwd is
 * replaced whole (through a file of the call's own, /etc/gogoc/.tunnel_passwd.XXXXXX) by 64 enciphered bytes and
 * readable by its owner alone. The password goes first: when the settings cannot be written, it is stored already. The
 * tunnel is left alone. Takes no lock.
 * @param pConf  the account; server, user and password end within their fields and hold no line end
 * @return 0; -1, logged, with
 *  - NET_ERR_BAD_PARAMETER for NULL, and for a text as above; nothing is written then
 *  - no code: the password does not end within its field, or its file cannot be written
 *  - NET_ERR_OUT_OF_MEMORY
 *  - the platform's code: the stored account cannot be read, the password not be enciphered, its file not be made, or
 *    the keys not be written
 */
int KOVATunnelConfigSet(const TUNNEL_CONF *pConf);

/**
 * Starts, stops or restarts the tunnel client (/usr/bin/gogoc) with "/etc/gogoc/rc.tun" "start", "stop" or "restart".
 * A process of its own runs the script; the call waits for it for at most 45 seconds, and the script goes on after
 * that. For a start and a restart the client's configuration, with the password in it, is written to
 * /etc/gogoc/gogoc.conf (mode 0600), which is gone when the call returns, whatever comes of it, unless another call has
 * put its own there by then: that is the other's to delete. Then "tsp-broker-list.txt" in the working directory, which
 * the client may have written, is renamed to "tsp-broker-list.txt.bak", and a running name-server relay ("kovarelayd")
 * is reloaded.
 *
 * A client that runs without an address on the interface "tun" after a restart or a stop hangs: it is killed, and
 * /etc/gogoc/gogoc.conf deleted whoever wrote it. After a start it may go on and get its address later. That there is
 * neither client nor address is no failure: the account may be refused, or the broker away; KOVALnxV6IPGet("tun", ...)
 * tells. Locks /etc/gogoc/gogoc.conf by file while it is written and deleted.
 * @param nAction  KOVA_TUNNEL_START, KOVA_TUNNEL_STOP or KOVA_TUNNEL_RESTART; for another value nothing is run, and
 *                 /etc/gogoc/gogoc.conf is deleted whoever wrote it
 * @param pConf    the account, or NULL for the stored one; only a start and a restart look at it, and of an anonymous
 *                 one at the server alone
 * @return 0; -1, logged,
 *  - with NET_ERR_BAD_PARAMETER for a text that is looked at and does not end within its field or holds a line end
 *  - with NET_ERR_OUT_OF_MEMORY
 *  - without a code when there is no process to be had, the client hangs, or "tun" has an address after a stop
 */
int KOVATunnelExecute(int nAction, const TUNNEL_CONF *pConf);

/**
 * The hour of the week by local time, for weekly schedules.
 * @return weekday (Sunday 0) * 24 + hour, 0 to 167
 */
int KOVASchedGetNowIndex(void);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
