/**
 * @file
 * What a shell may offer for the word at the cursor.
 */
#pragma once

#include <CLI/CLI.hpp>
#include <string>
#include <vector>

namespace kova {

/**
 * The words that fit in the place of the last of some, and begin as it does: commands, options, interface names and the
 * fixed choices of a command's words.
 * @param app    the command line, described
 * @param words  what follows the program's name; the last one may be empty
 */
std::vector<std::string> completions(const CLI::App &app, const std::vector<std::string> &words);

} // namespace kova
