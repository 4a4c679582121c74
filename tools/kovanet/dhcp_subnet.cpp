#include "dhcp_subnet.h"

#include "rules.h"
#include "words.h"

#include <algorithm>
#include <climits>

namespace kova {
namespace {

/** Addresses with commas between them, those of IPv6 in brackets. */
std::string server_list(const std::vector<std::string> &servers, size_t from, family type) {
    std::string list;
    for (size_t i = from; i < servers.size(); ++i) {
        list += (list.empty() ? "" : ",") + (type == kIPv4 ? servers[i] : "[" + servers[i] + "]");
    }
    return list;
}

std::vector<std::string> servers_in(const std::string &list) {
    std::vector<std::string> servers;
    for (const std::string &server : CLI::detail::split(list, ',')) {
        const bool is_bracketed = server.size() > 2 && server.front() == '[' && server.back() == ']';
        if (!server.empty()) {
            servers.push_back(is_bracketed ? server.substr(1, server.size() - 2) : server);
        }
    }
    return servers;
}

std::string name_of(const subnet_id &id) {
    return "subnet " + std::to_string(id.number) + (id.type == kIPv4 ? " of " : " (IPv6) of ") + id.ifname;
}

} // namespace

presence read_subnet(subnet &one) {
    clear_error();
    const int found = DHCPTagConfGet(one.id.ifname.c_str(), one.id.number, one.id.type, &one.conf);
    if (found != 1) {
        one.conf = {};
        return found == 0 ? presence::absent : presence::unreadable;
    }
    one.options.reset(one.conf.options);
    // the library reads the first two servers and the last domain of a list
    const std::vector<std::string> lines = lines_of(one.id);
    one.servers = servers_in(value_behind(lines, one.id.type == kIPv4 ? "option:dns-server" : "option6:dns-server"));
    put(one.conf.domain, value_behind(lines, "option:domain-search"));
    return presence::read;
}

subnet require_subnet(const subnet_id &id) {
    subnet one{id, {}, nullptr, {}};
    switch (read_subnet(one)) {
    case presence::absent:
        throw failure{kNotFound, name_of(id) + " is not there; see kovanet dhcp-server subnet list"};
    case presence::unreadable:
        call_failed("cannot read " + name_of(id));
    default:
        return one;
    }
}

void require_all_known(const subnet &one) {
    const std::vector<std::string> lines = lines_of(one.id);
    const auto in_file = std::count_if(lines.begin(), lines.end(), [](const std::string &line) {
        return line.starts_with("dhcp-option=") && line.find(",option:domain-") == std::string::npos;
    });
    long known = one.id.type == kIPv4 ? 2 : 1; // router and servers, or servers
    for (const DHCP_OPTION *option = one.options.get(); option != nullptr; option = option->next) {
        ++known;
    }
    const bool are_servers = std::all_of(one.servers.begin(), one.servers.end(),
                                         [](const std::string &server) { return !refuse_server(server); });
    if (in_file != known || !are_servers) {
        throw failure{kNo, "the file of " + name_of(one.id) +
                               " holds options that kovanet does not know and that would be lost: edit it by hand"};
    }
}

void write_subnet(subnet &one) {
    const std::string list = server_list(one.servers, 0, one.id.type);
    require("the list of name servers",
            refuse_server_line("dhcp-option=tag:" + tag_of(one.id) + (one.id.type == kIPv4 ? ",option:" : ",option6:") +
                               "dns-server," + list));
    put(one.conf.dns1, one.servers.empty() ? "" : one.servers[0]);
    put(one.conf.dns2, one.servers.size() < 2 ? "" : one.servers[1]);
    put(one.conf.dns_more, server_list(one.servers, 2, one.id.type));
    one.conf.options = one.options.get();
    clear_error();
    if (DHCPTagConfSet(one.id.ifname.c_str(), one.id.number, one.id.type, &one.conf) != 0) {
        call_failed("cannot write " + name_of(one.id));
    }
}

subnet_id subnet_words::id() const {
    require("interface name \"" + ifname + "\"", refuse_interface_name(ifname));
    subnet_id id{ifname, family_word == "6" ? kIPv6 : kIPv4};
    id.number = static_cast<unsigned>(number_within("subnet number", number, 0, UINT_MAX));
    return id;
}

void add_subnet_words(CLI::App &verb, subnet_words &words) {
    verb.add_option("IF", words.ifname, "interface")->required();
    verb.add_option("N", words.number, "number of the subnet, from 0")->required();
}

} // namespace kova
