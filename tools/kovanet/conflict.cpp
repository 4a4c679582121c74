// kovanet conflict: whether an address is somebody else's already.
#include "composition.h"
#include "errors.h"
#include "objects.h"

#include <cstdio>
#include <kovanetsdk/addr.h>
#include <kovanetsdk/link.h>
#include <net/if.h>

namespace kova {
namespace {

struct conflict_words {
    std::string name;
    std::string address;
};

/** Tells the answer, as the exit code too. */
void answer(const json &record, const std::string &text, bool as_json) {
    if (as_json) {
        print_json(record);
    } else {
        printf("%s\n", printable(text).c_str());
    }
    if (record["conflict"]) {
        throw failure{kNo, ""}; // the answer is the output
    }
}

void check_address(const conflict_words &words, bool as_json) {
    if (KOVANetGetAddrType(words.address.c_str()) == 0) {
        throw failure{kNo, "address \"" + words.address + "\" is not valid: it is no IPv4 or IPv6 address"};
    }
    require_interface(words.name);
    int found = 0;
    {
        const step_note note{"asking for " + words.address + ", this takes up to two seconds"};
        clear_error();
        found = KOVAIIpConflict(words.name.c_str(), words.address.c_str());
    }
    if (found < 0) {
        call_failed("cannot ask for " + words.address);
    }
    answer({{"interface", words.name}, {"address", words.address}, {"conflict", found == 1}},
           found == 1 ? "another host has " + words.address : "no other host answers at " + words.address, as_json);
}

/** The members of a bond but for the first, from which it has its address. Ends the program for what is no bond. */
std::vector<std::string> later_members_of(const std::string &bond) {
    const KOVALINKAGGROPT record = find_bond(bond).value_or(KOVALINKAGGROPT{});
    if (record.cSlaves == 0) {
        throw failure{kNotFound, bond + " is no bond with members; see kovanet bond list"};
    }
    return {record.aszSlaves + 1, record.aszSlaves + record.cSlaves};
}

std::string alternatives(const std::vector<std::string> &names) {
    std::string text;
    for (const std::string &name : names) {
        text += (text.empty() ? "" : " or ") + name;
    }
    return text;
}

void check_bond(const std::string &bond, bool as_json) {
    require_interface(bond);
    std::vector<std::string> members = later_members_of(bond);
    char beginning[IFNAMSIZ] = ""; // of the member's name: its first four characters
    clear_error();
    const int found = KOVANetBondIPConflict(bond.c_str(), beginning, sizeof beginning);
    if (found < 0) {
        call_failed("cannot compare the addresses of " + bond + " and its members");
    }
    std::erase_if(members, [&](const std::string &name) { return found == 0 || !name.starts_with(beginning); });
    answer({{"bond", bond}, {"conflict", found == 1}, {"members", members}},
           found == 1 ? alternatives(members) + " is configured with the address of " + bond
                      : "no other member of " + bond + " is configured with its address",
           as_json);
}

} // namespace

void add_conflict(CLI::App &object, const global_options &options) {
    auto &words = words_of<conflict_words>();
    CLI::App &address = *object.add_subcommand("address", "whether another host answers at an address");
    address.add_option("IF", words.name, "interface; its own address is no conflict")->required();
    address.add_option("ADDRESS", words.address, "IPv4 or IPv6 address")->required();
    address.callback([&words, &options] { check_address(words, options.json); });

    CLI::App &bond = *object.add_subcommand("bond", "whether a member of a bond is configured with its address");
    bond.add_option("BOND", words.name, "interface name of the bond")->required();
    bond.callback([&words, &options] { check_bond(words.name, options.json); });
}

} // namespace kova
