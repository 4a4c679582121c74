/**
 * @file
 * Words of the command line that are not known, and which ones may have been meant.
 */
#pragma once

#include <string>
#include <vector>

namespace kova {

/** "; did you mean NAME?" when one of the names is close to a word, else nothing. */
std::string suggestion(const std::string &word, const std::vector<std::string> &names);

} // namespace kova
