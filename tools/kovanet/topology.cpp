// kovanet topology: what the interfaces of the appliance are used for.
#include "composition.h"
#include "errors.h"
#include "objects.h"
#include "words.h"

#include <cstdio>
#include <kovanetsdk/bridge.h>
#include <kovanetsdk/stats.h>

namespace kova {
namespace {

const std::vector<std::string> &topology_names() {
    static const std::vector<std::string> names{gTopologyInfo[KLIB_TOPOLOGY_CLIENT].szName,
                                                gTopologyInfo[KLIB_TOPOLOGY_BRIDGE].szName,
                                                gTopologyInfo[KLIB_TOPOLOGY_ROUTER].szName};
    return names;
}

int number_of(const std::string &name) {
    int number = KLIB_TOPOLOGY_CLIENT;
    while (name != gTopologyInfo[number].szName) {
        ++number;
    }
    return number;
}

/** A topology, KLIB_TOPOLOGY_UNKNOWN for the current one; nothing on a model without the choice. */
std::optional<TOPOLOGYINFO> find_topology(int number) {
    constexpr int kUntouched = -1;
    TOPOLOGYINFO info{};
    info.nTopology = number == KLIB_TOPOLOGY_UNKNOWN ? kUntouched : number;
    const int found = KLIBNetTopologyGet(&info);
    return found == info.nTopology ? std::optional{info} : std::nullopt;
}

/** The interfaces and the part that each has. */
json roles_of(const TOPOLOGYINFO &info) {
    json roles = json::array();
    for (const BRIDGEINFO &part : grgTopologyIFInfo[info.nIFInfoRow]) {
        if (*part.szIfname == '\0') {
            break;
        }
        roles.push_back({{"name", part.szIfname}, {"role", role_word(part.nType)}, {"peer", known_text(part.szPeer)}});
    }
    return roles;
}

json describe(const std::optional<TOPOLOGYINFO> &info) {
    json record;
    record["supported"] = info.has_value();
    record["topology"] = info ? json(info->szName) : json();
    record["interface"] = info ? json(info->szIfname) : json();
    record["client"] = info ? json(info->blClient == 1) : json();
    record["interfaces"] = info ? roles_of(*info) : json::array();
    return record;
}

constexpr column kColumns[] = {
    {"topology", [](const json &row) { return field(row, "topology"); }},
    {"address on", [](const json &row) { return field(row, "interface"); }},
};

constexpr column kRoleColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"ROLE", [](const json &row) { return field(row, "role"); }},
    {"PEER", [](const json &row) { return field(row, "peer"); }},
};

void show(const std::optional<std::string> &name, bool as_json) {
    const json record = describe(find_topology(name ? number_of(*name) : KLIB_TOPOLOGY_UNKNOWN));
    if (as_json) {
        print_json(record);
    } else if (record["supported"] == false) {
        puts("this model has no choice of topologies");
    } else {
        print_record(record, kColumns);
        putchar('\n');
        print_table(record["interfaces"], kRoleColumns);
    }
}

void set(const std::string &name) {
    require_root();
    const std::optional<TOPOLOGYINFO> wanted = find_topology(number_of(name));
    if (!wanted) {
        throw failure{kNo, "this model has no choice of topologies"};
    }
    const change_lock lock;
    clear_error();
    if (KLIBNETSetTopologyConfigs(&*wanted) < 0) {
        call_failed("cannot store the topology " + name);
    }
}

struct topology_words {
    std::optional<std::string> shown;
    std::string name;
};

} // namespace

void add_topology(CLI::App &object, const global_options &options) {
    auto &words = words_of<topology_words>();
    CLI::App &one = *object.add_subcommand("show", "the current topology, or what another one is");
    one.add_option("TOPOLOGY", words.shown, "client, bridge or router")->check(choice(topology_names()));
    one.callback([&words, &options] { show(words.shown, options.json); });

    CLI::App &change = *object.add_subcommand("set", "store another topology; the interfaces stay as they are");
    change.add_option("TOPOLOGY", words.name, "client, bridge or router")->required()->check(choice(topology_names()));
    change.callback([&words] { set(words.name); });
}

} // namespace kova
