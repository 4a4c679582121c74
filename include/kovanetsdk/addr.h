/**
 * @file
 * Validation and arithmetic of addresses, masks, prefixes and names.
 *
 * The notion of a valid address is narrower than the C library's, and in one way wider: each part of a dotted IPv4 text
 * is a number as C writes it, so that 0x0a and 012 are both 10.
 *
 * Unless a call says otherwise, an argument that is NULL is logged, sets NET_ERR_BAD_PARAMETER and gives the failure
 * value; every other failure sets its code without a log line. No call takes a lock or touches a file; only
 * KOVANetCalNetwork and KOVANetCalBroadcast run a program.
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

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
