#include "dhcp/dhcpd_files.h"

namespace kova {

bool says_enabled(const path_text &info) {
    return KLIBCFileExist(info.c_str()) == 1 && KLIBCFileCheckKeyValue(info.c_str(), kEnable, "yes", 0) == 1;
}

bool make_dhcpd_dir(const place &at) {
    const bool is_made = KLIBCExec("/bin/mkdir", "-p", kDhcpdDir, nullptr, nullptr) == 0;
    if (!is_made) {
        log_err(at, "Failed to mkdir [%s]", kDhcpdDir);
    }
    return is_made;
}

} // namespace kova
