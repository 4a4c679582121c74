#include "dhcp/dhcp_option.h"

#include "core/report.h"
#include "core/text.h"
#include "dhcp/fragment.h"

#include <charconv>
#include <cstring>
#include <kovanetsdk/addr.h>

namespace kova {

namespace {

constexpr int kLastNumber = 254;
constexpr int kFirstWithRule = 7;
constexpr int kLastWithRule = 121;
constexpr int kLongestPrefix = 32;

/** Digits only, within bounds. */
bool is_number(const char *text, uint64_t low, uint64_t high) {
    const char *const end = text + strlen(text);
    uint64_t value = 0;
    const auto [stop, error] = std::from_chars(text, end, value);
    return error == std::errc{} && stop == end && value >= low && value <= high;
}

bool is_node_type(const char *text) {
    return strlen(text) == 1 && strchr("1248", *text) != nullptr;
}

bool is_value(const option_kind &kind, const char *value) {
    switch (kind.rule) {
    case option_rule::number:
        return is_number(value, kind.low, kind.high);
    case option_rule::node_type:
        return is_node_type(value);
    case option_rule::text:
        return is_list_field(value);
    default:
        return BlKLIBIsIpAddr(value) != 0;
    }
}

bool is_address_item(char *item, int index) {
    if (BlKLIBIsIpAddr(item) == 0) {
        log_err(HERE, "wrong list %d-th value [%s], not IP", index, item);
        return false;
    }
    return true;
}

bool is_mask_item(char *item, int index) {
    if (BlKLIBIsIpMask(item) == 0) {
        log_err(HERE, "wrong list %d-th value [%s], not mask", index, item);
        return false;
    }
    return true;
}

bool is_route_address(const char *address, const char *item, int index) {
    if (BlKLIBIsIpAddr(address) == 0) {
        log_err(HERE, "wrong list %d-th value [%s], wrong IP", index, item);
        return false;
    }
    return true;
}

/** "network/bits" */
bool is_route_destination(const char *item, int index) {
    const string_list parts = make_list();
    if (!parts.is_held() || split_fields(item, "/", parts.get()) < 0) {
        log_err(HERE, "allocate list failed in check static route option");
        return false;
    }
    if (parts.get()->nItem != 2) {
        log_err(HERE, "wrong list %d-th value [%s]", index, item);
        return false;
    }
    if (!is_route_address(KLIBCSzListGet(parts.get(), 0), item, index)) {
        return false;
    }
    if (!is_number(KLIBCSzListGet(parts.get(), 1), 0, kLongestPrefix)) {
        log_err(HERE, "wrong list %d-th value [%s], wrong netmask number", index, item);
        return false;
    }
    return true;
}

bool is_item(option_rule rule, char *item, int index) {
    const bool is_second = index % 2 == 1;
    if (rule == option_rule::routes) {
        return *item != '\0' && (is_second ? is_route_address(item, item, index) : is_route_destination(item, index));
    }
    return rule == option_rule::addresses_and_masks && is_second ? is_mask_item(item, index)
                                                                 : is_address_item(item, index);
}

/** Every item is valid, and together they fit on a line. */
bool are_items(option_rule rule, const KLIBSZLIST *items) {
    if (items == nullptr) {
        log_err(HERE, "option list value is empty");
        return false;
    }
    size_t length = 0;
    for (int i = 0; i < static_cast<int>(items->nItem); ++i) {
        // a mask is put in plain decimal in its place, which is never longer
        char *const item = const_cast<char *>(KLIBCSzListGet(items, i));
        if (item == nullptr || !is_item(rule, item, i)) {
            return false;
        }
        length += strlen(item) + (i > 0 ? 1 : 0);
    }
    return length <= kLongestOption;
}

} // namespace

bool is_valid_option(const DHCP_OPTION &option) {
    char name[sizeof option.name];
    char value[sizeof option.value];
    copy_text(name, option.name);
    copy_text(value, option.value);

    if (option.number < 1 || option.number > kLastNumber) {
        log_err(HERE, "wrong DHCP option number [%d]", option.number);
        return false;
    }
    const option_kind &kind = option_of(option.number);
    if (*name == '\0' || strncmp(option.name, kind.name, sizeof option.name) != 0) {
        log_err(HERE, "wrong DHCP option number [%d]: wrong name [%s]", option.number, name);
        return false;
    }
    if (option.number < kFirstWithRule || option.number > kLastWithRule || kind.rule == option_rule::none) {
        log_err(HERE, "Not supported DHCP option [%d]", option.number);
        return false;
    }
    if (kind.takes_list()) {
        const bool valid = are_items(kind.rule, option.items);
        if (!valid) {
            log_err(HERE, "wrong DHCP option number [%d]: wrong list value", option.number);
        }
        return valid;
    }
    // a field without its end is refused, not cut
    const bool valid = memchr(option.value, '\0', sizeof option.value) != nullptr && is_value(kind, value);
    if (!valid) {
        log_err(HERE, "wrong DHCP option number [%d]: wrong string value [%s]", option.number, value);
    }
    return valid;
}

} // namespace kova
