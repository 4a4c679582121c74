// kovanet ipv6: how the interfaces get their IPv6 addresses, and what they have.
#include "composition.h"
#include "confirm.h"
#include "errors.h"
#include "objects.h"

#include <arpa/inet.h>
#include <kova/core.h>

namespace kova {
namespace {

constexpr int kLogicalCards = 2;
constexpr const char *kModes[] = {"auto", "off", "dhcp", "static", "auto_dhcp"}; // by NET_IPV6_...

struct ipv6_settings {
    int mode = NET_IPV6_AUTO;
    std::string address; /**< the fixed one, "" for none */
    int prefix = -1;
    std::string gateway; /**< "" for none */
};

std::string fixed_text(const ipv6_settings &settings) {
    return settings.address + (settings.prefix < 0 ? "" : "/" + std::to_string(settings.prefix));
}

/** What the file of an interface says, nothing when it says nothing of IPv6. */
std::optional<ipv6_settings> configured_ipv6(const std::string &name) {
    if (!has_file(name)) {
        return std::nullopt;
    }
    ipv6_settings settings;
    char address[INET6_ADDRSTRLEN] = "";
    char gateway[INET6_ADDRSTRLEN] = "";
    clear_error();
    const int found = KOVANetIPv6ConfGet(name.c_str(), &settings.mode, address, sizeof address, &settings.prefix,
                                         gateway, sizeof gateway);
    if (found < 0) {
        call_failed("cannot read the IPv6 settings of " + name);
    }
    settings.address = address;
    settings.gateway = gateway;
    return found == 1 ? std::optional{settings} : std::nullopt;
}

// ---- show

json describe(const std::string &name) {
    const std::optional<ipv6_settings> settings = configured_ipv6(name);
    json row;
    row["name"] = name;
    row["mode"] = settings ? json(kModes[settings->mode]) : json();
    row["addresses"] = json::array();
    for (const KOVAV6IP &address : ipv6_addresses(name)) {
        row["addresses"].push_back(std::string(address.szIP) + "/" + std::to_string(address.nPrefixLength));
    }
    const ipv6_settings fixed = settings.value_or(ipv6_settings{});
    row["configured_address"] = known_text(fixed.address.c_str());
    row["configured_prefix"] = known_number(fixed.prefix, 0);
    row["configured_gateway"] = known_text(fixed.gateway.c_str());
    return row;
}

std::string configured_column(const json &row) {
    const std::string prefix = row["configured_prefix"].is_null() ? "" : "/" + field(row, "configured_prefix");
    return field(row, "configured_address") + (row["configured_address"].is_null() ? "" : prefix);
}

constexpr column kColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"MODE", [](const json &row) { return field(row, "mode"); }},
    {"CONFIGURED", configured_column},
    {"GATEWAY", [](const json &row) { return field(row, "configured_gateway"); }},
    {"ADDRESSES", [](const json &row) { return words_field(row, "addresses"); }},
};

/** Ends the program for an interface that has no IPv6 configuration of its own. */
void require_own_ipv6(const std::string &name) {
    require_interface(name);
    if (KOVANetIsDevTypeMatch(name.c_str(), kLogicalCards) == 0) {
        throw failure{kNo,
                      name + " has no IPv6 settings of its own: it is down, no card, or a part of a bond, a bridge or "
                             "a VLAN"};
    }
}

void show(const std::optional<std::string> &name, bool as_json) {
    json rows = json::array();
    if (name) {
        require_own_ipv6(*name);
        rows.push_back(describe(*name));
    } else {
        for (const IFINFO &info : all_interfaces()) {
            if (KOVANetIsDevTypeMatch(info.szIfname, kLogicalCards) != 0) {
                rows.push_back(describe(info.szIfname));
            }
        }
    }
    show_table(rows, kColumns, as_json);
}

// ---- what is to be set

struct ipv6_words {
    std::optional<std::string> shown;
    std::string name;
    std::string mode;
    std::string address;
    std::string keyword;
    std::string gateway;
    bool is_confirmed = false;
};

bool is_link_local(const std::string &address) {
    constexpr unsigned kBits = 10;
    return KOVANetIPv6IsSameSubnet(address.c_str(), "fe80::1", kBits) == 1;
}

