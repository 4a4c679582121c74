/**
 * @file
 * What the key/value files of the appliance say.
 */
#pragma once

#include <string>
#include <vector>

namespace kova {

/** The value of a key, "" without it or without the file. Ends the program when it cannot be read. */
std::string stored_value(const std::string &file, const std::string &key);

/** Ends the program for a file that is there and cannot be read: some calls of the library take that for a "no". */
void require_readable(const std::string &file);

/** The names in a folder, in no order; none without the folder. Ends the program when it cannot be read. */
std::vector<std::string> names_in(const std::string &folder);

} // namespace kova
