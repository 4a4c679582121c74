#include <kovanetsdk/dhcp.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/report.h"
#include "core/text.h"
#include "dhcp/dhcpd_files.h"
#include "dhcp/fragment.h"

#include <cstring>

using namespace kova;

namespace {

constexpr char kSettings[] = "/etc/dhcpd/dhcpd-pxe-setting";
constexpr char kSwitch[] = "/etc/dhcpd/dhcpd-pxe.info";
constexpr char kFragment[] = "/etc/dhcpd/dhcpd-pxe.conf";
constexpr char kTag[] = "pxe";

constexpr char kIsRemote[] = "is_remote_tftp";
constexpr char kLocalLoader[] = "local_bootloader";
constexpr char kRemoteLoader[] = "remote_bootloader";
constexpr char kRemoteServer[] = "remote_tftp_server_ip";

/** A missing key is "". */
template<size_t Size> bool read_key(const char *key, char (&value)[Size]) {
    return KLIBCFileGetKeyValue(kSettings, key, value, Size, 0) >= 0;
}

template<size_t Size> bool read_loader(const char *key, char (&value)[Size]) {
    const bool is_read = read_key(key, value);
    if (!is_read) {
        log_err(HERE, "Failed to get [%s] key", key);
    }
    return is_read;
}

bool read_boot_settings(DHCP_PXE_CONF &conf) {
    const int is_remote = KLIBCFileCheckKeyValue(kSettings, kIsRemote, "yes", 0);
    if (is_remote < 0) {
        log_err(HERE, "Failed to get [%s] key", kIsRemote);
        return false;
    }
    conf.is_remote_tftp = is_remote == 1 ? 1 : 0;
    if (!read_loader(kLocalLoader, conf.local_bootloader) || !read_loader(kRemoteLoader, conf.remote_bootloader)) {
        return false;
    }
    const bool is_read = read_key(kRemoteServer, conf.remote_tftp_server_ip);
    if (!is_read) {
        log_err(HERE, "Failed to get remote tftp server IP");
    }
    return is_read;
}

bool write_key(const char *key, const char *value) {
    const bool is_written = KLIBCFileSetKeyValue(kSettings, key, value, kQuotedLine) >= 0;
    if (!is_written) {
        log_err(HERE, "Failed to set [%s] key", key);
    }
    return is_written;
}

bool write_boot_settings(const DHCP_PXE_CONF &conf) {
    if (!write_key(kIsRemote, yes_or_no(conf.is_remote_tftp == 1))) {
        return false;
    }
    return conf.is_remote_tftp == 1 ? write_key(kRemoteLoader, conf.remote_bootloader) &&
                                          write_key(kRemoteServer, conf.remote_tftp_server_ip)
                                    : write_key(kLocalLoader, conf.local_bootloader);
}

/** One field of the daemon's line, which it reads quotes in. */
template<size_t Size> bool is_boot_field(const char (&value)[Size]) {
    return memchr(value, '\0', Size) != nullptr && is_list_field(value) && strchr(value, '"') == nullptr;
}

/** The line of the boot file. */
using boot_line = built_text<kLineRoom + 1>;

boot_line line_of(const DHCP_PXE_CONF &conf) {
    return conf.is_remote_tftp == 1 ? boot_line{"dhcp-boot=tag:%s,%s,bootserver,%s\n", kTag, conf.remote_bootloader,
                                                conf.remote_tftp_server_ip}
                                    : boot_line{"dhcp-boot=tag:%s,%s\n", kTag, conf.local_bootloader};
}

bool refuses_boot_settings(const DHCP_PXE_CONF &conf) {
    const bool is_remote = conf.is_remote_tftp == 1;
    if (is_remote && *conf.remote_bootloader == '\0') {
        log_err(HERE, "input error when set PXE config: empty remote bootloader");
        return true;
    }
    if (is_remote && *conf.remote_tftp_server_ip == '\0') {
        log_err(HERE, "input error when set PXE config: empty remote tftp ip");
        return true;
    }
    if (!is_remote && *conf.local_bootloader == '\0') {
        log_err(HERE, "input error when set PXE config: empty local bootloader");
        return true;
    }
    const bool is_valid = is_remote ? is_boot_field(conf.remote_bootloader) && is_boot_field(conf.remote_tftp_server_ip)
                                    : is_boot_field(conf.local_bootloader);
    if (!is_valid || !line_of(conf).fits()) {
        log_err(HERE, "input error when set PXE config: comma, double quote, control character, no end or too long");
        return true;
    }
    return false;
}

/** Writes what the daemon reads. */
bool write_fragment(const DHCP_PXE_CONF &conf) {
    stream file{fopen(kFragment, "we")};
    if (!file.is_held()) {
        log_err(HERE, "Failed to open file [%s].", kFragment);
        return false;
    }
    fputs(line_of(conf).c_str(), file.get());
    fputs("dhcp-vendorclass=set:pxe,PXEClient\n", file.get());
    if (!close_written(file)) {
        log_err(HERE, "Failed to write file [%s].", kFragment);
        return false;
    }
    return true;
}

bool set_boot_settings(const DHCP_PXE_CONF &conf) {
    return !refuses_boot_settings(conf) && make_dhcpd_dir(HERE) && write_boot_settings(conf) && write_fragment(conf);
}

} // namespace

extern "C" int DHCPPXEConfGetEnable(DHCP_PXE_CONF *conf) {
    if (conf == nullptr) {
        return fail_keeping_code(HERE, -1, "DHCPPXEConfGetEnable() cannot store to NULL structure");
    }
    conf->enabled = KLIBCFileCheckKeyValue(kSettings, kEnable, "yes", 0);
    return 0;
}

extern "C" int DHCPPXEConfGet(DHCP_PXE_CONF *conf) {
    if (conf == nullptr) {
        return fail_keeping_code(HERE, -1, "DHCPPXEConfGet() cannot store to NULL structure");
    }
    if (DHCPPXEConfGetEnable(conf) == -1) {
        return fail_keeping_code(HERE, -1, "Failed to get whether pxe is enable");
    }
    conf->is_remote_tftp = 0;
    conf->local_bootloader[0] = conf->remote_bootloader[0] = conf->remote_tftp_server_ip[0] = '\0';
    if (KLIBCFileExist(kSettings) == 0) {
        return 0;
    }
    return read_boot_settings(*conf) ? 0 : fail_keeping_code(HERE, -1, "Failed to get pxe config");
}

extern "C" int DHCPPXEConfSetEnable(int enable) {
    if (!make_dhcpd_dir(HERE)) {
        return -1;
    }
    for (const char *path : {kSettings, kSwitch}) {
        if (KLIBCFileSetKeyValue(path, kEnable, yes_or_no(enable == 1), kQuotedLine) < 0) {
            return -1;
        }
    }
    return 0;
}

extern "C" int DHCPPXEConfSet(const DHCP_PXE_CONF *conf) {
    if (conf == nullptr) {
        return fail_keeping_code(HERE, -1, "no interface parameter");
    }
    if (DHCPPXEConfSetEnable(conf->enabled) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to set info file of dhcp pxe server.");
    }
    if (conf->enabled != 1) {
        return 0;
    }
    return set_boot_settings(*conf) ? 0 : fail_keeping_code(HERE, -1, "Failed to set config file of dhcp pxe server.");
}
