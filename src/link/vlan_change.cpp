#include "link/vlan_change.h"

#include "core/commands.h"
#include "core/kernel_files.h"

#include <cstring>
#include <kovanetsdk/dhcp.h>
#include <kovanetsdk/pppoe.h>
#include <sys/stat.h>

namespace kova {

namespace {

/** What knows interfaces by name, in the order in which it is told. */
constexpr struct {
    const char *program;
    const char *verb;
} kListeners[] = {
    {"/usr/kova/bin/kovafirewall", "--change-adapter"},
    {"/usr/kova/bin/kovafirewall", "--change-security-adapter"},
    {"/usr/kova/bin/tctool", "-change_interface"},
};

bool begins_with_any(const char *line, std::initializer_list<const char *> beginnings) {
    for (const char *const beginning : beginnings) {
        if (strncmp(line, beginning, strlen(beginning)) == 0) {
            return true;
        }
    }
    return false;
}

} // namespace

new_ifcfg::new_ifcfg(const char *szIfname, const char *path_template)
    : target_(szIfname), file_(target_.c_str(), path_template) {}

int new_ifcfg::copy_lines(const place &at, const char *path, std::initializer_list<const char *> beginnings,
                          bool is_beginning_wanted) {
    const stream from{fopen(path, "re")};
    if (!from.is_held()) {
        return fail(at, NET_ERR_FILE_OPEN, -1, "Failed to open %s: %m", path);
    }
    while (const heap<char> line = next_line(from)) {
        if (begins_with_any(line.get(), beginnings) == is_beginning_wanted) {
            fprintf(file_.get(), "%s\n", line.get());
        }
    }
    if (errno != 0) { // out of memory, too, else the rest would be lost
        return fail(at, NET_ERR_FILE_OPEN, -1, "Failed to read %s: %m", path);
    }
    return 0;
}

int new_ifcfg::finish(const place &at) const {
    return file_.finish() ? 0 : fail(at, NET_ERR_FILE_WRITE, -1, "Failed to write %s: %m", target_.c_str());
}

int new_ifcfg::replace(const place &at) {
    constexpr mode_t kReadableByAll = 0644;
    if (!file_.replace()) {
        return -1;
    }
    if (chmod(target_.c_str(), kReadableByAll) != 0) {
        return fail_keeping_code(at, -1, "change %s's mode failed", target_.c_str());
    }
    return 0;
}

int tell_new_name(const place &at, const char *szOld, const char *szNew) {
    for (const auto &listener : kListeners) {
        if (run(listener.program, listener.verb, szOld, szNew) != 0) {
            return fail_keeping_code(at, -1, "Failed to %s -change_interface %s %s", listener.program, szOld, szNew);
        }
    }
    if (DHCPDConfChangeInterface(szOld, szNew) < 0) {
        return -1;
    }
    return KLIBNetDHCPServerRestart() < 0 ? -1 : 0;
}

int disable_pppoe(const place &at, const char *szIfname) {
    if (KLIBDisablePPPoEOnIf(szIfname) < 0) {
        return fail_keeping_code(at, -1, "Disable PPPoE interface %s Failed.[0x%04X %s:%d]", szIfname, REGISTER);
    }
    return 0;
}

} // namespace kova
