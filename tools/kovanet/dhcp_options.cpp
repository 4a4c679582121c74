#include "dhcp_options.h"

#include "errors.h"
#include "words.h"

#include <algorithm>
#include <charconv>

namespace kova {
namespace {

constexpr option_kind kOptions[] = {
    {7, "log-server", option_rule::addresses},
    {9, "lpr-server", option_rule::addresses},
    {13, "boot-file-size", option_rule::number, 0, 65536},
    {16, "swap-server", option_rule::address},
    {17, "root-path", option_rule::text},
    {18, "extension-path", option_rule::text},
    {19, "ip-forward-enable", option_rule::number, 0, 1},
    {20, "non-local-source-routing", option_rule::number, 0, 1},
    {21, "policy-filter", option_rule::addresses_and_masks},
    {22, "max-datagram-reassembly", option_rule::number, 576, 65536},
    {23, "default-ttl", option_rule::number, 1, 255},
    {26, "mtu", option_rule::number, 68, 65536},
    {27, "all-subnets-local", option_rule::number, 0, 1},
    {31, "router-discovery", option_rule::number, 0, 1},
    {32, "router-solicitation", option_rule::address},
    {34, "trailer-encapsulation", option_rule::number, 0, 1},
    {35, "arp-timeout", option_rule::number, 0, UINT64_MAX},
    {36, "ethernet-encap", option_rule::number, 0, 1},
    {37, "tcp-ttl", option_rule::number, 1, 255},
    {38, "tcp-keepalive", option_rule::number, 0, UINT64_MAX},
    {40, "nis-domain", option_rule::text},
    {41, "nis-server", option_rule::addresses},
    {42, "ntp-server", option_rule::addresses},
    {44, "netbios-ns", option_rule::addresses},
    {45, "netbios-dd", option_rule::addresses},
    {46, "netbios-nodetype", option_rule::node_type},
    {47, "netbios-scope", option_rule::text},
    {48, "x-windows-fs", option_rule::addresses},
    {49, "x-windows-dm", option_rule::addresses},
    {58, "T1", option_rule::number, 0, UINT64_MAX},
    {59, "T2", option_rule::number, 0, UINT64_MAX},
    {64, "nis+-domain", option_rule::text},
    {65, "nis+-server", option_rule::addresses},
    {68, "mobile-ip-home", option_rule::addresses},
    {69, "smtp-server", option_rule::addresses},
    {70, "pop3-server", option_rule::addresses},
    {71, "nntp-server", option_rule::addresses},
    {74, "irc-server", option_rule::addresses},
    {120, "sip-server", option_rule::addresses},
    {121, "classless-static-route", option_rule::routes},
};

bool is_number(const std::string &text, uint64_t low, uint64_t high) {
    uint64_t value = 0;
    const char *const end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, value);
    return error == std::errc{} && stop == end && value >= low && value <= high;
}

refusal refuse_destination(const std::string &text) {
    constexpr uint64_t kLongestPrefix = 32;
    const size_t slash = text.find('/');
    if (slash == std::string::npos || !is_number(text.substr(slash + 1), 0, kLongestPrefix)) {
        return "a destination is an address, \"/\" and a length from 0 to 32";
    }
    return refuse_address(text.substr(0, slash));
}

/** One of the values: what it breaks beside the rule of its option, perhaps nothing more. */
refusal refuse_value(const option_kind &kind, const std::string &value, bool is_second) {
    switch (kind.rule) {
    case option_rule::number:
        return is_number(value, kind.low, kind.high) ? std::nullopt : refusal{""};
    case option_rule::node_type:
        return value == "1" || value == "2" || value == "4" || value == "8" ? std::nullopt : refusal{""};
    case option_rule::text:
        return refuse_server_text(value);
    case option_rule::addresses_and_masks:
        return is_second ? refuse_mask(value) : refuse_address(value);
    case option_rule::routes:
        return is_second ? refuse_address(value) : refuse_destination(value);
    default:
        return refuse_address(value);
    }
}

/** A value without the octal and hexadecimal parts that the server does not take. */
std::string plain_value(const option_kind &kind, const std::string &value) {
    if (kind.rule < option_rule::address) {
        return value;
    }
    const size_t slash = std::min(value.find('/'), value.size());
    return plain_address(value.substr(0, slash)) + value.substr(slash);
}

bool is_pairs(const option_kind &kind) {
    return kind.rule == option_rule::addresses_and_masks || kind.rule == option_rule::routes;
}

} // namespace

const option_kind &require_option(const std::string &name) {
    std::vector<std::string> names;
    for (const option_kind &kind : kOptions) {
        if (name == kind.name || name == std::to_string(kind.number)) {
            return kind;
        }
        names.emplace_back(kind.name);
    }
    throw failure{kNo, "no option that can be set is called \"" + name + "\"" + suggestion(name, names)};
}

std::string takes(const option_kind &kind) {
    switch (kind.rule) {
    case option_rule::number:
        return kind.high == 1 ? "0 or 1"
                              : "a number from " + std::to_string(kind.low) + " to " + std::to_string(kind.high);
    case option_rule::node_type:
        return "1, 2, 4 or 8";
    case option_rule::text:
        return "one text";
    case option_rule::address:
        return "one IPv4 address";
    case option_rule::addresses:
        return "one or more IPv4 addresses";
    case option_rule::addresses_and_masks:
        return "pairs of an IPv4 address and a mask";
    default:
        return "pairs of a destination such as 10.1.0.0/16 and the IPv4 address of its gateway";
    }
}

std::vector<std::string> require_values(const option_kind &kind, const std::vector<std::string> &values) {
    const std::string rule = std::string("option ") + kind.name + " takes " + takes(kind);
    const bool is_list = kind.rule >= option_rule::addresses;
    if (values.empty() || (!is_list && values.size() > 1)) {
        throw failure{kNo, rule + ", not " + std::to_string(values.size()) + " values"};
    }
    if (is_pairs(kind) && values.size() % 2 != 0) {
        throw failure{kNo, rule + ": \"" + values.back() + "\" is alone"};
    }
    std::vector<std::string> plain;
    for (const std::string &value : values) {
        if (const refusal refused = refuse_value(kind, value, plain.size() % 2 != 0)) {
            const std::string more = refused->empty() ? "" : ": " + *refused;
            throw failure{kNo, std::string(rule).append(", not \"").append(value).append("\"").append(more)};
        }
        plain.push_back(plain_value(kind, value));
    }
    return plain;
}

} // namespace kova
