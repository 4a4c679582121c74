#include "composition.h"

#include "errors.h"
#include "lists.h"
#include "stored.h"

#include <csignal>
#include <cstdio>
#include <kova/core.h>
#include <kovanetsdk/addr.h>
#include <kovanetsdk/bridge.h>
#include <net/if.h>

namespace kova {
namespace {

constexpr char kFolder[] = "/etc/sysconfig/network-scripts";
constexpr int kWaitSeconds = 5;

std::string file_of(const std::string &name) {
    return std::string(kFolder) + "/ifcfg-" + name;
}

std::string key_of(const std::string &name, const char *key) {
    return stored_value(file_of(name), key);
}

/** From now on Ctrl-C ends the programs that are run, but leaves it to the library to put right what they have begun.
 */
void outlive_interrupts() {
    struct sigaction action {};
    action.sa_handler = [](int) {}; // ignored, it would be for these programs, too
    action.sa_flags = SA_RESTART;
    sigaction(SIGINT, &action, nullptr);
}

} // namespace

change_lock::change_lock() {
    constexpr int kExclusive = 1;
    clear_error();
    if (KLIBCFileLockTimeByFile(kFolder, kExclusive, kWaitSeconds, &fd_) < 0) {
        call_failed("cannot lock the interfaces");
    }
    outlive_interrupts();
}

change_lock::~change_lock() {
    KLIBCFileUnlockByFile(fd_);
}

std::optional<VLANINFO> find_vlan(const std::string &name) {
    VLANINFO vlan{};
    clear_error();
    const int result = KLIBNetVlanGet(name.c_str(), &vlan);
    if (result < 0) {
        call_failed("cannot ask whether " + name + " is a VLAN");
    }
    return result == 1 ? std::optional{vlan} : std::nullopt;
}

std::optional<VLANINFO> find_vlan_on(const std::string &row_device) {
    for (const IFINFO &info : all_interfaces()) {
        const std::optional<VLANINFO> vlan = find_vlan(info.szIfname);
        if (vlan && row_device == vlan->szRowDevice) {
            return vlan;
        }
    }
    return std::nullopt;
}

std::optional<KOVALINKAGGROPT> find_bond(const std::string &name) {
    KOVALINKAGGROPT bond{};
    clear_error();
    const int result = KOVANetLinkAggrGet(name.c_str(), &bond);
    if (result < 0) {
        call_failed("cannot read bond " + name);
    }
    return result > 0 || bond.cSlaves > 0 ? std::optional{bond} : std::nullopt;
}

std::vector<std::string> members_of(const KOVALINKAGGROPT &bond) {
    return {bond.aszSlaves, bond.aszSlaves + bond.cSlaves};
}

std::string joined(const names &all, const char *between) {
    std::string text;
    for (const std::string &name : all) {
        text += (text.empty() ? "" : between) + name;
    }
    return text;
}

bool is_switch_bond(const std::string &name) {
    constexpr int kBond = 2;
    return KLIBNetOVSIfIsMaster(name.c_str()) == kBond;
}

std::optional<std::string> behind_switch_port(const std::string &name) {
    constexpr int kPort = 1;
    char original[IFNAMSIZ] = "";
    const bool is_port = KLIBNetOVSIfIsMaster(name.c_str()) == kPort &&
                         KLIBNetOVSGetOriginalIf(name.c_str(), original, sizeof original) == 0;
    return is_port ? std::optional<std::string>{original} : std::nullopt;
}

std::vector<std::string> ports_of(const std::string &name) {
    if (KLIBNetBridgeIfIsMaster(name.c_str()) != 1) {
        return {};
    }
    const owned_list ports = make_list();
    clear_error();
    if (KLIBNetBridgeSlaveEnum(name.c_str(), ports.get()) < 0) {
        call_failed("cannot read the ports of " + name);
    }
    return texts_of(ports.get());
}

void require_no_vlan_on(const std::string &name) {
    if (const std::optional<VLANINFO> vlan = find_vlan_on(name)) {
        throw failure{kNo, name + " has the VLAN " + vlan->szIfname + " already; first: kovanet vlan remove " +
                               vlan->szIfname};
    }
}

bool is_port(const std::string &name) {
    return KLIBNetBridgeIfIsSlave(name.c_str()) == 1 || KOVANetIsIfBridgeType(name.c_str(), KLIB_BRIDGE_SLAVE) == 1;
}

IFINFO require_unused(const std::string &name) {
    IFINFO info = require_interface(name);
    if ((info.nFlags & (IFF_LOOPBACK | IFF_POINTOPOINT)) != 0) {
        throw failure{kNo, name + " is not a network card; see kovanet card list"};
    }
    if (KOVANetIfIsBondingPassive(name.c_str()) == 1 || !key_of(name, "MASTER").empty()) {
        throw failure{kNo, name + " is a member of a bond already; see kovanet bond list"};
    }
    if (is_port(name)) {
        throw failure{kNo, name + " is a port of a bridge already; see kovanet bridge show " + name};
    }
    if (find_vlan(name)) {
        throw failure{kNo, name + " is a VLAN, and nothing stands on a VLAN; see kovanet vlan list"};
    }
    require_no_vlan_on(name);
    return info;
}

bool has_file(const std::string &name) {
    return KLIBCFileExist(file_of(name).c_str()) == 1;
}

void require_file(const std::string &name) {
    if (!has_file(name)) {
        throw failure{kNo, name + " is not configured here: there is no " + file_of(name)};
    }
}

ipv4_settings settings_of(const std::string &name) {
    const std::string protocol = key_of(name, "BOOTPROTO");
    if (protocol == "dhcp") {
        return {ipv4_settings::kDhcp, {}};
    }
    const network fixed{key_of(name, "IPADDR"), key_of(name, "NETMASK")};
    const bool is_static = protocol == "static" || protocol.empty(); // without the key, as for every other reader
    if (!is_static || fixed.address.empty()) {
        return {};
    }
    return {ipv4_settings::kStatic, fixed};
}

std::string text_of(const ipv4_settings &settings) {
    switch (settings.source) {
    case ipv4_settings::kStatic:
        return "the address " + settings.fixed.address + " mask " + settings.fixed.mask;
    case ipv4_settings::kDhcp:
        return "an address from a DHCP server";
    default:
        return "no IPv4 address";
    }
}

NETINFO record_of(const ipv4_settings &settings) {
    NETINFO record{};
    if (settings.source == ipv4_settings::kStatic) {
        record.nIPSource = 1;
        snprintf(record.szIP, sizeof record.szIP, "%s", settings.fixed.address.c_str());
        snprintf(record.szMask, sizeof record.szMask, "%s", settings.fixed.mask.c_str());
    }
    return record;
}

void add_state(json &row, const std::string &name) {
    const IFINFO info = find_interface(name).value_or(IFINFO{});
    const int prefix = *info.szIP != '\0' ? KOVANetNetmaskToPrefix(info.szMask) : -1;
    row["up"] = (info.nFlags & IFF_UP) != 0;
    row["link"] = link_word(info.nLink != 0);
    row["address"] = known_text(info.szIP);
    row["prefix"] = known_number(prefix, 0);
}

std::string state_address(const json &row) {
    return row["prefix"].is_null() ? field(row, "address") : field(row, "address") + "/" + field(row, "prefix");
}

std::string loss_of(const std::string &name) {
    json row;
    add_state(row, name);
    return name + " loses " + (row["address"].is_null() ? "its addresses" : "its address " + state_address(row));
}

} // namespace kova
