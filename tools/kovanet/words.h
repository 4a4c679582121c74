/**
 * @file
 * Words of the command line that are not known, and which ones may have been meant.
 */
#pragma once

#include <CLI/CLI.hpp>
#include <string>
#include <vector>

namespace kova {

/** "; did you mean NAME?" when one of the names is close to a word, else nothing. */
std::string suggestion(const std::string &word, const std::vector<std::string> &names);

/** Refuses a word that is none of some. */
CLI::Validator choice(const std::vector<std::string> &names);

/** Refuses what is no decimal number within limits. */
CLI::Validator number_from(int least, int most);

/** Refuses what is not the word before a value. */
CLI::Validator keyword_before(const std::string &word, const std::string &value_name);

/**
 * A word that stands before a value, as in "mask MASK". The help tells only of the value.
 *
 * @param keyword  what was given of the word: empty, or the word
 */
template<typename Value>
void add_keyword(CLI::App &command, const std::string &word, std::string &keyword, const std::string &value_name,
                 Value &value, const std::string &description) {
    CLI::Option *const key = command.add_option(word, keyword)->check(keyword_before(word, value_name))->group("");
    key->needs(command.add_option(value_name, value, description));
}

} // namespace kova
