/** @file What string_view's own members do through a thrower, which must not be linked. */
#ifndef KOVA_PLATFORM_VIEWS_H
#define KOVA_PLATFORM_VIEWS_H

#include <cstring>
#include <string_view>

namespace kova {

inline bool begins_with(std::string_view text, std::string_view beginning) {
    return text.size() >= beginning.size() && memcmp(text.data(), beginning.data(), beginning.size()) == 0;
}

inline bool ends_in(std::string_view text, std::string_view end) {
    return text.size() >= end.size() && memcmp(text.data() + text.size() - end.size(), end.data(), end.size()) == 0;
}

} // namespace kova

#endif
