#include "completion.h"

#include "interfaces.h"

#include <algorithm>
#include <kovanetsdk/link.h>

namespace kova {
namespace {

using texts = std::vector<std::string>;

bool is_interface_word(const std::string &word) {
    static const texts kWords{"IF", "BOND", "BRIDGE", "PRIMARY", "OLD"};
    return std::find(kWords.begin(), kWords.end(), word) != kWords.end();
}

/** Whether a shell takes a name for nothing else: what is offered is put on its command line as it is. */
bool is_plain(const std::string &name) {
    const auto is_part = [](unsigned char c) {
        return isalnum(c) != 0 || c == '-' || c == '_' || c == '.' || c == '@';
    };
    return !name.starts_with('-') && std::all_of(name.begin(), name.end(), is_part);
}

void add_interfaces(texts &candidates) {
    for (const NETSTAT &stat : all_counters()) {
        if (is_plain(stat.szIfname)) {
            candidates.emplace_back(stat.szIfname);
        }
    }
}

void add_bond_modes(texts &candidates) {
    for (int mode = KOVA_LINK_AGGR_BALANCE_ALB; mode <= KOVA_LINK_AGGR_BALANCE_RR; ++mode) {
        candidates.emplace_back(KOVANetLinkAggrModeToString(mode));
    }
}

/** What one word of a help text stands for: "IF", or a choice as it is typed. */
void add_choices_of(const std::string &word, texts &candidates) {
    if (is_interface_word(word)) {
        add_interfaces(candidates);
    } else if (word == "MODE") {
        add_bond_modes(candidates);
    } else if (word.find_first_of("ABCDEFGHIJKLMNOPQRSTUVWXYZ/[]{}") == std::string::npos) {
        candidates.push_back(word);
    }
}

/** The choices of a word: those of its name ("static|dhcp"), and those it is checked against ("TEXT:{4,6}"). */
void add_choices(const CLI::Option &option, texts &candidates) {
    for (const std::string &part : CLI::detail::split(option.get_single_name(), ' ')) {
        for (const std::string &word : CLI::detail::split(part, '|')) {
            add_choices_of(word, candidates);
        }
    }
    const std::string checks = option.get_type_name();
    const size_t from = checks.find('{');
    const size_t to = checks.find('}', from);
    if (from != std::string::npos && to != std::string::npos) {
        for (const std::string &word : CLI::detail::split(checks.substr(from + 1, to - from - 1), ',')) {
            candidates.push_back(word);
        }
    }
}

/** The word of a command that comes after some others; the last one may be repeated. */
const CLI::Option *word_after(const CLI::App &command, size_t count) {
    const CLI::Option *last = nullptr;
    size_t at = 0;
    for (const CLI::Option *option : command.get_options()) {
        if (!option->get_positional()) {
            continue;
        }
        last = option;
        if (at++ == count) {
            return option;
        }
    }
    return last != nullptr && last->get_items_expected_max() > 1 ? last : nullptr;
}

void add_options(const CLI::App &command, texts &candidates) {
    for (const CLI::App *at = &command; at != nullptr; at = at->get_parent()) {
        for (const CLI::Option *option : at->get_options()) {
            if (!option->get_positional()) {
                candidates.push_back(option->get_name());
            }
        }
    }
}

/** Whether the word behind an option is its value. */
bool takes_value(const CLI::App &command, const std::string &option) {
    for (const CLI::App *at = &command; at != nullptr; at = at->get_parent()) {
        if (const CLI::Option *const found = at->get_option_no_throw(option)) {
            return found->get_items_expected_min() > 0;
        }
    }
    return false;
}

} // namespace

std::vector<std::string> completions(const CLI::App &app, const std::vector<std::string> &words) {
    const std::string begun = words.empty() ? "" : words.back();
    const auto all = [](const CLI::App *) { return true; };
    const CLI::App *command = &app;
    size_t count = 0; // of the command's words that are there
    for (size_t i = 0; i + 1 < words.size(); ++i) {
        const auto below = command->get_subcommands(all);
        const auto found = std::find_if(below.begin(), below.end(),
                                        [&](const CLI::App *each) { return each->get_name() == words[i]; });
        if (found != below.end()) {
            command = *found;
            count = 0;
        } else if (words[i].starts_with('-')) {
            i += takes_value(*command, words[i]) ? 1 : 0;
        } else {
            if (!below.empty()) {
                return {}; // no such command
            }
            ++count;
        }
    }
    texts candidates;
    if (begun.starts_with('-')) {
        add_options(*command, candidates);
    } else {
        for (const CLI::App *below : command->get_subcommands(all)) {
            candidates.push_back(below->get_name());
        }
        if (const CLI::Option *const word = word_after(*command, count)) {
            add_choices(*word, candidates);
        }
    }
    std::sort(candidates.begin(), candidates.end());
    candidates.erase(std::unique(candidates.begin(), candidates.end()), candidates.end());
    std::erase_if(candidates, [&begun](const std::string &each) { return !each.starts_with(begun); });
    return candidates;
}

} // namespace kova
