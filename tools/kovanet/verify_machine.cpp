// kovanet verify: what belongs to the machine as a whole: host name, routes, name servers.
#include "records.h"
#include "verify.h"

#include <arpa/inet.h>
#include <bit>
#include <fstream>
#include <kova/dhmx.h>
#include <map>
#include <sstream>
#include <sys/utsname.h>

namespace kova {
namespace {

constexpr char kNetwork[] = "/etc/sysconfig/network";
constexpr char kPppoe[] = "/etc/ppp/pppoe.conf";
constexpr char kStaticRoutes[] = "/etc/iproute2/config/static-route4.conf";
constexpr char kDefault[] = "0.0.0.0/0";

/** The kernel's IPv4 routes: "GATEWAY IF" by "NETWORK/LENGTH", a gateway of 0.0.0.0 where there is none. */
using routes = std::multimap<std::string, std::string>;

std::string address_text(uint32_t address) {
    char text[INET_ADDRSTRLEN] = "";
    inet_ntop(AF_INET, &address, text, sizeof text);
    return text;
}

routes routes_in_kernel() {
    routes all;
    std::ifstream file{"/proc/net/route"};
    std::string line;
    while (std::getline(file, line)) {
        std::istringstream fields{line};
        std::string device, flags, references, uses, metric;
        uint32_t network = 0, gateway = 0, mask = 0; // in the kernel's byte order
        fields >> device >> std::hex >> network >> gateway >> flags >> references >> uses >> metric >> mask;
        if (fields) { // unlike the header
            all.emplace(address_text(network) + "/" + std::to_string(std::popcount(mask)),
                        address_text(gateway) + " " + device);
        }
    }
    return all;
}

/** The wanted route when it is among those to a network, else the first one there is. */
std::string route_like(const routes &all, const std::string &network, const std::string &wanted) {
    const auto [first, end] = all.equal_range(network);
    for (auto route = first; route != end; ++route) {
        if (route->second == wanted) {
            return wanted;
        }
    }
    return first == end ? "" : first->second;
}

void compare_hostname(comparison &result) {
    std::ifstream file{"/etc/hostname"};
    std::string wanted;
    utsname system{};
    if (file >> wanted && KOVAIsDockerHMX() != 1 && uname(&system) == 0) { // a container is given its name from outside
        result.add("/etc/hostname", "hostname", wanted, system.nodename);
    }
}

/** A PPPoE connection that was asked to takes the place of the configured gateway. Without one the lease's router is
 * used. */
void compare_default_route(comparison &result, const routes &all) {
    const std::string connection = pppoe_interface();
    if (!connection.empty() && is_yes(kPppoe, "DEFAULTROUTE")) {
        const std::string wanted = "0.0.0.0 " + connection;
        result.add(kPppoe, "DEFAULTROUTE", "yes", yes_or_no(route_like(all, kDefault, wanted) == wanted));
        return;
    }
    const json gateway = gateway_record();
    if (!gateway["configured_gateway"].is_null()) {
        result.add(kNetwork, "GATEWAY", gateway["configured_gateway"],
                   gateway["gateway"].is_null() ? "" : gateway["gateway"].get<std::string>());
    }
}

void compare_static_routes(comparison &result, const routes &all) {
    std::ifstream file{kStaticRoutes};
    std::string line;
    while (std::getline(file, line)) {
        std::istringstream words{line};
        std::string network, gateway, device;
        if (words >> network >> gateway >> device && !network.starts_with('#')) {
            const std::string wanted = gateway + " " + device;
            result.add(kStaticRoutes, network, wanted, route_like(all, network, wanted));
        }
    }
}

/** As long as none are configured, those stay that were in use before. */
void compare_name_servers(comparison &result) {
    const json dns = dns_record();
    if (dns["mode"] == "static" && !dns["configured_servers"].empty()) {
        result.add("/etc/resolv.conf.static", "nameserver", words_field(dns, "configured_servers"),
                   dns["servers"].empty() ? "" : words_field(dns, "servers"));
    }
}

} // namespace

void compare_machine(comparison &result) {
    const routes all = routes_in_kernel();
    compare_hostname(result);
    compare_default_route(result, all);
    compare_static_routes(result, all);
    compare_name_servers(result);
}

} // namespace kova
