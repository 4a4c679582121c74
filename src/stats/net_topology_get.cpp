#include <kovanetsdk/stats.h>

#include "core/ifcfg.h"

#include <kovanetsdk/link.h>
#include <strings.h>

using namespace kova;

const TOPOLOGYINFO gTopologyInfo[KLIB_TOPOLOGY_COUNT] = {
    {KLIB_TOPOLOGY_UNKNOWN, "unknown", "eth0", 0, 3},
    {KLIB_TOPOLOGY_CLIENT, "client", "eth0", 1, 1},
    {KLIB_TOPOLOGY_BRIDGE, "bridge", "br0", 0, 2},
    {KLIB_TOPOLOGY_ROUTER, "router", "eth0", 0, 3},
};

namespace {

constexpr char kTopology[] = "net_topology";

int stored_topology() {
    char szName[1024];
    if (KLIBCFileGetKeyValue(kKovaInfo, kTopology, szName, sizeof szName, 0) <= 0) {
        log_info(HERE, "Failed to get key[%s] in [%s]", kTopology, kKovaInfo);
        return KLIB_TOPOLOGY_UNKNOWN;
    }
    for (const TOPOLOGYINFO &topology : gTopologyInfo) {
        if (strcasecmp(topology.szName, szName) == 0) {
            return topology.nTopology;
        }
    }
    return KLIB_TOPOLOGY_UNKNOWN;
}

/** The address is on the first VLAN of an interface that has one. */
void follow_to_vlan(char (&szIfname)[16]) {
    VLANINFO *found = nullptr;
    int number = 0;
    if (KLIBNetVlanEnum(&found, &number) < 0) {
        return;
    }
    const heap<VLANINFO> vlans{found};
    for (int i = 0; i < number; ++i) {
        if (strcmp(found[i].szRowDevice, szIfname) == 0) {
            copy_text(szIfname, found[i].szIfname);
            break;
        }
    }
}

} // namespace

extern "C" int KLIBNetTopologyGet(TOPOLOGYINFO *pInfo) {
    if (KLIBCFileCheckKeyValue(kKovaInfo, "support_net_topology", "yes", 0) != 1) {
        return KLIB_TOPOLOGY_UNKNOWN;
    }
    const int current = stored_topology();
    if (pInfo == nullptr) {
        return current;
    }
    const int asked_for = pInfo->nTopology;
    const bool is_topology = KLIB_TOPOLOGY_UNKNOWN < asked_for && asked_for < KLIB_TOPOLOGY_COUNT;
    const int described = is_topology ? asked_for : current;
    *pInfo = gTopologyInfo[described];
    follow_to_vlan(pInfo->szIfname);
    return described;
}

extern "C" int KLIBNETSetTopologyConfigs(const TOPOLOGYINFO *pInfo) {
    if (refuses_null(HERE, "pInfo", pInfo)) {
        return -1;
    }
    const field_text name{pInfo->szName};
    return KLIBCINFOSetKeyValue(kTopology, name.c_str()) < 0 ? -1 : 0;
}
