#include "table.h"

#include "errors.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <unistd.h>
#include <vector>

namespace kova {
namespace {

bool has_colour() {
    const char *no_color = getenv("NO_COLOR");
    const char *term = getenv("TERM");
    return isatty(STDOUT_FILENO) == 1 && (no_color == nullptr || *no_color == '\0') && term != nullptr &&
           strcmp(term, "dumb") != 0;
}

/** What goes around a cell; state words carry the colour. */
const char *colour_of(const std::string &text) {
    if (text == "up" || text == "on") {
        return "\033[32m";
    }
    return text == "down" ? "\033[31m" : nullptr;
}

void put(const std::string &text, bool colour) {
    const char *code = colour ? colour_of(text) : nullptr;
    if (code != nullptr) {
        fputs(code, stdout);
    }
    fputs(text.c_str(), stdout);
    if (code != nullptr) {
        fputs("\033[0m", stdout);
    }
}

void put_blanks(size_t count) {
    for (; count > 0; --count) {
        putchar(' ');
    }
}

/** Puts one line of a table, without blanks at its end. */
void put_line(const std::vector<std::string> &cells, const std::vector<size_t> &widths, std::span<const column> columns,
              bool colour) {
    for (size_t i = 0; i < cells.size(); ++i) {
        const size_t missing = widths[i] - cells[i].size();
        put_blanks(i > 0 ? 2 : 0);
        put_blanks(columns[i].is_number ? missing : 0);
        put(cells[i], colour);
        put_blanks(!columns[i].is_number && i + 1 < cells.size() ? missing : 0);
    }
    putchar('\n');
}

/** Bytes of the UTF-8 character at a place, 1 as well for a byte that begins none. */
size_t character_length(const std::string &text, size_t at) {
    const auto first = static_cast<unsigned char>(text[at]);
    const size_t length = first >= 0xf0 ? 4 : first >= 0xe0 ? 3 : first >= 0xc2 ? 2 : 1;
    for (size_t i = at + 1; i < at + length; ++i) {
        if (i >= text.size() || (static_cast<unsigned char>(text[i]) & 0xc0) != 0x80) {
            return 1;
        }
    }
    return length;
}

/** Whether a terminal may take a character for a command: also those that a byte above 127 alone may be. */
bool is_control(const std::string &text, size_t at, size_t length) {
    const auto first = static_cast<unsigned char>(text[at]);
    if (length == 1) {
        return first < 0x20 || first > 0x7e;
    }
    return first == 0xc2 && static_cast<unsigned char>(text[at + 1]) < 0xa0;
}

} // namespace

std::string field(const json &row, const char *key) {
    const auto found = row.find(key);
    if (found == row.end() || found->is_null()) {
        return "-";
    }
    return printable(found->is_string() ? found->get<std::string>() : found->dump());
}

std::string words_field(const json &row, const char *key) {
    std::string line;
    for (const json &word : row.value(key, json::array())) {
        line += (line.empty() ? "" : " ") + printable(word.get<std::string>());
    }
    return line.empty() ? "-" : line;
}

std::string up_field(const json &row) {
    return row["up"] == true ? "up" : "down";
}

int print_table(const json &rows, std::span<const column> columns) {
    std::vector<std::vector<std::string>> lines(1);
    for (const column &one : columns) {
        lines[0].emplace_back(one.title);
    }
    for (const json &row : rows) {
        std::vector<std::string> &cells = lines.emplace_back();
        for (const column &one : columns) {
            cells.push_back(one.text(row));
        }
    }
    std::vector<size_t> widths(columns.size());
    for (const auto &cells : lines) {
        for (size_t i = 0; i < cells.size(); ++i) {
            widths[i] = std::max(widths[i], cells[i].size());
        }
    }
    const bool colour = has_colour();
    for (const auto &cells : lines) {
        put_line(cells, widths, columns, colour && &cells != &lines[0]);
    }
    return static_cast<int>(lines.size());
}

void print_record(const json &record, std::span<const column> columns) {
    size_t width = 0;
    for (const column &one : columns) {
        width = std::max(width, strlen(one.title));
    }
    const bool colour = has_colour();
    for (const column &one : columns) {
        fputs(one.title, stdout);
        putchar(':');
        put_blanks(width - strlen(one.title) + 1);
        put(one.text(record), colour);
        putchar('\n');
    }
}

void print_json(const json &value) {
    fputs(value.dump(-1, ' ', false, json::error_handler_t::replace).c_str(), stdout);
    putchar('\n');
}

void show_table(const json &rows, std::span<const column> columns, bool as_json) {
    if (as_json) {
        print_json(rows);
    } else {
        print_table(rows, columns);
    }
}

void show_record(const json &record, std::span<const column> columns, bool as_json) {
    if (as_json) {
        print_json(record);
    } else {
        print_record(record, columns);
    }
}

std::string printable(std::string text) {
    for (size_t at = 0; at < text.size(); ++at) {
        const size_t length = character_length(text, at);
        if (is_control(text, at, length)) {
            text.replace(at, length, "?");
        } else {
            at += length - 1;
        }
    }
    return text;
}

void flush_output() {
    if (fflush(stdout) != 0 || ferror(stdout) != 0) {
        throw failure{kCallFailed, textf("cannot write the output: %s", strerror(errno))};
    }
}

step_note::step_note(const std::string &text) : shown_(isatty(STDERR_FILENO) == 1) {
    if (shown_) {
        fprintf(stderr, "%s ...", printable(text).c_str());
    }
}

step_note::~step_note() {
    if (shown_) {
        fputs("\r\033[K", stderr);
    }
}

} // namespace kova
