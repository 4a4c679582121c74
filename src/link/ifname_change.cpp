#include "link/ifname_change.h"

#include <kovanetsdk/events.h>

namespace kova {

bool ifname_change_event::open() {
    return KLIBPluginSDKInit("net", "net/ifname_change", event_.out()) >= 0;
}

void ifname_change_event::announce_before(const place &at) {
    if (KLIBPluginHasInit(event_.get()) != 0 && !raise(KLIB_PLUGIN_PRE, 0)) {
        log_err(at, "Fail to execute net plugin (PRE) [0x%04X %s:%d]", REGISTER);
    }
}

void ifname_change_event::announce_after(const place &at, int result) {
    if (KLIBPluginHasInit(event_.get()) != 0 && !raise(KLIB_PLUGIN_POST, result)) {
        log_err(at, "Fail to execute net plugin (POST) [0x%04X %s:%d]", REGISTER);
    }
}

bool ifname_change_event::raise(int phase, int result) {
    return KLIBNetIFChgPluginSetArgs(event_.get(), origin_.names, origin_.count, now_.names, now_.count, result) >= 0 &&
           KLIBPluginAction(phase, event_.get()) >= 0;
}

} // namespace kova
