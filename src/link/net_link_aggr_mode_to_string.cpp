#include <kovanetsdk/link.h>

const KOVABONDDESC grgBondDesc[KOVA_LINK_AGGR_MODES] = {
    {"", "", ""},
    {"6", "balance-alb", R"("mode=6 use_carrier=0 miimon=100 updelay=100")"},
    {"4", "802.3ad", R"("mode=4 use_carrier=0 miimon=100 updelay=100 lacp_rate=fast")"},
    {"2", "balance-xor", R"("mode=2 use_carrier=0 miimon=100 updelay=100")"},
    {"1", "active-backup", R"("mode=1 use_carrier=0 miimon=100 updelay=100")"},
    {"0", "balance-rr", R"("mode=0 use_carrier=0 miimon=100 updelay=100")"},
    {"", "", ""},
    {"", "", ""},
    {"", "", ""},
};

extern "C" const char *KOVANetLinkAggrModeToString(int mode) {
    switch (mode) {
    case KOVA_LINK_AGGR_OVS_ACTIVE_BACKUP:
        return "ovs-active-backup";
    case KOVA_LINK_AGGR_BALANCE_SLB:
        return "balance-slb";
    case KOVA_LINK_AGGR_BALANCE_TCP:
        return "balance-tcp";
    default:
        return KOVA_LINK_AGGR_BALANCE_ALB <= mode && mode <= KOVA_LINK_AGGR_BALANCE_RR ? grgBondDesc[mode].szName
                                                                                       : "unknown";
    }
}
