// kovanet verify: whether the kernel's network is what the configuration files say.
#include "composition.h"
#include "errors.h"
#include "objects.h"
#include "records.h"

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <kova/core.h>
#include <kovanetsdk/bridge.h>
#include <kovanetsdk/routing.h>
#include <net/if.h>

namespace kova {
namespace {

constexpr char kScripts[] = "/etc/sysconfig/network-scripts";
constexpr char kKovaInfo[] = "/etc/kovainfo.conf";
constexpr char kNetwork[] = "/etc/sysconfig/network";
constexpr char kNothing[] = "none";

/** The value of a key, "" without it or without the file. Ends the program when it cannot be read. */
std::string value_of(const std::string &file, const std::string &key) {
    char value[1024] = "";
    clear_error();
    if (KLIBCFileExist(file.c_str()) == 1 &&
        KLIBCFileGetKeyValue(file.c_str(), key.c_str(), value, sizeof value, 0) < 0) {
        call_failed("cannot read " + key + " of " + file);
    }
    return value;
}

std::string or_nothing(const std::string &text) {
    return text.empty() ? kNothing : text;
}

/** What files want and what there is, setting by setting. */
class comparison {
public:
    /** An empty value of either side is none. */
    void add(const std::string &file, const std::string &key, const std::string &wanted, const std::string &actual) {
        ++settings_;
        if (wanted != actual) {
            differences_.push_back(
                {{"file", file}, {"key", key}, {"wanted", or_nothing(wanted)}, {"actual", or_nothing(actual)}});
        }
    }
    [[nodiscard]] int settings() const { return settings_; }
    [[nodiscard]] const json &differences() const { return differences_; }

private:
    int settings_ = 0;
    json differences_ = json::array();
};

// ---- one interface

/** Bonds and bridges of the kernel, by what belongs to them. */
struct owners {
    std::map<std::string, std::string> bonds;
    std::map<std::string, std::string> bridges;
};

owners owners_in_kernel() {
    owners all;
    for (const IFINFO &info : all_interfaces()) {
        const std::optional<KOVALINKAGGROPT> bond = find_bond(info.szIfname);
        if (bond && !is_switch_bond(info.szIfname)) {
            for (const std::string &member : members_of(*bond)) {
                all.bonds[member] = info.szIfname;
            }
        }
        for (const std::string &port : ports_of(info.szIfname)) {
            all.bridges[port] = info.szIfname;
        }
    }
    return all;
}

std::string owner_of(const std::map<std::string, std::string> &all, const std::string &name) {
    const auto found = all.find(name);
    return found == all.end() ? "" : found->second;
}

/** The settings of one interface's file against the kernel. */
class interface_comparison {
public:
    interface_comparison(comparison &result, const IFINFO &info)
        : result_(result), info_(info), name_(info.szIfname), file_(file_of(name_)) {}

    static std::string file_of(const std::string &name) { return std::string(kScripts) + "/ifcfg-" + name; }

    void compare(const owners &all) {
        result_.add(file_, "ONBOOT", "up", (info_.nFlags & IFF_UP) != 0 ? "up" : "down");
        const std::string bond = value_of(file_, "MASTER");
        const std::string bridge = value_of(file_, "BRIDGE");
        result_.add(file_, "MASTER", bond, owner_of(all.bonds, name_));
        result_.add(file_, "BRIDGE", bridge, owner_of(all.bridges, name_));
        compare_kind();
        compare_mtu();
        if (bond.empty() && bridge.empty()) { // a part of another has no addresses of its own
            compare_ipv4();
            compare_ipv6();
        }
    }

private:
    void compare_kind() {
        const VLANINFO vlan = find_vlan(name_).value_or(VLANINFO{});
        result_.add(file_, "VLAN_ROW_DEVICE", value_of(file_, "VLAN_ROW_DEVICE"), vlan.szRowDevice);
        result_.add(file_, "VLAN_ID", value_of(file_, "VLAN_ID"), vlan.vlanId > 0 ? std::to_string(vlan.vlanId) : "");
        const std::string options = value_of(file_, "BONDING_OPTS");
        if (!options.empty()) {
            const std::optional<KOVALINKAGGROPT> bond = find_bond(name_);
            result_.add(file_, "BONDING_OPTS", mode_in(options), bond ? KOVANetLinkAggrModeToString(bond->mode) : "");
        }
        const bool is_bridge = KLIBNetBridgeIfIsMaster(name_.c_str()) == 1;
        result_.add(file_, "TYPE", value_of(file_, "TYPE") == "bridge" ? "bridge" : "", is_bridge ? "bridge" : "");
    }

    /** The name of the mode that the options of a bond name by its number. */
    static std::string mode_in(const std::string &options) {
        const size_t at = options.find("mode=");
        const std::string number =
            at == std::string::npos ? "" : options.substr(at + 5, options.find(' ', at) - at - 5);
        const auto *const found = std::find_if(std::begin(grgBondDesc), std::end(grgBondDesc), [&](const auto &known) {
            return !number.empty() && number == known.szKernelMode;
        });
        return found == std::end(grgBondDesc) ? options : found->szName;
    }

    void compare_mtu() {
        const std::string wanted = value_of(kKovaInfo, name_ + "_mtu");
        if (!wanted.empty()) {
            const int mtu = KOVAGetMTUSetting(name_.c_str());
            result_.add(kKovaInfo, name_ + "_mtu", wanted, mtu > 0 ? std::to_string(mtu) : "");
        }
    }

