#include <kovanetsdk/pppoe.h>

#include "core/commands.h"
#include "core/guards.h"
#include "core/pause.h"
#include "core/report.h"
#include "pppoe/relay_files.h"

#include <algorithm>
#include <csignal>
#include <kovanetsdk/bridge.h>

using namespace kova;

namespace {

constexpr char kRelay[] = "/usr/sbin/pppoe-relay";

bool is_relay_wanted(const char *szIfname, const PPPOE_RELAY_CONF &conf) {
    return KOVANetIsIfBridgeType(szIfname, KLIB_BRIDGE_LOCAL_LAN) == 1 && conf.blEnabled == 1 &&
           KOVANetIsIFUp(szIfname) == 1;
}

int start(const char *szIfname, const char *szServer) {
    if (run(kRelay, "-C", szIfname, "-S", szServer) != 0) {
        return fail(HERE, NET_ERR_EXEC, -1, "Failed to start %s on %s", kRelay, szIfname);
    }
    return 0;
}

/** Waits shortly until a relay that is to end has ended: two on one bridge would both answer its clients. */
void wait_for_end(const path_text &relay) {
    constexpr int kAttempts = 40;
    constexpr timespec kPause{0, 25'000'000};
    for (int i = 0; i < kAttempts && KLIBCIsProcAlive(relay.c_str()) == 1; ++i) {
        pause_for(kPause);
    }
}

} // namespace

extern "C" int KOVANetApplyPPPoERelayConfig(const char *szIfname) {
    if (szIfname == nullptr) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, -1, "Bad parameter");
    }
    PPPOE_RELAY_CONF conf;
    if (KOVANetGetPPPoERelayConfig(szIfname, &conf) < 0) {
        return -1;
    }
    const bool is_wanted = is_relay_wanted(szIfname, conf);
    const path_text relay{"%s -C %s", kRelay, szIfname};
    if (is_wanted && KLIBCIsProcAlive(relay.c_str()) != 1) {
        return start(szIfname, conf.szServer);
    }
    const path_text relay_to_server{"%s -C %s -S %s", kRelay, szIfname, conf.szServer};
    if (is_wanted && KLIBCIsProcAlive(relay_to_server.c_str()) == 1) {
        return 0;
    }
    if (KLIBCKill(relay.c_str(), SIGTERM) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to kill process");
    }
    wait_for_end(relay);
    return is_wanted ? start(szIfname, conf.szServer) : 0;
}

extern "C" int KOVANetApplyPPPoERelayConfigAll(void) {
    constexpr mode_t kMode = 0754;
    constexpr int kMostNames = 128;
    constexpr int kRegularFiles = 1154;
    if (!has_relay_directory(kMode)) {
        fail(HERE, NET_ERR_FILE_OPEN, -1, "Generat directory [%s] failed(%d)", kRelayDirectory, errno);
        return fail_keeping_code(HERE, -1, "Failed to get interfaces' config");
    }
    const string_list names = make_list(kMostNames);
    const int found = names.is_held() ? KLIBCFileEnumDir(kRelayDirectory, names.get(), nullptr, kRegularFiles) : -1;
    if (found < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get interfaces' config");
    }
    for (int i = 0; i < std::min(found, kMostNames); ++i) {
        if (KOVANetApplyPPPoERelayConfig(KLIBCSzListGet(names.get(), i)) < 0) {
            return -1;
        }
    }
    return 0;
}

extern "C" int KOVANetClearPPPoERelayConfigAll(void) {
    constexpr int kAnyType = 64;
    const string_list names = make_list();
    if (!names.is_held()) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, -1, "Failed to alloc memory for list");
    }
    if (KLIBCFileExist("/etc/sysconfig/pppoe-relay") != 1) { // with a slash behind it a plain file would be nothing
        return 0;
    }
    if (KLIBCFileCheckDir(kRelayDirectory) != 1) {
        return fail_quietly(HERE, NET_ERR_FILE_OPEN, -1);
    }
    const int found = KLIBCFileEnumDir(kRelayDirectory, names.get(), nullptr, kAnyType);
    if (found < 0) {
        return fail_keeping_code(HERE, -1, "Failed to enum [%s]", kRelayDirectory);
    }
    for (int i = 0; i < found; ++i) {
        const relay_path path{KLIBCSzListGet(names.get(), i)};
        if (unlink(path.c_str()) != 0) {
            log_info(HERE, "Failed to unlink [%s]", path.c_str());
        }
    }
    return 0;
}
