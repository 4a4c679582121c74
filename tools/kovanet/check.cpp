// kovanet check: whether the appliance takes a value. Changes nothing.
#include "errors.h"
#include "objects.h"
#include "rules.h"
#include "table.h"
#include "words.h"

#include <cstdio>

namespace kova {
namespace {

struct check_words {
    std::string value;
    std::string keyword;
    std::optional<std::string> mask;
};

/** Tells the answer, as the exit code too. @param meaning what a valid value stands for, if there is more to tell */
void answer(json record, const std::string &value, const refusal &refused, bool as_json,
            const std::string &meaning = "") {
    record["valid"] = !refused;
    record["reason"] = refused ? json(*refused) : json();
    if (as_json) {
        print_json(record);
    } else {
        const std::string &reason = refused ? *refused : meaning;
        printf("%s is %s%s%s\n", value.empty() ? "\"\"" : printable(value).c_str(), refused ? "not valid" : "valid",
               reason.empty() ? "" : ": ", reason.c_str());
    }
    if (refused) {
        throw failure{kNo, ""}; // the answer is the output
    }
}

void check_plain(const char *kind, const std::string &value, refusal (*refuse)(const std::string &), bool as_json) {
    answer({{"kind", kind}, {"value", value}}, value, refuse(value), as_json);
}

void check_address(const check_words &words, bool as_json) {
    if (!words.mask) {
        check_plain("address", words.value, refuse_address, as_json);
        return;
    }
    answer({{"kind", "address"}, {"value", words.value}, {"mask", *words.mask}},
           words.value + " with mask " + *words.mask, refuse_address_and_mask(words.value, *words.mask), as_json);
}

void check_prefix(const std::string &value, bool as_json) {
    json record = {{"kind", "prefix"}, {"value", value}};
    const refusal refused = refuse_prefix(value);
    const network named = refused ? network{} : network_of(value);
    record["network"] = refused ? json() : json(named.address);
    record["mask"] = refused ? json() : json(named.mask);
    answer(record, value, refused, as_json, "network " + named.address + ", mask " + named.mask);
}

/** A verb with one value and a rule. */
void add_plain(CLI::App &object, const global_options &options, const char *kind, const char *description,
               const char *value_name, refusal (*refuse)(const std::string &)) {
    auto &words = words_of<check_words>();
    CLI::App &verb = *object.add_subcommand(kind, description);
    verb.add_option(value_name, words.value)->required();
    verb.callback([&words, &options, kind, refuse] { check_plain(kind, words.value, refuse, options.json); });
}

} // namespace

void add_check(CLI::App &object, const global_options &options) {
    auto &words = words_of<check_words>();
    CLI::App &address = *object.add_subcommand("address", "an IPv4 address of a host, alone or with its mask");
    address.add_option("ADDRESS", words.value)->required();
    add_keyword(address, "mask", words.keyword, "MASK", words.mask, "dotted mask");
    address.callback([&words, &options] { check_address(words, options.json); });

    add_plain(object, options, "mask", "an IPv4 mask", "MASK", refuse_mask);
    CLI::App &prefix = *object.add_subcommand("prefix", "an IPv4 network");
    prefix.add_option("ADDRESS/LENGTH", words.value)->required();
    prefix.callback([&words, &options] { check_prefix(words.value, options.json); });
    add_plain(object, options, "ipv6", "an IPv6 address, alone or with its prefix length", "ADDRESS[/LENGTH]",
              refuse_ipv6);
    add_plain(object, options, "hostname", "a host name", "NAME", refuse_hostname);
    add_plain(object, options, "domain", "a domain name", "NAME", refuse_domain);
}

} // namespace kova
