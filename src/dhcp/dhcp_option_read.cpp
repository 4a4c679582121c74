#include "dhcp/dhcp_option.h"

#include "core/report.h"
#include "core/text.h"
#include "dhcp/fragment.h"

#include <algorithm>
#include <cstring>
#include <iterator>

namespace kova {

namespace {

constexpr char kTagged[] = "dhcp-option=tag:";
constexpr char kNamed[] = "option:";

/** Lines of a subnet that have fields of their own in its record. */
constexpr const char *kOwnFields[] = {"router", "dns-server", "domain-search", "domain-name"};

enum class outcome : unsigned char { is_option, is_no_option, is_malformed, no_memory };

/** Fills an option with one value or with the items from the third field on. */
outcome fill_value(const KLIBSZLIST *fields, const option_kind &kind, DHCP_OPTION &option) {
    if (!kind.takes_list()) {
        const char *const value = KLIBCSzListGet(fields, 2);
        if (value != nullptr) {
            copy_text(option.value, value);
        }
        return value != nullptr ? outcome::is_option : outcome::is_malformed;
    }
    option.items = KLIBCSzListAlloc(kContainerCapacity);
    if (option.items == nullptr) {
        log_err(HERE, "KLIBCSzListAlloc() Failed");
        return outcome::no_memory;
    }
    for (int i = 2; i < static_cast<int>(fields->nItem); ++i) {
        if (KLIBCSzListPush(&option.items, KLIBCSzListGet(fields, i)) < 0) {
            log_err(HERE, "KLIBCSzListPush() Failed");
            return outcome::no_memory;
        }
    }
    return outcome::is_option;
}

/** Makes an option of the fields of a line. */
outcome parse_fields(const KLIBSZLIST *fields, const char *line, option_list &option) {
    const char *const named = KLIBCSzListGet(fields, 1);
    if (named == nullptr || strncmp(named, kNamed, strlen(kNamed)) != 0) {
        log_err(HERE, "List get failed or wrong user-defined dhcp option format [%s]", line);
        return outcome::is_malformed;
    }
    const char *const name = named + strlen(kNamed);
    const auto is_name = [=](const char *own) { return strcmp(own, name) == 0; };
    if (std::any_of(std::begin(kOwnFields), std::end(kOwnFields), is_name)) {
        return outcome::is_no_option;
    }
    const option_kind &kind = option_of(name);
    if (kind.rule == option_rule::none) {
        log_err(HERE, "Unsupported dhcp option name [%s]", name);
        return outcome::is_malformed;
    }
    option = option_list{static_cast<DHCP_OPTION *>(calloc(1, sizeof(DHCP_OPTION)))};
    if (!option.is_held()) {
        log_err(HERE, "malloc failed");
        return outcome::no_memory;
    }
    option.get()->number = kind.number;
    copy_text(option.get()->name, kind.name);
    return fill_value(fields, kind, *option.get());
}

outcome parse_line(const char *line, option_list &option) {
    const string_list fields = make_list();
    if (!fields.is_held() || split_fields(line, ",", fields.get()) < 0) {
        log_err(HERE, "Failed to alloc list when get user-defined dhcp option");
        return outcome::no_memory;
    }
    const outcome parsed = parse_fields(fields.get(), line, option);
    if (parsed == outcome::is_option && !is_valid_option(*option.get())) {
        return outcome::is_malformed;
    }
    return parsed;
}

} // namespace

int read_options(const place &at, const char *path, option_list &options) {
    const stream file{fopen(path, "re")};
    if (!file.is_held()) {
        return fail_keeping_code(at, -1, "Failed to open DHCP config [%s] for reading", path);
    }
    DHCP_OPTION **end = options.out();
    char line[kLineRoom];
    while (next_cut_line(file, line)) {
        if (strncmp(line, kTagged, strlen(kTagged)) != 0) {
            continue;
        }
        option_list option;
        switch (parse_line(line, option)) {
        case outcome::is_option:
            *end = option.give_up();
            end = &(*end)->next;
            break;
        case outcome::is_no_option:
            break;
        case outcome::is_malformed:
            log_warning(at, "Wrong user-defined dhcp option format [%s]", line);
            break;
        case outcome::no_memory:
            return fail_keeping_code(at, -1, "Failed to get dhcp options from [%s]", path);
        }
    }
    return ferror(file.get()) == 0 ? 0 : fail_keeping_code(at, -1, "Failed to get dhcp options from [%s]", path);
}

} // namespace kova
