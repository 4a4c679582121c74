#include <kovanetsdk/events.h>

#include "core/guards.h"
#include "core/report.h"

#include <kova/service.h>

using namespace kova;

namespace {

constexpr uint32_t kServiceDispatch = 0x1000006;

/** One dispatch to the services. */
struct service_event {
    plugin_handle handle;
    uint32_t changes;
    int action;
    int result;
};

int has_change(const service_event &event, uint32_t change) {
    return (event.changes & change) != 0 ? 1 : 0;
}

int fire(const service_event &event, int phase) {
    const uint64_t handle = event.handle.get();
    const bool is_set =
        KLIBPluginHasInit(handle) != 0 &&
        KLIBPluginSetArgByInt(handle, "SERVICE_IP_CHANGE", has_change(event, KLIB_SERVICE_IP_CHANGE)) >= 0 &&
        KLIBPluginSetArgByInt(handle, "SERVICE_HOSTNAME_CHANGE", has_change(event, KLIB_SERVICE_HOSTNAME_CHANGE)) >=
            0 &&
        KLIBPluginSetArgByInt(handle, "SERVICE_MTU_CHANGE", has_change(event, KLIB_SERVICE_MTU_CHANGE)) >= 0 &&
        KLIBPluginSetArgByInt(handle, "SERVICE_DAEMON_ACTION", event.action) >= 0 &&
        KLIBPluginSetArgByInt(handle, "RESULT", event.result) >= 0;
    return is_set ? KLIBPluginAction(phase, handle) : -1;
}

} // namespace

extern "C" int KLIBServicePlugin(int nDaemonAction, uint32_t nChangeFlags) {
    const named_lock lock{kServiceDispatch};
    if (!lock.is_held()) {
        return fail_keeping_code(HERE, -1, "Lock failed");
    }
    service_event event{.handle = {}, .changes = nChangeFlags, .action = nDaemonAction, .result = 0};
    if (KLIBPluginSDKInit("service", "service", event.handle.out()) < 0) {
        return fail_keeping_code(HERE, -1, "Fail to do plugin init[0x%04X %s:%d]", KLIBCErrGet(), KLIBCErrorGetFile(),
                                 KLIBCErrorGetLine());
    }
    if (fire(event, KLIB_PLUGIN_PRE) < 0) {
        log_err(HERE, "Fail to execute service plugin (PRE)");
    }
    if (fire(event, KLIB_PLUGIN_POST) < 0) {
        log_err(HERE, "Fail to execute service plugin (POST)");
    }
    return 0;
}

extern "C" int KLIBServiceStopBeforeIPChange(void) {
    return KLIBServicectlJobStop("pppoerelay") < 0 ? -1 : 0;
}
