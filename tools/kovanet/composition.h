/**
 * @file
 * What VLANs, bonds and bridges have in common: interfaces that stand on other interfaces, described by files.
 */
#pragma once

#include "interfaces.h"
#include "rules.h"

#include <kovanetsdk/link.h>

namespace kova {

using names = std::vector<std::string>;

/** Names with a text between them. */
std::string joined(const names &all, const char *between = ", ");

/** Keeps other changes of this kind away while it lives; ends the program when it cannot be had. */
class change_lock {
public:
    change_lock();
    change_lock(const change_lock &) = delete;
    change_lock &operator=(const change_lock &) = delete;
    ~change_lock();

private:
    int fd_ = -1;
};

/** A VLAN, nothing for what is none. Ends the program when the kernel cannot be asked. */
std::optional<VLANINFO> find_vlan(const std::string &name);
/** The VLAN on an interface, which has one at most. */
std::optional<VLANINFO> find_vlan_on(const std::string &row_device);

/** A bond with its members, nothing for what has none; one of the virtual switch may be read in part. */
std::optional<KOVALINKAGGROPT> find_bond(const std::string &name);
std::vector<std::string> members_of(const KOVALINKAGGROPT &bond);

/** Whether an interface is a bond of the virtual switch. */
bool is_switch_bond(const std::string &name);
/** The interface behind a port of the virtual switch, nothing for what is no such port. */
std::optional<std::string> behind_switch_port(const std::string &name);

/** The ports of a bridge; none of what is no bridge. */
std::vector<std::string> ports_of(const std::string &name);

/** Ends the program when an interface has a VLAN. */
void require_no_vlan_on(const std::string &name);
/** Whether an interface is a port of a bridge, in the kernel or by its file. */
bool is_port(const std::string &name);
/**
 * The record of an interface that another may be put on: ends the program when it is unknown, no network card of any
 * kind, part of a bond or bridge (now or by its file), a VLAN, or has one.
 */
IFINFO require_unused(const std::string &name);
/** Ends the program when an interface has no file. */
void require_file(const std::string &name);
/** Whether there is a file of an interface, used or not. */
bool has_file(const std::string &name);

/** How an interface gets its IPv4 address. */
struct ipv4_settings {
    enum kind { kNone, kStatic, kDhcp } source = kNone;
    network fixed; /**< address and mask of a static one */
};
/** What the file of an interface says. */
ipv4_settings settings_of(const std::string &name);
/** "the address 192.168.1.10 mask 255.255.255.0", "an address from a DHCP server" or "no IPv4 address". */
std::string text_of(const ipv4_settings &settings);
/** The library's record of them, without a name. */
NETINFO record_of(const ipv4_settings &settings);

/** "eth0 loses its address 192.168.1.10/24", or its addresses when it has none of IPv4. */
std::string loss_of(const std::string &name);
/** Sets up, link, address and prefix in a row. */
void add_state(json &row, const std::string &name);
/** Address and prefix of such a row as a table shows them. */
std::string state_address(const json &row);

/** The word for a role in a bridge, null for one that is not known. */
json role_word(int role);

} // namespace kova
