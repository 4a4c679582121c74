#include "words.h"

#include "errors.h"

#include <algorithm>
#include <charconv>
#include <numeric>
#include <utility>

namespace kova {
namespace {

/** Number of letters to change, add or leave out to get from one word to the other. */
size_t distance(const std::string &from, const std::string &to) {
    std::vector<size_t> row(to.size() + 1);
    std::iota(row.begin(), row.end(), 0U);
    for (size_t i = 1; i <= from.size(); ++i) {
        size_t diagonal = std::exchange(row[0], i);
        for (size_t j = 1; j <= to.size(); ++j) {
            const size_t changed = diagonal + (from[i - 1] == to[j - 1] ? 0 : 1);
            diagonal = std::exchange(row[j], std::min({changed, row[j] + 1, row[j - 1] + 1}));
        }
    }
    return row.back();
}

} // namespace

std::string suggestion(const std::string &word, const std::vector<std::string> &names) {
    constexpr size_t kClose = 2;
    const auto nearest = std::min_element(names.begin(), names.end(), [&word](const auto &one, const auto &other) {
        return distance(word, one) < distance(word, other);
    });
    const bool is_close = nearest != names.end() && distance(word, *nearest) <= kClose;
    return is_close ? "; did you mean " + *nearest + "?" : "";
}

CLI::Validator choice(const std::vector<std::string> &names) {
    const std::string all = CLI::detail::join(names, ", ");
    const auto complaint = [names, all](const std::string &word) {
        const bool is_known = std::find(names.begin(), names.end(), word) != names.end();
        return is_known ? "" : "\"" + word + "\" is none of " + all + suggestion(word, names);
    };
    return {complaint, "{" + CLI::detail::join(names, ",") + "}"};
}

CLI::Validator keyword_before(const std::string &word, const std::string &value_name) {
    const auto complaint = [word, value_name](const std::string &given) {
        return given == word ? "" : "\"" + given + "\" is not expected here: write " + word + " " + value_name;
    };
    return {complaint, "{" + word + "}"};
}

std::optional<int64_t> decimal_in(const std::string &text, int64_t least, int64_t most) {
    int64_t number = 0;
    const char *const end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, number);
    const bool is_valid = error == std::errc{} && stop == end && number >= least && number <= most;
    return is_valid ? std::optional{number} : std::nullopt;
}

int64_t number_within(const char *kind, const std::string &text, int64_t least, int64_t most) {
    if (const std::optional<int64_t> number = decimal_in(text, least, most)) {
        return *number;
    }
    throw failure{kNo, std::string(kind) + " \"" + text + "\" is not valid: it is a number from " +
                           std::to_string(least) + " to " + std::to_string(most)};
}

CLI::Option &add_words(CLI::App &command, const char *name, std::vector<std::string> &words,
                       const std::string &description) {
    constexpr int kAnyNumber = CLI::detail::expected_max_vector_size;
    // what may be repeated without end is split at brackets, what is expected that often is not; any number is taken
    return *command.add_option(name, words, description)
                ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll)
                ->expected(kAnyNumber, kAnyNumber)
                ->allow_extra_args(false);
}

} // namespace kova
