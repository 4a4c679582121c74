#include <kovanetsdk/dhcp.h>

#include "core/ifcfg.h"
#include "core/report.h"
#include "core/text.h"
#include "dhcp/dhcpd_files.h"
#include "dhcp/fragment.h"
#include "dhcp/subnet_read.h"
#include "dhcp/subnet_write.h"

using namespace kova;

namespace {

constexpr char kBackup[] = "bonding_backup_enable";

using switch_value = char[1024];

bool read_switch(const path_text &info, const char *key, switch_value &value) {
    const bool is_read = KLIBCFileGetKeyValue(info.c_str(), key, value, sizeof value, 0) > 0;
    if (!is_read) {
        log_err(HERE, "Failed to get %s key in [%s]", key, info.c_str());
    }
    return is_read;
}

bool write_switch(const path_text &info, const char *key, const char *value) {
    const bool is_written = KLIBCFileSetKeyValue(info.c_str(), key, value, kQuotedLine) >= 0;
    if (!is_written) {
        log_err(HERE, "Failed to set %s key in [%s]", key, info.c_str());
    }
    return is_written;
}

/** Keeps the switch of an interface that goes into a bond aside and turns it off. */
bool save_switch(const path_text &info) {
    switch_value value;
    if (!read_switch(info, kEnable, value) || !write_switch(info, kBackup, value)) {
        return false;
    }
    const bool is_off = KLIBCFileSetKeyValue(info.c_str(), kEnable, yes_or_no(false), kQuotedLine) >= 0;
    if (!is_off) {
        log_err(HERE, "Failed to set %s key to \"no\" in [%s]", kEnable, info.c_str());
    }
    return is_off;
}

/** Brings back what was kept aside, if something was. */
bool restore_switch(const path_text &info) {
    switch_value value;
    const int found = KLIBCFileGetKeyValue(info.c_str(), kBackup, value, sizeof value, 0);
    if (found < 0) {
        log_err(HERE, "Failed to get %s key in [%s]", kBackup, info.c_str());
    }
    return found == 0 || (found > 0 && write_switch(info, kEnable, value));
}

/** Changes the info files of an interface that are there, IPv4 first. @return whether all went well; not for NULL */
bool for_both_families(const char *ifname, bool (*change)(const path_text &info)) {
    if (ifname == nullptr) {
        return false;
    }
    for (const int type : {kTypeV4, kTypeV6}) {
        const path_text info = dhcpd_info_path(type, ifname);
        if (KLIBCFileExist(info.c_str()) == 1 && !change(info)) {
            return false;
        }
    }
    return true;
}

/** Interfaces went into a bond, which gets back what it had. */
int hand_to_bond(const char *bond, const KLIBSZLIST *slaves) {
    for (int i = 0; i < static_cast<int>(slaves->nItem); ++i) {
        const char *const slave = KLIBCSzListGet(slaves, i);
        if (!for_both_families(slave, save_switch)) {
            return fail_keeping_code(HERE, -1, "Failed to save [%s] interface's dhcp conf", slave);
        }
    }
    return for_both_families(bond, restore_switch)
               ? 0
               : fail_keeping_code(HERE, -1, "Failed to restore [%s] interface's dhcp conf", bond);
}

/** A bond is gone, its interfaces get back what they had. The two messages are in each other's place. */
int hand_to_slaves(const char *bond, const KLIBSZLIST *slaves) {
    if (!for_both_families(bond, save_switch)) {
        return fail_keeping_code(HERE, -1, "Failed to restore [%s] interface's dhcp conf", bond);
    }
    for (int i = 0; i < static_cast<int>(slaves->nItem); ++i) {
        const char *const slave = KLIBCSzListGet(slaves, i);
        if (!for_both_families(slave, restore_switch)) {
            return fail_keeping_code(HERE, -1, "Failed to save [%s] interface's dhcp conf", slave);
        }
    }
    return 0;
}

bool refuses_members(const place &at, const char *bond, const KLIBSZLIST *slaves) {
    if (refuses_ifname(at, "bond", bond) || refuses_null(at, "slaves", slaves)) {
        return true;
    }
    for (int i = 0; i < static_cast<int>(slaves->nItem); ++i) {
        if (refuses_ifname(at, "slaves", KLIBCSzListGet(slaves, i))) {
            return true;
        }
    }
    return false;
}

} // namespace

extern "C" int DHCPTagConfSetEnable(const char *ifname, unsigned int subnet, int type, int enable) {
    if (ifname == nullptr) {
        return fail_keeping_code(HERE, -1, "Bad parameters.");
    }
    if (refuses_ifname(HERE, "ifname", ifname)) {
        return -1;
    }
    if (!is_dhcp_type(type)) {
        return fail_keeping_code(HERE, -1, "Wrong DHCP ip type");
    }
    if (!make_dhcpd_dir(HERE)) {
        return -1;
    }
    const path_text path = subnet_info_path(type, ifname, subnet);
    fragment info{path};
    if (!info.is_open()) {
        return fail_keeping_code(HERE, -1, "Failed to open file [%s].", path.c_str());
    }
    info.write_enable(enable == 1);
    return info.close() ? 0 : fail_keeping_code(HERE, -1, "Failed to write file [%s].", path.c_str());
}

