// kovanet verify: the services that a file switches on or off against their processes and interfaces.
#include "records.h"
#include "verify.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <kova/core.h>
#include <kova/service.h>
#include <kovanetsdk/pppoe.h>
#include <net/if.h>
#include <strings.h>

namespace kova {
namespace {

constexpr char kKovaInfo[] = "/etc/kovainfo.conf";
constexpr char kPppoe[] = "/etc/ppp/pppoe.conf";
constexpr char kRunKeys[] = "/etc/kova/service";
constexpr char kRelays[] = "/etc/sysconfig/pppoe-relay/";
constexpr char kRelay[] = "/usr/sbin/pppoe-relay -C ";
constexpr char kTunnel[] = "kovatunnel";

// ---- PPPoE

/** The interface that the kernel has a session on, "" without one. */
std::string session_device() {
    std::ifstream file{"/proc/net/pppoe"};
    std::string line, id, peer, device;
    std::getline(file, line); // the titles
    file >> id >> peer >> device;
    return device;
}

void compare_pppoe(comparison &result) {
    const bool is_wanted = strcasecmp(stored_value(kKovaInfo, "pppoe_enable").c_str(), "yes") == 0;
    const bool has_client = KLIBCPs("pppoe-connect", nullptr, 0, 0) > 0;
    const bool is_connected = has_client && !pppoe_interface().empty();
    if (!is_wanted) {
        result.add(kKovaInfo, "pppoe_enable", "no", yes_or_no(has_client));
        return;
    }
    const char *const unconnected = has_client ? "dialling" : "no client";
    result.add(kKovaInfo, "pppoe_enable", "yes", is_connected ? "yes" : unconnected);
    if (is_connected) {
        result.add(kPppoe, "ETH", stored_value(kPppoe, "ETH"), session_device());
    }
}

// ---- its relays

bool is_relayed(const std::string &words) {
    return KLIBCIsProcAlive((kRelay + words).c_str()) == 1;
}

/** The interface that the relay of a bridge leads to: the wanted one when that is it. */
std::string server_like(const std::string &bridge, const std::string &wanted) {
    if (is_relayed(bridge + " -S " + wanted)) {
        return wanted;
    }
    for (const IFINFO &info : all_interfaces()) {
        if (is_relayed(bridge + " -S " + info.szIfname)) {
            return info.szIfname;
        }
    }
    return "";
}

/** Also relays that run on without settings. */
void compare_relays(comparison &result) {
    const bool some_run = KLIBCPs("pppoe-relay", nullptr, 0, 0) > 0;
    const json configured = pppoe_relay_records();
    for (const json &relay : configured) {
        const std::string name = relay["name"];
        result.add(kRelays + name, "enable", yes_or_no(relay["enabled"]), yes_or_no(relay["running"]));
        if (relay["enabled"] == true && relay["running"] == true) {
            const std::string server = relay["server"].is_null() ? "" : relay["server"].get<std::string>();
            result.add(kRelays + name, "server", server, server_like(name, server));
        }
    }
    for (const IFINFO &info : some_run ? all_interfaces() : std::vector<IFINFO>{}) {
        const bool has_settings = std::any_of(configured.begin(), configured.end(),
                                              [&info](const json &relay) { return relay["name"] == info.szIfname; });
        if (!has_settings && is_relayed(info.szIfname)) {
            result.add(kRelays + std::string(info.szIfname), "enable", "no", "yes");
        }
    }
}

// ---- services with a run key

/** "yes" and "no", or the state between them. */
std::string running_tunnel() {
    const std::string state = tunnel_state();
    return state == "connecting" ? state : yes_or_no(state == "up");
}

void compare_run_keys(comparison &result) {
    for (const std::string &file : names_in(kRunKeys)) {
        const std::filesystem::path path = std::filesystem::path{kRunKeys} / file;
        const std::string service = path.stem();
        int run = KLIB_SERVICE_DO_NOT_RUN;
        const bool is_tunnel = service == kTunnel;
        const bool has_state = is_tunnel || KLIBCFileExist(("/usr/kova/service/" + service).c_str()) == 1;
        if (path.extension() == ".conf" && has_state && KLIBServicecfgRunKeyGet(service.c_str(), &run) == 0) {
            const bool is_running = !is_tunnel && KLIBServiceIsRunning(service.c_str()) == 1;
            result.add(path, "run", yes_or_no(run == KLIB_SERVICE_RUN),
                       is_tunnel ? running_tunnel() : yes_or_no(is_running));
        }
    }
}

} // namespace

std::string pppoe_interface() {
    char interface[IFNAMSIZ] = "";
    char address[16] = "";
    const bool is_connected = KOVAPPPoeIntfGet(interface, sizeof interface) == 0 &&
                              KOVAPPPoeNetInfoGet(address, sizeof address, nullptr, 0) == 0;
    return is_connected ? interface : "";
}

void compare_services(comparison &result) {
    compare_pppoe(result);
    compare_relays(result);
    compare_run_keys(result);
}

} // namespace kova
