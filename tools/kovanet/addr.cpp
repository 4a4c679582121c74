// kovanet addr: IPv4 and IPv6 addresses as the kernel has them now.
#include "errors.h"
#include "interfaces.h"
#include "objects.h"
#include "records.h"
#include "rules.h"

#include <algorithm>
#include <charconv>
#include <kovanetsdk/addr.h>
#include <kovanetsdk/iface.h>
#include <kovanetsdk/ipv6.h>

namespace kova {
namespace {

/** An address with its prefix length, checked. */
struct interface_address {
    const char *family; /**< as the library names it */
    std::string text;
    int prefix;
};

json ipv6_flags(uint16_t flags) {
    constexpr struct {
        uint16_t bit;
        const char *name;
    } kNames[] = {
        {0x01, "temporary"}, {0x08, "dadfailed"}, {0x20, "deprecated"}, {0x40, "tentative"}, {0x80, "permanent"}};
    json names = json::array();
    for (const auto &known : kNames) {
        if ((flags & known.bit) != 0) {
            names.push_back(known.name);
        }
    }
    return names;
}

const char *scope_word(uint32_t scope) {
    switch (scope) {
    case 0x10:
        return "host";
    case 0x20:
        return "link";
    case 0x40:
        return "site";
    default:
        return "global";
    }
}

json row_of(const std::string &name, int family, const char *address, int prefix) {
    json row;
    row["interface"] = name;
    row["family"] = family;
    row["address"] = address;
    row["prefix"] = known_number(prefix, 0);
    return row;
}

std::string flag_list(const json &row) {
    std::string list;
    for (const json &flag : row["flags"]) {
        list += (list.empty() ? "" : ",") + flag.get<std::string>();
    }
    return list.empty() ? "-" : list;
}

constexpr column kColumns[] = {
    {"INTERFACE", [](const json &row) { return field(row, "interface"); }},
    {"FAMILY", [](const json &row) { return "IPv" + field(row, "family"); }},
    {"ADDRESS", [](const json &row) { return field(row, "address") + "/" + field(row, "prefix"); }},
    {"SCOPE", [](const json &row) { return field(row, "scope"); }},
    {"FLAGS", flag_list},
};

void list(const std::optional<std::string> &name, bool as_json) {
    json rows = json::array();
    const std::vector<IFINFO> asked = name ? std::vector{require_interface(*name)} : all_interfaces();
    for (const IFINFO &info : asked) {
        const json found = address_rows(info);
        rows.insert(rows.end(), found.begin(), found.end());
    }
    show_table(rows, kColumns, as_json);
}

interface_address checked(const std::string &given) {
    const size_t slash = given.find('/');
    const bool is_ipv6 = given.find(':') != std::string::npos;
    const std::string address = given.substr(0, slash);
    require("address \"" + address + "\"", is_ipv6 ? refuse_ipv6(address) : refuse_address(address));
    if (slash == std::string::npos) {
        throw failure{kNo,
                      "address \"" + given + "\" has no prefix length: write " + given + (is_ipv6 ? "/64" : "/24")};
    }
    require("prefix \"" + given + "\"", is_ipv6 ? refuse_ipv6(given) : refuse_prefix(given));
    if (!is_ipv6) {
        return {"-4", plain_address(address), KOVANetNetmaskToPrefix(network_of(given).mask.c_str())};
    }
    int prefix = 0;
    std::from_chars(given.data() + slash + 1, given.data() + given.size(), prefix);
    return {"-6", address, prefix};
}

/** Whether the library lists the address on the interface; of several IPv4 addresses it knows the first. */
bool is_listed(const std::string &name, const interface_address &wanted) {
    if (wanted.family[1] == '4') {
        return wanted.text == require_interface(name).szIP;
    }
    const std::vector<KOVAV6IP> all = ipv6_addresses(name);
    return std::any_of(all.begin(), all.end(),
                       [&wanted](const KOVAV6IP &each) { return is_same_ipv6(wanted.text, each.szIP); });
}

void add_address(const std::string &name, const std::string &given) {
    require_root();
    const interface_address address = checked(given);
    require_interface(name);
    const config_lock lock{config_lock::kExclusive}; // the library's call leaves it to its caller
    clear_error();
    if (KOVANetSetIP(address.family, name.c_str(), address.text.c_str(), address.prefix, "add") < 0) {
        call_failed("cannot add " + given + " to " + name);
    }
}

void delete_address(const std::string &name, const std::string &given) {
    require_root();
    const interface_address address = checked(given);
    require_interface(name);
    const config_lock lock{config_lock::kExclusive};
    const bool listed = is_listed(name, address);
    clear_error();
    if (KOVANetSetIP(address.family, name.c_str(), address.text.c_str(), address.prefix, "del") < 0) {
        if (!listed) {
            throw failure{kNotFound, name + " has no address " + given + "; see kovanet addr list " + name};
        }
        call_failed("cannot remove " + given + " from " + name);
    }
}

void flush(const std::string &name, const std::string &family) {
    require_root();
    require_interface(name);
    const step_note note{"removing the addresses of " + name};
    const config_lock lock{config_lock::kExclusive};
    clear_error();
    if (KOVANetFlushIP(family == "4" ? "-4" : "-6", name.c_str()) < 0) {
        call_failed("cannot remove the IPv" + family + " addresses of " + name);
    }
}

struct addr_words {
    std::optional<std::string> listed;
    std::string name;
    std::string address;
};

} // namespace

json address_rows(const IFINFO &info) {
    json rows = json::array();
    const std::string name = info.szIfname;
    if (*info.szIP != '\0') {
        json row = row_of(name, 4, info.szIP, KOVANetNetmaskToPrefix(info.szMask));
        row["scope"] = json();
        row["flags"] = json::array();
        rows.push_back(row);
    }
    for (const KOVAV6IP &address : ipv6_addresses(name)) {
        json row = row_of(name, 6, address.szIP, static_cast<int>(address.nPrefixLength));
        row["scope"] = scope_word(address.nScope);
        row["flags"] = ipv6_flags(address.nFlags);
        rows.push_back(row);
    }
    return rows;
}

void add_addr(CLI::App &object, const global_options &options) {
    auto &words = words_of<addr_words>();
    CLI::App &all = *object.add_subcommand("list", "addresses of all interfaces, or of one");
    all.add_option("IF", words.listed, "interface");
    all.callback([&words, &options] { list(words.listed, options.json); });

    CLI::App &add =
        *object.add_subcommand("add", "add an IPv6 address, or put an IPv4 address in place of the old one");
    add.add_option("IF", words.name, "interface")->required();
    add.add_option("ADDRESS/LENGTH", words.address, "address and prefix length")->required();
    add.callback([&words] { add_address(words.name, words.address); });

    CLI::App &del = *object.add_subcommand("del", "remove an address");
    del.add_option("IF", words.name, "interface")->required();
    del.add_option("ADDRESS/LENGTH", words.address, "address and prefix length")->required();
    del.callback([&words] { delete_address(words.name, words.address); });

    CLI::App &none = *object.add_subcommand("flush", "remove all addresses of a family");
    none.add_option("IF", words.name, "interface")->required();
    none.add_option("FAMILY", words.address, "4 or 6")->required()->check(CLI::IsMember({"4", "6"}));
    none.callback([&words] { flush(words.name, words.address); });
}

} // namespace kova
