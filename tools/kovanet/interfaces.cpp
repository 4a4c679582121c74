#include "interfaces.h"

#include "errors.h"
#include "rules.h"

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <cstring>
#include <kova/core.h>
#include <kovanetsdk/core.h>
#include <memory>
#include <tuple>

namespace kova {
namespace {

constexpr uint32_t kConfigName = 0x100;
constexpr int kWaitSeconds = 5;
constexpr int kMaxInterfaces = 1024;
constexpr uint32_t kGlobalScope = 0;

/** The widest scope first, and by value within one: the kernel's list is in an order of its own, a new one each boot.
 */
bool comes_before(const KOVAV6IP &one, const KOVAV6IP &other) {
    const auto key = [](const KOVAV6IP &address) {
        in6_addr value{};
        inet_pton(AF_INET6, address.szIP, &value);
        return std::tuple{address.nScope != kGlobalScope, ~address.nScope, std::to_array(value.s6_addr)};
    };
    return key(one) < key(other);
}

} // namespace

config_lock::config_lock(mode wanted) {
    clear_error();
    if (KLIBCFileLock(wanted, kWaitSeconds) != 0) {
        call_failed("cannot lock the network configuration");
    }
}

config_lock::~config_lock() {
    KLIBCFileUnlock(kConfigName);
}

std::optional<IFINFO> find_interface(const std::string &name) {
    require("interface name \"" + name + "\"", refuse_interface_name(name));
    IFINFO info{};
    clear_error();
    if (KOVANetIFGetInfo(name.c_str(), &info, nullptr) == 0) {
        return info;
    }
    // the kernel's first answer about a name is its flags: refused means that it knows no such interface
    if (KLIBCErrGet() != NET_ERR_IOCTL) {
        call_failed("cannot read interface " + name);
    }
    return std::nullopt;
}

IFINFO require_interface(const std::string &name) {
    std::optional<IFINFO> info = find_interface(name);
    if (!info) {
        throw failure{kNotFound, "no interface is named " + name + "; see kovanet link show"};
    }
    return *info;
}

std::vector<KOVAV6IP> ipv6_addresses(const std::string &name) {
    if (KLIBCFileExist("/proc/net/if_inet6") == 0) {
        return {}; // a kernel without IPv6
    }
    std::vector<KOVAV6IP> addresses(16);
    for (;;) {
        clear_error();
        const int count = KOVALnxV6IPGet(name.c_str(), addresses.data(), static_cast<int>(addresses.size()));
        if (count < 0) {
            call_failed("cannot read the IPv6 addresses of " + name);
        }
        const bool all_fit = static_cast<size_t>(count) <= addresses.size();
        addresses.resize(static_cast<size_t>(count));
        if (all_fit) {
            std::ranges::sort(addresses, comes_before);
            return addresses;
        }
    }
}

std::vector<NETSTAT> all_counters() {
    clear_error();
    const std::unique_ptr<NETSTAT, decltype(&KLIBNetStatFree)> stats{KLIBNetStatInit(kMaxInterfaces), KLIBNetStatFree};
    const int count = stats != nullptr ? KLIBNetStatGetAll(stats.get(), kMaxInterfaces) : -1;
    if (count < 0) {
        call_failed("cannot read the interfaces");
    }
    return std::vector<NETSTAT>(stats.get(), stats.get() + count);
}

std::vector<IFINFO> all_interfaces() {
    std::vector<IFINFO> all;
    for (const NETSTAT &stat : all_counters()) {
        const std::string name = stat.szIfname;
        if (refuse_interface_name(name)) {
            continue;
        }
        if (const std::optional<IFINFO> info = find_interface(name)) { // it may be gone by now
            all.push_back(*info);
        }
    }
    return all;
}

std::string mac_text(const unsigned char (&mac)[6]) {
    return textf("%02x:%02x:%02x:%02x:%02x:%02x", mac[0], mac[1], mac[2], mac[3], mac[4], mac[5]);
}

json known_number(int value, int lowest) {
    return value < lowest ? json() : json(value);
}

json known_text(const char *text) {
    return *text == '\0' ? json() : json(text);
}

json duplex_word(int duplex) {
    if (duplex != 0 && duplex != 1) {
        return {};
    }
    return duplex == 1 ? "full" : "half";
}

const char *link_word(bool has_link) {
    return has_link ? "up" : "down";
}

} // namespace kova
