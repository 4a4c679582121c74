/**
 * @file
 * What a process tells another through a pipe: texts of any content.
 */
#pragma once

#include "support/rig.h"

#include <iosfwd>

namespace kova_test {

void write_texts(std::ostream &out, const texts &lines);
texts read_texts(std::istream &in);

/** Writes all of it, or ends the process. */
void send(int fd, const std::string &text);
/** Reads until every other end is closed. */
std::string receive(int fd);

} // namespace kova_test
