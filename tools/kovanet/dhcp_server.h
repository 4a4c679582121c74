/**
 * @file
 * What the verbs of the DHCP server have in common.
 */
#pragma once

#include "errors.h"
#include "interfaces.h"
#include "objects.h"

namespace kova {

enum family { kIPv4 = 0, kIPv6 = 1 }; /**< as the library takes them */
inline int number_of(family type) {
    return type == kIPv4 ? 4 : 6;
}

/** A verb of the DHCP server that changes something, with its option --no-restart. */
CLI::App &add_change(CLI::App &parent, const char *name, const char *description);

/** Brings the server to its files unless the service is off or --no-restart is given. Ends the program when it fails.
 */
void follow_change();

/** A change of the server's files: nobody else changes them meanwhile, then the server follows. */
template<typename Change> void change_server(const Change &change) {
    require_root();
    {
        const config_lock lock{config_lock::kExclusive}; // the library's calls leave it to their caller
        change();
    }
    follow_change();
}

/** Ends the program for an interface that the server's files cannot name. */
void require_servable(const std::string &ifname);

/** The interface that serves a subnet which an accepted range overlaps, "" when there is none. */
std::string conflicting_interface(const std::string &ifname, const std::string &start, const std::string &end,
                                  const std::string &mask);

void add_subnet_verbs(CLI::App &object, const global_options &options);
void add_option_verbs(CLI::App &object, const global_options &options);
void add_vendor_verbs(CLI::App &object, const global_options &options);
void add_pxe_verbs(CLI::App &object, const global_options &options);

} // namespace kova
