/**
 * @file
 * The objects of the command line: kovanet OBJECT VERB ... Each adds its verbs below its own command.
 */
#pragma once

#include <CLI/CLI.hpp>

namespace kova {

/** Options that every command takes. */
struct global_options {
    bool json = false;
    bool verbose = false;
};

void add_show(CLI::App &object, const global_options &options);
void add_verify(CLI::App &object, const global_options &options);
void add_monitor(CLI::App &object, const global_options &options);
void add_card(CLI::App &object, const global_options &options);
void add_link(CLI::App &object, const global_options &options);
void add_addr(CLI::App &object, const global_options &options);
void add_gateway(CLI::App &object, const global_options &options);
void add_route(CLI::App &object, const global_options &options);
void add_stats(CLI::App &object, const global_options &options);
void add_block(CLI::App &object, const global_options &options);
void add_vlan(CLI::App &object, const global_options &options);
void add_bond(CLI::App &object, const global_options &options);
void add_bridge(CLI::App &object, const global_options &options);
void add_ipv6(CLI::App &object, const global_options &options);
void add_mtu(CLI::App &object, const global_options &options);
void add_pppoe(CLI::App &object, const global_options &options);
void add_pppoe_relay(CLI::App &object, const global_options &options);
void add_dns(CLI::App &object, const global_options &options);
void add_dhcp_server(CLI::App &object, const global_options &options);
void add_conflict(CLI::App &object, const global_options &options);
void add_lookup(CLI::App &object, const global_options &options);
void add_ports(CLI::App &object, const global_options &options);
void add_wake(CLI::App &object, const global_options &options);
void add_hostname(CLI::App &object, const global_options &options);
void add_service(CLI::App &object, const global_options &options);
void add_topology(CLI::App &object, const global_options &options);
void add_reach(CLI::App &object, const global_options &options);
void add_tunnel(CLI::App &object, const global_options &options);
void add_check(CLI::App &object, const global_options &options);

/** Where the words of one command go: CLI11 fills it, and it lives until the program ends. */
template<typename Words> Words &words_of() {
    static Words words;
    return words;
}

} // namespace kova
