// kovanet block: the reasons for which an interface is kept from changes.
#include "errors.h"
#include "interfaces.h"
#include "objects.h"
#include "words.h"

#include <algorithm>
#include <cstdio>
#include <iterator>
#include <kovanetsdk/iface.h>

namespace kova {
namespace {

constexpr struct {
    const char *name;
    unsigned bit;
} kReasons[] = {{"ha", 1}, {"aha", 2}, {"virtual", 4}, {"orlena", 8}};

constexpr column kColumns[] = {
    {"REASON", [](const json &row) { return field(row, "reason"); }},
    {"BLOCKED", [](const json &row) { return field(row, "state"); }},
};

void show(const std::string &name, bool as_json) {
    require_interface(name);
    int mask = 0; // the call adds its bits to what is there
    clear_error();
    if (KOVANetGetIfBlock(name.c_str(), &mask) != 0) {
        call_failed("cannot read the blocks of " + name);
    }
    json record = {{"name", name}, {"blocked", mask != 0}};
    json rows = json::array();
    for (const auto &reason : kReasons) {
        const bool on = (static_cast<unsigned>(mask) & reason.bit) != 0;
        record[reason.name] = on;
        rows.push_back({{"reason", reason.name}, {"state", on ? "on" : "off"}});
    }
    if (as_json) {
        print_json(record);
    } else {
        print_table(rows, kColumns);
    }
}

void set(const std::string &name, const std::string &reason_name, bool on) {
    require_root();
    require_interface(name);
    const auto *reason = std::find_if(std::begin(kReasons), std::end(kReasons),
                                      [&reason_name](const auto &known) { return reason_name == known.name; });
    const step_note note{"waiting for the file of " + name};
    clear_error();
    if (KOVANetSetIfBlock(name.c_str(), reason->bit, on ? 1 : 0) != 0) {
        call_failed("cannot switch block " + reason_name + " of " + name);
    }
}

struct block_words {
    std::string name;
    std::string reason;
    std::string state;
};

} // namespace

void add_block(CLI::App &object, const global_options &options) {
    auto &words = words_of<block_words>();
    CLI::App &one = *object.add_subcommand("show", "which reasons block an interface");
    one.add_option("IF", words.name, "interface")->required();
    one.callback([&words, &options] { show(words.name, options.json); });

    CLI::App &change = *object.add_subcommand("set", "switch one reason on or off");
    change.add_option("IF", words.name, "interface")->required();
    change.add_option("REASON", words.reason, "ha, aha, virtual or orlena")
        ->required()
        ->check(choice({"ha", "aha", "virtual", "orlena"}));
    change.add_option("STATE", words.state, "on or off")->required()->check(choice({"on", "off"}));
    change.callback([&words] { set(words.name, words.reason, words.state == "on"); });
}

} // namespace kova
