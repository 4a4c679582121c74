/**
 * @file
 * Validation and arithmetic of addresses, masks, prefixes and names; what is in use on the network around: addresses of
 * other hosts, local ports, the addresses of a name; waking a host.
 *
 * The notion of a valid address is narrower than the C library's, and in one way wider: each part of a dotted IPv4 text
 * is a number as C writes it, so that 0x0a and 012 are both 10.
 *
 * Unless a call says otherwise, an argument that is NULL is logged, sets NET_ERR_BAD_PARAMETER and gives the failure
 * value; every other failure sets its code without a log line. No call takes a lock, touches a file or runs a program
 * unless it says so.
 */
#ifndef KOVANETSDK_ADDR_H
#define KOVANETSDK_ADDR_H

#include <stddef.h>
#include <stdint.h>

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/* ---- IPv4 texts ------------------------------------------------------------------------------------------------ */

/**
 * Takes a dotted IPv4 text apart. Parts are not checked for their range; what no 32-bit number can hold, negative
 * numbers included, becomes the largest one.
 * @param szIP    the text; at most 31 characters are looked at
 * @param rgPart  receives up to 4 parts, the leftmost first; slots behind the last part read are left as they were
 * @return 4 for a whole address; else the number of dots passed, with NET_ERR_BAD_ADDRESS unless the text ends right
 *         after its third dot
 */
int cKLIBISepIP(const char *szIP, uint32_t rgPart[4]);

/**
 * Whether a text is the address of an IPv4 host: first part 1 to 223 without 127, the others 0 to 255.
 * @return 1; 0 with NET_ERR_BAD_ADDRESS (also for an empty text) or as cKLIBISepIP
 */
int BlKLIBIsIpAddr(const char *szIP);

/**
 * Counts the bits of a contiguous mask.
 * @param rgPart  4 parts, the leftmost first
 * @return 1 to 32; 0 for the mask without bits; 0 with NET_ERR_BAD_ADDRESS for a part above 255 or a mask with a gap
 */
int cKLIBICalMask(const uint32_t rgPart[4]);

/**
 * Whether a text is an IPv4 mask of 1 to 32 bits.
 * @param szMask  the text; a mask is rewritten in place in plain decimal, which is never longer
 * @return 1; 0 with NET_ERR_BAD_ADDRESS
 */
int BlKLIBIsIpMask(char *szMask);

/**
 * Whether an address and a mask are valid and fit each other: the address is not the broadcast address of its subnet,
 * the mask 255.255.255.255 excepted. The address of the network itself is accepted.
 * @param szMask  the mask; at most 19 characters are looked at
 * @return 1; 0 with NET_ERR_BAD_ADDRESS or as BlKLIBIsIpAddr
 */
int BlKLIBIsValidIpMask(const char *szIP, const char *szMask);

/**
 * Counts the one bits of a mask, contiguous or not.
 * @param szMask  an IPv4 text as inet_aton reads it
 * @return 0 to 32; -1 for NULL or what is no address, without a code or a log line
 */
int KOVANetNetmaskToPrefix(const char *szMask);

/**
 * Turns "192.168.1.77/24" into "192.168.1.0/255.255.255.0": network address and mask.
 * @param szSubnet  address, "/" and a prefix length of 1 to 32; at most 63 characters. Without szIpMask it receives the
 *                  result and holds at least 64 bytes
 * @param szIpMask  receives the result, at least 64 bytes; or NULL
 * @return 0; -1 with NET_ERR_BAD_PARAMETER (NULL or no "/", logged) or NET_ERR_BAD_ADDRESS, nothing written
 */
int ErrKLIBSubnetToIpMask(char *szSubnet, char *szIpMask);

/**
 * Turns "192.168.1.77/255.255.255.0" into "192.168.1.0/24": network address and prefix length.
 * @param szIpMask  address, "/" and a contiguous mask of 1 to 32 bits; at most 63 characters. Without szSubnet it
 *                  receives the result and holds at least 64 bytes
 * @param szSubnet  receives the result, at least 64 bytes; or NULL
 * @return as ErrKLIBSubnetToIpMask
 */
int ErrKLIBIpMaskToSubnet(char *szIpMask, char *szSubnet);

