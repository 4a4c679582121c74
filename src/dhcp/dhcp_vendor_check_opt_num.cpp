#include <kovanetsdk/dhcp.h>

#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"
#include "dhcp/dhcpd_files.h"
#include "dhcp/fragment.h"

#include <cstring>

using namespace kova;

namespace {

constexpr char kFragment[] = "/etc/dhcpd/dhcpd-vendor.conf";
constexpr char kPrefix[] = "dhcp-option=vendor:";
constexpr int kLastNumber = 254;
constexpr char kUnreadable[] = "Failed to read DHCP vendor config";

// flags of the platform's line operations
constexpr int kWholeField = 1026;
constexpr int kAppendOfSet = 512;
constexpr int kAppendOfOption = 0;

/** A line of the fragment, or the beginning of one. */
using line_text = built_text<kLineRoom>;

const char *shown(const char *text) {
    return text == nullptr ? "" : text;
}

bool is_number(int number) {
    return number >= 1 && number <= kLastNumber;
}

struct vendor_option {
    char number[kLineRoom];
    char value[kLineRoom];
};

/** Takes a line apart; logs what is wrong with it. */
int parse_line(const char *line, vendor_option &option) {
    if (strncmp(line, kPrefix, strlen(kPrefix)) != 0) {
        return fail_keeping_code(HERE, -1, "vendor opt line [%s] has wrong format", line);
    }
    const string_list fields = make_list();
    if (!fields.is_held() || split_fields(line, ",", fields.get()) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to alloc memory when parse vendor opt line [%s]", line);
    }
    if (fields.get()->nItem != 3) {
        return fail_keeping_code(HERE, -1, "vendor opt line [%s] has wrong format", line);
    }
    copy_text(option.number, KLIBCSzListGet(fields.get(), 1));
    copy_text(option.value, KLIBCSzListGet(fields.get(), 2));
    option.value[strcspn(option.value, "\r")] = '\0'; // the line may have been written elsewhere
    if (DHCPVendorCheckOptNum(option.number) == 0) {
        return fail_keeping_code(HERE, -1, "Wrong option number [%s]", option.number);
    }
    return 0;
}

line_text option_line(const char *vendor, const char *number, const char *value) {
    return line_text{"dhcp-option=vendor:%s,%s,%s", vendor, number, value};
}

/** Whether a vendor class and a value make one line that can be read whole. */
bool can_be_stored(const char *vendor, const char *number, const char *value) {
    return is_line_text(vendor) && strchr(vendor, ',') == nullptr && is_line_text(value) &&
           option_line(vendor, number, value).fits();
}

int append_option(const char *vendor, const char *number, const char *value, int flags) {
    return KLIBCFileAddLine(kFragment, nullptr, option_line(vendor, number, value).c_str(), flags);
}

/** Removes the lines that begin with a text and go on with "," or end there. */
int remove_lines(const line_text &beginning) {
    return KLIBCFileExist(kFragment) == 1 ? KLIBCFileRemoveKey(kFragment, beginning.c_str()) : 0;
}

/** Whether all values of a map can be stored; the numbers are looked at when they are written. */
bool can_be_stored(const char *vendor, const KLIBSZHASH *options, const KLIBSZLIST *numbers) {
    const char *number = nullptr;
    for (int i = 0; (number = KLIBCSzListGet(numbers, i)) != nullptr; ++i) {
        const char *const value = KLIBCSzHashGetValue(options, number);
        if (value != nullptr && !can_be_stored(vendor, number, value)) {
            return false;
        }
    }
    return true;
}

int append_options(const char *vendor, const KLIBSZHASH *options, const KLIBSZLIST *numbers) {
    const char *number = nullptr;
    for (int i = 0; (number = KLIBCSzListGet(numbers, i)) != nullptr; ++i) {
        const char *const value = KLIBCSzHashGetValue(options, number);
        if (value == nullptr) {
            return fail_keeping_code(HERE, -1, "Failed to set vendor [%s] option, hash error", vendor);
        }
        if (DHCPVendorCheckOptNum(number) == 0) {
            return fail_keeping_code(HERE, -1, "Failed to set vendor [%s] option, Wrong option number [%s]", vendor,
                                     number);
        }
        const int result = append_option(vendor, number, value, kAppendOfSet);
        if (result < 0) {
            return fail_keeping_code(HERE, result, "Faild to set vendor [%s] option: KLIBCFileAddLine() erorr", vendor);
        }
    }
    return 0;
}

/** @return 0; -1, logged, when a file that was read to its end was not readable to its end */
int fail_unless_read(const stream &file) {
    return ferror(file.get()) == 0 ? 0 : fail_keeping_code(HERE, -1, kUnreadable);
}

/** Adds the vendor class that a line is about to a list, unless it is there. */
int add_vendor(const char *line, KLIBSZLIST **vendors) {
    char vendor[kLineRoom];
    if (sscanf(line, "%*[^:]:%1023[^,],%*s", vendor) != 1) {
        log_warning(HERE, "wrong format [%s] in DHCP vendor config", line); // passed over
        return 0;
    }
    if (KLIBCSzListFind(*vendors, vendor) >= 0 || KLIBCSzListPush(vendors, vendor) >= 0) {
        return 0;
    }
    return fail_keeping_code(HERE, -1, "Failed to add vendor [%s] to list", vendor);
}

} // namespace

extern "C" int DHCPVendorCheckOptNum(const char *text) {
    if (text == nullptr || *text == '\0' || text[strspn(text, "0123456789")] != '\0') {
        return 0;
    }
    const unsigned long number = strtoul(text, nullptr, 10);
    return number >= 1 && number <= kLastNumber ? 1 : 0;
}

