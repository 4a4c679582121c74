#include "operations.h"

#include <cstdio>
#include <ctime>
#include <kova/core.h>
#include <kovanetsdk/kovanetsdk.h>
#include <unistd.h>

/** In place of the C library's: nothing here has to settle, and every operation runs hundreds of times. */
extern "C" int nanosleep(const timespec *, timespec *) {
    return 0;
}

namespace kova_test {

namespace {

constexpr char kPlain[] = "%s=%s\n";
constexpr char kQuoted[] = "%s=\"%s\"\n";
constexpr char kInfo[] = "/etc/kovainfo.conf";
constexpr char kIfcfg[] = "/etc/sysconfig/network-scripts/ifcfg-eth0";
constexpr char kNoProtocol[] = "DEVICE=eth0\nONBOOT=yes\n";
constexpr char kAddress[] = "192.168.7.10";
constexpr char kMask[] = "255.255.255.0";
constexpr char kBrokenMask[] = "255.255.255.999";
constexpr char kIpv6Address[] = "2001:db8::10";
constexpr char kIpv6Gateway[] = "2001:db8::1";

bool set_keys(const char *path) {
    KLIBSZHASH *const set = KLIBCSzHashAlloc(8);
    KLIBSZHASH *const removed = KLIBCSzHashAlloc(8);
    const bool works = KLIBCSzHashSetValue(set, "KEY", "new") == 0 && KLIBCSzHashSetValue(set, "MORE", "1") == 0 &&
                       KLIBCSzHashSetValue(removed, "MASTER", "") == 0 &&
                       KLIBCFileSetKeys(path, set, removed, kPlain) == 0;
    KLIBCSzHashFree(set);
    KLIBCSzHashFree(removed);
    return works;
}

bool cipher(const char *) {
    char hidden[16];
    return KLIBCCryptBufCrypt("password", 8, hidden, sizeof hidden) == 0;
}

bool lock_by_name(const char *) {
    return KLIBCFileLock(0x105, 5) == 0 && KLIBCFileLock(0x106, 5) == 0 && KLIBCFileUnlock(0x100) == 0 &&
           KLIBCFileUnlock(0x100) == 0;
}

bool lock_by_file(const char *path) {
    int fd = -1;
    return KLIBCFileLockTimeByFile(path, 1, 30, &fd) == 0 && KLIBCFileUnlockByFile(fd) == 1;
}

NETINFO card(int source) {
    NETINFO card = {};
    card.nIPSource = source;
    snprintf(card.szIfname, sizeof card.szIfname, "eth0");
    snprintf(card.szIP, sizeof card.szIP, "%s", kAddress);
    snprintf(card.szMask, sizeof card.szMask, "%s", kMask);
    return card;
}

bool set_card(int source) {
    NETINFO wanted = card(source);
    return KOVANetSetCard1(&wanted, nullptr) == 0;
}

bool set_relay(const char *) {
    const PPPOE_RELAY_CONF conf{1, "eth1"};
    return KOVANetSetPPPoERelayConfig("lbr0", &conf) == 0;
}

/** The file of an address that is refused after it was written. */
bool set_broken_mask(const char *path) {
    const std::pair<const char *, const char *> lines[] = {
        {"DEVICE", "eth0"}, {"ONBOOT", "yes"}, {"IPADDR", kAddress}, {"NETMASK", kBrokenMask}, {"BOOTPROTO", "static"}};
    bool works = KLIBCFileRemoveKey(path, "MASTER") == 0;
    for (const auto &[key, value] : lines) {
        works = works && KLIBCFileSetKeyValue(path, key, value, kPlain) == 0;
    }
    return works;
}

bool make_bond(const char *) {
    KOVALINKAGGROPT bond = {"bond0", KOVA_LINK_AGGR_BALANCE_RR, 0, 2, {"eth0", "eth1"}};
    return KOVANetLinkAggrSet(&bond) == 0;
}

bool make_vlan(const char *) {
    constexpr int kId = 10;
    const NETINFO wanted = card(1);
    return KLIBNetVlanCreate("eth0", kId, &wanted) == 0;
}

/** The address is given to /bin/true: what is looked at is the file. */
bool set_fixed_ipv6(const char *) {
    return KOVANetIPv6ConfSet(NET_IPV6_STATIC, "eth0", kIpv6Address, 64, kIpv6Gateway) == 0;
}

/** One key of several that an operation writes one after the other. */
std::function<bool(const char *)> writes(const char *key, const char *value) {
    return [key, value](const char *path) { return KLIBCFileSetKeyValue(path, key, value, kQuoted) == 0; };
}

bool make_temporary(const char *) {
    char path[] = "/tmp/crash/.file.XXXXXX";
    FILE *const file = KLIBCFileTempFileOpen(path);
    return file != nullptr && fclose(file) == 0 && unlink(path) == 0;
}

bool set_tunnel_password(const char *) {
    const TUNNEL_CONF conf = {0, "broker", "user", "secret"};
    return KOVATunnelConfigSet(&conf) == 0;
}

bool set_tunnel_server(const char *) {
    const TUNNEL_CONF conf = {1, "broker", "", ""};
    return KOVATunnelConfigSet(&conf) == 0;
}

bool set_secret(const char *) {
    const PPPOE_CONF conf = {"eth0", "user", "secret", "1492", 1};
    return PPPoEConfigSet(&conf) == 0;
}

} // namespace

const std::vector<operation> &operations() {
    static const std::vector<operation> all = {
        // ---- platform
        {"KLIBCFileSetKeyValue_presentKey", 48,
         [](const char *path) { return KLIBCFileSetKeyValue(path, "KEY", "new", kPlain) == 0; }},
        {"KLIBCFileSetKeyValue_newKey", 48,
         [](const char *path) { return KLIBCFileSetKeyValue(path, "NEW", "new value", kQuoted) == 0; }},
        {"KLIBCFileSetKeys", 48, set_keys},
        {"KLIBCFileRemoveKey", 50, [](const char *path) { return KLIBCFileRemoveKey(path, "KEY") == 0; },
         works_on::kPresentFile},
        {"KLIBCINFOSetKeyValue", 44, [](const char *) { return KLIBCINFOSetKeyValue("KEY", "new") == 0; },
         works_on::kAnyFile, kInfo},
        {"KLIBCINFORemoveKey", 50, [](const char *) { return KLIBCINFORemoveKey("KEY") == 0; }, works_on::kPresentFile,
         kInfo},
        {"KLIBCFileTouch", 48, [](const char *path) { return KLIBCFileTouch(path) == 0; }, works_on::kMissingFile},
        {"KLIBCFileAddLine_atTheEnd", 48,
         [](const char *path) { return KLIBCFileAddLine(path, nullptr, "line", 0) == 0; }},
        {"KLIBCFileAddLine_behindMarker", 48,
         [](const char *path) { return KLIBCFileAddLine(path, "MARKER", "line", 512) == 0; }},
        {"KLIBCFileReplaceSubStr", 50,
         [](const char *path) { return KLIBCFileReplaceSubStr(path, "old", "much newer") == 0; },
         works_on::kPresentFile},
        {.name = "KLIBCCryptBufCrypt",
         .floor = 60,
         .call = cipher,
         .files = works_on::kMissingFile,
         .path = "/etc/kova/secret.key",
         .mode = 0600,
         .is_random = true},
        {.name = "KLIBCFileTempFileOpen",
         .floor = 10,
         .call = make_temporary,
         .files = works_on::kNoFile,
         .path = "/tmp/crash/file",
         .mode = 0600,
         .is_built_of_others = true,
         .temporaries = {".file."}},
        {"KLIBCFileLock", 28, lock_by_name, works_on::kNoFile},
        {"KLIBCFileLockTimeByFile", 22, lock_by_file, works_on::kNoFile},

        // ---- library
        {.name = "KLIBNetSetIfCfg",
         .floor = 74,
         .call = [](const char *) { return KLIBNetSetIfCfg("eth0", "KEY", "new") == 0; },
         .path = kIfcfg,
         .is_built_of_others = true},
        {.name = "KOVANetSetIfBlock",
         .floor = 144,
         .call = [](const char *) { return KOVANetSetIfBlock("eth0", 1, 1) == 0; },
         .files = works_on::kPresentFile,
         .path = kIfcfg,
         .is_built_of_others = true,
         .parts = {writes("BLOCK_HA", "yes")}},
        {.name = "BlKOVALnxIsDHCP_repair",
         .floor = 94,
         .call = [](const char *) { return BlKOVALnxIsDHCP("eth0") == 0; },
         .path = kIfcfg,
         .text = kNoProtocol,
         .is_built_of_others = true},
        {.name = "KOVAILnxSetIPNetmask",
         .floor = 176,
         .call = [](const char *) { return KOVAILnxSetIPNetmask("eth0", kAddress, kMask) == 0; },
         .path = kIfcfg,
         .is_built_of_others = true,
         .keeps_backup = true},
        {.name = "KOVAILnxSetIPNetmask_failing",
         .floor = 124,
         .call = [](const char *) { return KOVAILnxSetIPNetmask("eth0", kAddress, kBrokenMask) == -1; },
         .path = kIfcfg,
         .is_built_of_others = true,
         .puts_back = true,
         .keeps_backup = true,
         .parts = {set_broken_mask}},
        {.name = "KOVANetSetCard1_static",
         .floor = 226,
         .call = [](const char *) { return set_card(1); },
         .path = kIfcfg,
         .is_built_of_others = true,
         .keeps_backup = true},
        {.name = "KOVANetSetCard1_dhcp",
         .floor = 120,
         .call = [](const char *) { return set_card(0); },
         .path = kIfcfg,
         .is_built_of_others = true},
        {.name = "KOVANetIPv6ConfSet_auto",
         .floor = 200,
         .call = [](const char *) { return KOVANetIPv6ConfSet(NET_IPV6_AUTO, "eth0", nullptr, 0, nullptr) == 0; },
         .path = kIfcfg,
         .is_built_of_others = true,
         .parts = {writes("IPV6INIT", "auto")}},
        {.name = "KOVANetIPv6ConfSet_static",
         .floor = 450,
         .call = set_fixed_ipv6,
         .path = kIfcfg,
         .is_built_of_others = true,
         .parts = {writes("IPV6_ACCEPT_RA", "0"), writes("IPV6INIT", "static"), writes("IPV6ADDR", kIpv6Address),
                   writes("IPV6PREFIXLENG", "64")}},
        {.name = "KOVANetDefaultGatewaySetConf",
         .floor = 44,
         .call = [](const char *) { return KOVANetDefaultGatewaySetConf("192.168.7.1") == 0; },
         .path = "/etc/sysconfig/network",
         .is_built_of_others = true},
        {.name = "DHCPInterfaceSetEnabled",
         .floor = 44,
         .call = [](const char *) { return DHCPInterfaceSetEnabled("eth0", 0, 1) == 0; },
         .path = "/etc/dhcpd/dhcpd-eth0.info",
         .is_built_of_others = true},
        {.name = "KLIBNetVlanCreate",
         .floor = 370,
         .call = make_vlan,
         .files = works_on::kPresentFile,
         .path = kIfcfg,
         .is_built_of_others = true,
         .makes_anew = true,
         .others = {"ifcfg-eth0.10"},
         .temporaries = {"DEVICE_", "VLAN_"}},
        {.name = "KOVANetLinkAggrSet_make",
         .floor = 350,
         .call = make_bond,
         .files = works_on::kPresentFile,
         .path = kIfcfg,
         .is_built_of_others = true,
         .others = {"ifcfg-bond0", "ifcfg-eth0.saved", "ifcfg-eth1", "ifcfg-eth1.saved"}},
        {.name = "PPPoEConfigSet",
         .floor = 210,
         .call = set_secret,
         .files = works_on::kMissingFile,
         .path = "/etc/ppp/pap-secrets",
         .mode = 0600,
         .is_built_of_others = true,
         .keeps_backup = true,
         .others = {"pppoe.conf"}},
        {.name = "KOVATunnelConfigSet_password",
         .floor = 60,
         .call = set_tunnel_password,
         .path = "/etc/gogoc/.tunnel_passwd",
         .text = "another",
         .mode = 0600,
         .is_built_of_others = true,
         .makes_anew = true,
         .temporaries = {".tunnel_passwd."}},
        {.name = "KOVATunnelConfigSet_server",
         .floor = 56,
         .call = set_tunnel_server,
         .path = "/etc/sysconfig/network-scripts/ifcfg-tun",
         .is_built_of_others = true},
        {.name = "KLIBNETSetTopologyConfigs",
         .floor = 44,
         .call = [](const char *) { return KLIBNETSetTopologyConfigs(&gTopologyInfo[KLIB_TOPOLOGY_BRIDGE]) == 0; },
         .path = kInfo,
         .is_built_of_others = true},
        {.name = "KOVANetSetPPPoERelayConfig",
         .floor = 44,
         .call = set_relay,
         .files = works_on::kPresentFile,
         .path = "/etc/sysconfig/pppoe-relay/lbr0",
         .is_built_of_others = true},
    };
    return all;
}

} // namespace kova_test
