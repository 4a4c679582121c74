/**
 * @file
 * The host name.
 */
#ifndef KOVANETSDK_HOSTNAME_H
#define KOVANETSDK_HOSTNAME_H

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/**
 * Reads the kernel's host name, without its domain: everything from the first "." on is cut. Holds the lock 0x105.
 * @param szHostname  receives the name, 64 bytes with the terminator; untouched on failure
 * @return 1; 0 when there is no name, szHostname is "" then; -1 with
 *  - NET_ERR_BAD_PARAMETER, logged, for NULL
 *  - NET_ERR_LOCK, logged
 *  - NET_ERR_SYSCALL: the kernel does not tell it, or it has more than 63 characters with its domain
 */
int KOVALnxGetHostname(char *szHostname);

/**
 * Sets the host name: in the kernel, in /etc/hostname (the name and a newline) and in /etc/hosts, which then names
 * localhost and the host for 127.0.0.1 and ::1 and nothing else: lines made by hand are lost. Both files are replaced
 * whole, so that a reader, or a machine that loses power, finds the old one or the new one; their mode is 0644. Then
 * the system logger is reloaded ("/sbin/initctl reload syslog-ng") and "net/hostname_change" raised
 * (KOVANetHostnameChangeHook). Holds the lock 0x106 over all of it. Nothing is changed in the containerised variant of
 * the system (docker_hmx="yes" in /etc/kova/platform.conf).
 *
 * The first step that fails ends the call; what was changed before it stays.
 * @param szHostname  1 to 63 characters, which are not looked at (BlKLIBIsHostname does that); one with a newline fails
 *                    at the event
 * @return 0; -1 with
 *  - NET_ERR_BAD_PARAMETER, logged, for NULL or ""
 *  - NET_ERR_OUT_OF_RANGE for 64 characters or more
 *  - NET_ERR_LOCK, logged
 *  - NET_ERR_SYSCALL: the kernel refuses the name
 *  - NET_ERR_FILE_OPEN: a file cannot be made; logged for /etc/hostname
 *  - NET_ERR_FILE_WRITE: a file cannot be written or brought to the disk
 *  - NET_ERR_RENAME: a file cannot be replaced
 *  - the platform's code: the logger's reload could not be run (one that ran and failed leaves none), or the event
 */
int KOVALnxSetHostname(const char *szHostname);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
