#include "dhcp_files.h"

#include "stored.h"

#include <charconv>
#include <filesystem>
#include <fstream>
#include <net/if.h>
#include <set>

namespace kova {
namespace {

constexpr char kFolder[] = "/etc/dhcpd";
constexpr char kSubnet[] = "-subnet";

const char *prefix_of(family type) {
    return type == kIPv4 ? "dhcpd-" : "dhcpd6-";
}

/** What stands between the family's prefix and an ending. */
std::optional<served_family> between(const std::string &name, const std::string &ending) {
    for (const family type : {kIPv4, kIPv6}) {
        const std::string prefix = prefix_of(type);
        if (name.starts_with(prefix) && name.ends_with(ending) && name.size() > prefix.size() + ending.size()) {
            return served_family{name.substr(prefix.size(), name.size() - prefix.size() - ending.size()), type};
        }
    }
    return std::nullopt;
}

/** The subnet whose file this is, as its name says it. */
std::optional<subnet_id> subnet_of(const std::string &name, const std::string &ending) {
    const std::optional<served_family> both = between(name, ending);
    const size_t at = both ? both->ifname.rfind(kSubnet) : std::string::npos;
    if (at == std::string::npos || at == 0) {
        return std::nullopt;
    }
    const std::string digits = both->ifname.substr(at + strlen(kSubnet));
    subnet_id subnet{both->ifname.substr(0, at), both->type};
    std::from_chars(digits.data(), digits.data() + digits.size(), subnet.number);
    return std::to_string(subnet.number) == digits ? std::optional{subnet} : std::nullopt;
}

/** An interface's switch: a name with "-" may also be an interface and a tag. */
std::optional<served_family> switch_of(const std::string &name) {
    const std::optional<served_family> both = between(name, ".info");
    const bool is_other = !both || subnet_of(name, ".info") || (both->type == kIPv4 && both->ifname == "pxe") ||
                          (both->ifname.find('-') != std::string::npos && if_nametoindex(both->ifname.c_str()) == 0);
    return is_other ? std::nullopt : both;
}

} // namespace

std::vector<subnet_id> subnets_there() {
    std::set<subnet_id> found;
    for (const std::string &name : names_in(kFolder)) {
        if (const std::optional<subnet_id> subnet = subnet_of(name, ".conf")) {
            found.insert(*subnet);
        }
    }
    return {found.begin(), found.end()};
}

std::vector<served_family> families_there() {
    std::set<served_family> found;
    for (const subnet_id &subnet : subnets_there()) {
        found.insert({subnet.ifname, subnet.type});
    }
    for (const std::string &name : names_in(kFolder)) {
        if (const std::optional<served_family> served = switch_of(name)) {
            found.insert(*served);
        }
    }
    return {found.begin(), found.end()};
}

std::string fragment_of(const subnet_id &subnet) {
    return prefix_of(subnet.type) + subnet.ifname + kSubnet + std::to_string(subnet.number);
}

std::vector<std::string> lines_of(const subnet_id &subnet) {
    std::ifstream file{std::string(kFolder) + "/" + fragment_of(subnet) + ".conf"};
    std::vector<std::string> lines;
    for (std::string line; std::getline(file, line);) {
        line.erase(line.find_last_not_of(" \t\r") + 1);
        if (!line.empty()) {
            lines.push_back(line);
        }
    }
    return lines;
}

std::string switch_file_of(const served_family &served) {
    return std::string(kFolder) + "/" + prefix_of(served.type) + served.ifname + ".info";
}

std::string value_behind(const std::vector<std::string> &lines, const std::string &option) {
    for (const std::string &line : lines) {
        const size_t at = line.find("," + option + ",");
        if (at != std::string::npos) {
            return line.substr(at + option.size() + 2);
        }
    }
    return "";
}

std::string tag_of(const subnet_id &subnet) {
    return subnet.ifname + (subnet.type == kIPv4 ? "" : "v6") + std::to_string(subnet.number);
}

} // namespace kova