/** Why no interface can have an address that is written as it should be, nothing for one that it can have. */
refusal refuse_for_interface(const std::string &address) {
    in6_addr binary{};
    inet_pton(AF_INET6, address.c_str(), &binary);
    if (IN6_IS_ADDR_UNSPECIFIED(&binary) || IN6_IS_ADDR_LOOPBACK(&binary)) {
        return "it is no address of the network";
    }
    if (IN6_IS_ADDR_MULTICAST(&binary)) {
        return "it is a multicast address";
    }
    return std::nullopt;
}

void require_address(const std::string &what, const std::string &address) {
    const std::string named = what + " \"" + address + "\"";
    require(named, refuse_ipv6(address));
    require(named, refuse_for_interface(address));
}

void require_gateway(const ipv6_settings &wanted) {
    if (wanted.gateway.find('/') != std::string::npos) {
        throw failure{kNo, "gateway \"" + wanted.gateway + "\" is not valid: it has no prefix length"};
    }
    require_address("gateway", wanted.gateway);
    const auto prefix = static_cast<unsigned>(wanted.prefix);
    if (!is_link_local(wanted.gateway) &&
        KOVANetIPv6IsSameSubnet(wanted.gateway.c_str(), wanted.address.c_str(), prefix) != 1) {
        throw failure{kNo, "gateway \"" + wanted.gateway + "\" is not valid: it is neither in the subnet of " +
                               fixed_text(wanted) + " nor link-local (fe80::/10)"};
    }
}

void read_fixed(const ipv6_words &words, ipv6_settings &wanted) {
    const size_t slash = words.address.find('/');
    if (slash == std::string::npos) {
        throw failure{kUsage, "static needs the address with its prefix length: 2001:db8::10/64"};
    }
    require("address \"" + words.address + "\"", refuse_ipv6(words.address));
    wanted.address = words.address.substr(0, slash);
    wanted.prefix = std::stoi(words.address.substr(slash + 1));
    wanted.gateway = words.gateway;
    require_address("address", wanted.address);
    if (is_link_local(wanted.address)) {
        throw failure{kNo, "address \"" + wanted.address +
                               "\" is not valid: it is link-local, and the interface gives "
                               "itself such an address"};
    }
    if (!words.keyword.empty()) {
        require_gateway(wanted);
    }
}

ipv6_settings wanted_by(const ipv6_words &words) {
    ipv6_settings wanted;
    while (words.mode != kModes[wanted.mode]) { // it is one of them
        ++wanted.mode;
    }
    if (wanted.mode == NET_IPV6_STATIC) {
        read_fixed(words, wanted);
    } else if (!words.address.empty()) {
        throw failure{kUsage, words.mode + " takes no address: only static does"};
    }
    return wanted;
}

std::vector<std::string> effects_of(const std::string &name, const ipv6_settings &wanted,
                                    const std::optional<ipv6_settings> &before) {
    const std::string ends = "Connections over its IPv6 addresses end.";
    if (wanted.mode == NET_IPV6_OFF) {
        return {name + " loses its IPv6 addresses and has no IPv6.", ends};
    }
    if (wanted.mode == NET_IPV6_STATIC) {
        return {name + " loses its IPv6 addresses and gets " + fixed_text(wanted) +
                    (wanted.gateway.empty() ? "" : " and the gateway " + wanted.gateway) + ".",
                ends};
    }
    std::vector<std::string> effects;
    if (before && before->mode == NET_IPV6_STATIC) {
        effects.push_back(name + " loses its IPv6 address " + fixed_text(*before) + ".");
    }
    effects.push_back(wanted.mode == NET_IPV6_DHCP ? name + " gets its IPv6 address from a DHCPv6 server."
                                                   : name + " makes its IPv6 addresses of what routers advertise.");
    return effects;
}

// ---- set

std::string note_of(const std::string &name, int mode) {
    const bool looks_for_duplicates = mode == NET_IPV6_DHCP || mode == NET_IPV6_STATIC;
    return "configuring IPv6 of " + name +
           (looks_for_duplicates ? ", this takes five to ten seconds" : ", this takes up to five seconds");
}

int apply(const std::string &name, const ipv6_settings &settings) {
    const step_note note{note_of(name, settings.mode)};
    clear_error();
    return KOVANetIPv6ConfSet(settings.mode, name.c_str(), settings.address.c_str(), settings.prefix,
                              settings.gateway.c_str());
}

