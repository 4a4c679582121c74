/**
 * @file
 * Passwords: read from a file, an open descriptor or a prompt; never from the command line, and never shown.
 */
#pragma once

#include <CLI/CLI.hpp>
#include <cstddef>
#include <cstring>
#include <optional>
#include <string>

namespace kova {

/** Where the command line says that the password is; a terminal is asked when it says nothing. */
struct password_words {
    std::optional<std::string> file;
    std::optional<std::string> fd;
    bool is_kept = false;
};

/** Adds --password-file, --password-fd and --keep-password; a password among the words is refused unseen. */
void add_password(CLI::App &command, password_words &words);

/**
 * Fills a field of a record with the password, one line without its end, or keeps the stored one. Ends the program when
 * there is none to be had or to be kept, when it is empty or does not fit, or when it holds a control character or is
 * no single line.
 * @param field  holds the stored password, NUL-terminated; size is its size
 */
void read_password(const password_words &words, char *field, size_t size);

template<size_t Size> void read_password(const password_words &words, char (&field)[Size]) {
    read_password(words, field, Size);
}

/** A record with a password, wiped when it goes. */
template<typename Record> class secret_record {
public:
    secret_record() = default;
    secret_record(const secret_record &) = delete;
    secret_record &operator=(const secret_record &) = delete;
    ~secret_record() { explicit_bzero(&record_, sizeof record_); }
    Record &operator*() { return record_; }
    Record *operator->() { return &record_; }

private:
    Record record_{};
};

} // namespace kova