/**
 * Asks "/bin/ipcalc -n" for the network address of a subnet.
 * @param szSubnet   what the tool is given, "192.168.1.77/24"; not empty
 * @param szNetwork  receives the address in dotted text; left as it was when the tool's first line holds none
 * @param cbNetwork  size of szNetwork, above 0; as much of the tool's line ("NETWORK=" included) is read, so that fewer
 *                   than 24 bytes can cut an address
 * @return 0, also when the tool gave no address; -1 with NET_ERR_BAD_PARAMETER, or when the tool cannot be started,
 * with the platform's code and a log line
 */
int KOVANetCalNetwork(const char *szSubnet, char *szNetwork, int cbNetwork);

/**
 * Asks "/bin/ipcalc -b" for the broadcast address of a subnet.
 * @param szSubnet     as KOVANetCalNetwork
 * @param szBroadcast  receives the address, as KOVANetCalNetwork
 * @param cbBroadcast  as KOVANetCalNetwork; the line begins with "BROADCAST=", so that fewer than 26 bytes can cut an
 *                     address
 * @return as KOVANetCalNetwork
 */
int KOVANetCalBroadcast(const char *szSubnet, char *szBroadcast, int cbBroadcast);

/**
 * Whether a text is a private IPv4 address: 10.x, 127.x, 172.16.x to 172.31.x, 192.168.x, 169.254.x. Parts behind the
 * ones named are not checked for their range.
 * @return 1 or 0; 0 with the code of cKLIBISepIP for what is no address
 */
int KOVANetIsPrivateIP(const char *szIP);

/**
 * Writes an address in dotted text.
 * @param nIP  IPv4 address in network byte order
 * @return the text, in a buffer of the library that the next call overwrites
 */
const char *KOVANetNtoa(uint32_t nIP);

/* ---- addresses of both families -------------------------------------------------------------------------------- */

/**
 * Whether two addresses are in one subnet.
 * @param szIP1, szIP2  IPv4 or IPv6 addresses
 * @param szMask        the mask, as an address of the same family
 * @return 1; 0 when not, when a text is no address or when the families differ
 */
int KOVANetIsSameSubnet(const char *szIP1, const char *szIP2, const char *szMask);

/**
 * Whether an address lies between two others, both included, whichever is the smaller.
 * @param nFamily  2 for IPv4, 10 for IPv6
 * @return 1 inside; 0 outside; -1 for NULL, a text that is no address of the family, or another family (logged);
 *         without a code
 */
int KLIBIsIpInRange(const char *szIP, const char *szBound1, const char *szBound2, int nFamily);

/** @return 2 when a text is an IPv4 address, 10 for IPv6, 0 for neither */
int KOVANetGetAddrType(const char *szIP);

/**
 * Whether a text is an IPv6 address of at most 46 characters, alone or followed by "/" and a prefix length of 0 to 128
 * in 1 to 3 decimal digits.
 * @return 1; 0 with NET_ERR_BAD_ADDRESS
 */
int BlKLIBIsv6IpAddrValid(const char *szV6IPAddr);

/* ---- names ----------------------------------------------------------------------------------------------------- */

/**
 * Whether a text is a name label: not empty, without blanks, without characters below 33, without the double quote and
 * without any of (),.:;<>[\]@
 * @return 1 or 0
 */
int BlKLIBIsAtom(const char *szAtom);

/**
 * Whether every dot-separated label of a text, the first and the last included, is a name label.
 * @param szDomain  the text; at most 511 characters are looked at
 * @return 1 or 0
 */
int BlKLIBIsDomain(const char *szDomain);

/**
 * Whether a text is a short host name: a letter or "_", then letters, digits, "-" and "_", at most 15 characters.
 * @return 1 or 0
 */
int BlKLIBIsHostname(const char *szHostname);

/* ---- addresses of other hosts ---------------------------------------------------------------------------------- */

/**
 * Whether another host answers at an address. Runs "/bin/ping -c 1 -w 2", so that an address nobody has takes up to two
 * seconds; not for the interface's own address, whatever way its numbers are written.
 * @param szIfname  interface whose own address is no conflict; not empty
 * @param szIP      address, as the tool takes it; not empty, and not an option
 * @return 1 a host answers; 0 none does, or it is the interface's own; -1, logged, with NET_ERR_BAD_PARAMETER,
 *         NET_ERR_EXEC (the tool cannot be run) or the code of KOVAILnxGetIP
 */
int KOVAIIpConflict(const char *szIfname, const char *szIP);

