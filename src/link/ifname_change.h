/**
 * @file
 * The event "net/ifname_change": the configuration of some interfaces moves to others.
 */
#pragma once

#include "core/guards.h"
#include "core/report.h"

namespace kova {

/** Names of interfaces; the array outlives what it is given to. */
struct ifnames {
    const char *const *names;
    int count;
};

/** Raised before the change and, with its result, after it. One that cannot be raised is logged as the caller. */
class ifname_change_event {
public:
    ifname_change_event(const ifnames &origin, const ifnames &now) : origin_(origin), now_(now) {}

    /** @return whether the event could be opened; only then it is raised */
    [[nodiscard]] bool open();
    void announce_before(const place &at);
    void announce_after(const place &at, int result);

private:
    [[nodiscard]] bool raise(int phase, int result);

    ifnames origin_;
    ifnames now_;
    plugin_handle event_;
};

} // namespace kova
