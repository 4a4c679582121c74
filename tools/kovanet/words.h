/**
 * @file
 * Words of the command line: those that are not known, numbers, and words that may be repeated.
 */
#pragma once

#include <CLI/CLI.hpp>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace kova {

/** "; did you mean NAME?" when one of the names is close to a word, else nothing. */
std::string suggestion(const std::string &word, const std::vector<std::string> &names);

/** Refuses a word that is none of some. */
CLI::Validator choice(const std::vector<std::string> &names);

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

/** A decimal number within its limits, nothing for any other text. */
std::optional<int64_t> decimal_in(const std::string &text, int64_t least, int64_t most);
/** The same of a kind, such as "port"; ends the program for any other text. */
int64_t number_within(const char *kind, const std::string &text, int64_t least, int64_t most);

/** Adds a word that may be repeated. Each one is kept as it is typed; CLI11 alone would take "[one,two]" for two. */
CLI::Option &add_words(CLI::App &command, const char *name, std::vector<std::string> &words,
                       const std::string &description);

} // namespace kova
