/**
 * @file
 * The DHCP server's directory and the files in it.
 */
#pragma once

#include "core/guards.h"
#include "core/report.h"

namespace kova {

inline constexpr char kDhcpdDir[] = "/etc/dhcpd";

/** Makes the directory when it is missing. @return 0; -1, logged as the caller */
[[nodiscard]] int make_dhcpd_dir(const place &at);

/** Whether a text can stand in a line of a fragment: no control character, the line's end above all. */
bool is_line_text(const char *text);

/** Whether a text can be one of the fields that "," separates in such a line: not empty either. */
bool is_line_field(const char *text);

/** Room for a line of a fragment; readers cut longer ones. */
inline constexpr int kLineRoom = 1024;

/** The next line without its newline, cut to the room; what is beyond is passed over. @return false at the end */
bool next_cut_line(const stream &file, char (&line)[kLineRoom]);

} // namespace kova
