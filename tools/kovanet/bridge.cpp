// kovanet bridge: bridges, and which part the interfaces have in them.
#include "composition.h"
#include "confirm.h"
#include "errors.h"
#include "lists.h"
#include "objects.h"
#include "words.h"

#include <cstdio>
#include <kovanetsdk/bridge.h>
#include <net/if.h>

namespace kova {
namespace {

// by KLIB_BRIDGE_...
constexpr const char *kRoles[] = {nullptr, "none", "master", "local-lan", "slave"};

} // namespace

json role_word(int role) {
    return kRoles[role] == nullptr ? json() : json(kRoles[role]);
}

namespace {

bool is_bridge(int role) {
    return role == KLIB_BRIDGE_MASTER || role == KLIB_BRIDGE_LOCAL_LAN;
}

/** The part that the file of an interface gives it, of role 0 without a file. */
BRIDGEINFO configured_part(const std::string &name) {
    BRIDGEINFO part{};
    if (has_file(name) && KOVANetGetBridgeConfig(name.c_str(), nullptr, &part) < 0) {
        call_failed("cannot read the file of " + name);
    }
    return part;
}

json describe(const std::string &name) {
    const BRIDGEINFO configured = configured_part(name);
    json row;
    row["name"] = name;
    row["role"] = role_word(KLIBNETGetBridgeInfo(name.c_str(), nullptr));
    row["ports"] = ports_of(name);
    row["configured_role"] = role_word(configured.nType);
    row["configured_peer"] = known_text(configured.szPeer);
    add_state(row, name);
    return row;
}

std::string configured_text(const json &row) {
    const char *const between = row["configured_role"] == kRoles[KLIB_BRIDGE_SLAVE] ? " of " : ", first port ";
    return field(row, "configured_role") +
           (row["configured_peer"].is_null() ? "" : between + field(row, "configured_peer"));
}

constexpr column kListColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"ROLE", [](const json &row) { return field(row, "role"); }},
    {"STATE", up_field},
    {"LINK", [](const json &row) { return field(row, "link"); }},
    {"ADDRESS", state_address},
    {"PORTS", [](const json &row) { return words_field(row, "ports"); }},
};

constexpr column kShowColumns[] = {
    {"name", [](const json &row) { return field(row, "name"); }},
    {"role", [](const json &row) { return field(row, "role"); }},
    {"ports", [](const json &row) { return words_field(row, "ports"); }},
    {"configured", configured_text},
    {"state", up_field},
    {"link", [](const json &row) { return field(row, "link"); }},
    {"address", state_address},
};

void list(bool as_json) {
    constexpr char kHidden[] = "gbr"; // the system's own
    json rows = json::array();
    for (const IFINFO &info : all_interfaces()) { // the library's own list is of the first 32 interfaces
        const std::string name = info.szIfname;
        if (KLIBNetBridgeIfIsMaster(name.c_str()) == 1 && name.find(kHidden) == std::string::npos) {
            rows.push_back(describe(name));
        }
    }
    show_table(rows, kListColumns, as_json);
}

/** Ends the program for what is neither in the kernel nor configured. */
void require_known(const std::string &name) {
    if (!find_interface(name) && !has_file(name)) {
        throw failure{kNotFound, "no interface is named " + name + "; see kovanet link show"};
    }
}

void show(const std::string &name, bool as_json) {
    require_known(name);
    const json record = describe(name);
    show_record(record, kShowColumns, as_json);
}

struct bridge_words {
    std::string name;
    std::string role;
    std::vector<std::string> rest;
    bool is_confirmed = false;
};

/** What the words after the role say. */
struct details {
    std::string peer;
    std::optional<ipv4_settings> settings; /**< nothing: as it is */
};

[[noreturn]] void misunderstood(const std::string &why) {
    throw failure{kUsage, why + "; see kovanet bridge set --help"};
}

details details_of(const bridge_words &words, int role) {
    details found;
    auto word = words.rest.begin();
    const auto end = words.rest.end();
    if (role != KLIB_BRIDGE_NONE) {
        if (word == end) {
            misunderstood(words.role + (role == KLIB_BRIDGE_SLAVE ? " needs the bridge" : " needs the first port"));
        }
        found.peer = *word++;
    }
    if (word != end && role == KLIB_BRIDGE_SLAVE) {
        misunderstood("a port has no address, the bridge has it");
    }
    if (word != end) {
        const std::string &source = *word++;
        if (source == "static") {
            found.settings = {ipv4_settings::kStatic, fixed_address_of(word != end ? *word++ : "")};
        } else if (source == "dhcp") {
            found.settings = {ipv4_settings::kDhcp, {}};
        } else {
            misunderstood("\"" + source + "\" is neither static nor dhcp");
        }
    }
    if (word != end) {
        misunderstood("\"" + *word + "\" is one word too many");
    }
    return found;
}

