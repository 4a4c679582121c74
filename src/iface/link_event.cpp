#include "iface/link_event.h"

#include "core/guards.h"

namespace kova {

namespace {

/** Handed back on every path, opened or not. */
struct event_handle {
    uint64_t value = 0;

    event_handle() = default;
    event_handle(const event_handle &) = delete;
    event_handle &operator=(const event_handle &) = delete;
    ~event_handle() {
        const errno_keeper keep;
        KLIBPluginExit(value);
    }
};

} // namespace

int raise_link_event(const place &at, const char *name, const char *szIfname) {
    if (refuses_ifname(at, "szIfname", szIfname)) {
        return -1;
    }
    event_handle event;
    if (KLIBPluginSDKInit("net", name, &event.value) < 0 || KLIBPluginSetArg(event.value, "IFNAME", szIfname) < 0 ||
        KLIBPluginAction(KLIB_PLUGIN_POST, event.value) < 0) {
        return -1;
    }
    return 0;
}

} // namespace kova
