// kovanet dhcp-server subnet: the ranges that the server hands addresses from.
#include "dhcp_subnet.h"
#include "rules.h"
#include "words.h"

#include <algorithm>
#include <arpa/inet.h>
#include <climits>
#include <cstring>
#include <kovanetsdk/addr.h>
#include <map>

namespace kova {
namespace {

constexpr int kDefaultLease = 86400; // seconds
constexpr char kNone[] = "none";

/** What a command says about a subnet: values by the name of the key. */
using given_keys = std::map<std::string, std::vector<std::string>>;

struct set_words : subnet_words {
    std::vector<std::string> keys;
    bool force = false;
};

// ---- reading ----------------------------------------------------------------------------------------------------

/** A subnet without what its fragment says: for one that cannot be read that is null. */
json blank_record(const subnet_id &id) {
    int enabled = 0;
    DHCPTagConfGetEnable(id.ifname.c_str(), id.number, id.type, &enabled);
    json record = {{"interface", id.ifname},
                   {"number", id.number},
                   {"family", number_of(id.type)},
                   {"enabled", enabled == 1},
                   {"readable", false}};
    for (const char *key : {"mode", "start", "end", "mask", "router", "domain", "dns", "lease_seconds", "options"}) {
        record[key] = nullptr;
    }
    return record;
}

json record_of(const subnet &one) {
    json record = blank_record(one.id);
    record["readable"] = true;
    record["start"] = known_text(one.conf.start_ip);
    record["end"] = known_text(one.conf.end_ip);
    record["dns"] = one.servers;
    record["lease_seconds"] = one.conf.lease_time;
    if (one.id.type == kIPv6) {
        record["mode"] = one.conf.v6_mode;
        return record;
    }
    record["mask"] = known_text(one.conf.netmask);
    record["router"] = known_text(one.conf.router);
    record["domain"] = known_text(one.conf.domain);
    int count = 0;
    for (const DHCP_OPTION *option = one.options.get(); option != nullptr; option = option->next) {
        ++count;
    }
    record["options"] = count;
    return record;
}

std::string state(const json &row) {
    return row.at("enabled") == true ? "on" : "off";
}

constexpr column kList[] = {
    {"INTERFACE", [](const json &row) { return field(row, "interface"); }},
    {"N", [](const json &row) { return field(row, "number"); }, true},
    {"FAMILY", [](const json &row) { return "IPv" + field(row, "family"); }},
    {"STATE", state},
    {"MODE", [](const json &row) { return row.at("readable") == true ? field(row, "mode") : "unreadable"; }},
    {"START", [](const json &row) { return field(row, "start"); }},
    {"END", [](const json &row) { return field(row, "end"); }},
    {"MASK", [](const json &row) { return field(row, "mask"); }},
};

constexpr column kRecord[] = {
    {"interface", [](const json &row) { return field(row, "interface"); }},
    {"number", [](const json &row) { return field(row, "number"); }},
    {"family", [](const json &row) { return "IPv" + field(row, "family"); }},
    {"state", state},
    {"mode", [](const json &row) { return field(row, "mode"); }},
    {"range",
     [](const json &row) { return row.at("start").is_null() ? "-" : field(row, "start") + " " + field(row, "end"); }},
    {"mask", [](const json &row) { return field(row, "mask"); }},
    {"router", [](const json &row) { return field(row, "router"); }},
    {"domain", [](const json &row) { return field(row, "domain"); }},
    {"dns", [](const json &row) { return words_field(row, "dns"); }},
    {"lease", [](const json &row) { return field(row, "lease_seconds") + " s"; }},
    {"options", [](const json &row) { return field(row, "options"); }},
};

void list(bool as_json) {
    const config_lock lock{config_lock::kShared}; // one view of all files
    json rows = json::array();
    for (const subnet_id &id : subnets_there()) {
        subnet one{id, {}, nullptr, {}};
        rows.push_back(read_subnet(one) == presence::read ? record_of(one) : blank_record(id));
    }
    show_table(rows, kList, as_json);
}

void show(const subnet_id &id, bool as_json) {
    const config_lock lock{config_lock::kShared};
    const json record = record_of(require_subnet(id));
    show_record(record, kRecord, as_json);
}

// ---- keys and values --------------------------------------------------------------------------------------------

std::vector<std::string> keys_for(family type) {
    return type == kIPv4 ? std::vector<std::string>{"range", "mask", "router", "domain", "dns", "lease"}
                         : std::vector<std::string>{"mode", "range", "dns", "lease"};
}

[[noreturn]] void bad_usage(const std::string &what) {
    throw failure{kUsage, what + "; see kovanet dhcp-server subnet set --help"};
}

given_keys sorted_keys(const std::vector<std::string> &words, family type) {
    const std::vector<std::string> known = keys_for(type);
    const auto is_key = [&known](const std::string &word) {
        return std::find(known.begin(), known.end(), word) != known.end();
    };
    given_keys keys;
    for (auto word = words.begin(); word != words.end();) {
        const std::string key = *word++;
        if (!is_key(key)) {
            bad_usage("\"" + key + "\" is no key of an IPv" + std::to_string(number_of(type)) + " subnet" +
                      suggestion(key, known));
        }
        const auto values = key == "dns" ? std::find_if(word, words.end(), is_key) - word : key == "range" ? 2 : 1;
        if (keys.contains(key) || values == 0 || words.end() - word < values) {
            bad_usage(keys.contains(key) ? key + " is given twice" : key + " lacks a value");
        }
        keys[key].assign(word, word + values);
        word += values;
    }
    return keys;
}

int lease_of(const std::string &text) {
    constexpr int kShortest = 120; // what the server makes of less
    return static_cast<int>(number_within("lease", text, kShortest, INT_MAX));
}

/** An address as bytes in order, IPv4 in four of them. */
std::vector<unsigned char> bytes_of(const std::string &address, family type) {
    unsigned char bytes[16] = {};
    inet_pton(type == kIPv4 ? AF_INET : AF_INET6, address.c_str(), bytes);
    return {bytes, bytes + (type == kIPv4 ? 4 : 16)};
}

void require_server(const std::string &server, family type) {
    refusal refused = type == kIPv4 ? refuse_address(server) : refuse_ipv6(server);
    if (!refused && server.find('/') != std::string::npos) {
        refused = "a name server has no prefix length";
    }
    require("name server \"" + server + "\"", refused);
}

void take_servers(const std::vector<std::string> &servers, subnet &one) {
    one.servers.clear();
    if (one.id.type == kIPv4 && servers == std::vector<std::string>{kNone}) {
        return;
    }
    for (const std::string &server : servers) {
        require_server(server, one.id.type);
        one.servers.push_back(one.id.type == kIPv4 ? plain_address(server) : server);
    }
}

void take_domain(const std::string &domain, subnet &one) {
    constexpr size_t kLongest = 253;
    require("domain \"" + domain + "\"", refuse_domain(domain));
    if (domain.size() > kLongest) {
        throw failure{kNo, "the domain is not valid: a domain name has at most 253 characters"};
    }
    put(one.conf.domain, domain == kNone ? "" : domain);
}

/** Start and end, whose order is that of their bytes. */
void require_order(const DHCP_TAG_CONF &conf, family type) {
    if (bytes_of(conf.start_ip, type) > bytes_of(conf.end_ip, type)) {
        throw failure{kNo, std::string("range is not valid: ") + conf.end_ip + " comes before " + conf.start_ip};
    }
}

// ---- changing ---------------------------------------------------------------------------------------------------

void take_v4_keys(const given_keys &keys, subnet &one) {
    DHCP_TAG_CONF &conf = one.conf;
    const auto take = [&keys](const char *key, size_t index, auto &text) {
        if (keys.contains(key)) {
            const std::string &value = keys.at(key)[index];
            const bool is_mask = strcmp(key, "mask") == 0;
            require(std::string(key) + " \"" + value + "\"", is_mask ? refuse_mask(value) : refuse_address(value));
            put(text, plain_address(value));
        }
    };
    take("mask", 0, conf.netmask);
    take("range", 0, conf.start_ip);
    take("range", 1, conf.end_ip);
    take("router", 0, conf.router);
    for (const char *address : {conf.start_ip, conf.end_ip, conf.router}) {
        const std::string what = std::string("address \"") + address + "\" with mask \"" + conf.netmask + "\"";
        require(what, refuse_address_and_mask(address, conf.netmask));
        if (KOVANetIsSameSubnet(conf.start_ip, address, conf.netmask) != 1) {
            throw failure{kNo, what + " is not valid: it is not in the subnet of " + conf.start_ip};
        }
    }
    require_order(conf, kIPv4);
    if (keys.contains("domain")) {
        take_domain(keys.at("domain")[0], one);
    }
}

void take_v6_keys(const given_keys &keys, subnet &one) {
    constexpr size_t kPrefixBytes = 8; // the server's prefix length is fixed
    DHCP_TAG_CONF &conf = one.conf;
    if (keys.contains("mode")) {
        put(conf.v6_mode, keys.at("mode")[0]);
    }
    if (strcmp(conf.v6_mode, "stateful") != 0) {
        if (keys.contains("range")) {
            throw failure{kNo, "only a stateful subnet has a range"};
        }
        conf.start_ip[0] = conf.end_ip[0] = '\0';
        return;
    }
    if (keys.contains("range")) {
        for (const std::string &address : keys.at("range")) {
            require("range \"" + address + "\"", address.find('/') == std::string::npos
                                                     ? refuse_ipv6(address)
                                                     : refusal{"its addresses have no prefix length"});
        }
        put(conf.start_ip, keys.at("range")[0]);
        put(conf.end_ip, keys.at("range")[1]);
    }
    if (conf.start_ip[0] == '\0') {
        bad_usage("a stateful subnet needs a range");
    }
    const std::vector<unsigned char> start = bytes_of(conf.start_ip, kIPv6);
    const std::vector<unsigned char> end = bytes_of(conf.end_ip, kIPv6);
    if (!std::equal(start.begin(), start.begin() + kPrefixBytes, end.begin())) {
        throw failure{kNo, "range is not valid: its addresses are not in one network of the length 64"};
    }
    require_order(conf, kIPv6);
}

/** Ends the program when a subnet that cannot keep its values is not told all that it needs. */
void require_needed(const given_keys &keys, const subnet_id &id, presence found) {
    std::vector<std::string> needed = id.type == kIPv4 ? std::vector<std::string>{"range", "mask", "router"}
                                                       : std::vector<std::string>{"mode", "dns"};
    std::erase_if(needed, [&keys](const std::string &key) { return keys.contains(key); });
    if (!needed.empty()) {
        bad_usage((found == presence::absent ? "a new subnet needs " : "the subnet cannot be read and needs ") +
                  CLI::detail::join(needed, ", "));
    }
}

/** Ends the program when the numbers of an interface's subnets would get a gap, behind which the library sees none. */
void require_no_gap(const subnet_id &id) {
    const std::vector<subnet_id> there = subnets_there();
    for (subnet_id before{id.ifname, id.type, 0}; before.number < id.number; ++before.number) {
        if (std::find(there.begin(), there.end(), before) == there.end()) {
            throw failure{kNo, "the subnets of an interface are numbered without a gap, and " + id.ifname +
                                   " has no subnet " + std::to_string(before.number)};
        }
    }
}

void require_no_conflict(const DHCP_TAG_CONF &conf, const std::string &ifname) {
    const std::string other = conflicting_interface(ifname, conf.start_ip, conf.end_ip, conf.netmask);
    if (!other.empty()) {
        throw failure{kNo, "the subnet overlaps one of " + other + "; with --force it is set all the same"};
    }
}

/** The subnet as it is, or a new one that is told all that it needs. */
subnet subnet_to_change(const subnet_id &id, const given_keys &keys) {
    subnet one{id, {}, nullptr, {}};
    const presence found = read_subnet(one);
    if (found == presence::read) {
        require_all_known(one);
        return one;
    }
    require_needed(keys, id, found);
    require_no_gap(id);
    one.conf.lease_time = kDefaultLease;
    return one;
}

void take_keys(const given_keys &keys, subnet &one) {
    if (one.id.type == kIPv4) {
        take_v4_keys(keys, one);
    } else {
        take_v6_keys(keys, one);
    }
    if (keys.contains("dns")) {
        take_servers(keys.at("dns"), one);
    }
    if (keys.contains("lease")) {
        one.conf.lease_time = lease_of(keys.at("lease")[0]);
    }
}

void require_mode(const given_keys &keys) {
    if (keys.contains("mode")) {
        const std::string &mode = keys.at("mode")[0];
        const std::vector<std::string> modes = {"ra-only", "ra-stateless", "stateful"};
        if (std::find(modes.begin(), modes.end(), mode) == modes.end()) {
            bad_usage("mode \"" + mode + "\" is not ra-only, ra-stateless or stateful" + suggestion(mode, modes));
        }
    }
}

void set(const set_words &words) {
    const subnet_id id = words.id();
    const given_keys keys = sorted_keys(words.keys, id.type);
    require_mode(keys);
    require_servable(id.ifname);
    change_server([&] {
        require_interface(id.ifname);
        subnet one = subnet_to_change(id, keys);
        take_keys(keys, one);
        if (id.type == kIPv4 && !words.force && (keys.contains("range") || keys.contains("mask"))) {
            require_no_conflict(one.conf, id.ifname);
        }
        one.conf.enabled = 1;
        write_subnet(one);
    });
}

void switch_off(const subnet_id &id) {
    change_server([&id] {
        const std::vector<subnet_id> there = subnets_there();
        if (std::find(there.begin(), there.end(), id) == there.end()) {
            require_subnet(id); // which says that it is not there
        }
        clear_error();
        if (DHCPTagConfSetEnable(id.ifname.c_str(), id.number, id.type, 0) < 0) {
            call_failed("cannot switch the subnet off");
        }
    });
}

void add_family_word(CLI::App &verb, subnet_words &words) {
    verb.validate_positionals(); // a key may stand in its place
    verb.add_option("4|6", words.family_word, "IPv4, which is meant without it, or IPv6")->check(choice({"4", "6"}));
}

} // namespace

void add_subnet_verbs(CLI::App &object, const global_options &options) {
    auto &words = words_of<set_words>();
    CLI::App &subnets = *object.add_subcommand("subnet", "the subnets that are served");
    subnets.add_subcommand("list", "all subnets, served or not")->callback([&options] { list(options.json); });

    CLI::App &one = *subnets.add_subcommand("show", "everything about one subnet");
    add_subnet_words(one, words);
    add_family_word(one, words);
    one.callback([&words, &options] { show(words.id(), options.json); });

    CLI::App &change = add_change(subnets, "set", "serve a subnet; what is not given stays as it is");
    add_subnet_words(change, words);
    add_family_word(change, words);
    constexpr char kKeys[] =
        "IPv4: range START END, mask MASK, router ADDRESS, domain NAME, dns ADDRESS..., lease SECONDS; "
        "IPv6: mode ra-only|ra-stateless|stateful, range START END, dns ADDRESS..., lease SECONDS";
    add_words(change, "KEYS", words.keys, kKeys);
    change.add_flag("--force", words.force, "also when it overlaps a subnet of another interface");
    change.callback([&words] { set(words); });

    CLI::App &off = add_change(subnets, "off", "serve a subnet no more, and keep its settings");
    add_subnet_words(off, words);
    add_family_word(off, words);
    off.callback([&words] { switch_off(words.id()); });
}

} // namespace kova
