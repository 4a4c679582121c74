#include <kovanetsdk/bridge.h>

#include "core/ifcfg.h"

using namespace kova;

namespace {

constexpr char kMissing[] = "Failed to get key[%s] in file[%s].";

template<size_t Size> bool read_key(const ifcfg_path &path, const char *key, char (&value)[Size]) {
    value[0] = '\0';
    return KLIBCFileGetKeyValue(path.c_str(), key, value, Size, 0) > 0;
}

bool is_set_to(const ifcfg_path &path, const char *key, const char *value) {
    return KLIBCFileCheckKeyValue(path.c_str(), key, value, 0) == 1;
}

void read_role(const ifcfg_path &path, BRIDGEINFO &bridge) {
    if (is_set_to(path, key::kType, "bridge")) {
        bridge.nType = is_set_to(path, key::kLocalLan, "yes") ? KLIB_BRIDGE_LOCAL_LAN : KLIB_BRIDGE_MASTER;
        if (!read_key(path, key::kPrimary, bridge.szPeer)) {
            log_info(HERE, kMissing, key::kPrimary, path.c_str());
        }
    } else {
        const bool is_member = read_key(path, key::kBridge, bridge.szPeer) && bridge.szPeer[0] != '\0';
        bridge.nType = is_member ? KLIB_BRIDGE_SLAVE : KLIB_BRIDGE_NONE;
    }
}

void read_address(const ifcfg_path &path, NETINFO &ip) {
    ip.blLinkUp = is_set_to(path, key::kOnBoot, "yes") ? 1 : 0;
    ip.nIPSource = is_set_to(path, key::kBootProto, "static") ? 1 : 0;
    if (ip.nIPSource == 0) {
        return;
    }
    // the log has always named this key for both
    if (!read_key(path, key::kIpAddr, ip.szIP)) {
        log_info(HERE, kMissing, key::kPrimary, path.c_str());
    }
    if (!read_key(path, key::kNetmask, ip.szMask)) {
        log_info(HERE, kMissing, key::kPrimary, path.c_str());
    }
}

void change_address(key_changes &changes, const NETINFO &ip) {
    if (ip.nIPSource != 0) {
        changes.set(key::kIpAddr, field_text{ip.szIP}.c_str());
        changes.set(key::kNetmask, field_text{ip.szMask}.c_str());
        changes.set(key::kBootProto, "static");
    } else {
        changes.set(key::kBootProto, "dhcp");
        changes.remove(key::kIpAddr);
        changes.remove(key::kNetmask);
    }
}

/** @return whether the role is one of the table */
bool change_role(key_changes &changes, const BRIDGEINFO &bridge) {
    const field_text peer{bridge.szPeer};
    switch (bridge.nType) {
    case KLIB_BRIDGE_NONE:
        changes.remove(key::kType);
        changes.remove(key::kPrimary);
        changes.remove(key::kBridge);
        break;
    case KLIB_BRIDGE_MASTER:
    case KLIB_BRIDGE_LOCAL_LAN:
        changes.set(key::kType, "bridge");
        changes.set(key::kPrimary, peer.c_str());
        changes.remove(key::kBridge);
        break;
    case KLIB_BRIDGE_SLAVE:
        changes.set(key::kBridge, peer.c_str());
        changes.remove(key::kType);
        changes.remove(key::kPrimary);
        break;
    default:
        return false;
    }
    if (bridge.nType == KLIB_BRIDGE_LOCAL_LAN) {
        changes.set(key::kLocalLan, "yes");
    } else {
        changes.remove(key::kLocalLan);
    }
    return true;
}

/** The copy is for people, nothing is put back from it. */
void save_copy(const ifcfg_path &path) {
    (void)KLIBCExec("/bin/cp", "-f", path.c_str(), path_text{"%s.saved", path.c_str()}.c_str(), nullptr);
}

} // namespace

extern "C" int KOVANetGetBridgeConfig(const char *szIfname, NETINFO *pNetInfo, BRIDGEINFO *pBridge) {
    if (pNetInfo == nullptr && pBridge == nullptr) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, -1, "Wrong Parameter.");
    }
    if (refuses_ifname(HERE, "szIfname", szIfname)) {
        return -1;
    }
    const ifcfg_path path{szIfname};
    if (KLIBCFileExist(path.c_str()) != 1) {
        return fail_keeping_code(HERE, -1, "Failed to access [%s].", path.c_str());
    }
    if (pBridge != nullptr) {
        *pBridge = {};
        copy_text(pBridge->szIfname, szIfname);
        read_role(path, *pBridge);
    }
    if (pNetInfo != nullptr) {
        copy_text(pNetInfo->szIfname, szIfname);
        read_address(path, *pNetInfo);
    }
    return 0;
}

extern "C" int KOVANetSetBridgeConfig(const NETINFO *pNetInfo, const BRIDGEINFO *pBridge) {
    if (pBridge == nullptr) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, -1, "Wrong Parameter.");
    }
    const field_text ifname{pBridge->szIfname};
    if (refuses_ifname(HERE, "pBridge->szIfname", ifname.c_str())) {
        return -1;
    }
    key_changes changes;
    changes.set(key::kDevice, ifname.c_str());
    if (!change_role(changes, *pBridge)) {
        return fail_keeping_code(HERE, -1, "Failed to set bridge config with wrong type.");
    }
    if (pNetInfo != nullptr) {
        changes.set(key::kOnBoot, pNetInfo->blLinkUp != 0 ? "yes" : "no");
        change_address(changes, *pNetInfo);
    }
    if (!changes.is_complete()) {
        return fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
    }
    const ifcfg_path path{ifname.c_str()};
    if (KLIBCFileExist(path.c_str()) == 1) {
        save_copy(path);
    }
    return changes.apply(path.c_str());
}

extern "C" int KOVANetIsIfBridgeType(const char *szIfname, int nType) {
    if (szIfname == nullptr) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, 0, "Bad parameter");
    }
    BRIDGEINFO bridge = {};
    if (KOVANetGetBridgeConfig(szIfname, nullptr, &bridge) < 0) {
        return fail_keeping_code(HERE, 0, "Failed to get PPPoE relay config");
    }
    return bridge.nType == nType ? 1 : 0;
}

extern "C" int KOVANetDisableBridgeSlave(const NETINFO *pNetInfo) {
    if (refuses_null(HERE, "pNetInfo", pNetInfo)) {
        return -1;
    }
    const field_text ifname{pNetInfo->szIfname};
    if (refuses_ifname(HERE, "pNetInfo->szIfname", ifname.c_str())) {
        return -1;
    }
    key_changes changes;
    changes.set(key::kDevice, ifname.c_str());
    changes.set(key::kOnBoot, "yes");
    change_address(changes, *pNetInfo);
    changes.remove(key::kBridge);
    changes.remove(key::kType);
    if (!changes.is_complete()) {
        return fail_quietly(HERE, NET_ERR_OUT_OF_MEMORY, -1);
    }
    const ifcfg_path path{ifname.c_str()};
    save_copy(path);
    return changes.apply(path.c_str());
}
