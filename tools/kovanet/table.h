/**
 * @file
 * Output: the same rows as a table for people or as JSON for programs.
 */
#pragma once

#include <nlohmann/json.hpp>
#include <span>
#include <string>

namespace kova {

/** Fields keep the order in which they were set. */
using json = nlohmann::ordered_json;

/** One column of a table: its title and how a row shows in it. */
struct column {
    const char *title;
    std::string (*text)(const json &row);
    bool is_number = false; /**< aligned to the right */
};

/** A field as a table shows it, "-" when it is null or absent. */
std::string field(const json &row, const char *key);

/** The same of a field that is an array of texts, with blanks between them. */
std::string words_field(const json &row, const char *key);
/** The field "up" of an interface. */
std::string up_field(const json &row);

/** Rows as an aligned table with a header line; returns the number of lines. */
int print_table(const json &rows, std::span<const column> columns);
/** One record as "title: text" lines. */
void print_record(const json &record, std::span<const column> columns);
/** A value as one line of JSON. */
void print_json(const json &value);
/** Rows as JSON or as a table, a record as JSON or as lines: whichever is asked for. */
void show_table(const json &rows, std::span<const column> columns, bool as_json);
void show_record(const json &record, std::span<const column> columns, bool as_json);

/** Text for standard output without the control characters that an interface name may hold. */
std::string printable(std::string text);

/** Ends the program when standard output did not take everything. */
void flush_output();

/** A note on a terminal while a long step runs; gone when the step is over. */
class step_note {
public:
    explicit step_note(const std::string &text);
    step_note(const step_note &) = delete;
    step_note &operator=(const step_note &) = delete;
    ~step_note();

private:
    bool shown_;
};

} // namespace kova
