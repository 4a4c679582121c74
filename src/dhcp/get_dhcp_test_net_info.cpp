#include <kovanetsdk/dhcp.h>

#include "core/commands.h"
#include "core/ifcfg.h"
#include "core/report.h"
#include "core/text.h"

#include <cerrno>
#include <cstring>

using namespace kova;

namespace {

constexpr char kScript[] = "/tmp/dhclient-script";
constexpr int kNotExecuted = 127;

int copy_script() {
    if (KLIBCFileExist(kScript) == 1) {
        return 0;
    }
    return KLIBCExec("/bin/cp", "-f", "/etc/dhclient/dhclient-script", kScript, nullptr);
}

/** Has the client get a lease without using it. */
int ask_server(const char *ifname) {
    const path_text pid{"/etc/dhclient/ipv4/dhcpcd-%s.pid", ifname};
    const path_text leases{"/tmp/dhcpv4.leases.%s", ifname};
    const int status = run("/usr/sbin/dhclient", "-q", "--kova_test", "-lf", leases.c_str(), "-pf", pid.c_str(), "-sf",
                           kScript, ifname);
    if (status != 0) {
        const int error = status < 0 || status == kNotExecuted ? errno : 0; // a client that ran and failed leaves none
        return fail(HERE, NET_ERR_EXEC, -1, "/usr/sbin/dhclient -q --kova_test -lf %s -pf %s -sf %s %s failed(%s).",
                    leases.c_str(), pid.c_str(), kScript, ifname, strerror(error));
    }
    return 0;
}

} // namespace

extern "C" int KOVAIGetDHCPTestNetInfo(NETINFO *info) {
    if (refuses_null(HERE, "info", info)) {
        return -1;
    }
    const field_text ifname{info->szIfname};
    if (refuses_ifname(HERE, "info->szIfname", ifname.c_str()) ||
        refuses(HERE, info->szIfname[0] != '-', "'-' != *info->szIfname")) { // an option to the client
        return -1;
    }
    if (copy_script() != 0) {
        return fail_keeping_code(HERE, -1, "copy /etc/dhclient/dhclient-script to /tmp/dhclient-script failed");
    }
    if (ask_server(ifname.c_str()) < 0) {
        return -1;
    }
    const lease_path lease{ifname.c_str()};
    if (KLIBCFileGetKeyValue(lease.c_str(), key::kIpAddr, info->szIP, sizeof info->szIP, 0) <= 0) {
        return fail_keeping_code(HERE_FUNCTION, -1, "KLIBCFileGetKeyValue(IPADDR) failed(%X).", KLIBCErrGet());
    }
    if (KLIBCFileGetKeyValue(lease.c_str(), key::kNetmask, info->szMask, sizeof info->szMask, 0) <= 0) {
        return fail_keeping_code(HERE_FUNCTION, -1, "KLIBCFileGetKeyValue(NETMASK) failed(%X).", KLIBCErrGet());
    }
    return 0;
}