/** Sets an interface as it was before a change that failed; one without settings accepts what routers advertise. */
std::string put_back(const std::string &name, const ipv6_settings &before) {
    const std::string mode = kModes[before.mode];
    return apply(name, before) == 0 ? "; " + name + " is back in mode " + mode
                                    : "; going back to mode " + mode + " failed, too: set it anew";
}

[[noreturn]] void set_failed(const std::string &name, int result, const ipv6_settings &before) {
    if (result > 0) { // what the library would refuse with 2 and 3 has been refused above
        throw failure{kCallFailed, "another machine has " + std::string(result == 1 ? "the address" : "the addresses") +
                                       " that " + name + " got, so nothing of it was kept" + put_back(name, before)};
    }
    try {
        call_failed("cannot configure IPv6 of " + name); // before another call changes the error register
    } catch (const failure &failed) {
        throw failure{failed.code, failed.text + put_back(name, before)};
    }
}

/** The route of the mode that ends, which would stay beside those that routers tell. */
void drop_fixed_route(const std::string &name, const ipv6_settings &before) {
    constexpr int kDelete = 1;
    if (before.mode == NET_IPV6_STATIC && !before.gateway.empty()) {
        // a route has no prefix length here; one that is gone already is as well
        KOVANetIPv6IPAction(kDelete, name.c_str(), before.address.c_str(), 0, before.gateway.c_str());
    }
}

/** Routers are asked, and listened to for name servers, wherever the kernel listens to them. */
void listen_for_servers(const std::string &name, int mode) {
    constexpr int kQuietly = 0xBB;
    const bool listens = mode != NET_IPV6_OFF && mode != NET_IPV6_STATIC;
    const std::string interface = "IFACE=" + name;
    if (KLIBCExecl(listens ? "/sbin/start" : "/sbin/stop", kQuietly, "ra-dns", interface.c_str(),
                   static_cast<const char *>(nullptr)) != 0) {
        throw failure{kCallFailed, name + " is in mode " + kModes[mode] +
                                       ", but the listener for name servers cannot be " +
                                       (listens ? "started" : "stopped")};
    }
}

void set(const ipv6_words &words) {
    require_root();
    const ipv6_settings wanted = wanted_by(words);
    require_own_ipv6(words.name);
    const std::optional<ipv6_settings> before = configured_ipv6(words.name);
    confirm(effects_of(words.name, wanted, before), words.is_confirmed);

    const change_lock lock;
    const int result = apply(words.name, wanted);
    if (result != 0) {
        set_failed(words.name, result, before.value_or(ipv6_settings{}));
    }
    if (before && wanted.mode != NET_IPV6_STATIC && wanted.mode != NET_IPV6_OFF) {
        drop_fixed_route(words.name, *before);
    }
    listen_for_servers(words.name, wanted.mode);
}

void init() {
    require_root();
    clear_error();
    if (KOVANetIpv6Init() < 0) {
        call_failed("cannot set whether the interfaces accept router advertisements");
    }
}

} // namespace

void add_ipv6(CLI::App &object, const global_options &options) {
    auto &words = words_of<ipv6_words>();
    CLI::App &one = *object.add_subcommand("show", "mode and addresses of all interfaces, or of one");
    one.add_option("IF", words.shown, "interface");
    one.callback([&words, &options] { show(words.shown, options.json); });

    CLI::App &change =
        *object.add_subcommand("set", "set how an interface gets its IPv6 addresses, now and at every start");
    change.add_option("IF", words.name, "interface")->required();
    change
        .add_option("auto|off|dhcp|static|auto_dhcp", words.mode,
                    "from routers, none, from a DHCPv6 server, fixed, or "
                    "from routers with name servers from a DHCPv6 server")
        ->required()
        ->check(CLI::IsMember({"auto", "off", "dhcp", "static", "auto_dhcp"}));
    change.add_option("ADDRESS/LENGTH", words.address, "static: address with its prefix length");
    auto *gateway_key =
        change.add_option("gateway", words.keyword, "the word gateway")->check(CLI::IsMember({"gateway"}));
    gateway_key->needs(change.add_option("GATEWAY", words.gateway, "static: default router"));
    add_yes(change, words.is_confirmed);
    change.callback([&words] { set(words); });

    object.add_subcommand("init", "have all interfaces accept router advertisements or not, as their files say")
        ->callback(init);
}

} // namespace kova
