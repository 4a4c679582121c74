/**
 * @file
 * The help of the commands: no line wider than a terminal, and the examples of what was asked for.
 */
#pragma once

#include <CLI/CLI.hpp>
#include <string>

namespace kova {

/** A command with the words before it, "kovanet card set". */
std::string whole_name(const CLI::App &command);

/**
 * The lines of examples, "  kovanet ..." and their deeper indented continuations, that begin with a command.
 *
 * @param examples lines with newlines between them
 */
std::string examples_of(const std::string &command, const std::string &examples);

/** Lines of words with no more than 79 columns; the second and later ones are indented. */
std::string wrapped(const std::string &text, size_t indent);

class help_format : public CLI::Formatter {
public:
    help_format();
    std::string make_usage(const CLI::App *app, std::string name) const override;
    std::string make_help(const CLI::App *app, std::string name, CLI::AppFormatMode mode) const override;
    std::string make_option(const CLI::Option *option, bool is_positional) const override;
    std::string make_subcommand(const CLI::App *command) const override;
    std::string make_option_opts(const CLI::Option *option) const override;
    std::string make_footer(const CLI::App *app) const override;
};

} // namespace kova