/** An interface that can be a port, one of another bridge included: it changes over. */
void require_port(const std::string &name) {
    require_interface(name);
    if (!is_port(name)) {
        require_unused(name);
    }
    if (KLIBNetBridgeIfIsMaster(name.c_str()) == 1 || is_bridge(configured_part(name).nType)) {
        throw failure{kNo, name + " is a bridge itself and cannot be a port"};
    }
}

/** The name of a bridge that is there, or will be: an interface of another kind cannot become one. */
void require_no_card(const std::string &name) {
    const bool is_there = find_interface(name).has_value();
    if (!is_there) {
        require("interface name \"" + name + "\"", refuse_new_interface_name(name));
    }
    if (is_there && KLIBNetBridgeIfIsMaster(name.c_str()) != 1) {
        throw failure{kNo, name + " is an interface of another kind and cannot become a bridge"};
    }
}

void require_bridge(const std::string &name) {
    require("interface name \"" + name + "\"", refuse_interface_name(name));
    if (KLIBNetBridgeIfIsMaster(name.c_str()) != 1 && !is_bridge(configured_part(name).nType)) {
        throw failure{kNotFound, "no bridge is named " + name + "; to configure it: kovanet bridge set " + name +
                                     " master PRIMARY"};
    }
}

/** Ends the program for a part that the interface cannot have. */
void require_possible(const std::string &name, int role, const std::string &peer) {
    require("interface name \"" + name + "\"", refuse_interface_name(name));
    if (name == peer) {
        throw failure{kNo, name + " cannot be part of itself"};
    }
    switch (role) {
    case KLIB_BRIDGE_NONE:
        require_known(name);
        break;
    case KLIB_BRIDGE_SLAVE:
        require_port(name);
        require_bridge(peer);
        break;
    default:
        require_no_card(name);
        require_port(peer);
    }
}

std::vector<std::string> effects_of(const std::string &name, int role, const details &wanted) {
    std::string part = " is part of no bridge";
    if (role == KLIB_BRIDGE_SLAVE) {
        part = " is a port of " + wanted.peer + " and has no address of its own";
    } else if (is_bridge(role)) {
        part = std::string(" is the bridge") + (role == KLIB_BRIDGE_LOCAL_LAN ? " of the local LAN" : "") +
               " with the first port " + wanted.peer;
    }
    if (role != KLIB_BRIDGE_SLAVE) {
        part += " and has " + text_of(wanted.settings.value_or(settings_of(name)));
    }
    return {"From the next start of the network on, " + name + part + ".", "Until then everything stays as it is."};
}

int role_of(const std::string &word) {
    int role = KLIB_BRIDGE_NONE;
    while (role < KLIB_BRIDGE_SLAVE && word != kRoles[role]) {
        ++role;
    }
    return role;
}

BRIDGEINFO part_of(const std::string &name, int role, const std::string &peer) {
    BRIDGEINFO part{};
    part.nType = role;
    snprintf(part.szIfname, sizeof part.szIfname, "%s", name.c_str());
    snprintf(part.szPeer, sizeof part.szPeer, "%s", peer.c_str());
    return part;
}

void set(const bridge_words &words) {
    require_root();
    const int role = role_of(words.role);
    const details wanted = details_of(words, role);
    require_possible(words.name, role, wanted.peer);
    confirm(effects_of(words.name, role, wanted), words.is_confirmed);

    const change_lock others;
    require_possible(words.name, role, wanted.peer); // it may have become wrong while somebody read
    const BRIDGEINFO part = part_of(words.name, role, wanted.peer);
    NETINFO record = record_of(wanted.settings.value_or(ipv4_settings{}));
    record.blLinkUp = 1;                             // brought up at boot
    const config_lock lock{config_lock::kExclusive}; // the library's call leaves it to its caller
    clear_error();
    if (KOVANetSetBridgeConfig(wanted.settings ? &record : nullptr, &part) < 0) {
        call_failed("cannot write the file of " + words.name);
    }
}

} // namespace

void add_bridge(CLI::App &object, const global_options &options) {
    auto &words = words_of<bridge_words>();
    object.add_subcommand("list", "the bridges there are now")->callback([&options] { list(options.json); });

    CLI::App &one = *object.add_subcommand("show", "the part of one interface in bridges, now and as configured");
    one.add_option("IF", words.name, "a bridge, or any other interface")->required();
    one.callback([&words, &options] { show(words.name, options.json); });

    CLI::App &change = *object.add_subcommand("set", "configure the part of an interface for the next start");
    change.add_option("IF", words.name, "interface")->required();
    change
        .add_option("none|master|local-lan|slave", words.role,
                    "no part, a bridge, the bridge of the local LAN, or a port")
        ->required()
        ->check(choice({"none", "master", "local-lan", "slave"}));
    add_words(change, "PRIMARY|BRIDGE static ADDRESS/LENGTH|dhcp", words.rest,
              "of a bridge its first port, of a port its bridge; then, if it changes, where the IPv4 address "
              "comes from");
    add_yes(change, words.is_confirmed);
    change.callback([&words] { set(words); });
}

} // namespace kova
