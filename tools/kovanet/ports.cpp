// kovanet ports: which ports of this machine are in use.
#include "errors.h"
#include "objects.h"
#include "table.h"
#include "words.h"

#include <algorithm>
#include <cstdio>
#include <kovanetsdk/addr.h>
#include <vector>

namespace kova {
namespace {

constexpr int kHighestPort = 65535;

struct protocol {
    const char *name;
    int number; /**< the library's */
};
constexpr protocol kProtocols[] = {{"tcp", 1}, {"udp", 2}};

struct ports_words {
    std::optional<std::string> protocol;
    std::optional<std::string> low;
    std::optional<std::string> high;
};

int port_of(const std::optional<std::string> &word, int otherwise) {
    return word ? static_cast<int>(number_within("port", *word, 0, kHighestPort)) : otherwise;
}

constexpr column kColumns[] = {
    {"PROTOCOL", [](const json &row) { return field(row, "protocol"); }},
    {"PORT", [](const json &row) { return field(row, "port"); }, true},
};

void require_order(int low, int high) {
    if (low > high) {
        throw failure{kNo,
                      "the lowest port, " + std::to_string(low) + ", is above the highest, " + std::to_string(high)};
    }
}

std::vector<int> listening_ports(const protocol &asked, int low, int high) {
    std::vector<int> ports(kHighestPort + 1);
    int count = static_cast<int>(ports.size());
    clear_error();
    if (KOVANetGetPortUsedInRange(ports.data(), &count, low, high, asked.number) < 0) {
        call_failed("cannot list the ports");
    }
    ports.resize(static_cast<size_t>(count));
    std::sort(ports.begin(), ports.end());
    return ports;
}

void list(const ports_words &words, bool as_json) {
    const int low = port_of(words.low, 0);
    const int high = port_of(words.high, kHighestPort);
    require_order(low, high);
    json rows = json::array();
    for (const protocol &each : kProtocols) {
        if (words.protocol && *words.protocol != each.name) {
            continue;
        }
        for (const int port : listening_ports(each, low, high)) {
            rows.push_back({{"protocol", each.name}, {"port", port}});
        }
    }
    show_table(rows, kColumns, as_json);
}

void tell_whether_used(const ports_words &words, bool as_json) {
    const int low = port_of(words.low, 0);
    const int high = port_of(words.high, low);
    require_order(low, high);
    const auto &asked = *std::find_if(std::begin(kProtocols), std::end(kProtocols),
                                      [&](const protocol &each) { return *words.protocol == each.name; });
    const bool is_used = KOVANetIsPortRangeUsed(low, high, asked.number) == 1;
    if (as_json) {
        print_json({{"protocol", asked.name}, {"low", low}, {"high", high}, {"used", is_used}});
    } else if (low == high) {
        printf("%s port %d is %s\n", asked.name, high, is_used ? "used" : "free");
    } else {
        printf("%s %s port from %d to %d is used\n", is_used ? "a" : "no", asked.name, low, high);
    }
    if (!is_used) {
        throw failure{kNo, ""}; // the answer is the output
    }
}

void add_range(CLI::App &verb, ports_words &words, bool is_required) {
    verb.add_option("LOW", words.low, "lowest port, 0 to 65535")->required(is_required);
    verb.add_option("HIGH", words.high, "highest port");
}

} // namespace

void add_ports(CLI::App &object, const global_options &options) {
    auto &words = words_of<ports_words>();
    const CLI::Validator protocols = choice({"tcp", "udp"});
    CLI::App &listed = *object.add_subcommand("list", "the ports at which this machine listens");
    listed.add_option("tcp|udp", words.protocol, "protocol, both if left out")->check(protocols);
    add_range(listed, words, false);
    listed.callback([&words, &options] { list(words, options.json); });

    CLI::App &used =
        *object.add_subcommand("used", "whether a port, or one of a range, is in use, listening or connected");
    used.add_option("tcp|udp", words.protocol, "protocol")->required()->check(protocols);
    add_range(used, words, true);
    used.callback([&words, &options] { tell_whether_used(words, options.json); });
}

} // namespace kova
