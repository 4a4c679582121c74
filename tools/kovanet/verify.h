/**
 * @file
 * What the parts of kovanet verify have in common: each compares some of the files with what there is.
 */
#pragma once

#include "table.h"

#include <string>

namespace kova {

/** What files want and what there is, setting by setting. */
class comparison {
public:
    /** An empty value of either side is none. */
    void add(const std::string &file, const std::string &key, const std::string &wanted, const std::string &actual);
    [[nodiscard]] int settings() const { return settings_; }
    [[nodiscard]] const json &differences() const { return differences_; }

private:
    int settings_ = 0;
    json differences_ = json::array();
};

/** The value of a key, "" without it or without the file. Ends the program when it cannot be read. */
std::string value_of(const std::string &file, const std::string &key);
bool is_yes(const std::string &file, const std::string &key);
/** The same of a switch, in one spelling. */
inline const char *yes_or_no(bool is_on) {
    return is_on ? "yes" : "no";
}

/** The interface of the PPPoE connection, "" while there is none. */
std::string pppoe_interface();

/** The interfaces whose files bring them up at boot. */
void compare_interfaces(comparison &result);
/** Host name, default route, name servers and static routes. */
void compare_machine(comparison &result);
/** The DHCP and router-advertisement server. */
void compare_dhcp_server(comparison &result);
/** PPPoE, its relays, the IPv6 tunnel, and what else is switched on or off by a file. */
void compare_services(comparison &result);

} // namespace kova
