// kovanet vlan: VLAN interfaces.
#include "composition.h"
#include "confirm.h"
#include "errors.h"
#include "objects.h"
#include "words.h"

#include <cstring>
#include <kova/core.h>
#include <kovanetsdk/pppoe.h>
#include <net/if.h>

namespace kova {
namespace {

json describe(const VLANINFO &vlan) {
    json row;
    row["name"] = vlan.szIfname;
    row["row_device"] = vlan.szRowDevice;
    row["id"] = vlan.vlanId;
    add_state(row, vlan.szIfname);
    return row;
}

constexpr column kListColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"ON", [](const json &row) { return field(row, "row_device"); }},
    {"ID", [](const json &row) { return field(row, "id"); }, true},
    {"STATE", up_field},
    {"LINK", [](const json &row) { return field(row, "link"); }},
    {"ADDRESS", state_address},
};

constexpr column kShowColumns[] = {
    {"name", [](const json &row) { return field(row, "name"); }},
    {"on", [](const json &row) { return field(row, "row_device"); }},
    {"id", [](const json &row) { return field(row, "id"); }},
    {"state", up_field},
    {"link", [](const json &row) { return field(row, "link"); }},
    {"address", state_address},
};

/** The kernel is asked about each interface: its own list of VLANs is for root only. */
void list(bool as_json) {
    json rows = json::array();
    for (const IFINFO &info : all_interfaces()) {
        if (const std::optional<VLANINFO> vlan = find_vlan(info.szIfname)) {
            rows.push_back(describe(*vlan));
        }
    }
    show_table(rows, kListColumns, as_json);
}

void show(const std::string &name, bool as_json) {
    require_interface(name);
    std::optional<VLANINFO> vlan = find_vlan(name);
    if (!vlan) {
        vlan = find_vlan_on(name);
    }
    if (!vlan) {
        throw failure{kNotFound, name + " is no VLAN and has none; see kovanet vlan list"};
    }
    const json record = describe(*vlan);
    show_record(record, kShowColumns, as_json);
}

struct vlan_words {
    std::string name;
    std::string id;
    std::string source;
    std::string address;
    bool is_confirmed = false;
};

int id_of(const std::string &text) {
    constexpr int kHighest = 4094;
    return static_cast<int>(number_within("VLAN id", text, 1, kHighest));
}

std::string name_for(const std::string &row_device, int id) {
    std::string name = row_device + "." + std::to_string(id);
    require("interface name \"" + name + "\"", refuse_interface_name(name));
    return name;
}

ipv4_settings settings_for(const vlan_words &words) {
    if (words.source != "static" && !words.address.empty()) {
        throw failure{kUsage, words.source + " takes no address; see kovanet vlan create --help"};
    }
    if (words.source == "static") {
        return {ipv4_settings::kStatic, fixed_address_of(words.address)};
    }
    if (words.source == "dhcp") {
        return {ipv4_settings::kDhcp, {}};
    }
    ipv4_settings kept = settings_of(words.name);
    if (kept.source == ipv4_settings::kNone) {
        throw failure{kNo, words.name + " has no IPv4 configuration to keep; say static or dhcp"};
    }
    return kept;
}

/** An address of another interface cannot be the VLAN's, too. */
void require_free_address(const ipv4_settings &settings, const std::string &row_device) {
    char owner[IFNAMSIZ] = "";
    if (settings.source == ipv4_settings::kStatic &&
        KOVANetIP2If(settings.fixed.address.c_str(), owner, sizeof owner) == 1 && row_device != owner) {
        throw failure{kNo, "address \"" + settings.fixed.address + "\" is not valid: it is the address of " + owner};
    }
}

/** A VLAN to be. */
struct plan {
    std::string row_device;
    int id;
    std::string name;
    ipv4_settings settings;
};

/** Ends the program for whatever the library or the kernel would refuse, before anything is touched. */
plan checked(const vlan_words &words) {
    require("interface name \"" + words.name + "\"", refuse_interface_name(words.name));
    const int id = id_of(words.id);
    const std::string name = name_for(words.name, id);
    require_unused(words.name);
    require_file(words.name);
    plan wanted{words.name, id, name, settings_for(words)};
    if (find_interface(wanted.name)) {
        throw failure{kNo, "there is an interface named " + wanted.name + " already"};
    }
    require_free_address(wanted.settings, wanted.row_device);
    return wanted;
}