/**
 * Whether a member of a bond is configured with the bond's own address. The first member is not looked at: the bond has
 * its address from there. Reads the bond as KOVANetLinkAggrGet does, and the interface files of the bond and its
 * members ("ovs_%s" with the member's name for a bond of the virtual switch), under the lock 0x105 each; a member
 * without an address is noted in the log.
 * @param szBond  bond
 * @param szName  receives up to 4 characters of the member's name, cut to the buffer; "" without a conflict
 * @param cbName  size of szName, above 0
 * @return 1 a member has it; 0 none has; -1, logged, with NET_ERR_BAD_PARAMETER, or with the code of
 *         KOVANetLinkAggrGet or KOVAILnxGetIPFromCfg
 */
int KOVANetBondIPConflict(const char *szBond, char *szName, int cbName);

/* ---- names of hosts -------------------------------------------------------------------------------------------- */

/** An address that a name stands for. */
typedef struct KOVALOOKUPIP {
    char szIP[46];   /**< the address in text */
    int32_t nFamily; /**< 2 for IPv4, 10 for IPv6 */
} KOVALOOKUPIP;

/**
 * Looks up the addresses of a name: with the system's resolver, and when that knows none and the name holds neither "."
 * nor ":", by asking the local network with "/usr/bin/nmblookup" (of its output at most 65,536 lines or 64 MiB are
 * read; a name of more than 68 characters, or one that begins with "-", is not asked for). Name servers that do not
 * answer take as long as
 * "/etc/resolv.conf" gives them.
 * @param szName      name or address; not empty
 * @param pResult     receives the addresses in the order of the answers; every record is zeroed first
 * @param cResult     records in pResult; pResult may be NULL when it is 0
 * @param blCountAll  not 0: count all addresses there are, also those behind the last record
 * @return number of addresses, above cResult only with blCountAll; 0 when there is none or the name cannot be looked
 *         up, with NET_ERR_BAD_PARAMETER for a bad argument, NET_ERR_OUT_OF_MEMORY, logged, when the tool's output
 *         cannot be read, and NET_ERR_EXEC, logged, when the tool cannot be run
 */
int KOVANetLookupIP(const char *szName, KOVALOOKUPIP *pResult, int cResult, int blCountAll);

/* ---- local ports ----------------------------------------------------------------------------------------------- */

/**
 * Whether a socket of this machine, connected or not, has a local port of a range. Reads "/proc/net/tcp" and
 * "/proc/net/tcp6", or "/proc/net/udp" and "/proc/net/udp6"; one that cannot be read is noted in the log and left out.
 * @param nLow, nHigh  lowest and highest port
 * @param nProtocol    1 for TCP, anything else for UDP
 * @return 1 or 0; 0 also when nLow is above nHigh
 */
int KOVANetIsPortRangeUsed(int nLow, int nHigh, int nProtocol);

/**
 * The ports of a range at which sockets of this machine listen, from the files of KOVANetIsPortRangeUsed. Of UDP these
 * are the sockets that the kernel reports in the state of listening (10), which an unconnected one is not.
 * @param rgPort       receives the ports in the order in which the kernel lists them, each once
 * @param pcPort       in: entries in rgPort, 0 or more; out: number stored, no more than that
 * @param nLow, nHigh  lowest and highest port
 * @param nProtocol    1 for TCP, anything else for UDP
 * @return 0; -1 with NET_ERR_BAD_PARAMETER
 */
int KOVANetGetPortUsedInRange(int *rgPort, int *pcPort, int nLow, int nHigh, int nProtocol);

/* ---- sleeping hosts -------------------------------------------------------------------------------------------- */

/** Whom to wake. */
typedef struct KLIBETHERWAKE {
    unsigned char abMac[6]; /**< hardware address of the host */
    char szIfname[16];      /**< interface to send over; at most 13 characters are used */
} KLIBETHERWAKE;

/**
 * Sends one Wake-on-LAN frame: 110 bytes, to all hosts behind an interface. Needs the right to send raw frames.
 * @return 0 when it is sent; -1, logged, with NET_ERR_BAD_PARAMETER (no request), NET_ERR_FILE_OPEN (no packet socket)
 *         or NET_ERR_EXEC (no such interface, down, or refused)
 */
int KLIBNetEtherWake(const KLIBETHERWAKE *pWake);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
