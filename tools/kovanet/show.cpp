// kovanet show: what the network of this machine is now, on one screen.
#include "composition.h"
#include "errors.h"
#include "objects.h"
#include "records.h"
#include "stored.h"

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <functional>
#include <kova/core.h>
#include <kovanetsdk/bridge.h>
#include <kovanetsdk/routing.h>
#include <net/if.h>
#include <set>

namespace kova {
namespace {

// ---- what there is

/** What an interface is and is made of. */
struct composition {
    const char *kind;
    names parts;
    json vlan_id;
    json bond_mode;
};

/** What a VLAN is on: nothing when that is in another namespace, where the name of one here may be its name. */
names lower_of(const VLANINFO &vlan) {
    unsigned lower = 0;
    std::ifstream{std::string("/sys/class/net/") + vlan.szIfname + "/iflink"} >> lower;
    const bool is_here = std::string(vlan.szIfname) != vlan.szRowDevice && lower == if_nametoindex(vlan.szRowDevice);
    return is_here ? names{vlan.szRowDevice} : names{};
}

composition compose(const IFINFO &info) {
    const std::string name = info.szIfname;
    if ((info.nFlags & IFF_LOOPBACK) != 0) {
        return {"loopback", {}, {}, {}};
    }
    if ((info.nFlags & IFF_POINTOPOINT) != 0) {
        return {"point-to-point", {}, {}, {}};
    }
    if (const std::optional<VLANINFO> vlan = find_vlan(name)) {
        return {"vlan", lower_of(*vlan), vlan->vlanId, {}};
    }
    if (const std::optional<KOVALINKAGGROPT> bond = find_bond(name)) {
        const bool is_known = bond->mode != KOVA_LINK_AGGR_UNKNOWN;
        return {"bond", members_of(*bond), {}, is_known ? json(KOVANetLinkAggrModeToString(bond->mode)) : json()};
    }
    if (const std::optional<std::string> original = behind_switch_port(name)) {
        return {"switch-port", {*original}, {}, {}};
    }
    if (KLIBNetBridgeIfIsMaster(name.c_str()) == 1) {
        return {"bridge", ports_of(name), {}, {}};
    }
    return {"card", {}, {}, {}};
}

const char *source_word(const std::string &name) {
    switch (settings_of(name).source) {
    case ipv4_settings::kStatic:
        return "static";
    case ipv4_settings::kDhcp:
        return "dhcp";
    default:
        return "none";
    }
}

/** A row; what the file of the interface cannot tell is null, and its failure is noted. */
json describe(const IFINFO &info, std::vector<failure> &failures) {
    const composition made = compose(info);
    ETHINFO link{};
    const bool has_settings = KOVANetGetEthInfo(&link, info.szIfname) == 0;
    json row;
    row["name"] = info.szIfname;
    row["kind"] = made.kind;
    row["parts"] = made.parts;
    row["vlan_id"] = made.vlan_id;
    row["bond_mode"] = made.bond_mode;
    row["up"] = (info.nFlags & IFF_UP) != 0;
    row["link"] = link_word(info.nLink != 0);
    row["speed_mbps"] = known_number(has_settings ? link.nSpeed : -1, 1);
    row["mtu"] = known_number(KOVAGetMTU(info.szIfname), 1);
    row["mac"] = mac_text(info.abMac);
    try {
        row["source"] = source_word(info.szIfname);
    } catch (const failure &failed) {
        row["source"] = nullptr;
        failures.push_back(failed);
    }
    row["addresses"] = json::array();
    for (const json &address : address_rows(info)) {
        row["addresses"].push_back(
            {{"address", address["address"]}, {"prefix", address["prefix"]}, {"scope", address["scope"]}});
    }
    return row;
}

json interface_records(std::vector<failure> &failures) {
    json rows = json::array();
    for (const IFINFO &info : all_interfaces()) {
        rows.push_back(describe(info, failures));
    }
    return rows;
}

json service_records() {
    const json server = dhcp_server_record();
    json served = json::array();
    for (const json &row : server["interfaces"]) {
        if (row["enabled"] == true) {
            served.push_back(row["interface"].get<std::string>() + "/" + field(row, "family"));
        }
    }
    return {{"dhcp_server", server["service"]},
            {"dhcp_server_interfaces", served},
            {"pppoe", is_pppoe_switched_on()},
            {"tunnel", stored_value("/etc/kova/service/kovatunnel.conf", "run") == "yes"}};
}

/** What can be told; a part that cannot be read is null, and its failure is told at the end. */
struct overview {
    json record;
    std::vector<failure> failures;

