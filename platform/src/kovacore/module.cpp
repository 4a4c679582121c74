#include "kova/core.h"

#include <algorithm>
#include <climits>
#include <cstdio>
#include <cstring>
#include <string_view>
#include <sys/utsname.h>

#include "common/platform_conf.h"
#include "common/report.h"
#include "common/views.h"
#include "kovacore/line_source.h"

using namespace kova;
using std::string_view;

namespace {

constexpr const char *kNameCharacters = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789_-";

/** What features that are built in without parameters can be told by. */
struct kernel_trace {
    const char *module;
    const char *path;
};
constexpr kernel_trace kTraces[] = {{"8021q", "/proc/net/vlan/config"}, {"bonding", "/sys/class/net/bonding_masters"}};

/** The kernel writes modules with an underscore, their files may have a dash. */
bool same_module(string_view left, string_view right) {
    if (left.size() != right.size())
        return false;
    for (size_t i = 0; i < left.size(); i++)
        if ((left[i] == '-' ? '_' : left[i]) != (right[i] == '-' ? '_' : right[i]))
            return false;
    return true;
}

bool has_sysfs_entry(const char *module) {
    char path[PATH_MAX];
    const int prefix = snprintf(path, sizeof path, "/sys/module/%s", module) - static_cast<int>(strlen(module));
    for (char *c = path + prefix; *c != '\0'; c++)
        if (*c == '-')
            *c = '_';
    return access(path, F_OK) == 0;
}

bool is_in_list(line_source &modules, const char *module) {
    string_view line;
    while (modules.next(line))
        if (same_module({line.data(), std::min(line.find(' '), line.size())}, module))
            return true;
    return false;
}

bool is_built_in(const char *module) {
    struct utsname system;
    char path[PATH_MAX];
    if (uname(&system) < 0)
        return false;
    snprintf(path, sizeof path, "/lib/modules/%s/modules.builtin", system.release);
    line_source files{path};
    string_view line;
    while (files.next(line)) {
        line.remove_prefix(line.rfind('/') + 1);
        if (ends_in(line, ".ko"))
            line.remove_suffix(3);
        if (same_module(line, module))
            return true;
    }
    return false;
}

bool leaves_trace(const char *module) {
    for (const kernel_trace &trace : kTraces)
        if (same_module(trace.module, module) && access(trace.path, F_OK) == 0)
            return true;
    return false;
}

/** A kernel without loadable modules has no list of them. */
bool has_no_list() {
    return access("/proc/modules", F_OK) < 0 && access("/proc/self", F_OK) == 0;
}

} // namespace

int KLIBCModuleIsLoad(const char *szModule) {
    if (is_empty(szModule) || szModule[strspn(szModule, kNameCharacters)] != '\0' || strlen(szModule) > NAME_MAX)
        return fail(HERE, kErrArgument);

    line_source modules{"/proc/modules"};
    if (has_sysfs_entry(szModule) || is_in_list(modules, szModule) || is_built_in(szModule) || leaves_trace(szModule))
        return 1;
    return modules.failed() && !has_no_list() ? fail(HERE, kErrFileOpen) : 0;
}

int KLIBCSupportDualhead(void) {
    return platform_says("support_dualhead") ? 1 : 0;
}
