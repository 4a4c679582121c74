// kovanet gateway: the IPv4 default gateway, in use and configured.
#include "errors.h"
#include "interfaces.h"
#include "objects.h"
#include "records.h"
#include "rules.h"

#include <kova/core.h>
#include <kova/plugin.h>
#include <kovanetsdk/addr.h>
#include <kovanetsdk/events.h>
#include <kovanetsdk/routing.h>
#include <net/if.h>

namespace kova {
namespace {

/** The default route of the kernel, both texts empty without one. */
struct default_route {
    std::string gateway;
    std::string interface;
};

default_route route_in_use() {
    char gateway[16] = "";
    char interface[IFNAMSIZ] = "";
    clear_error();
    if (DefaultGatewayGet(gateway, sizeof gateway, interface, sizeof interface) < 0) {
        call_failed("cannot read the default route");
    }
    return {gateway, interface};
}

std::string configured_gateway() {
    char gateway[256] = "";
    clear_error();
    if (KLIBCFileExist("/etc/sysconfig/network") != 0 && KOVANetDefaultGatewayGetConf(gateway, sizeof gateway) < 0) {
        call_failed("cannot read the configured gateway in /etc/sysconfig/network");
    }
    return gateway;
}

constexpr column kColumns[] = {
    {"gateway", [](const json &row) { return field(row, "gateway"); }},
    {"interface", [](const json &row) { return field(row, "interface"); }},
    {"configured", [](const json &row) { return field(row, "configured_gateway"); }},
};

void show(bool as_json) {
    const config_lock lock{config_lock::kShared}; // one view of the kernel and the file
    const json record = gateway_record();
    show_record(record, kColumns, as_json);
}

/** A change of the gateway, announced before and after. Unless it is done, the old default route is put back. */
class announced_change {
public:
    announced_change(std::string interface, std::string wanted)
        : interface_(std::move(interface)), wanted_(std::move(wanted)) {
        announce(KLIB_PLUGIN_PRE, wanted_);
    }
    announced_change(const announced_change &) = delete;
    announced_change &operator=(const announced_change &) = delete;
    ~announced_change() {
        if (!done_) {
            KOVANetDefaultGatewaySet(in_use_.c_str());
        }
        announce(KLIB_PLUGIN_POST, done_ ? wanted_ : configured_);
    }
    void done() { done_ = true; }

private:
    /** A plug-in that fails is in the log and stops nothing. */
    void announce(int phase, const std::string &gateway) const {
        KOVANetGatewayConfigChangeHook(phase, "ipv4", interface_.c_str(), configured_.c_str(), gateway.c_str());
    }

    std::string interface_;
    std::string wanted_;
    std::string in_use_ = route_in_use().gateway;
    std::string configured_ = configured_gateway();
    bool done_ = false;
};

/** @param gateway  the new one, empty for none; the caller holds the lock */
void change(const std::string &interface, const std::string &gateway) {
    announced_change announced{interface, gateway};
    clear_error();
    if (KOVANetDefaultGatewaySet(gateway.c_str()) < 0) {
        call_failed(gateway.empty() ? "cannot remove the default gateway"
                                    : "cannot set the default gateway to " + gateway);
    }
    if (KOVANetDefaultGatewaySetConf(gateway.c_str()) < 0) {
        call_failed(gateway.empty() ? "cannot remove the configured gateway from /etc/sysconfig/network"
                                    : "cannot store the default gateway in /etc/sysconfig/network");
    }
    announced.done();
}

/** The interface that leads to a gateway. Ends the program when there is none. */
std::string interface_to(const std::string &gateway) {
    const std::string what = "gateway \"" + gateway + "\"";
    char own[IFNAMSIZ] = "";
    if (KOVANetIP2If(gateway.c_str(), own, sizeof own) == 1) {
        throw failure{kNo, what + " is not valid: it is the address of " + own};
    }
    for (const IFINFO &info : all_interfaces()) {
        const bool is_usable = (info.nFlags & IFF_UP) != 0 && *info.szIP != '\0';
        if (is_usable && KOVANetIsSameSubnet(info.szIP, gateway.c_str(), info.szMask) == 1) {
            require(what, refuse_address_and_mask(gateway, info.szMask));
            return info.szIfname;
        }
    }
    throw failure{kNo,
                  what + " is not valid: no interface that is up has an address in its subnet; see kovanet addr list"};
}

void set(const std::string &given) {
    require_root();
    require("gateway \"" + given + "\"", refuse_address(given));
    const std::string gateway = plain_address(given);
    const config_lock lock{config_lock::kExclusive}; // the library's calls leave it to their caller
    change(interface_to(gateway), gateway);
}

void clear() {
    require_root();
    const config_lock lock{config_lock::kExclusive};
    change(route_in_use().interface, "");
}

} // namespace

json gateway_record() {
    const default_route route = route_in_use();
    json record;
    record["gateway"] = known_text(route.gateway.c_str());
    record["interface"] = known_text(route.interface.c_str());
    record["configured_gateway"] = known_text(configured_gateway().c_str());
    return record;
}

void add_gateway(CLI::App &object, const global_options &options) {
    auto &address = words_of<std::string>();
    object.add_subcommand("show", "the gateway in use, its interface, and the configured gateway")
        ->callback([&options] { show(options.json); });

    CLI::App &one = *object.add_subcommand("set", "use a gateway, now and at every start");
    one.add_option("ADDRESS", address, "address of a router on a subnet of this machine")->required();
    one.callback([&address] { set(address); });

    object.add_subcommand("clear", "remove the default route and the configured gateway")->callback(clear);
}

} // namespace kova
