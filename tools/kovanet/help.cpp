#include "help.h"

#include <sstream>

namespace kova {
namespace {

constexpr size_t kWidth = 79;
constexpr size_t kColumn = 24; // where descriptions begin

/** A name, and at the column its description; a long name has its description on the next line. */
std::string described(const std::string &name, const std::string &description) {
    std::string line = "  " + name;
    if (description.empty()) {
        return line + "\n";
    }
    if (line.size() + 2 > kColumn) {
        line += "\n";
        line.append(kColumn, ' ');
    } else {
        line.resize(kColumn, ' ');
    }
    const std::string padding(kColumn, ' ');
    return line + wrapped(padding + description, kColumn).erase(0, kColumn) + "\n";
}

/** In the usage a keyword and the value behind it are one: "[mask MASK]". */
std::string joined_keywords(const CLI::App &app, std::string usage) {
    for (const CLI::Option *option : app.get_options()) {
        if (option->get_positional() && option->get_group().empty()) {
            constexpr char kHidden[] = "[] [";
            usage.replace(usage.find(kHidden), sizeof kHidden - 1, "[" + option->get_single_name() + " ");
        }
    }
    return usage;
}

} // namespace

std::string whole_name(const CLI::App &command) {
    const CLI::App *const parent = command.get_parent();
    return parent == nullptr ? command.get_name() : whole_name(*parent) + " " + command.get_name();
}

std::string examples_of(const std::string &command, const std::string &examples) {
    std::istringstream lines(examples);
    std::string found;
    bool is_wanted = false;
    for (std::string line; std::getline(lines, line);) {
        if (!line.starts_with("    ")) {
            is_wanted = (line + " ").starts_with("  " + command + " ");
        }
        found += is_wanted ? line + "\n" : "";
    }
    return found;
}

std::string wrapped(const std::string &text, size_t indent) {
    std::string whole;
    std::string line = text.substr(0, text.find_first_not_of(' '));
    std::istringstream words(text);
    bool is_first = true; // on its line
    for (std::string word; words >> word; is_first = false) {
        if (!is_first && line.size() + 1 + word.size() > kWidth) {
            whole += line + "\n";
            line.assign(indent, ' ');
            is_first = true;
        }
        line += (is_first ? "" : " ") + word;
    }
    return whole + line;
}

help_format::help_format() {
    label("SUBCOMMAND", "COMMAND");
    label("Positionals", "Words");
}

std::string help_format::make_usage(const CLI::App *app, std::string name) const {
    std::string usage = Formatter::make_usage(app, name);
    usage.pop_back(); // its newline
    return wrapped(joined_keywords(*app, usage), sizeof "Usage:") + "\n";
}

/** With one empty line where a hidden group makes two. */
std::string help_format::make_help(const CLI::App *app, std::string name, CLI::AppFormatMode mode) const {
    return CLI::detail::find_and_replace(Formatter::make_help(app, name, mode), "\n\n\n", "\n\n");
}

std::string help_format::make_option(const CLI::Option *option, bool is_positional) const {
    return described(make_option_name(option, is_positional) + make_option_opts(option), option->get_description());
}

std::string help_format::make_subcommand(const CLI::App *command) const {
    return described(command->get_name(), command->get_description());
}

/** The value of an option; what a word holds is told by its description. */
std::string help_format::make_option_opts(const CLI::Option *option) const {
    if (option->get_positional() || option->get_type_size() == 0) {
        return "";
    }
    if (!option->get_option_text().empty()) {
        return " " + option->get_option_text();
    }
    const std::string type = option->get_type_name();
    return " " + type.substr(0, type.find(':')); // without what it is checked for
}

/** The part of the examples that is about the command, and what is below them. */
std::string help_format::make_footer(const CLI::App *app) const {
    const std::string footer = app->get_footer();
    const size_t end = footer.find("\n\n");
    const std::string heading = footer.substr(0, footer.find('\n') + 1);
    const std::string examples = footer.substr(heading.size(), end - heading.size());
    const std::string own = app->get_parent() == nullptr ? examples + "\n" : examples_of(whole_name(*app), examples);
    return heading + own + footer.substr(end + 1) + "\n";
}

} // namespace kova
