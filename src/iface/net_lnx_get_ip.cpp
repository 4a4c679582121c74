#include <kovanetsdk/iface.h>

#include "core/ifcfg.h"
#include "core/kernel.h"
#include "core/report.h"

namespace {

using namespace kova;

bool refuses_buffer(const place &at, const char *szIP, int cbIP) {
    return refuses_null_text(at, "szIP", szIP) || refuses(at, 0 < cbIP, "0 < cbIP");
}

} // namespace

extern "C" int KOVAILnxGetIP(const char *szIfname, char *szIP, int cbIP) {
    if (refuses_text(HERE, "szIfname", szIfname) || refuses_buffer(HERE, szIP, cbIP)) {
        return -1;
    }
    *szIP = '\0';
    const interface_socket socket;
    if (!socket.is_open()) {
        return fail_socket(HERE, -1);
    }
    uint32_t address = 0;
    if (socket.address(szIfname, address) < 0) {
        return errno == EADDRNOTAVAIL ? 0 : fail(HERE, request_code(errno), -1, "Cannot get IP of %s: %m", szIfname);
    }
    address_text text;
    write_address(address, text);
    return refuses(HERE, copy_whole(szIP, cbIP, text), "strlen(szAddress) < cbIP") ? -1 : 0;
}

extern "C" int KOVAILnxGetIPFromCfg(const char *szIfname, char *szIP, int cbIP) {
    if (refuses_ifname(HERE, "szIfname", szIfname) || refuses_buffer(HERE, szIP, cbIP)) {
        return -1;
    }
    *szIP = '\0';
    const named_lock lock{kConfigShared};
    if (!lock.is_held()) {
        return fail_lock(HERE, -1);
    }
    const ifcfg_path path{szIfname};
    if (KLIBCFileGetKeyValue(path.c_str(), key::kIpAddr, szIP, cbIP, 0) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get [%s] from [%s], kovaerr=[0x%04X]", key::kIpAddr, path.c_str(),
                                 KLIBCErrGet());
    }
    return 0;
}