    void add(const char *name, const std::function<json()> &read) {
        try {
            record[name] = read();
        } catch (const failure &failed) {
            record[name] = nullptr;
            failures.push_back(failed);
        }
    }
};

overview look() {
    overview all;
    all.add("hostname", [] { return hostname_record()["name"]; });
    all.add("gateway", gateway_record);
    all.add("dns", dns_record);
    all.add("services", service_records);
    all.add("interfaces", [&all] { return interface_records(all.failures); });
    return all;
}

// ---- the screen

constexpr char kUnknown[] = "cannot be read";

std::string gateway_text(const json &record) {
    const json &gateway = record["gateway"];
    if (gateway.is_null()) {
        return kUnknown;
    }
    return gateway["gateway"].is_null() ? "none" : field(gateway, "gateway") + " on " + field(gateway, "interface");
}

std::string dns_text(const json &record) {
    const json &dns = record["dns"];
    if (dns.is_null()) {
        return kUnknown;
    }
    return (dns["servers"].empty() ? "none" : words_field(dns, "servers")) + " (" + field(dns, "mode") + ")";
}

std::string services_text(const json &record) {
    const json &services = record["services"];
    if (services.is_null()) {
        return kUnknown;
    }
    const bool serves = services["dhcp_server"] == true;
    return std::string("dhcp-server ") +
           (serves ? "on (" + words_field(services, "dhcp_server_interfaces") + ")" : "off") + ", pppoe " +
           (services["pppoe"] == true ? "on" : "off") + ", tunnel " + (services["tunnel"] == true ? "on" : "off");
}

constexpr column kMachine[] = {
    {"host name", [](const json &record) { return field(record, "hostname"); }},
    {"gateway", gateway_text},
    {"DNS", dns_text},
    {"services", services_text},
};

std::string role_text(const json &row) {
    return field(row, "kind") + (row["vlan_id"].is_null() ? "" : " " + field(row, "vlan_id")) +
           (row["bond_mode"].is_null() ? "" : " " + field(row, "bond_mode"));
}

/** Those that are of use beyond the link. */
std::string addresses_text(const json &row) {
    std::string line;
    for (const json &address : row["addresses"]) {
        if (address["scope"] != "link") {
            line += (line.empty() ? "" : " ") + field(address, "address") + "/" + field(address, "prefix");
        }
    }
    return line.empty() ? "-" : line;
}

constexpr column kInterfaces[] = {
    {"INTERFACE", [](const json &row) { return field(row, "branch") + field(row, "name"); }},
    {"ROLE", role_text},
    {"STATE", up_field},
    {"LINK", [](const json &row) { return field(row, "link"); }},
    {"SPEED", [](const json &row) { return field(row, "speed_mbps"); }, true},
    {"SOURCE", [](const json &row) { return field(row, "source"); }},
    {"ADDRESSES", addresses_text},
};

/** The interfaces as rows of a tree: below each what it is made of. */
class interface_tree {
public:
    explicit interface_tree(const json &interfaces) {
        std::set<std::string> parts;
        for (const json &row : interfaces) {
            by_name_[row["name"]] = row;
            parts.insert(row["parts"].begin(), row["parts"].end());
        }
        for (const json &row : interfaces) {
            if (row["kind"] != "loopback" && !parts.contains(row["name"])) {
                add(row, "", "");
            }
        }
        for (const json &row : interfaces) { // whatever is said of their parts, none is left out
            if (row["kind"] != "loopback" && !added_.contains(row["name"])) {
                add(row, "", "");
            }
        }
    }
    [[nodiscard]] const json &rows() const { return rows_; }

private:
    void add(json row, const std::string &branch, const std::string &below) {
        const std::string name = row["name"];
        added_.insert(name);
        path_.push_back(name);
        names parts;
        for (const std::string part : row["parts"]) {
            const bool is_above = std::find(path_.begin(), path_.end(), part) != path_.end();
            if (by_name_.contains(part) && !is_above) { // neither in another namespace nor without an end
                parts.push_back(part);
            }
        }
        row["branch"] = branch;
        rows_.push_back(std::move(row));
        for (size_t i = 0; i < parts.size(); ++i) {
            const bool is_last = i + 1 == parts.size();
            add(by_name_[parts[i]], below + (is_last ? "`-" : "|-"), below + (is_last ? "  " : "| "));
        }
        path_.pop_back();
    }

    std::map<std::string, json> by_name_;
    std::set<std::string> added_;
    names path_; // from the root to what is added
    json rows_ = json::array();
};

void show(bool as_json) {
    const config_lock lock{config_lock::kShared}; // one view of the kernel and all files
    const overview all = look();
    if (as_json) {
        print_json(all.record);
    } else {
        print_record(all.record, kMachine);
        if (!all.record["interfaces"].is_null()) {
            putchar('\n');
            print_table(interface_tree{all.record["interfaces"]}.rows(), kInterfaces);
        }
    }
    for (const failure &failed : all.failures) {
        throw failed; // the first one is enough to look at
    }
}

} // namespace

void add_show(CLI::App &object, const global_options &options) {
    object.callback([&options] { show(options.json); });
}

} // namespace kova