extern "C" int DHCPTagConfSetConfig(const char *ifname, unsigned int subnet, int type, const DHCP_TAG_CONF *conf) {
    if (!is_dhcp_type(type)) {
        return fail_keeping_code(HERE, -1, "Wrong DHCP ip type");
    }
    if (ifname == nullptr || conf == nullptr) {
        return fail_keeping_code(HERE, -1, "Bad parameters.");
    }
    if (refuses_ifname(HERE, "ifname", ifname)) {
        return -1;
    }
    const subnet_id id{ifname, subnet, type};
    if (!is_writable(id, *conf)) {
        return fail_keeping_code(HERE, -1, "Bad parameters.");
    }
    return type == kTypeV4 ? write_v4_subnet(HERE, id, *conf) : write_v6_subnet(HERE, id, *conf);
}

extern "C" int DHCPTagConfSet(const char *ifname, unsigned int subnet, int type, const DHCP_TAG_CONF *conf) {
    if (ifname == nullptr || conf == nullptr) {
        return fail_keeping_code(HERE, -1, "parameter error");
    }
    if (refuses_ifname(HERE, "ifname", ifname)) {
        return -1;
    }
    if (is_dhcp_type(type) && !is_writable({ifname, subnet, type}, *conf)) {
        return fail_keeping_code(HERE, -1, "parameter error");
    }
    if (DHCPTagConfSetEnable(ifname, subnet, type, conf->enabled) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to set to dhcp server info file [%s].", ifname);
    }
    const int result = DHCPTagConfSetConfig(ifname, subnet, type, conf);
    return result == 0 ? 0 : fail_keeping_code(HERE, result, "Failed to set config file of dhcp server [%s].", ifname);
}

extern "C" int DHCPTagConfGetEnable(const char *ifname, unsigned int subnet, int type, int *enabled) {
    if (ifname == nullptr || enabled == nullptr) {
        return fail_keeping_code(HERE, -1, "Wrong parameters");
    }
    if (refuses_ifname(HERE, "ifname", ifname)) {
        return -1;
    }
    if (!is_dhcp_type(type)) {
        return fail_keeping_code(HERE, -1, "Wrong DHCPD ip type");
    }
    const path_text info = subnet_info_path(type, ifname, subnet);
    *enabled = says_enabled(info) ? 1 : 0;
    return KLIBCFileExist(info.c_str()) == 1 ? 1 : 0;
}

extern "C" int DHCPTagConfGet(const char *ifname, unsigned int subnet, int type, DHCP_TAG_CONF *conf) {
    if (ifname == nullptr || *ifname == '\0' || conf == nullptr) {
        return fail_keeping_code(HERE, -1, "Wrong parameters");
    }
    if (refuses_ifname(HERE, "ifname", ifname)) {
        return -1;
    }
    if (!is_dhcp_type(type)) {
        return fail_keeping_code(HERE, -1, "Wrong or unsupported DHCPD ip type");
    }
    const built_text<256> name{"%s", ifname}; // may be the record's own
    *conf = {};
    const path_text path = subnet_conf_path(type, name.c_str(), subnet);
    if (KLIBCFileExist(path.c_str()) != 1) {
        return 0;
    }
    conf->enabled = says_enabled(subnet_info_path(type, name.c_str(), subnet)) ? 1 : 0;
    if (type == kTypeV4) {
        return read_v4_subnet(HERE, path, *conf) == 0
                   ? 1
                   : fail_keeping_code(HERE, -1, "Failed to get DHCP Server config from [%s, %u]", name.c_str(),
                                       subnet);
    }
    return read_v6_subnet(HERE, path, *conf) == 0
               ? 1
               : fail_keeping_code(HERE, -1, "Failed to get DHCPv6 Server config from [%s, %u]", name.c_str(), subnet);
}

extern "C" int DHCPDLinkAggrSet(int op, const char *bond, const KLIBSZLIST *slaves) {
    constexpr int kBonded = 1;
    if (bond == nullptr) {
        return fail_keeping_code(HERE, -1, "Bond interface is null");
    }
    if (refuses_members(HERE, bond, slaves)) {
        return -1;
    }
    if ((op == kBonded ? hand_to_bond(bond, slaves) : hand_to_slaves(bond, slaves)) < 0) {
        return -1;
    }
    if (DHCPServerRestart() < 0) {
        return fail_keeping_code(HERE, -1, "Restart DHCP daemon \"dnsmasq\" failed");
    }
    return 0;
}
