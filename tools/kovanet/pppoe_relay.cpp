// kovanet pppoe-relay: takes PPPoE from the clients on a bridge of the local LAN to a server elsewhere.
#include "composition.h"
#include "errors.h"
#include "lists.h"
#include "objects.h"
#include "records.h"
#include "words.h"

#include <ctime>
#include <kova/core.h>
#include <kovanetsdk/bridge.h>
#include <kovanetsdk/pppoe.h>

namespace kova {
namespace {

constexpr char kFolder[] = "/etc/sysconfig/pppoe-relay";

bool has_settings(const std::string &name) {
    return KLIBCFileExist((std::string(kFolder) + '/' + name).c_str()) == 1;
}

/** The settings of a bridge, off and without a server as long as there are none: reading them leaves no file. */
PPPOE_RELAY_CONF settings_for(const std::string &name) {
    PPPOE_RELAY_CONF conf{};
    clear_error();
    if (has_settings(name) && KOVANetGetPPPoERelayConfig(name.c_str(), &conf) < 0) {
        call_failed("cannot read the relay settings of " + name);
    }
    return conf;
}

/** Whether a relay runs for a bridge, with any server. */
bool is_relayed(const std::string &name) {
    return KLIBCIsProcAlive(("/usr/sbin/pppoe-relay -C " + name).c_str()) == 1;
}

/** The bridges that have settings, sorted by name. */
std::vector<std::string> configured() {
    constexpr int kRegularFiles = 1154; // as the library applies them
    if (KLIBCFileExist(kFolder) == 0) {
        return {};
    }
    const owned_list names = make_list();
    clear_error();
    if (KLIBCFileEnumDir(kFolder, names.get(), nullptr, kRegularFiles) < 0) {
        call_failed(std::string("cannot list ") + kFolder);
    }
    return texts_of(names.get());
}

json describe(const std::string &name) {
    const PPPOE_RELAY_CONF conf = settings_for(name);
    return {{"name", name},
            {"enabled", conf.blEnabled == 1},
            {"server", known_text(conf.szServer)},
            {"running", is_relayed(name)}};
}

constexpr column kColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"RELAY", [](const json &row) -> std::string { return row["enabled"] == true ? "on" : "off"; }},
    {"SERVER", [](const json &row) { return field(row, "server"); }},
    {"RUNS", [](const json &row) -> std::string { return row["running"] == true ? "yes" : "no"; }},
};

/** Ends the program for what is neither in the kernel nor has settings. */
void require_known(const std::string &name) {
    if (!find_interface(name) && !has_settings(name)) {
        throw failure{kNotFound, "no interface is named " + name + "; see kovanet link show"};
    }
}

void show(const std::optional<std::string> &name, bool as_json) {
    json rows;
    if (name) {
        require_known(*name);
        rows.push_back(describe(*name));
    } else {
        rows = pppoe_relay_records();
    }
    show_table(rows, kColumns, as_json);
}

struct relay_words {
    std::optional<std::string> chosen;
    std::string name;
    std::string state;
    std::optional<std::string> server;
};

/** Only the clients on a bridge of the local LAN are relayed. */
void require_local_lan(const std::string &name) {
    require("interface name \"" + name + "\"", refuse_interface_name(name));
    if (KOVANetIsIfBridgeType(name.c_str(), KLIB_BRIDGE_LOCAL_LAN) != 1) {
        throw failure{kNo, name + " is no bridge of the local LAN; first: kovanet bridge set " + name +
                               " local-lan PRIMARY"};
    }
}

void set(const relay_words &words) {
    require_root();
    const bool is_on = words.state == "on";
    if (is_on != words.server.has_value()) {
        throw failure{kUsage, std::string(is_on ? "on needs the interface towards the server" : "off takes no server") +
                                  "; see kovanet pppoe-relay set --help"};
    }
    if (is_on) {
        require_local_lan(words.name);
        require_interface(*words.server);
    } else {
        require_known(words.name);
    }
    PPPOE_RELAY_CONF conf = settings_for(words.name);
    conf.blEnabled = is_on ? 1 : 0;
    if (is_on) {
        if (*words.server == words.name) {
            throw failure{kNo, words.name + " cannot be on both sides of its relay"};
        }
        snprintf(conf.szServer, sizeof conf.szServer, "%s", words.server->c_str());
    }
    clear_error();
    if (KOVANetSetPPPoERelayConfig(words.name.c_str(), &conf) < 0) {
        call_failed("cannot store the relay settings of " + words.name);
    }
}

/** Whether a relay that was just started is found: while it goes to the background, a look at all processes can miss
 * it. */
bool becomes_relayed(const std::string &name) {
    constexpr timespec kPause = {0, 20'000'000};
    constexpr int kTries = 50;
    for (int i = 0; i < kTries; ++i) {
        if (is_relayed(name)) {
            return true;
        }
        nanosleep(&kPause, nullptr);
    }
    return false;
}

const char *why_not_relayed(const std::string &name) {
    if (KOVANetIsIfBridgeType(name.c_str(), KLIB_BRIDGE_LOCAL_LAN) != 1) {
        return "it is no bridge of the local LAN";
    }
    return KOVANetIsIFUp(name.c_str()) != 1 ? "it is not up" : "its relay has ended again; see the system log";
}

/** Tells what is switched on and all the same not relayed. */
void require_relayed(const std::string &name) {
    if (settings_for(name).blEnabled == 1 && !becomes_relayed(name)) {
        throw failure{kNo, name + " is not relayed now: " + why_not_relayed(name)};
    }
}

void apply(const std::optional<std::string> &name) {
    require_root();
    if (name) {
        require_known(*name);
    }
    clear_error();
    if ((name ? KOVANetApplyPPPoERelayConfig(name->c_str()) : KOVANetApplyPPPoERelayConfigAll()) < 0) {
        call_failed("cannot bring the relays into step with their settings");
    }
    for (const std::string &each : name ? std::vector<std::string>{*name} : configured()) {
        require_relayed(each);
    }
}

void clear() {
    require_root();
    clear_error();
    if (KOVANetClearPPPoERelayConfigAll() < 0) {
        call_failed("cannot delete the relay settings");
    }
    const std::vector<std::string> left = configured();
    if (!left.empty()) {
        throw failure{kCallFailed, "cannot delete " + std::string(kFolder) + '/' + left.front()};
    }
}

} // namespace

json pppoe_relay_records() {
    json rows = json::array();
    for (const std::string &each : configured()) {
        rows.push_back(describe(each));
    }
    return rows;
}

void add_pppoe_relay(CLI::App &object, const global_options &options) {
    auto &words = words_of<relay_words>();
    CLI::App &one = *object.add_subcommand("show", "the bridges that have settings, or one");
    one.add_option("BRIDGE", words.chosen, "bridge of the local LAN");
    one.callback([&words, &options] { show(words.chosen, options.json); });

    CLI::App &change = *object.add_subcommand("set", "change the settings of a bridge; see apply");
    change.add_option("BRIDGE", words.name, "bridge of the local LAN")->required();
    change.add_option("on|off", words.state, "whether its clients are relayed")
        ->required()
        ->check(choice({"on", "off"}));
    change.add_option("IF", words.server, "with on: the interface towards the PPPoE server");
    change.callback([&words] { set(words); });

    CLI::App &use = *object.add_subcommand("apply", "start, restart and stop relays as the settings say");
    use.add_option("BRIDGE", words.chosen, "all that have settings, if left out");
    use.callback([&words] { apply(words.chosen); });

    object.add_subcommand("clear", "delete the settings of all bridges; relays that run go on")->callback(clear);
}

} // namespace kova
