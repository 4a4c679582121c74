/**
 * @file
 * The options of an IPv4 subnet beside router, DNS servers and domain: what the daemon's names for them are, which
 * values they take, how they are read back from a fragment.
 */
#pragma once

#include "core/guards.h"
#include "core/report.h"

#include <kovanetsdk/dhcp.h>

namespace kova {

/** What an option takes as its value. */
enum class option_rule : unsigned char {
    none, ///< not supported
    number,
    node_type,
    text,
    address,
    addresses,
    addresses_and_masks,
    routes,
};

/** A supported option. */
struct option_kind {
    int number;
    option_rule rule;
    const char *name;   ///< as the daemon calls it
    uint64_t low, high; ///< bounds of a number, inclusive
    [[nodiscard]] bool takes_list() const { return rule >= option_rule::addresses; }
};

/** The option of a number, or of a name; one without name and rule when it is not supported. */
const option_kind &option_of(int number);
const option_kind &option_of(const char *name);

/** Longest value of an option, or of its items joined by ",". */
inline constexpr size_t kLongestOption = 1023;

/** Whether name and value are what the number asks for; logs the reason when not. Masks are put in plain decimal. */
[[nodiscard]] bool is_valid_option(const DHCP_OPTION &option);

struct options_kind {
    static DHCP_OPTION *none() { return nullptr; }
    static void release(DHCP_OPTION *head) { DHCPOptionFree(head); }
};
using option_list = owner<options_kind>;

/**
 * Reads the options of a fragment in the order of its lines. A line that is none of a supported option is logged and
 * left out, at the caller's place; the lines of router, DNS servers and domain are left out silently.
 * @return 0; -1, logged there, when the file cannot be read or memory runs out
 */
[[nodiscard]] int read_options(const place &at, const char *path, option_list &options);

} // namespace kova
