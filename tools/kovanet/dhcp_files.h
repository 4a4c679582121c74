/**
 * @file
 * What the names and lines of the DHCP server's files tell beyond the library's records.
 */
#pragma once

#include "dhcp_server.h"

#include <optional>
#include <string>
#include <vector>

namespace kova {

/** A numbered subnet of an interface. Ordered by interface, family and number. */
struct subnet_id {
    std::string ifname;
    family type = kIPv4;
    unsigned number = 0;
    auto operator<=>(const subnet_id &) const = default;
};

/** A family of an interface. */
struct served_family {
    std::string ifname;
    family type = kIPv4;
    auto operator<=>(const served_family &) const = default;
};

/** The subnets that have a fragment, sorted. */
std::vector<subnet_id> subnets_there();
/** What has a switch or a subnet, sorted. */
std::vector<served_family> families_there();
/** The file with the switch of an interface. */
std::string switch_file_of(const served_family &served);

/** The name of a subnet's files, without folder and ending. */
std::string fragment_of(const subnet_id &subnet);
/** The lines of a subnet's fragment that say something. */
std::vector<std::string> lines_of(const subnet_id &subnet);
/** Everything behind the name of an option in a fragment's lines, "" when it is not there. */
std::string value_behind(const std::vector<std::string> &lines, const std::string &option);

/** What the options of a subnet are for. */
std::string tag_of(const subnet_id &subnet);

} // namespace kova
