#include <kovanetsdk/iface.h>

#include "core/commands.h"
#include "core/file_backup.h"
#include "core/ifcfg.h"
#include "core/report.h"

#include <kovanetsdk/addr.h>

using namespace kova;

extern "C" int KOVAILnxSetIPNetmask(const char *szIfname, const char *szIP, const char *szMask) {
    if (refuses_ifname(HERE, "szIfname", szIfname) || refuses_text(HERE, "szIP", szIP) ||
        refuses_text(HERE, "szMask", szMask)) {
        return -1;
    }
    const ifcfg_path path{szIfname};
    file_backup backup{HERE, path};
    if (rewrite_keys(HERE, path.c_str(),
                     {{key::kDevice, szIfname},
                      {key::kOnBoot, "yes"},
                      {key::kIpAddr, szIP},
                      {key::kNetmask, szMask},
                      {key::kBootProto, "static"}},
                     {key::kMaster, key::kSlave}) < 0) {
        return fail_keeping_code(HERE, -1, "Set %s error.", path.c_str());
    }
    if (stop_dhcp_client(szIfname) != 0) {
        log_warning(HERE, "unable to stop dhcp-client instance on %s", szIfname);
    }
    const int prefix = KOVANetNetmaskToPrefix(szMask);
    if (prefix < 0) {
        return fail_keeping_code(HERE, -1, "calculate prefix length failed");
    }
    if (KOVANetSetIP("-4", szIfname, szIP, prefix, "add") < 0) {
        return fail_keeping_code(HERE, -1, "excute command /usr/kova/sbin/kovanet--set_ip failed");
    }
    backup.keep_new();
    return 0;
}
