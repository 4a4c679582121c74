/**
 * @file
 * Fragments, the daemon's configuration in pieces: writing them line by line and finding values in them again. A line
 * is a key, "=" and fields joined by ",". Nothing here logs.
 */
#pragma once

#include "core/guards.h"
#include "core/text.h"

#include <cstring>
#include <kovanetsdk/dhcp.h>

namespace kova {

/** Keys of the lines, and names of the options that have fields of their own in a subnet's record. */
namespace daemon_key {
inline constexpr char kInterface[] = "interface";
inline constexpr char kRange[] = "dhcp-range";
inline constexpr char kOption[] = "dhcp-option";
inline constexpr char kRouter[] = "option:router";
inline constexpr char kDomainSearch[] = "option:domain-search";
inline constexpr char kDomainName[] = "option:domain-name";
inline constexpr char kDnsServer[] = "option:dns-server";
inline constexpr char kDnsServerV6[] = "option6:dns-server";
} // namespace daemon_key

/** Room for a line of a fragment: what is longer is not written, and cut by who reads it. */
inline constexpr int kLineRoom = 1024;

/** Whether a text can be part of a line: no control character in it, the line's end above all. */
[[nodiscard]] bool is_line_text(const char *text);

/** Whether a text can be one of the fields that "," separates in a line: not empty either. */
[[nodiscard]] bool is_list_field(const char *text);

/** Whether a record's field is such a text, and ends within itself. */
template<size_t Size> [[nodiscard]] bool is_line_field(const char (&field)[Size]) {
    return memchr(field, '\0', Size) != nullptr && is_line_text(field);
}

/** The same for what stands between two ",", perhaps empty. */
template<size_t Size> [[nodiscard]] bool is_range_field(const char (&field)[Size]) {
    return is_line_field(field) && strchr(field, ',') == nullptr;
}

/**
 * Whether an option for the clients with a tag is one line for the daemon and for the readers here. What is beyond
 * their room the daemon takes for the next line, which a long value could so forge.
 */
[[nodiscard]] bool is_one_line(const char *tag, const char *name, const char *value);

/**
 * A fragment, or an info file, that is written whole: emptied when opened, then filled line by line. All texts have
 * passed is_line_text. Failed writes are remembered and told by close.
 */
class fragment {
public:
    /** errno says why when it is not open. */
    explicit fragment(const path_text &path) : file_(fopen(path.c_str(), "we")) {}
    fragment() = default;
    [[nodiscard]] bool is_open() const { return file_.is_held(); }

    /** enable="yes", alone in an info file. */
    void write_enable(bool is_on);
    void write_interface(const char *ifname);
    /** A range from address to address; `mask` is the prefix length for IPv6. */
    void write_range(const char *tag, const char *start, const char *end, const char *mask, int lease_time);
    /** A range of IPv6 that is built on the addresses of an interface. */
    void write_advertised_range(const char *tag, const char *ifname, const char *mode, int lease_time);
    /** An option for the clients with a tag; `name` with its "option:". */
    void write_option(const char *tag, const char *name, const char *value);
    void write_option(const char *tag, const char *name, const char *first, const char *second);
    /** The flag that turns router advertisements on. */
    void write_enable_ra();

    /** @return whether everything was written */
    [[nodiscard]] bool close();

private:
    stream file_;
};

/** The fields of a text between ",", empty ones included. */
class comma_fields {
public:
    /** NULL is no text. */
    explicit comma_fields(const char *text);
    /** Whether there was a text, and memory for the list. */
    [[nodiscard]] bool is_held() const { return count_ >= 0; }
    [[nodiscard]] int count() const { return count_; }
    /** A field, "" past the last one and without memory for the list. */
    [[nodiscard]] const char *operator[](int index) const;

private:
    string_list list_;
    int count_;
};

/** The next line without its newline, cut to the room; what is beyond is passed over. @return false at the end */
[[nodiscard]] bool next_cut_line(const stream &file, char (&line)[kLineRoom]);

/** What looking for a line has found. */
struct found_line {
    heap<char> text; ///< without its line end; NULL when there is none
    bool is_read;    ///< whether the file could be read as far as needed, and memory was enough
};

/** The first line of a file that holds a text anywhere. */
[[nodiscard]] found_line line_holding(const path_text &path, const char *text);

/** The fields of that line, tag first; not held when there is none. */
[[nodiscard]] comma_fields fields_of_line(const path_text &path, const char *text);

/** The fields of a file's range, tag first; not held when there is none. */
[[nodiscard]] comma_fields fields_of_range(const path_text &path);

/** Room for addresses of IPv4 subnets, however long their fields are: readers cut to it. */
inline constexpr size_t kAddressRoom = 20;

/** Reads addresses, mask and lease time of an IPv4 range, each "" or 0 when missing. @return whether there is a range
 */
[[nodiscard]] bool read_v4_range(const path_text &path, DHCP_TAG_CONF &conf);

/**
 * Reads an option: the last field of the first line that holds its name.
 * @param out  receives the value, cut; untouched when there is none
 * @return 1; 0 when there is none; -1 when that cannot be told
 */
[[nodiscard]] int read_option(const path_text &path, const char *name, char *out, size_t size);

} // namespace kova
