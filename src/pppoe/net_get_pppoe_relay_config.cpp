#include <kovanetsdk/pppoe.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/report.h"
#include "pppoe/relay_files.h"

using namespace kova;

namespace {

constexpr char kEnable[] = "enable";
constexpr char kServer[] = "server";

/** Whether a field is empty or names an interface: it becomes an argument of the relay. */
template<size_t Size> bool is_server(const char (&field)[Size]) {
    return memchr(field, '\0', Size) != nullptr && (*field == '\0' || is_interface_name(field));
}

/** Makes the directory and an empty file where they are missing. @return 0; -1, logged */
int prepare(const relay_path &path) {
    constexpr mode_t kMode = 0755;
    if (!has_relay_directory(kMode)) {
        return fail(HERE, NET_ERR_FILE_OPEN, -1, "Failed to create [%s]: %m", kRelayDirectory);
    }
    if (KLIBCFileTouch(path.c_str()) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to create [%s] [0x%04X %s:%d]", path.c_str(), REGISTER);
    }
    return 0;
}

} // namespace

extern "C" int KOVANetGetPPPoERelayConfig(const char *szIfname, PPPOE_RELAY_CONF *pConf) {
    if (szIfname == nullptr || pConf == nullptr) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, -1, "Wrong Parameter.");
    }
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    const relay_path path{szIfname};
    if (prepare(path) < 0) {
        return -1;
    }
    *pConf = {};
    pConf->blEnabled = KLIBCFileCheckKeyValue(path.c_str(), kEnable, "yes", 0) == 1 ? 1 : 0;
    if (KLIBCFileGetKeyValue(path.c_str(), kServer, pConf->szServer, sizeof pConf->szServer, 0) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get key[%s] in file[%s].", kServer, path.c_str());
    }
    return 0;
}

extern "C" int KOVANetSetPPPoERelayConfig(const char *szIfname, const PPPOE_RELAY_CONF *pConf) {
    if (pConf == nullptr) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, -1, "Wrong Parameter.");
    }
    if (refuses_ifname(HERE, "szIfname", szIfname) ||
        refuses(HERE, is_server(pConf->szServer), "is_server(pConf->szServer)")) {
        return -1;
    }
    const relay_path path{szIfname};
    if (prepare(path) < 0) {
        return -1;
    }
    const char *const szEnable = pConf->blEnabled == 1 ? "yes" : "no";
    return rewrite_keys(HERE, path.c_str(), {{kEnable, szEnable}, {kServer, pConf->szServer}}, {});
}

extern "C" int KOVANetIsSamePPPoERelayConfig(const PPPOE_RELAY_CONF *pConf, const PPPOE_RELAY_CONF *pOther) {
    if (pConf == nullptr || pOther == nullptr) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, 0, "Bad parameters");
    }
    const bool is_same = pConf->blEnabled == pOther->blEnabled &&
                         strncmp(pConf->szServer, pOther->szServer, sizeof pConf->szServer) == 0;
    return is_same ? 1 : 0;
}
