// kovanet card: the cards and their IPv4 configuration.
#include "composition.h"
#include "errors.h"
#include "objects.h"
#include "rules.h"
#include "words.h"

#include <cstdio>
#include <kovanetsdk/addr.h>
#include <kovanetsdk/iface.h>
#include <kovanetsdk/link.h>
#include <net/if.h>

namespace kova {
namespace {

constexpr int kMaxCards = 32;
constexpr int kLogicalCards = 2; /**< bonds instead of their members, no loopback */

/** Where a card's IPv4 address comes from, and the address that its configuration or its lease names. */
void add_configuration(json &row, const char *name) {
    NETINFO configured{};
    const bool has_address = KOVANetIFGetIPConfig(name, &configured) == 0;
    const bool is_static = configured.nIPSource != 0;
    row["source"] = !is_static ? "dhcp" : has_address ? "static" : "none";
    row["configured_address"] = known_text(configured.szIP);
    row["configured_mask"] = known_text(configured.szMask);
}

json describe(const IFINFO &info) {
    ETHINFO link{};
    const bool has_settings = KOVANetGetEthInfo(&link, info.szIfname) == 0;
    const int prefix = *info.szIP != '\0' ? KOVANetNetmaskToPrefix(info.szMask) : -1;
    json row;
    row["name"] = info.szIfname;
    row["up"] = (info.nFlags & IFF_UP) != 0;
    row["link"] = link_word(info.nLink != 0);
    row["speed_mbps"] = known_number(has_settings ? link.nSpeed : -1, 1);
    row["duplex"] = duplex_word(has_settings ? link.nDuplex : -1);
    row["best_speed_mbps"] = known_number(has_settings ? link.nBestSpeed : -1, 1);
    row["best_duplex"] = duplex_word(has_settings ? link.nBestDuplex : -1);
    row["best_mode"] = known_text(has_settings ? link.szBestMode : "");
    row["address"] = known_text(info.szIP);
    row["prefix"] = known_number(prefix, 0);
    row["mask"] = prefix < 0 ? json() : json(info.szMask);
    add_configuration(row, info.szIfname);
    row["mac"] = mac_text(info.abMac);
    row["mtu"] = known_number(has_settings ? link.nMTU : KOVAGetMTU(info.szIfname), 1);
    return row;
}

std::string configured_with_mask(const json &row) {
    return row["configured_mask"].is_null()
               ? field(row, "configured_address")
               : field(row, "configured_address") + " mask " + field(row, "configured_mask");
}

std::string best_link(const json &row) {
    if (row["best_speed_mbps"].is_null()) {
        return "-";
    }
    return field(row, "best_speed_mbps") + " Mb/s " + field(row, "best_duplex") + " " + field(row, "best_mode");
}

constexpr column kListColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"LINK", [](const json &row) { return field(row, "link"); }},
    {"SPEED", [](const json &row) { return field(row, "speed_mbps"); }, true},
    {"SOURCE", [](const json &row) { return field(row, "source"); }},
    {"ADDRESS", state_address},
    {"MAC", [](const json &row) { return field(row, "mac"); }},
    {"MTU", [](const json &row) { return field(row, "mtu"); }, true},
};

constexpr column kShowColumns[] = {
    {"name", [](const json &row) { return field(row, "name"); }},
    {"state", up_field},
    {"link", [](const json &row) { return field(row, "link"); }},
    {"speed", [](const json &row) { return row["speed_mbps"].is_null() ? "-" : field(row, "speed_mbps") + " Mb/s"; }},
    {"duplex", [](const json &row) { return field(row, "duplex"); }},
    {"best link", best_link},
    {"source", [](const json &row) { return field(row, "source"); }},
    {"address", state_address},
    {"configured", configured_with_mask},
    {"MAC", [](const json &row) { return field(row, "mac"); }},
    {"MTU", [](const json &row) { return field(row, "mtu"); }},
};

void list(bool as_json) {
    const config_lock lock{config_lock::kShared}; // one view of all cards, and taken once instead of once per card
    IFINFO cards[kMaxCards];
    clear_error();
    const int count = KLIBNetGetInterfaceInfo(cards, kMaxCards, kLogicalCards);
    if (count < 0) {
        call_failed("cannot list the cards");
    }
    json rows = json::array();
    for (int i = 0; i < count; ++i) {
        rows.push_back(describe(cards[i]));
    }
    show_table(rows, kListColumns, as_json);
}

