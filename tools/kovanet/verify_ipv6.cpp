// kovanet verify: IPv6 of an interface, its switches in the kernel, its clients, its fixed address and router.
#include "records.h"
#include "rules.h"
#include "verify.h"

#include <algorithm>
#include <arpa/inet.h>
#include <fstream>

namespace kova {
namespace {

std::string first_word_in(const std::string &path) {
    std::ifstream file{path};
    std::string word;
    file >> word;
    return word;
}

/** An address of the kernel's table, 32 digits, in its short form. */
std::string short_form(const std::string &digits) {
    std::string text;
    for (size_t at = 0; at < digits.size(); at += 4) {
        text += (at == 0 ? "" : ":") + digits.substr(at, 4);
    }
    in6_addr binary{};
    char shortest[INET6_ADDRSTRLEN] = "";
    inet_pton(AF_INET6, text.c_str(), &binary);
    inet_ntop(AF_INET6, &binary, shortest, sizeof shortest);
    return shortest;
}

/** The routers of an interface's IPv6 default routes. */
std::vector<std::string> ipv6_routers(const std::string &name) {
    constexpr char kAnywhere[] = "00000000000000000000000000000000";
    std::vector<std::string> routers;
    std::ifstream routes{"/proc/net/ipv6_route"};
    std::string to, length, from, from_length, via, metric, references, uses, flags, device;
    while (routes >> to >> length >> from >> from_length >> via >> metric >> references >> uses >> flags >> device) {
        if (to == kAnywhere && length == "00" && via != kAnywhere && device == name) {
            routers.push_back(short_form(via));
        }
    }
    return routers;
}

std::string in_lower_case(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(), [](unsigned char c) { return std::tolower(c); });
    return text;
}

/** The IPv6 settings of one interface's file against the kernel. */
class ipv6_comparison {
public:
    ipv6_comparison(comparison &result, std::string file, const IFINFO &info)
        : result_(result), info_(info), name_(info.szIfname), file_(std::move(file)) {}

    void compare() {
        const std::string mode = in_lower_case(wanted("IPV6INIT"));
        const std::string is_off = ipv6_switch("disable_ipv6");
        if (is_off.empty()) { // a kernel without IPv6
            return;
        }
        if (!mode.empty()) {
            add("IPV6INIT", mode, is_off == "1" ? "off" : ipv6_mode(mode));
        }
        if (mode == "off") {
            return;
        }
        compare_advertisements(mode);
        if (mode == "static") {
            const std::string address =
                wanted("IPV6ADDR").empty() ? "" : wanted("IPV6ADDR") + "/" + wanted("IPV6PREFIXLENG");
            add("IPV6ADDR", address, like(address, ipv6_addresses(), is_same_prefix));
            if (const std::string router = wanted("IPV6_DEFAULTGW"); !router.empty()) {
                add("IPV6_DEFAULTGW", router, like(router, ipv6_routers(name_), is_same_ipv6));
            }
        }
    }

private:
    [[nodiscard]] std::string wanted(const std::string &key) const { return stored_value(file_, key); }
    void add(const std::string &key, const std::string &is_wanted, const std::string &actual) {
        result_.add(file_, key, is_wanted, actual);
    }

    [[nodiscard]] std::string ipv6_switch(const char *name) const {
        return first_word_in("/proc/sys/net/ipv6/conf/" + name_ + "/" + name);
    }

    /** What an interface that has IPv6 runs in, by its clients: the wanted mode when they are those of it. */
    [[nodiscard]] std::string ipv6_mode(const std::string &mode) const {
        const bool asks_for_address = job_runs("dhcp-client6,ACTION=client,IFACE=" + name_);
        const bool asks_for_servers = job_runs("dhcp-client6,ACTION=info,IFACE=" + name_);
        const bool is_dynamic = mode == "auto" || mode == "dhcp" || mode == "auto_dhcp";
        if (mode == "off") {
            return "on";
        }
        if (asks_for_address != (mode == "dhcp") || asks_for_servers != (mode == "auto_dhcp")) {
            const char *const no_address = asks_for_servers ? "auto_dhcp" : "no client";
            return asks_for_address ? "dhcp" : no_address;
        }
        if (job_runs("ra-dns,IFACE=" + name_) != is_dynamic) {
            return is_dynamic ? "no listener for name servers" : "a listener for name servers";
        }
        return mode;
    }

    /** Without a word about router advertisements, all but fixed addresses come from them. */
    void compare_advertisements(const std::string &mode) {
        const std::string said = wanted("IPV6_ACCEPT_RA");
        if (said.empty() && mode.empty()) {
            return;
        }
        const bool is_wanted = said.empty() ? mode != "static" : said != "0";
        // a machine that forwards takes them only where it is told so
        const std::string accepts = ipv6_switch("accept_ra");
        const bool is_taken = accepts == "2" || (accepts == "1" && ipv6_switch("forwarding") == "0");
        add("IPV6_ACCEPT_RA", is_wanted ? "1" : "0", is_taken ? "1" : "0");
    }

    /** Those that reach beyond the link. */
    [[nodiscard]] std::vector<std::string> ipv6_addresses() const {
        std::vector<std::string> all;
        for (const json &row : address_rows(info_)) {
            if (row["family"] == 6 && row["scope"] != "link") {
                all.push_back(field(row, "address") + "/" + field(row, "prefix"));
            }
        }
        return all;
    }

    static bool is_same_prefix(const std::string &one, const std::string &other) {
        const size_t slash = one.find('/');
        const size_t other_slash = other.find('/');
        return one.substr(slash) == other.substr(other_slash) &&
               is_same_ipv6(one.substr(0, slash), other.substr(0, other_slash));
    }

    comparison &result_;
    const IFINFO &info_;
    std::string name_;
    std::string file_;
};

} // namespace

void compare_ipv6(comparison &result, const std::string &file, const IFINFO &info) {
    ipv6_comparison{result, file, info}.compare();
}

} // namespace kova