/** The library stops the connection before it changes the interface that it goes over. */
std::vector<std::string> with_pppoe(std::vector<std::string> effects, const char *name) {
    char dialled[IFNAMSIZ] = "";
    if (KOVAPPPoECheckStatus(0) == 1 &&
        KLIBCFileGetKeyValue("/etc/ppp/pppoe.conf", "ETH", dialled, sizeof dialled, 0) > 0 &&
        strcmp(dialled, name) == 0) {
        effects.push_back(std::string("The PPPoE connection over ") + name + " ends, and is switched off.");
    }
    return effects;
}

std::vector<std::string> effects_of(const plan &wanted) {
    std::vector<std::string> effects = {
        wanted.name + " is made on " + wanted.row_device + " and gets " + text_of(wanted.settings) + ".",
        loss_of(wanted.row_device) + " and has none while the VLAN is there; its IPv6 settings move to " + wanted.name +
            ", too.",
        "Connections over " + wanted.row_device + " end."};
    if (has_file(wanted.name)) {
        effects.push_back("The file that " + wanted.name + " has from before is replaced.");
    }
    return with_pppoe(std::move(effects), wanted.row_device.c_str());
}

void create(const vlan_words &words) {
    require_root();
    confirm(effects_of(checked(words)), words.is_confirmed);
    const change_lock lock;
    const plan wanted = checked(words); // it may have become wrong while somebody read
    const NETINFO record = record_of(wanted.settings);
    const step_note note{"making " + wanted.name + ", this takes a few seconds"};
    clear_error();
    if (KLIBNetVlanCreate(wanted.row_device.c_str(), wanted.id, &record) < 0) {
        call_failed("cannot make " + wanted.name + " whole, what was done stays (kovanet vlan list)");
    }
    if (!find_vlan(wanted.name)) {
        throw failure{kCallFailed, "the files of " + wanted.name +
                                       " are written, but the kernel has no such VLAN; see "
                                       "what /etc/rc.network start " +
                                       wanted.row_device + " " + wanted.name + " says"};
    }
}

VLANINFO require_vlan(const std::string &name) {
    require_interface(name);
    const std::optional<VLANINFO> vlan = find_vlan(name);
    if (!vlan) {
        const std::optional<VLANINFO> above = find_vlan_on(name);
        throw failure{kNotFound,
                      name + " is no VLAN" +
                          (above ? std::string(", but has one: ") + above->szIfname : "; see kovanet vlan list")};
    }
    require_file(vlan->szIfname);
    require_file(vlan->szRowDevice);
    return *vlan;
}

void remove(const vlan_words &words) {
    require_root();
    const VLANINFO shown = require_vlan(words.name);
    confirm(with_pppoe({loss_of(words.name) + " and is removed.",
                        std::string(shown.szRowDevice) + " gets its IPv6 settings and " +
                            text_of(settings_of(words.name)) + ".",
                        "Connections over " + words.name + " end."},
                       words.name.c_str()),
            words.is_confirmed);
    const change_lock lock;
    require_vlan(words.name);
    const step_note note{"removing " + words.name + ", this takes a few seconds"};
    clear_error();
    if (KLIBNetVlanRemove(words.name.c_str()) < 0) {
        call_failed("cannot remove " + words.name + " wholly, what was done stays (kovanet vlan list)");
    }
    if (find_vlan(words.name)) {
        throw failure{kCallFailed, "the file of " + words.name +
                                       " is gone, but the kernel still has it; see what "
                                       "/etc/rc.network restart " +
                                       shown.szRowDevice + " says"};
    }
}

} // namespace

void add_vlan(CLI::App &object, const global_options &options) {
    auto &words = words_of<vlan_words>();
    object.add_subcommand("list", "all VLANs")->callback([&options] { list(options.json); });

    CLI::App &one = *object.add_subcommand("show", "one VLAN");
    one.add_option("IF", words.name, "the VLAN, or the interface it is on")->required();
    one.callback([&words, &options] { show(words.name, options.json); });

    CLI::App &make = *object.add_subcommand("create", "make a VLAN, which takes the place of its interface");
    make.add_option("IF", words.name, "interface, which has no VLAN yet")->required();
    make.add_option("ID", words.id, "VLAN id, 1 to 4094")->required();
    make.add_option("static|dhcp|keep", words.source,
                    "a fixed address, one from a DHCP server, or what the interface has")
        ->required()
        ->check(choice({"static", "dhcp", "keep"}));
    make.add_option("ADDRESS/LENGTH", words.address, "the fixed address with its prefix length");
    add_yes(make, words.is_confirmed);
    make.callback([&words] { create(words); });

    CLI::App &end = *object.add_subcommand("remove", "remove a VLAN, whose settings go back to its interface");
    end.add_option("IF", words.name, "the VLAN")->required();
    add_yes(end, words.is_confirmed);
    end.callback([&words] { remove(words); });
}

} // namespace kova
