// kovanet pppoe: the PPPoE client, its settings and its connection.
#include "composition.h"
#include "errors.h"
#include "objects.h"
#include "password.h"
#include "records.h"
#include "stored.h"
#include "words.h"

#include <algorithm>
#include <cstring>
#include <kova/core.h>
#include <kovanetsdk/pppoe.h>
#include <map>
#include <net/if.h>
#include <unistd.h>

namespace kova {
namespace {

constexpr char kConf[] = "/etc/ppp/pppoe.conf";

using settings = secret_record<PPPOE_CONF>;

// ---- reading ----------------------------------------------------------------------------------------------------

enum class password_state { kUnknown, kStored, kMissing };

/** Reads what is stored, nothing without a file. The password is unknown to those who may not read it. */
password_state read_settings(settings &conf) {
    if (KLIBCFileExist(kConf) == 0) {
        return password_state::kMissing;
    }
    clear_error();
    if (PPPoEConfigGet(&*conf) == 0) {
        return *conf->szPassword != '\0' ? password_state::kStored : password_state::kMissing;
    }
    if (*conf->szUser == '\0') {
        call_failed("cannot read the PPPoE settings");
    }
    return geteuid() == 0 ? password_state::kMissing : password_state::kUnknown; // the secrets are read last
}

json number_or_null(const std::string &text) {
    constexpr int64_t kMost = 99999;
    const std::optional<int64_t> number = decimal_in(text, 0, kMost);
    return number ? json(*number) : json();
}

constexpr column kSettingsColumns[] = {
    {"interface", [](const json &row) { return field(row, "interface"); }},
    {"user", [](const json &row) { return field(row, "user"); }},
    {"password",
     [](const json &row) -> std::string {
         return row["password_stored"].is_null() ? "only root knows" : row["password_stored"] == true ? "stored" : "-";
     }},
    {"MTU", [](const json &row) { return field(row, "mtu"); }},
    {"default route", [](const json &row) -> std::string { return row["default_route"] == true ? "yes" : "no"; }},
};

void show(bool as_json) {
    settings conf;
    const password_state password = read_settings(conf);
    json record;
    record["interface"] = known_text(conf->szIfname);
    record["user"] = known_text(conf->szUser);
    record["password_stored"] =
        password == password_state::kUnknown ? json() : json(password == password_state::kStored);
    record["mtu"] = number_or_null(conf->szMTU);
    record["default_route"] = conf->blDefaultRoute != 0;
    show_record(record, kSettingsColumns, as_json);
}

std::string state_word(const json &row) {
    if (row["enabled"] == false) {
        return "off";
    }
    if (row["running"] == false) {
        return "switched on, but the client does not run";
    }
    return row["address"].is_null() ? "dialling" : "connected";
}

constexpr column kStatusColumns[] = {
    {"state", state_word},
    {"interface", [](const json &row) { return field(row, "interface"); }},
    {"address", [](const json &row) { return field(row, "address"); }},
    {"mask", [](const json &row) { return field(row, "mask"); }},
};

void status(bool as_json) {
    clear_error();
    const int running = KOVAPPPoECheckStatus(0);
    if (running < 0) {
        call_failed("cannot ask whether the PPPoE client runs");
    }
    char interface[IFNAMSIZ] = "";
    char address[16] = "";
    char mask[16] = "";
    if (running == 1 && KOVAPPPoeIntfGet(interface, sizeof interface) == 0) {
        (void)KOVAPPPoeNetInfoGet(address, sizeof address, mask, sizeof mask); // none while it dials again
    }
    json record;
    record["enabled"] = is_pppoe_switched_on();
    record["running"] = running == 1;
    record["interface"] = known_text(interface);
    record["address"] = known_text(address);
    record["mask"] = known_text(mask);
    show_record(record, kStatusColumns, as_json);
}

// ---- settings ---------------------------------------------------------------------------------------------------

struct pppoe_words {
    std::string name;
    std::vector<std::string> keys;
    password_words password;
};

[[noreturn]] void misunderstood(const std::string &why) {
    throw failure{kUsage, why + "; see kovanet pppoe set --help"};
}

/** Values by their keys. */
std::map<std::string, std::string> sorted_keys(const std::vector<std::string> &words) {
    const std::vector<std::string> known = {"user", "mtu", "default-route"};
    std::map<std::string, std::string> values;
    for (auto word = words.begin(); word != words.end(); word += 2) {
        if (std::find(known.begin(), known.end(), *word) == known.end()) {
            const std::string meant = suggestion(*word, known);
            // what means nothing here may be a password that is better not shown
            misunderstood((meant.empty() ? "a word" : "\"" + *word + "\"") + " is neither user, mtu nor default-route" +
                          meant);
        }
        if (word + 1 == words.end()) {
            misunderstood(*word + " lacks a value");
        }
        if (!values.emplace(*word, *(word + 1)).second) {
            misunderstood(*word + " is given twice");
        }
    }
    return values;
}

/** A line that would be cut when it is stored, or a name that is none, would not be what was typed. */
void require_user(const std::string &user) {
    constexpr size_t kMost = sizeof PPPOE_CONF::szUser - 1;
    constexpr size_t kMostQuoted = 511; // with quotes around it, and five characters for each quote in it
    constexpr size_t kPerQuote = 5;
    const auto quotes = static_cast<size_t>(std::count(user.begin(), user.end(), '\''));
    const auto is_control = [](unsigned char byte) { return byte < ' ' || byte == 0x7f; };
    const std::string what = "user \"" + user + "\"";
    if (user.empty() || std::any_of(user.begin(), user.end(), is_control)) {
        throw failure{kNo, what + " is not valid: it is one line without control characters"};
    }
    if (user.size() > kMost || user.size() + quotes * (kPerQuote - 1) + 2 > kMostQuoted) {
        throw failure{kNo, what + " is too long: it has at most 255 bytes, of which each ' counts as five"};
    }
}

void require_mtu(const std::string &text) {
    constexpr int kLeast = 128;
    constexpr int kMost = 1492;
    const json mtu = number_or_null(text);
    if (mtu.is_null() || mtu < kLeast || mtu > kMost) {
        throw failure{kNo, "MTU \"" + text + "\" is not valid: it is a number from 128 to 1492"};
    }
}

/** Blanks at its ends would be lost when it is read back. */
void require_password(const char *password) {
    const std::string text{password};
    const bool is_kept_whole = text.find_first_not_of(" \t") == 0 && text.find_last_not_of(" \t") == text.size() - 1;
    if (!is_kept_whole) {
        throw failure{kNo, "the password is not valid: it begins or ends with a blank"};
    }
}

/** An interface that there is, and that is no connection itself. */
void require_ethernet(const std::string &name) {
    const IFINFO info = require_interface(name);
    if ((info.nFlags & (IFF_LOOPBACK | IFF_POINTOPOINT)) != 0) {
        throw failure{kNo, name + " is no Ethernet interface"};
    }
}

template<size_t Size> void fill(char (&text)[Size], const std::string &value) {
    snprintf(text, Size, "%s", value.c_str());
}

/** What the words say goes over what is stored. */
void apply_keys(const std::map<std::string, std::string> &keys, PPPOE_CONF &conf) {
    for (const auto &[key, value] : keys) {
        if (key == "user") {
            require_user(value);
            fill(conf.szUser, value);
        } else if (key == "mtu") {
            require_mtu(value);
            fill(conf.szMTU, std::to_string(std::stoi(value)));
        } else if (value == "on" || value == "off") {
            conf.blDefaultRoute = value == "on" ? 1 : 0;
        } else {
            misunderstood("default-route is on or off, not \"" + value + "\"");
        }
    }
    if (*conf.szUser == '\0') {
        throw failure{kNo, "no user is stored yet; add: user NAME"};
    }
}

/** What the command line wants stored, with the password that is stored now. Ends the program for what is not valid. */
void read_wanted(const pppoe_words &words, settings &conf) {
    (void)read_settings(conf);
    apply_keys(sorted_keys(words.keys), *conf);
    fill(conf->szIfname, words.name);
    if (*conf->szMTU == '\0') {
        fill(conf->szMTU, "1492");
    }
}

void set(const pppoe_words &words) {
    require_root();
    require_ethernet(words.name);
    settings conf;
    read_wanted(words, conf); // what is not valid is told before a password is asked for
    read_password(words.password, conf->szPassword);
    require_password(conf->szPassword);

    const change_lock lock; // not while somebody types
    settings latest;
    read_wanted(words, latest);
    memcpy(latest->szPassword, conf->szPassword, sizeof conf->szPassword);
    clear_error();
    if (PPPoEConfigSet(&*latest) < 0) {
        call_failed("cannot store the PPPoE settings");
    }
}

// ---- the connection ---------------------------------------------------------------------------------------------

void start() {
    constexpr int kRefused = 19;
    require_root();
    const change_lock lock; // of two starts, one would fail and switch off the other's connection
    settings conf;
    if (read_settings(conf) != password_state::kStored || *conf->szUser == '\0' || *conf->szIfname == '\0') {
        throw failure{kNo, "there are no settings to dial with; first: kovanet pppoe set IF user NAME"};
    }
    const std::string name = conf->szIfname;
    require_ethernet(name);
    const step_note note{"dialling over " + name + ", this may take a minute"};
    clear_error();
    const int result = KOVAPPPoEService(1);
    if (result == kRefused) {
        throw failure{kCallFailed, "no connection over " + name + ": the other side refuses user or password"};
    }
    if (result != 0 && KLIBCErrGet() == 0) {
        throw failure{kCallFailed,
                      "no connection over " + name + "; what pppd and pppoe-connect say is in the system log"};
    }
    if (result != 0) {
        call_failed("cannot start the PPPoE client");
    }
}

void stop() {
    require_root();
    const step_note note{"ending the connection"};
    clear_error();
    if (KOVAPPPoEService(0) < 0) {
        call_failed("cannot stop the PPPoE client");
    }
    if (KLIBCPs("pppoe-connect", nullptr, 0, 0) > 0) {
        throw failure{kCallFailed, "the PPPoE client does not end; see what /usr/sbin/pppoe-stop says"};
    }
}

} // namespace

bool is_pppoe_switched_on() {
    return strcasecmp(stored_value("/etc/kovainfo.conf", "pppoe_enable").c_str(), "yes") == 0; // as the library does
}

void add_pppoe(CLI::App &object, const global_options &options) {
    auto &words = words_of<pppoe_words>();
    object.add_subcommand("show", "the settings")->callback([&options] { show(options.json); });

    CLI::App &change = *object.add_subcommand("set", "change the settings for the next start");
    change.add_option("IF", words.name, "Ethernet interface to dial on")->required();
    add_words(change, "KEY VALUE", words.keys,
              "user NAME, mtu 128 to 1492 (1492 unless set), default-route on|off; what is left out stays");
    add_password(change, words.password);
    change.callback([&words] { set(words); });

    object.add_subcommand("start", "dial, and dial again whenever the connection is lost")->callback(start);
    object.add_subcommand("stop", "end the connection")->callback(stop);
    object.add_subcommand("status", "whether there is a connection, its interface and address")->callback([&options] {
        status(options.json);
    });
}

} // namespace kova
