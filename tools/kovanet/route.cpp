// kovanet route: the routes to the subnets that the interfaces are in.
#include "errors.h"
#include "interfaces.h"
#include "objects.h"
#include "rules.h"

#include <kova/core.h>
#include <kovanetsdk/dhcp.h>
#include <kovanetsdk/iface.h>
#include <kovanetsdk/routing.h>
#include <net/if.h>

namespace kova {
namespace {

struct route_words {
    std::string name;
    std::optional<std::string> address;
};

void require_address(const std::string &given) {
    const std::string address = given.substr(0, given.find('/'));
    require("address \"" + address + "\"", refuse_address(address));
    require("prefix \"" + given + "\"", refuse_prefix(given));
}

/** Ends the program when the library would leave the interface without a route and say nothing of it. */
void require_routable(const IFINFO &info, bool is_configured) {
    constexpr int kLogicalCards = 2;
    const std::string name = info.szIfname;
    if ((info.nFlags & IFF_UP) == 0) {
        throw failure{kNo, name + " is down and can have no route; first: kovanet link up " + name};
    }
    if (!is_configured) {
        return;
    }
    if (KOVANetIsDevTypeMatch(name.c_str(), kLogicalCards) == 0 && KLIBNetOVSIfIsSlave(name.c_str()) == 0) {
        throw failure{kNo, name + " has no route of its own: it is no card, or a part of a bond, a bridge or a VLAN"};
    }
    if (BlKOVALnxIsDHCP(name.c_str()) != 0) {
        throw failure{kNo, name + " uses DHCP: its client sets the route"};
    }
}

void edit(int type, const route_words &words) {
    require_root();
    if (words.address) {
        require_address(*words.address);
    }
    const IFINFO info = require_interface(words.name);
    const config_lock lock{config_lock::kExclusive}; // the library's calls leave it to their caller
    if (type == NET_ROUTE_ADD) {
        require_routable(info, !words.address);
    }
    clear_error();
    int result = 0;
    if (words.address) {
        const std::string address = plain_address(words.address->substr(0, words.address->find('/')));
        result = NetRoutetableEdit(type, address.c_str(), network_of(*words.address).mask.c_str(), info.szIfname);
    } else {
        result = NetRoutetableHandler(type, info.szIfname);
    }
    if (result < 0 && !words.address && KLIBCErrGet() == 0) {
        throw failure{kNo, words.name + " has no address in its file or lease; say which: kovanet route " +
                               (type == NET_ROUTE_ADD ? "add " : "del ") + words.name + " ADDRESS/LENGTH"};
    }
    if (result < 0) {
        call_failed((type == NET_ROUTE_ADD ? "cannot add the route of " : "cannot delete the route of ") + words.name);
    }
}

void check() {
    require_root();
    clear_error();
    if (NetRoutetableCheck() != 0) {
        call_failed("cannot delete the routes of the interfaces without link");
    }
}

} // namespace

void add_route(CLI::App &object, const global_options &) {
    auto &words = words_of<route_words>();
    object.add_subcommand("check", "delete the routes of the interfaces that have no link")->callback(check);

    const auto add_verb = [&object, &words](const char *name, const char *description, int type) {
        CLI::App &verb = *object.add_subcommand(name, description);
        verb.add_option("IF", words.name, "interface")->required();
        verb.add_option("ADDRESS/LENGTH", words.address, "address in the subnet, the configured one if left out");
        verb.callback([&words, type] { edit(type, words); });
    };
    add_verb("add", "set the route to an interface's subnet anew", NET_ROUTE_ADD);
    add_verb("del", "delete the route to an interface's subnet", NET_ROUTE_DELETE);
}

} // namespace kova
