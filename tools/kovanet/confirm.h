/**
 * @file
 * Changes that take addresses away from interfaces: said before, and done only when that is wanted.
 */
#pragma once

#include <CLI/CLI.hpp>
#include <string>
#include <vector>

namespace kova {

/** Adds the option --yes, which answers the question beforehand. */
void add_yes(CLI::App &command, bool &is_confirmed);

/**
 * Says on the terminal what a change will do and asks for it. Ends the program when the answer is not yes, and when
 * there is neither a terminal to ask on nor --yes.
 */
void confirm(const std::vector<std::string> &effects, bool is_confirmed);

} // namespace kova
