// kovanet verify: the files of the interfaces against the kernel and the clients that run for them.
#include "composition.h"
#include "errors.h"
#include "records.h"
#include "verify.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <kova/core.h>
#include <kovanetsdk/bridge.h>
#include <kovanetsdk/routing.h>
#include <map>
#include <net/if.h>
#include <sstream>

namespace kova {
namespace {

constexpr char kScripts[] = "/etc/sysconfig/network-scripts";
constexpr char kKovaInfo[] = "/etc/kovainfo.conf";

// ---- what the kernel says

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

// ---- one interface

/** The settings of one interface's file against the kernel. */
class interface_comparison {
public:
    interface_comparison(comparison &result, const IFINFO &info)
        : result_(result), info_(info), name_(info.szIfname), file_(file_of(name_)) {}

    static std::string file_of(const std::string &name) { return std::string(kScripts) + "/ifcfg-" + name; }

    void compare(const owners &all) {
        const std::string device = wanted("DEVICE");
        add("DEVICE", device.empty() ? name_ : device, name_);
        add("ONBOOT", "up", (info_.nFlags & IFF_UP) != 0 ? "up" : "down");
        const std::string bond = wanted("MASTER");
        const std::string bridge = wanted("BRIDGE");
        const std::string bond_there = owner_of(all.bonds, name_);
        add("MASTER", bond, bond_there);
        add("SLAVE", wanted("SLAVE") == "yes" ? "yes" : "", bond_there.empty() ? "" : "yes");
        add("BRIDGE", bridge, owner_of(all.bridges, name_));
        compare_vlan();
        compare_bond();
        compare_bridge();
        if (bond.empty()) { // which gives its members the MTU that it has itself
            compare_mtu();
        }
        if (bond.empty() && bridge.empty()) { // a part of another has no addresses of its own
            compare_ipv4();
            compare_ipv6(result_, file_, info_);
        }
    }

private:
    [[nodiscard]] std::string wanted(const std::string &key) const { return stored_value(file_, key); }
    void add(const std::string &key, const std::string &is_wanted, const std::string &actual) {
        result_.add(file_, key, is_wanted, actual);
    }

    void compare_vlan() {
        const VLANINFO vlan = find_vlan(name_).value_or(VLANINFO{});
        add("VLAN_ROW_DEVICE", wanted("VLAN_ROW_DEVICE"), vlan.szRowDevice);
        add("VLAN_ID", wanted("VLAN_ID"), vlan.vlanId > 0 ? std::to_string(vlan.vlanId) : "");
    }

    /** The options of the bond's driver one by one, the mode by its name. */
    void compare_bond() {
        std::istringstream options{wanted("BONDING_OPTS")};
        for (std::string option; options >> option;) {
            const size_t equals = option.find('=');
            const std::string key = option.substr(0, equals);
            const std::string value = equals == std::string::npos ? "" : option.substr(equals + 1);
            const std::string there = "/sys/class/net/" + name_ + "/bonding/" + key;
            if (key == "mode") {
                const std::optional<KOVALINKAGGROPT> bond = find_bond(name_);
                add("BONDING_OPTS", mode_of(value), bond ? KOVANetLinkAggrModeToString(bond->mode) : "");
            } else if (KLIBCFileExist(there.c_str()) == 1 && value.find(',') == std::string::npos) {
                add("BONDING_OPTS", option, key + "=" + value_like(value, there));
            }
        }
    }

    /** The name of the mode that the driver knows by a number. */
    static std::string mode_of(const std::string &number) {
        const auto *const found = std::find_if(std::begin(grgBondDesc), std::end(grgBondDesc), [&](const auto &known) {
            return !number.empty() && number == known.szKernelMode;
        });
        return found == std::end(grgBondDesc) ? number : found->szName;
    }

    /** The driver tells a setting by its name and number: the wanted one when it is one of them, else the first. */
    static std::string value_like(const std::string &value, const std::string &path) {
        std::ifstream file{path};
        std::string first, second;
        file >> first >> second;
        return second == value ? second : first;
    }

    void compare_bridge() {
        const bool is_bridge = KLIBNetBridgeIfIsMaster(name_.c_str()) == 1;
        const bool is_wanted = wanted("TYPE") == "bridge";
        add("TYPE", is_wanted ? "bridge" : "", is_bridge ? "bridge" : "");
        if (const std::string primary = wanted("PRIMARY"); is_wanted && !primary.empty()) {
            add("PRIMARY", primary, like(primary, ports_of(name_), std::equal_to<std::string>{}));
        }
    }

    void compare_mtu() {
        const std::string key = name_ + "_mtu";
        if (const std::string mtu = stored_value(kKovaInfo, key); !mtu.empty()) {
            const int present = KOVAGetMTUSetting(name_.c_str());
            result_.add(kKovaInfo, key, mtu, present > 0 ? std::to_string(present) : "");
        }
    }

    void compare_ipv4() {
        const ipv4_settings settings = settings_of(name_);
        if (settings.source == ipv4_settings::kDhcp) {
            compare_lease();
            return;
        }
        const bool is_static = settings.source == ipv4_settings::kStatic;
        const char *const protocol = is_static ? "static" : "none";
        const bool has_client = job_runs("dhcp-client,IFACE=" + name_);
        if (is_static) {
            add("BOOTPROTO", protocol, has_client ? "dhcp" : protocol);
            add("IPADDR", settings.fixed.address, info_.szIP);
            add("NETMASK", settings.fixed.mask, *info_.szIP != '\0' ? info_.szMask : "");
        } else {
            add("BOOTPROTO", protocol, has_client ? "dhcp" : or_none(info_.szIP));
        }
    }

    static std::string or_none(const std::string &text) { return text.empty() ? "none" : text; }

    /** As long as there is no lease the client asks, and an earlier address may stay. */
    void compare_lease() {
        const std::string lease = "/etc/dhclient/ipv4/dhcpcd-" + name_ + ".info";
        const std::string leased = is_yes(lease, "OFFER") ? "" : stored_value(lease, "IPADDR");
        add("BOOTPROTO", "dhcp", job_runs("dhcp-client,IFACE=" + name_) ? "dhcp" : "no client");
        if (!leased.empty()) {
            result_.add(lease, "IPADDR", leased, info_.szIP);
            result_.add(lease, "NETMASK", stored_value(lease, "NETMASK"), *info_.szIP != '\0' ? info_.szMask : "");
        }
    }

    comparison &result_;
    const IFINFO &info_;
    std::string name_;
    std::string file_;
};

// ---- all of them

/** Interfaces that a start of the system brings up, by their files. */
std::vector<std::string> configured_interfaces() {
    constexpr std::string_view kPrefix = "ifcfg-";
    std::vector<std::string> all;
    for (const std::string &file : names_in(kScripts)) {
        const std::string name = file.starts_with(kPrefix) ? file.substr(kPrefix.size()) : "";
        const bool is_copy = name.find(".tmp") != std::string::npos || name.ends_with(".saved") ||
                             name.ends_with(".bak") || name.ends_with('~');
        if (!name.empty() && !is_copy && !refuse_interface_name(name) &&
            is_yes(interface_comparison::file_of(name), "ONBOOT")) {
            all.push_back(name);
        }
    }
    std::sort(all.begin(), all.end());
    return all;
}

} // namespace

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

} // namespace kova
