#include <kovanetsdk/routing.h>

#include "core/guards.h"
#include "core/report.h"

#include <kovanetsdk/iface.h>

using namespace kova;

namespace {

constexpr int kMaxInterfaces = 32;
constexpr uint32_t kLink = 2;

/** Deletes the routes of the interfaces without link, up to the first that fails. */
int clear_without_link(const IFINFO *records, int count) {
    for (int i = 0; i < count; ++i) {
        const char *const name = records[i].szIfname;
        if (records[i].nLink != kLink && NetRoutetableHandler(NET_ROUTE_DELETE, name) == -1) {
            return fail_keeping_code(HERE, -1, "NetRoutetableHandler clear [%s] route table fail", name);
        }
    }
    return 0;
}

} // namespace

extern "C" int NetRoutetableCheck(void) {
    const named_lock lock{kConfigShared};
    if (!lock.is_held()) {
        return fail_keeping_code(HERE, lock.result(), "lock fail(%X)", KLIBCErrGet());
    }
    const heap<IFINFO> records{static_cast<IFINFO *>(calloc(kMaxInterfaces, sizeof(IFINFO)))};
    if (records == nullptr) {
        return fail_keeping_code(HERE, -1, "malloc fail");
    }
    const int count = KLIBNetInterfaceEnum(records.get(), kMaxInterfaces, 0);
    if (count < 1) {
        return fail_keeping_code(HERE, -1, "%s", count == 0 ? "No interface." : "Get interface info fail.");
    }
    if (count == 1) { // its subnet can be reached over no other
        return 0;
    }
    return clear_without_link(records.get(), count);
}
