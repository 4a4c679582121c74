#include <kovanetsdk/link.h>

#include "core/report.h"

#include <cstring>

namespace {

/** In the order in which they are tried: a name may be the beginning of the text only. */
constexpr struct {
    const char *name;
    KOVA_LINK_AGGR_MODE mode;
} kModes[] = {
    {"balance-alb", KOVA_LINK_AGGR_BALANCE_ALB}, {"balance-xor", KOVA_LINK_AGGR_BALANCE_XOR},
    {"802.3ad", KOVA_LINK_AGGR_8023AD},          {"active-backup", KOVA_LINK_AGGR_ACTIVE_BACKUP},
    {"balance-rr", KOVA_LINK_AGGR_BALANCE_RR},   {"ovs-active-backup", KOVA_LINK_AGGR_OVS_ACTIVE_BACKUP},
    {"balance-slb", KOVA_LINK_AGGR_BALANCE_SLB}, {"balance-tcp", KOVA_LINK_AGGR_BALANCE_TCP},
};

} // namespace

extern "C" KOVA_LINK_AGGR_MODE KOVANetLinkAggrStringToMode(const char *szMode) {
    using namespace kova;
    if (refuses_null_text(HERE, "szMode", szMode)) {
        return KOVA_LINK_AGGR_UNKNOWN;
    }
    for (const auto &entry : kModes) {
        if (strncmp(szMode, entry.name, strlen(entry.name)) == 0) {
            return entry.mode;
        }
    }
    return KOVA_LINK_AGGR_UNKNOWN;
}
