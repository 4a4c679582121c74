/**
 * @file
 * The options that an IPv4 subnet hands out beside router, name servers and domain, and what they take.
 */
#pragma once

#include "rules.h"

#include <cstdint>
#include <string>
#include <vector>

namespace kova {

enum class option_rule { number, node_type, text, address, addresses, addresses_and_masks, routes };

struct option_kind {
    int number;
    const char *name;
    option_rule rule;
    uint64_t low = 0; /**< bounds of a number */
    uint64_t high = 0;
};

/** The option of a name or number. Ends the program when there is none. */
const option_kind &require_option(const std::string &name);

/** What an option takes, in words. */
std::string takes(const option_kind &kind);

/** Values of an option, addresses and masks in plain decimal. Ends the program when they are not acceptable. */
std::vector<std::string> require_values(const option_kind &kind, const std::vector<std::string> &values);

} // namespace kova
