// kovanet dhcp-server vendor: the options for the clients of one vendor class.
#include "dhcp_server.h"
#include "lists.h"
#include "rules.h"

#include <algorithm>
#include <kovanetsdk/dhcp.h>

namespace kova {
namespace {

struct vendor_words {
    std::string vendor;
    std::string number;
    std::string value;
};

struct map_free {
    void operator()(KLIBSZHASH *map) const { KLIBCSzHashFree(map); }
};
using owned_map = std::unique_ptr<KLIBSZHASH, map_free>;

owned_map make_map() {
    constexpr int kCapacity = 16;
    clear_error();
    owned_map map{KLIBCSzHashAlloc(kCapacity)};
    if (map == nullptr) {
        call_failed("cannot make a map");
    }
    return map;
}

std::vector<std::string> vendors() {
    const owned_list owned = make_list();
    KLIBSZLIST *list = owned.get();
    clear_error();
    if (DHCPVendorEnum(&list) < 0) {
        call_failed("cannot read the vendor classes");
    }
    return texts_of(list);
}

/** The options of a vendor class, nothing when one of them cannot be read. */
owned_map readable_options(const std::string &vendor) {
    owned_map map = make_map();
    KLIBSZHASH *options = map.get();
    clear_error();
    return DHCPVendorGetVendor(vendor.c_str(), &options) < 0 ? nullptr : std::move(map);
}

/** The same, ending the program. */
owned_map options_of(const std::string &vendor) {
    owned_map map = readable_options(vendor);
    if (map == nullptr) {
        call_failed("cannot read the options of vendor class " + vendor);
    }
    return map;
}

json rows_of(const owned_map &map) {
    const owned_list numbers = make_list();
    clear_error();
    if (KLIBCSzHashEnumKey(map.get(), numbers.get()) < 0) {
        call_failed("cannot read the options");
    }
    json rows = json::array();
    for (const std::string &number : texts_of(numbers.get())) {
        rows.push_back({{"number", std::stoi(number)}, {"value", KLIBCSzHashGetValue(map.get(), number.c_str())}});
    }
    return rows;
}

void require_vendor(const std::string &vendor) {
    const std::vector<std::string> known = vendors();
    if (std::find(known.begin(), known.end(), vendor) == known.end()) {
        throw failure{kNotFound, "vendor class " + vendor + " has no options; see kovanet dhcp-server vendor list"};
    }
}

constexpr column kVendors[] = {
    {"CLASS", [](const json &row) { return field(row, "class"); }},
    {"OPTIONS", [](const json &row) { return field(row, "options"); }, true},
};
constexpr column kOptions[] = {
    {"NUMBER", [](const json &row) { return field(row, "number"); }, true},
    {"VALUE", [](const json &row) { return field(row, "value"); }},
};

void print_rows(const json &rows, std::span<const column> columns, bool as_json) {
    show_table(rows, columns, as_json);
}

void list(bool as_json) {
    const config_lock lock{config_lock::kShared};
    json rows = json::array();
    for (const std::string &vendor : vendors()) {
        const owned_map map = readable_options(vendor);
        rows.push_back({{"class", vendor}, {"options", map != nullptr ? json(rows_of(map).size()) : json()}});
    }
    print_rows(rows, kVendors, as_json);
}

void show(const std::string &vendor, bool as_json) {
    const config_lock lock{config_lock::kShared};
    require_vendor(vendor);
    print_rows(rows_of(options_of(vendor)), kOptions, as_json);
}

int require_number(const std::string &number) {
    if (DHCPVendorCheckOptNum(number.c_str()) != 1) {
        throw failure{kNo, "\"" + number + "\" is not valid: an option has a number from 1 to 254"};
    }
    return std::stoi(number);
}

void set(const vendor_words &words) {
    const int number = require_number(words.number);
    require("vendor class \"" + words.vendor + "\"", refuse_server_text(words.vendor));
    require("value \"" + words.value + "\"", refuse_server_text(words.value));
    require("vendor class and value together", refuse_server_line("dhcp-option=vendor:" + words.vendor + "," +
                                                                  std::to_string(number) + "," + words.value));
    change_server([&] {
        clear_error();
        if (DHCPVendorSetVendorOpt(words.vendor.c_str(), number, words.value.c_str()) < 0) {
            call_failed("cannot set the option of vendor class " + words.vendor);
        }
    });
}

/** What stays of a vendor class without an option; nothing stays without a number. */
owned_map rest_of(const vendor_words &words) {
    owned_map rest = make_map();
    if (words.number.empty()) {
        return rest;
    }
    const int number = require_number(words.number);
    bool is_there = false;
    for (const json &row : rows_of(options_of(words.vendor))) {
        if (row.at("number") == number) {
            is_there = true;
        } else if (KLIBCSzHashSetValue(rest.get(), row.at("number").dump().c_str(),
                                       row.at("value").get<std::string>().c_str()) < 0) {
            call_failed("cannot make a map");
        }
    }
    if (!is_there) {
        throw failure{kNotFound, "vendor class " + words.vendor + " has no option " + words.number};
    }
    return rest;
}

void del(const vendor_words &words) {
    change_server([&] {
        require_vendor(words.vendor);
        const owned_map rest = rest_of(words);
        clear_error();
        if (DHCPVendorSetVendor(words.vendor.c_str(), rest.get()) < 0) {
            call_failed("cannot change the options of vendor class " + words.vendor);
        }
    });
}

} // namespace

void add_vendor_verbs(CLI::App &object, const global_options &options) {
    auto &words = words_of<vendor_words>();
    CLI::App &all = *object.add_subcommand("vendor", "options for the clients of one vendor class");
    all.add_subcommand("list", "the vendor classes that have options")->callback([&options] { list(options.json); });

    CLI::App &one = *all.add_subcommand("show", "the options of a vendor class");
    one.add_option("CLASS", words.vendor, "vendor class, as the clients send it")->required();
    one.callback([&words, &options] { show(words.vendor, options.json); });

    CLI::App &change = add_change(all, "set", "set an option of a vendor class");
    change.add_option("CLASS", words.vendor, "vendor class, as the clients send it")->required();
    change.add_option("NUMBER", words.number, "number of the option, 1 to 254")->required();
    change.add_option("VALUE", words.value, "value as dnsmasq takes it, such as 1i for a number in 4 bytes")
        ->required();
    change.callback([&words] { set(words); });

    CLI::App &gone = add_change(all, "del", "hand an option out no more, or none of a vendor class");
    gone.add_option("CLASS", words.vendor, "vendor class")->required();
    gone.add_option("NUMBER", words.number, "number of the option, all of them if left out");
    gone.callback([&words] { del(words); });
}

} // namespace kova
