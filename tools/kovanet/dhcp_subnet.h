/**
 * @file
 * A numbered subnet of the DHCP server, with all that its files hold.
 */
#pragma once

#include "dhcp_files.h"

#include <kovanetsdk/dhcp.h>
#include <memory>

namespace kova {

struct options_free {
    void operator()(DHCP_OPTION *head) const { DHCPOptionFree(head); }
};
using owned_options = std::unique_ptr<DHCP_OPTION, options_free>;

/** A record of the library, its texts whole and its options owned. */
struct subnet {
    subnet_id id;
    DHCP_TAG_CONF conf{};
    owned_options options;
    std::vector<std::string> servers; /**< all name servers */
};

enum class presence { absent, unreadable, read };
presence read_subnet(subnet &one);
/** The same, ending the program unless it is there and can be read. */
subnet require_subnet(const subnet_id &id);

/** Ends the program when the fragment holds options that would be lost if the library wrote it again. */
void require_all_known(const subnet &one);

/** Writes a subnet, its switch as well. Ends the program when that fails, or when a line would be too long. */
void write_subnet(subnet &one);

/** A subnet's words of the command line. */
struct subnet_words {
    std::string ifname;
    std::string number;
    std::string family_word = "4";
    /** Ends the program for a name or number that is none. */
    [[nodiscard]] subnet_id id() const;
};
/** The words IF and N. */
void add_subnet_words(CLI::App &verb, subnet_words &words);

/** Copies a text that has passed the checks into a record's field. */
template<size_t Size> void put(char (&field)[Size], const std::string &text) {
    snprintf(field, Size, "%s", text.c_str());
}

} // namespace kova