extern "C" int DHCPVendorGetVendor(const char *vendor, KLIBSZHASH **options) {
    if (vendor == nullptr || options == nullptr || *options == nullptr) {
        log_err(HERE, "Failed to get vendor option: parameter error"); // and goes on
    }
    if (KLIBCFileExist(kFragment) == 0) {
        return 0;
    }
    const stream file{fopen(kFragment, "re")};
    if (!file.is_held()) {
        return fail_keeping_code(HERE, -1, kUnreadable);
    }
    const line_text wanted{"%s%s,", kPrefix, shown(vendor)};
    char line[kLineRoom];
    const bool can_be_there = vendor != nullptr && wanted.fits() && strchr(vendor, ',') == nullptr;
    while (can_be_there && next_cut_line(file, line)) {
        if (strstr(line, wanted.c_str()) == nullptr) {
            continue;
        }
        vendor_option option;
        if (parse_line(line, option) < 0) {
            return -1;
        }
        const int result = KLIBCSzHashSetValue(options == nullptr ? nullptr : *options, option.number, option.value);
        if (result < 0) {
            return fail_keeping_code(HERE, result, "Failed to get vendor option: generate vendor hash error");
        }
    }
    return fail_unless_read(file);
}

extern "C" int DHCPVendorGetVendorOpt(const char *vendor, int number, char *value, unsigned int size) {
    if (*shown(vendor) == '\0' || value == nullptr || !is_number(number)) {
        return fail_keeping_code(HERE, -1, "get vendor [%s] option [#%d] failed: wrong input format", shown(vendor),
                                 number);
    }
    const line_text wanted{"%s%s,%d", kPrefix, vendor, number};
    if (KLIBCFileExist(kFragment) == 0 || !wanted.fits() || strchr(vendor, ',') != nullptr) { // none could be stored
        return 0;
    }
    char line[kLineRoom];
    const int found = KLIBCFileGetLine(kFragment, wanted.c_str(), line, sizeof line, kWholeField);
    if (found < 0) {
        return fail_keeping_code(HERE, -1, "KLIBCFileGetLine() failed");
    }
    if (found == 0) {
        log_debug(HERE, "No match [%s] line in DHCP vendor config", wanted.c_str());
        return 0;
    }
    if (size == 0) {
        return fail_keeping_code(HERE, -1, "Failed to parse vendor opt line [%s], parameter error", line);
    }
    vendor_option option;
    if (parse_line(line, option) < 0) {
        return -1;
    }
    snprintf(value, size, "%s", option.value);
    return 1;
}

extern "C" int DHCPVendorSetVendor(const char *vendor, KLIBSZHASH *options) {
    if (*shown(vendor) == '\0' || options == nullptr) {
        return fail_keeping_code(HERE, -1, "Failed to set vendor [%s] option: parameter error", shown(vendor));
    }
    const string_list numbers = make_list();
    if (!numbers.is_held()) {
        return fail_keeping_code(HERE, -1, "Failed to set vendor [%s] option: KLIBCSzListAlloc() error", vendor);
    }
    const int keys = KLIBCSzHashEnumKey(options, numbers.get());
    if (keys < 0) {
        return fail_keeping_code(HERE, keys, "Failed to set vendor [%s] option: KLIBCSzHashEnumKey() error", vendor);
    }
    if (!can_be_stored(vendor, "", "") || !can_be_stored(vendor, options, numbers.get())) {
        return fail_keeping_code(HERE, -1, "Failed to set vendor [%s] option: parameter error", vendor);
    }
    if (!make_dhcpd_dir(HERE)) {
        return -1;
    }
    if (remove_lines(line_text{"%s%s", kPrefix, vendor}) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to set vendor [%s] option: remove old config", vendor);
    }
    return append_options(vendor, options, numbers.get());
}

extern "C" int DHCPVendorSetVendorOpt(const char *vendor, int number, const char *value) {
    if (*shown(vendor) == '\0' || *shown(value) == '\0' || !is_number(number)) {
        log_err(HERE, "Failed to set vendor [%s] option [#%d]: parameter error", shown(vendor), number); // and goes on
    }
    const built_text<16> digits{"%d", number};
    if (!can_be_stored(shown(vendor), digits.c_str(), shown(value))) {
        return fail_keeping_code(HERE, -1, "Failed to set vendor [%s] option [#%d]: parameter error", shown(vendor),
                                 number);
    }
    if (!make_dhcpd_dir(HERE)) {
        return -1;
    }
    if (remove_lines(line_text{"%s%s,%d", kPrefix, shown(vendor), number}) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to set vendor [%s] option [#%d]: remove old config", shown(vendor),
                                 number);
    }
    const int result = append_option(shown(vendor), digits.c_str(), shown(value), kAppendOfOption);
    return result >= 0
               ? 0
               : fail_keeping_code(HERE, result, "Faild to set vendor [%s] option [#%d]: KLIBCFileAddLine() erorr",
                                   shown(vendor), number);
}

extern "C" int DHCPVendorEnum(KLIBSZLIST **vendors) {
    if (vendors == nullptr || *vendors == nullptr) {
        return fail_keeping_code(HERE, -1, "Failed to enum vendors: parameter error");
    }
    if (KLIBCFileExist(kFragment) == 0) {
        return 0;
    }
    const stream file{fopen(kFragment, "re")};
    if (!file.is_held()) {
        return fail_keeping_code(HERE, -1, kUnreadable);
    }
    char line[kLineRoom];
    while (next_cut_line(file, line)) {
        if (strstr(line, kPrefix) != nullptr && add_vendor(line, vendors) < 0) {
            return -1;
        }
    }
    return fail_unless_read(file);
}