    void compare_ipv4() {
        const ipv4_settings settings = settings_of(name_);
        if (settings.source == ipv4_settings::kStatic) {
            result_.add(file_, "IPADDR", settings.fixed.address, info_.szIP);
            result_.add(file_, "NETMASK", settings.fixed.mask, *info_.szIP != '\0' ? info_.szMask : "");
        } else if (settings.source == ipv4_settings::kDhcp) {
            const std::string lease = "/etc/dhclient/ipv4/dhcpcd-" + name_ + ".info";
            const std::string leased = value_of(lease, "IPADDR");
            result_.add(leased.empty() ? file_ : lease, leased.empty() ? "BOOTPROTO" : "IPADDR",
                        leased.empty() ? "dhcp" : leased, leased.empty() ? "no lease" : info_.szIP);
        } else {
            result_.add(file_, "BOOTPROTO", "", info_.szIP);
        }
    }

    void compare_ipv6() {
        const std::string kernel = "/proc/sys/net/ipv6/conf/" + name_;
        const std::string mode = value_of(file_, "IPV6INIT");
        if (mode.empty() || KLIBCFileExist((kernel + "/disable_ipv6").c_str()) != 1) {
            return;
        }
        result_.add(file_, "IPV6INIT", mode == "off" ? "off" : "on",
                    number_in(kernel + "/disable_ipv6") != 0 ? "off" : "on");
        if (const std::string wanted = value_of(file_, "IPV6_ACCEPT_RA"); !wanted.empty() && mode != "off") {
            result_.add(file_, "IPV6_ACCEPT_RA", wanted == "0" ? "0" : "1",
                        number_in(kernel + "/accept_ra") == 0 ? "0" : "1");
        }
        if (mode == "static") {
            const std::string address = value_of(file_, "IPV6ADDR");
            const std::string prefix = value_of(file_, "IPV6PREFIXLENG");
            result_.add(file_, "IPV6ADDR", address + "/" + prefix, ipv6_like(address, prefix));
        }
    }

    /** The wanted address when the interface has it, else those it has, without the link's. */
    std::string ipv6_like(const std::string &address, const std::string &prefix) {
        std::string others;
        for (const json &row : address_rows(info_)) {
            if (row["family"] == 6 && row["scope"] != "link") {
                const std::string one = field(row, "address") + "/" + field(row, "prefix");
                if (is_same_ipv6(field(row, "address"), address) && field(row, "prefix") == prefix) {
                    return address + "/" + prefix;
                }
                others += (others.empty() ? "" : " ") + one;
            }
        }
        return others;
    }

    static int number_in(const std::string &path) {
        FILE *const file = fopen(path.c_str(), "re");
        int number = 0;
        if (file == nullptr || fscanf(file, "%d", &number) != 1) {
            number = 0;
        }
        if (file != nullptr) {
            fclose(file);
        }
        return number;
    }

    comparison &result_;
    const IFINFO &info_;
    std::string name_;
    std::string file_;
};

// ---- all of it

/** Interfaces that a start of the system brings up, by their files. */
std::vector<std::string> configured_interfaces() {
    constexpr std::string_view kPrefix = "ifcfg-";
    std::vector<std::string> all;
    std::error_code failed;
    for (const auto &entry : std::filesystem::directory_iterator(kScripts, failed)) {
        const std::string file = entry.path().filename();
        const std::string name = file.starts_with(kPrefix) ? file.substr(kPrefix.size()) : "";
        const bool is_copy = name.find(".tmp") != std::string::npos || name.ends_with(".saved") ||
                             name.ends_with(".bak") || name.ends_with('~');
        if (!name.empty() && !is_copy && !refuse_interface_name(name) && value_of(entry.path(), "ONBOOT") == "yes") {
            all.push_back(name);
        }
    }
    if (failed) {
        throw failure{kCallFailed, std::string("cannot read ") + kScripts + ": " + failed.message()};
    }
    std::sort(all.begin(), all.end());
    return all;
}

void compare_interfaces(comparison &result) {
    const owners all = owners_in_kernel();
    for (const std::string &name : configured_interfaces()) {
        if (const std::optional<IFINFO> info = find_interface(name)) {
            interface_comparison{result, *info}.compare(all);
        } else {
            result.add(interface_comparison::file_of(name), "DEVICE", name, "");
        }
    }
}

void compare_machine(comparison &result) {
    const json gateway = gateway_record();
    if (!gateway["configured_gateway"].is_null()) { // without one the lease's router is used
        result.add(kNetwork, "GATEWAY", gateway["configured_gateway"],
                   gateway["gateway"].is_null() ? "" : gateway["gateway"].get<std::string>());
    }
    const json dns = dns_record();
    if (dns["mode"] == "static") {
        result.add("/etc/resolv.conf", "nameserver", words_field(dns, "configured_servers"),
                   words_field(dns, "servers"));
    }
}

constexpr column kColumns[] = {
    {"FILE", [](const json &row) { return field(row, "file"); }},
    {"KEY", [](const json &row) { return field(row, "key"); }},
    {"WANTED", [](const json &row) { return field(row, "wanted"); }},
    {"ACTUAL", [](const json &row) { return field(row, "actual"); }},
};

void verify(bool as_json) {
    comparison result;
    {
        const config_lock lock{config_lock::kShared}; // no change is half done meanwhile
        compare_interfaces(result);
        compare_machine(result);
    }
    const json &differences = result.differences();
    if (as_json) {
        print_json({{"agree", differences.empty()}, {"settings", result.settings()}, {"differences", differences}});
    } else if (differences.empty()) {
        printf("the kernel agrees with the files in all %d settings\n", result.settings());
    } else {
        print_table(differences, kColumns);
    }
    if (!differences.empty()) {
        throw failure{kNo, ""}; // the answer is the output
    }
}

} // namespace

void add_verify(CLI::App &object, const global_options &options) {
    object.callback([&options] { verify(options.json); });
}

} // namespace kova
