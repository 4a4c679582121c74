#include <kovanetsdk/dhcp.h>

#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"
#include "dhcp/dhcpd_files.h"

#include <cstring>
#include <glob.h>

using namespace kova;

namespace {

/** The paths that match a pattern, sorted. */
class matches {
public:
    explicit matches(const path_text &pattern) : result_(glob(pattern.c_str(), 0, nullptr, &found_)) {}
    matches(const matches &) = delete;
    matches &operator=(const matches &) = delete;
    ~matches() { globfree(&found_); }
    /** 0, GLOB_NOMATCH, or what went wrong. */
    [[nodiscard]] int result() const { return result_; }
    [[nodiscard]] size_t count() const { return found_.gl_pathc; }
    [[nodiscard]] const char *operator[](size_t index) const { return found_.gl_pathv[index]; }

private:
    glob_t found_{};
    int result_;
};

/** The name in "<prefix>-<name>.info", cut out of the path; NULL when the path has another form. */
const char *cut_out_name(char *path) {
    constexpr char kDelimiters[] = "-.";
    char *rest = nullptr;
    KLIBCStrTok(path, kDelimiters, &rest);
    const char *const name = KLIBCStrTok(nullptr, kDelimiters, &rest);
    const char *const ending = KLIBCStrTok(nullptr, kDelimiters, &rest);
    return ending != nullptr && strcmp(ending, "info") == 0 ? name : nullptr;
}

/** @return 1 when the path gave a name, 0 when not, -1 when memory ran out */
int push_name(KLIBSZLIST *list, const char *path) {
    const size_t size = strlen(path) + 1;
    const heap<char> copy{static_cast<char *>(calloc(1, size))};
    if (copy == nullptr) {
        return fail_keeping_code(HERE, 0, "calloc() failed");
    }
    memcpy(copy.get(), path, size);
    const char *const name = cut_out_name(copy.get());
    if (name == nullptr) {
        return 0;
    }
    if (KLIBCSzListPush(&list, name) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to push [%s] into interface list", name);
    }
    return 1;
}

} // namespace

extern "C" int DHCPInterfaceListGet(KLIBSZLIST **list_inout, int type) {
    if (list_inout == nullptr) {
        return fail_keeping_code(HERE, -1, "Parameter error");
    }
    if (!is_dhcp_type(type)) {
        return fail_keeping_code(HERE, -1, "Wrong DHCPD ip type");
    }
    const matches found{path_text{"%s-*.info", type == kTypeV4 ? kDhcpdV4 : kDhcpdV6}};
    if (found.result() == GLOB_NOMATCH) {
        return 0;
    }
    if (found.result() != 0) {
        return fail_keeping_code(HERE, -1, "glob() error");
    }
    string_list names = make_list();
    if (!names.is_held()) {
        return fail_keeping_code(HERE, -1, "Allocate interface list failed");
    }
    int count = 0;
    for (size_t i = 0; i < found.count(); ++i) {
        const int pushed = push_name(names.get(), found[i]);
        if (pushed < 0) {
            return -1;
        }
        count += pushed;
    }
    if (count > 0) {
        const string_list old{*list_inout};
        *list_inout = names.give_up();
    }
    return count;
}
