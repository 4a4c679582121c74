#include <kovanetsdk/dhcp.h>

#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"
#include "dhcp/dhcpd_files.h"

#include <cstring>

using namespace kova;

namespace {

struct rename_pair {
    const char *from;
    const char *to;
};

/** A name that goes into a path and into sed's expression, where "\n" would start a line. */
bool refuses_name(const place &at, const char *name, const char *text) {
    if (refuses_ifname(at, name, text)) {
        return true;
    }
    const bool usable = strchr(text, '\\') == nullptr;
    if (!usable) {
        report_refused(at, "'\\\\' != *%s", name);
    }
    return !usable;
}

int rename_file(const path_text &from, const path_text &to) {
    if (rename(from.c_str(), to.c_str()) != 0) {
        return fail_keeping_code(HERE, -1, "Failed to rename [%s][%s]", from.c_str(), to.c_str());
    }
    return 0;
}

/** @return 1 renamed, 0 not there, -1 logged */
int rename_if_there(const path_text &from, const path_text &to) {
    if (KLIBCFileExist(from.c_str()) != 1) {
        return 0;
    }
    return rename_file(from, to) < 0 ? -1 : 1;
}

/** Replaces the old name wherever it stands: the daemon's tags are names with something behind them. */
int replace_name(const rename_pair &names, const path_text &file) {
    const path_text expression{"s/%s/%s/g", names.from, names.to};
    if (KLIBCExec("/bin/sed", "-i", expression.c_str(), file.c_str(), nullptr) != 0) {
        return fail_keeping_code(HERE, -1, "Failed to sed [/bin/sed -i %s %s]", expression.c_str(), file.c_str());
    }
    return 0;
}

/** Moves "dhcpd-<old>-subnet<number>.<ending>". Not scanned with a pattern: names may hold "%". */
int move_subnet_file(const rename_pair &names, const char *filename, size_t prefix_length) {
    if (filename == nullptr) {
        return fail_keeping_code(HERE, -1, "Filename is NULL");
    }
    const char *const number = filename + prefix_length;
    const char *const dot = strchr(number, '.');
    if (dot == nullptr || dot == number || dot[1] == '\0') {
        return fail_keeping_code(HERE, -1, "Parsing filename error!");
    }
    const path_text from{"/etc/dhcpd/%s", filename};
    const path_text to{"/etc/dhcpd/dhcpd-%s-subnet%s", names.to, number};
    if (rename_file(from, to) < 0) {
        return -1;
    }
    if (replace_name(names, to) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to replace tag in [%s]", to.c_str());
    }
    return 0;
}

int move_subnets(const rename_pair &names) {
    constexpr int kRegularFiles = 1154;
    const path_text prefix{"dhcpd-%s-subnet", names.from};
    const string_list found = make_list();
    const int count = found.is_held() ? KLIBCFileEnumDir(kDhcpdDir, found.get(), prefix.c_str(), kRegularFiles) : -1;
    if (count < 0) {
        return fail_keeping_code(HERE, -1, "bad enum [%s] in [%s]", prefix.c_str(), kDhcpdDir);
    }
    for (int i = 0; i < count; ++i) {
        if (move_subnet_file(names, KLIBCSzListGet(found.get(), i), strlen(prefix.c_str())) < 0) {
            return -1;
        }
    }
    return 0;
}

int move_static_leases(const rename_pair &names) {
    return rename_if_there(path_text{"%s-%s-static.conf", kDhcpdV4, names.from},
                           path_text{"%s-%s-static.conf", kDhcpdV4, names.to});
}

int move_wpad(const rename_pair &names) {
    const path_text conf{"%s/wpad-%s.conf", kDhcpdDir, names.to};
    const int moved = rename_if_there(path_text{"%s/wpad-%s.conf", kDhcpdDir, names.from}, conf);
    if (moved < 0 || (moved > 0 && replace_name(names, conf) < 0)) {
        return -1;
    }
    return rename_if_there(path_text{"%s/wpad-%s.info", kDhcpdDir, names.from},
                           path_text{"%s/wpad-%s.info", kDhcpdDir, names.to});
}

} // namespace

extern "C" int DHCPDConfChangeInterface(const char *old_if, const char *new_if) {
    if (old_if == nullptr || new_if == nullptr) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, -1, "Bad parameters");
    }
    if (refuses_name(HERE, "old_if", old_if) || refuses_name(HERE, "new_if", new_if)) {
        return -1;
    }
    if (KLIBCFileCheckDir(kDhcpdDir) == 0) {
        return 0;
    }
    const rename_pair names{old_if, new_if};
    if (rename_if_there(dhcpd_info_path(kTypeV4, old_if), dhcpd_info_path(kTypeV4, new_if)) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to move interface global setting from [%s] to [%s]", old_if, new_if);
    }
    if (move_subnets(names) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to move DHCP tag conf from [%s] to [%s]", old_if, new_if);
    }
    if (move_static_leases(names) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to move DHCP static conf from [%s] to [%s]", old_if, new_if);
    }
    if (move_wpad(names) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to move DHCP WPAD conf from [%s] to [%s]", old_if, new_if);
    }
    return 0;
}
