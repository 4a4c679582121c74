/**
 * @file
 * The library's checks with their reasons. Each gives nothing for a value the library accepts, else the rule it breaks
 * in plain words.
 */
#pragma once

#include <optional>
#include <string>

namespace kova {

using refusal = std::optional<std::string>;

refusal refuse_address(const std::string &address);
refusal refuse_mask(const std::string &mask);
/** Address and mask, and whether they fit each other. */
refusal refuse_address_and_mask(const std::string &address, const std::string &mask);
/** "ADDRESS/LENGTH" as it names a network. */
refusal refuse_prefix(const std::string &prefix);
/** With or without "/LENGTH". */
refusal refuse_ipv6(const std::string &address);
refusal refuse_hostname(const std::string &name);
/** What may be set as the host name, which also has longer names, and with a domain. */
refusal refuse_new_hostname(const std::string &name);
refusal refuse_domain(const std::string &name);
/** A name server: an address of either family. */
refusal refuse_server(const std::string &address);
refusal refuse_interface_name(const std::string &name);
/** What an interface may be called that has another name yet: the kernel would fill in a number for "%d". */
refusal refuse_new_interface_name(const std::string &name);
/** A text that becomes a field of a line in the DHCP server's files. */
refusal refuse_server_text(const std::string &text);
/** A whole line of those files. */
refusal refuse_server_line(const std::string &line);

/** Ends the program when there is a refusal. */
void require(const std::string &what, const refusal &refused);

/** The plain decimal form of an accepted address: parts may also be written octal or hexadecimal. */
std::string plain_address(const std::string &address);

/** Whether two texts are the same IPv6 address. */
bool is_same_ipv6(const std::string &one, const std::string &other);

/** A network given as "ADDRESS/LENGTH". */
struct network {
    std::string address;
    std::string mask;
};
/** The network that an accepted prefix names. */
network network_of(const std::string &prefix);
/** The address that an interface gets, given with its prefix length, and its mask. Ends the program for a bad one. */
network fixed_address_of(const std::string &given);

} // namespace kova
