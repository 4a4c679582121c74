// kovanet verify: what the DHCP and router-advertisement server is to serve, and what the running one serves.
#include "dhcp_files.h"
#include "verify.h"

#include <algorithm>
#include <fstream>
#include <kova/core.h>
#include <kovanetsdk/addr.h>
#include <kovanetsdk/dhcp.h>
#include <map>

namespace kova {
namespace {

const std::string kFolder = "/etc/dhcpd/";
constexpr char kService[] = "/etc/dhcpd/dhcpd.info";
constexpr char kPxe[] = "dhcpd-pxe";
constexpr char kEnable[] = "enable";
constexpr char kServer[] = "/usr/sbin/dnsmasq --conf-file=/run/kova/dhcp-server/dnsmasq.conf";

/** The lines of a fragment that say what is handed out. */
using range_lines = std::vector<std::string>;
/** What the running server was started with, by the names of the fragments. */
using fragments = std::map<std::string, range_lines>;

bool is_range(const std::string &line) {
    return line.starts_with("dhcp-range=");
}

fragments served_fragments() {
    fragments all;
    std::ifstream file{"/run/kova/dhcp-server/dnsmasq.conf"};
    std::string line, name;
    while (std::getline(file, line)) {
        if (line.starts_with("# dhcpd-") || line.starts_with("# dhcpd6-") || line.starts_with("# wpad-")) {
            name = line.substr(2);
            all[name];
        } else if (is_range(line)) {
            all[name].push_back(line);
        }
    }
    return all;
}

std::string joined(const range_lines &lines) {
    std::string all;
    for (const std::string &line : lines) {
        all += (all.empty() ? "" : " ") + line.substr(line.find('=') + 1);
    }
    return all;
}

/** Whether the server can hear the clients of a subnet that it was started with; "yes", or why not. */
std::string listening_state(const subnet_id &subnet, const std::string &ranges) {
    constexpr int kUdp = 2;
    const int port = subnet.type == kIPv4 ? 67 : 547;
    if (KOVANetIsIFUp(subnet.ifname.c_str()) != 1) {
        return subnet.ifname + " is not up";
    }
    const bool only_advertises = ranges.find("ra-only") != std::string::npos;
    return only_advertises || KOVANetIsPortRangeUsed(port, port, kUdp) == 1 ? "yes" : "not listening";
}

bool is_interface_on(const subnet_id &subnet) {
    return DHCPInterfaceIsEnabled(subnet.ifname.c_str(), subnet.type) == 1;
}

bool is_wanted(const subnet_id &subnet) {
    return is_interface_on(subnet) && is_yes(kFolder + fragment_of(subnet) + ".info", kEnable);
}

/** The ranges in the file of a subnet. */
std::string wanted_ranges(const subnet_id &subnet) {
    range_lines lines = lines_of(subnet);
    std::erase_if(lines, [](const std::string &line) { return !is_range(line); });
    return joined(lines);
}

/** A subnet against the running server, under the switch that decides it. */
void compare_subnet(comparison &result, const subnet_id &subnet, const fragments &served) {
    const std::string name = fragment_of(subnet);
    const std::string decides = is_interface_on(subnet) ? name : name.substr(0, name.rfind("-subnet"));
    const auto found = served.find(name);
    const bool is_served = found != served.end();
    if (!is_wanted(subnet) || !is_served) {
        result.add(kFolder + decides + ".info", kEnable, yes_or_no(is_wanted(subnet)), yes_or_no(is_served));
        return;
    }
    const std::string ranges = joined(found->second);
    result.add(kFolder + decides + ".info", kEnable, "yes", listening_state(subnet, ranges));
    result.add(kFolder + name + ".conf", "dhcp-range", wanted_ranges(subnet), ranges);
}

/** Whether the service is on by its process; one that has nobody to serve needs none. */
const char *service_state(bool is_on, bool runs, const std::vector<subnet_id> &subnets) {
    if (runs || !is_on) {
        return yes_or_no(runs);
    }
    return std::any_of(subnets.begin(), subnets.end(), is_wanted) ? "no server" : "yes";
}

} // namespace

void compare_dhcp_server(comparison &result) {
    const std::vector<subnet_id> subnets = subnets_there();
    const bool is_on = DHCPIsEnabled() == 1;
    const bool runs = KLIBCIsProcAlive(kServer) == 1;
    result.add(kService, kEnable, yes_or_no(is_on), service_state(is_on, runs, subnets));
    if (!is_on || !runs) {
        return;
    }
    const fragments served = served_fragments();
    for (const subnet_id &subnet : subnets) {
        compare_subnet(result, subnet, served);
    }
    const std::string pxe = kFolder + kPxe + ".info";
    result.add(pxe, kEnable, yes_or_no(is_yes(pxe, kEnable)), yes_or_no(served.contains(kPxe)));
}

} // namespace kova