/** The record of an interface that can be a card, up or not. */
IFINFO require_card(const std::string &name) {
    IFINFO info = require_interface(name);
    if ((info.nFlags & (IFF_LOOPBACK | IFF_POINTOPOINT)) != 0) {
        throw failure{kNotFound, name + " is not a card; see kovanet card list"};
    }
    return info;
}

void show(const std::string &name, bool as_json) {
    const IFINFO info = require_card(name);
    const config_lock lock{config_lock::kShared};
    const json record = describe(info);
    show_record(record, kShowColumns, as_json);
}

/** The card's record as it is before a change, nothing when it is not among the cards in use. */
std::optional<NETINFO> old_record(const std::string &name) {
    for (int i = 0; i < kMaxCards; ++i) {
        NETINFO card{};
        const int found = KOVANetGetCard1(i, nullptr, &card); // below 0 for a card without an address: go on
        if (found == 0) {
            break;
        }
        if (found > 0 && name == card.szIfname) {
            return card;
        }
    }
    return std::nullopt;
}

void change(const NETINFO &wanted) {
    NETINFO card = wanted;
    require_card(card.szIfname);
    const step_note note{textf("configuring %s", card.szIfname)};
    const config_lock lock{config_lock::kExclusive};
    std::optional<NETINFO> old = old_record(card.szIfname);
    clear_error();
    if (KOVANetSetCard1(&card, old ? &*old : nullptr) < 0) {
        call_failed(textf("cannot configure %s", card.szIfname));
    }
}

NETINFO record_for(const std::string &name) {
    require("interface name \"" + name + "\"", refuse_interface_name(name));
    NETINFO card{};
    snprintf(card.szIfname, sizeof card.szIfname, "%s", name.c_str());
    return card;
}

/** @param mask  the mask, empty when the address has its prefix length with it */
void set_static(const std::string &name, const std::string &given, const std::string &given_mask) {
    const size_t slash = given.find('/');
    if (given.empty() || (slash == std::string::npos) == given_mask.empty()) {
        throw failure{kUsage, "give the address as ADDRESS/LENGTH, or as ADDRESS mask MASK"};
    }
    network fixed{given, given_mask};
    if (given_mask.empty()) {
        fixed = fixed_address_of(given);
    } else {
        require("address \"" + given + "\" with mask \"" + given_mask + "\"",
                refuse_address_and_mask(given, given_mask));
    }

    NETINFO card = record_for(name);
    card.nIPSource = 1;
    snprintf(card.szIP, sizeof card.szIP, "%s", plain_address(fixed.address).c_str());
    snprintf(card.szMask, sizeof card.szMask, "%s", plain_address(fixed.mask).c_str());
    change(card);
}

struct card_words {
    std::string name;
    std::string source;
    std::string address;
    std::string keyword;
    std::string mask;
};

void set(const card_words &words) {
    require_root();
    if (words.source == "static") {
        set_static(words.name, words.address, words.mask);
    } else if (words.address.empty()) {
        change(record_for(words.name));
    } else {
        throw failure{kUsage, "dhcp takes no address: the DHCP server gives it"};
    }
}

} // namespace

void add_card(CLI::App &object, const global_options &options) {
    auto &words = words_of<card_words>();
    object.add_subcommand("list", "the cards in use")->callback([&options] { list(options.json); });

    CLI::App &one = *object.add_subcommand("show", "everything about one card");
    one.add_option("IF", words.name, "interface")->required();
    one.callback([&words, &options] { show(words.name, options.json); });

    CLI::App &change = *object.add_subcommand("set", "set how a card gets its IPv4 address, now and at every start");
    change.add_option("IF", words.name, "interface")->required();
    change.add_option("static|dhcp", words.source, "a fixed address, or from a DHCP server")
        ->required()
        ->check(choice({"static", "dhcp"}));
    change.add_option("ADDRESS[/LENGTH]", words.address, "address with its prefix length, or followed by its mask");
    add_keyword(change, "mask", words.keyword, "MASK", words.mask, "dotted mask, unless there is a LENGTH");
    change.callback([&words] { set(words); });
}

} // namespace kova
