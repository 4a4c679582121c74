#include "words.h"

#include <algorithm>
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

} // namespace kova
