#include <kovanetsdk/dhcp.h>

#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"
#include "dhcp/dhcpd_files.h"

#include <cstring>

using namespace kova;

namespace {

/** Whether a file's name is "<prefix><anything>.info"; the prefix is known to be there. */
bool is_info_file(const char *name, const char *prefix) {
    constexpr char kEnding[] = ".info";
    const size_t length = strlen(name);
    return length >= strlen(prefix) + strlen(kEnding) && strcmp(name + length - strlen(kEnding), kEnding) == 0;
}

/** The name in "<prefix>-<name>.info", cut out of the file's; NULL when that has another form. */
const char *cut_out_name(char *file) {
    constexpr char kDelimiters[] = "-.";
    char *rest = nullptr;
    KLIBCStrTok(file, kDelimiters, &rest);
    const char *const name = KLIBCStrTok(nullptr, kDelimiters, &rest);
    const char *const ending = KLIBCStrTok(nullptr, kDelimiters, &rest);
    return ending != nullptr && strcmp(ending, "info") == 0 ? name : nullptr;
}

/** @return 1 when the file gave a name, 0 when not, -1 when the list cannot take it */
int push_name(KLIBSZLIST *list, const char *file) {
    const size_t size = strlen(file) + 1;
    const heap<char> copy{static_cast<char *>(calloc(1, size))};
    if (copy == nullptr) {
        return fail_keeping_code(HERE, 0, "calloc() failed");
    }
    memcpy(copy.get(), file, size);
    const char *const name = cut_out_name(copy.get());
    if (name == nullptr) {
        return 0;
    }
    if (KLIBCSzListPush(&list, name) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to push [%s] into interface list", name);
    }
    return 1;
}

/**
 * Lists the names that the info files of a family give. Not by the C library's pattern search, which frees memory twice
 * when it runs out of it. @return their number; -1, logged
 */
int collect_names(const char *prefix, KLIBSZLIST *files, KLIBSZLIST *names) {
    constexpr int kAnyType = 64;
    if (KLIBCFileEnumDir(kDhcpdDir, files, prefix, kAnyType) < 0) {
        return fail_keeping_code(HERE, -1, "glob() error");
    }
    int count = 0;
    for (int i = 0; const char *file = KLIBCSzListGet(files, i); ++i) {
        const int pushed = is_info_file(file, prefix) ? push_name(names, file) : 0;
        if (pushed < 0) {
            return -1;
        }
        count += pushed;
    }
    return count;
}

} // namespace

extern "C" int DHCPInterfaceListGet(KLIBSZLIST **list_inout, int type) {
    if (list_inout == nullptr) {
        return fail_keeping_code(HERE, -1, "Parameter error");
    }
    if (!is_dhcp_type(type)) {
        return fail_keeping_code(HERE, -1, "Wrong DHCPD ip type");
    }
    if (KLIBCFileCheckDir(kDhcpdDir) == 0) {
        return 0;
    }
    const string_list files = make_list();
    string_list names = make_list();
    if (!files.is_held() || !names.is_held()) {
        return fail_keeping_code(HERE, -1, "Allocate interface list failed");
    }
    const int count = collect_names(type == kTypeV4 ? "dhcpd-" : "dhcpd6-", files.get(), names.get());
    if (count > 0) {
        const string_list old{*list_inout};
        *list_inout = names.give_up();
    }
    return count;
}
