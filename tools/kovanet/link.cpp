// kovanet link: state and names of the interfaces.
#include "errors.h"
#include "interfaces.h"
#include "interrupt.h"
#include "link_changes.h"
#include "objects.h"
#include "rules.h"

#include <kovanetsdk/iface.h>
#include <kovanetsdk/link.h>
#include <net/if.h>

namespace kova {
namespace {

json describe(const IFINFO &info) {
    ETHINFO link{};
    const bool has_settings = KOVANetGetEthInfo(&link, info.szIfname) == 0;
    json row;
    row["name"] = info.szIfname;
    row["up"] = (info.nFlags & IFF_UP) != 0;
    row["link"] = link_word(KOVANetIfIsLink(info.szIfname) == 1);
    row["speed_mbps"] = known_number(has_settings ? link.nSpeed : -1, 1);
    row["duplex"] = duplex_word(has_settings ? link.nDuplex : -1);
    row["mtu"] = known_number(has_settings ? link.nMTU : KOVAGetMTU(info.szIfname), 1);
    row["mac"] = mac_text(info.abMac);
    return row;
}

constexpr column kColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"STATE", up_field},
    {"LINK", [](const json &row) { return field(row, "link"); }},
    {"SPEED", [](const json &row) { return field(row, "speed_mbps"); }, true},
    {"DUPLEX", [](const json &row) { return field(row, "duplex"); }},
    {"MTU", [](const json &row) { return field(row, "mtu"); }, true},
    {"MAC", [](const json &row) { return field(row, "mac"); }},
};

void show(const std::optional<std::string> &name, bool as_json) {
    json rows = json::array();
    if (name) {
        rows.push_back(describe(require_interface(*name)));
    } else {
        for (const IFINFO &info : all_interfaces()) {
            rows.push_back(describe(info));
        }
    }
    show_table(rows, kColumns, as_json);
}

void set_state(const std::string &name, bool up) {
    require_root();
    require_interface(name);
    clear_error();
    if ((up ? KLIBNetIfUp(name.c_str()) : KLIBNetIfDown(name.c_str())) != 0) {
        call_failed("cannot bring " + name + (up ? " up" : " down"));
    }
}

void rename(const std::string &old_name, const std::string &new_name) {
    require_root();
    require("interface name \"" + new_name + "\"", refuse_new_interface_name(new_name));
    const IFINFO info = require_interface(old_name);
    if (find_interface(new_name)) {
        throw failure{kNo, "there is an interface named " + new_name + " already"};
    }
    if ((info.nFlags & IFF_UP) != 0) {
        throw failure{kNo, old_name + " is up and cannot be renamed; first: kovanet link down " + old_name};
    }
    clear_error();
    if (KOVANetRenameEth(old_name.c_str(), new_name.c_str()) != 0) {
        call_failed("cannot rename " + old_name + " to " + new_name);
    }
}

/** Raises the library's event for every link that comes or goes, until told to stop. */
void watch() {
    require_root("raising events");
    stop_on_signals();
    link_watcher links;
    constexpr int kLookEveryMs = 1000; // a signal may come just before a wait
    while (!is_interrupted()) {
        for (const link_change &change : links.wait(kLookEveryMs)) {
            if (change.link_changed) {
                // a plug-in that fails is in the log and stops nothing
                (change.link ? KLIBNetIfLinkUpEvent : KLIBNetIfLinkDownEvent)(change.name.c_str());
            }
        }
    }
}

struct link_words {
    std::optional<std::string> shown;
    std::string name;
    std::string new_name;
};

} // namespace

void add_link(CLI::App &object, const global_options &options) {
    auto &words = words_of<link_words>();
    CLI::App &one = *object.add_subcommand("show", "state of all interfaces, or of one");
    one.add_option("IF", words.shown, "interface");
    one.callback([&words, &options] { show(words.shown, options.json); });

    CLI::App &up = *object.add_subcommand("up", "bring an interface up");
    up.add_option("IF", words.name, "interface")->required();
    up.callback([&words] { set_state(words.name, true); });

    CLI::App &down = *object.add_subcommand("down", "take an interface down");
    down.add_option("IF", words.name, "interface")->required();
    down.callback([&words] { set_state(words.name, false); });

    object.add_subcommand("watch", "raise the events of links that come and go, until interrupted")->callback(watch);

    CLI::App &move = *object.add_subcommand("rename", "give an interface that is down another name");
    move.add_option("OLD", words.name, "interface")->required();
    move.add_option("NEW", words.new_name, "its new name")->required();
    move.callback([&words] { rename(words.name, words.new_name); });
}

} // namespace kova
