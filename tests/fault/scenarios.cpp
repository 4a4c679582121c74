#include "fault/sweep.h"

#include "support/fake_names.h"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <kova/plugin.h>
#include <utility>

namespace fault {

using kova_test::ifcfg;
using kova_test::write_file;

// ---- the appliance that every call starts from: cards eth0 (static) and eth1 (DHCP), both members of bond0

world::world() : list(KLIBCSzListAlloc(4)), map(KLIBCSzHashAlloc(4)) {
    KLIBCSzListPush(&list, "10.0.0.1");
    KLIBCSzListPush(&list, "10.0.0.2");
    kernel.add("eth0", {.ip = "192.168.1.10", .mask = "255.255.255.0", .supported = 0x20});
    kernel.add("eth1", {.ip = "192.168.2.10", .mask = "255.255.255.0", .last_mac_byte = 2});
    write_file(ifcfg("eth0"),
               "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=192.168.1.10\nNETMASK=255.255.255.0\n"
               "IPV6INIT=auto\nLOCAL_LAN=yes\nMASTER=bond0\nSLAVE=yes\n"
               "BLOCK_CNT=\"1\"\nBLOCK_HA=\"no\"\nBLOCK_AHA=\"yes\"\nBLOCK_VIRTUAL=\"no\"\nBLOCK_ORLENA=\"no\"\n");
    write_file(ifcfg("eth1"), "DEVICE=eth1\nBOOTPROTO=dhcp\nONBOOT=yes\n");
    write_file("/etc/dhclient/ipv4/dhcpcd-eth1.info", "IPADDR=192.168.2.10\nNETMASK=255.255.255.0\n");
    write_file("/etc.defaults/kovainfo.conf", "maxlanport=\"2\"\nlocal_lan=\"eth0 eth1\"\n");
    write_file("/run/ddns/externalIP.result", "externalIP=198.51.100.7\n");
    write_file("/etc/kova/platform.conf", "ha_running=no\n");
    rig.replace_file("/proc/net/if_inet6", "fe80000000000000000000000000000a 02 40 20 80     eth0\n");
    rig.replace_file("/proc/sys/net/ipv6/conf/eth0/disable_ipv6", "0\n");
    rig.replace_file("/proc/sys/kernel/kova_internal_netif_num", "2\n");
    rig.replace_file("/sys/class/net/eth0/flags", "0x1003\n");
    rig.replace_file("/sys/class/net/bond0/bonding/slaves", "eth0 eth1\n");
    rig.replace_file("/sys/class/net/bond0/bonding/mode", "802.3ad 4\n");
    rig.replace_file("/proc/net/bonding//bond0", "\tPartner Mac Address: 00:11:22:33:44:55\n");
    rig.answer("/bin/mkdir -p /etc/dhcpd", 0, "", [] { std::filesystem::create_directories("/etc/dhcpd"); });
    rig.answer("/bin/ipcalc -n", 0, "NETWORK=192.168.1.0\n");
    rig.answer("/bin/ipcalc -b", 0, "BROADCAST=192.168.1.255\n");
}

world::~world() {
    release();
}

void world::release() {
    KLIBCSzListFree(std::exchange(list, nullptr));
    KLIBCSzHashFree(std::exchange(map, nullptr));
    DHCPOptionFree(std::exchange(subnet.options, nullptr));
    DHCPRangeFree(std::exchange(ranges, nullptr));
    if (event != 0) {
        KLIBPluginExit(event);
        event = 0;
    }
}

const tolerances &tolerated_everywhere() {
    static const tolerances all{
        {"access ", "a look whether something is there has no third answer", kAnyResult},
        {"KLIBCFileExist ", "a look whether something is there has no third answer", kAnyResult},
        {"KLIBCFileCheckDir ", "a look whether something is there has no third answer", kAnyResult},
        {"KOVAHA", "a machine that cannot tell is no node of a cluster", kAnyResult},
        {"KLIBCModuleIsLoad 8021q > ", "one of several places that tell; a kernel that tells nowhere has no VLANs",
         kAnyResult},
        {"fopen /sys/class/net/kova_ovs_bonds", "logged; without the list there is no switch", kAnyResult},
        {"fread /sys/class/net/kova_ovs_bonds", "without the list there is no switch", kAnyResult},
        {"close ", "what it was for is done"},
        {"closedir ", "what it was for is done"},
        {"fclose read ", "what it was for is done"},
        {"fclose written /proc/sys/", "the flush before it told"},
        {"setvbuf ", "only the speed depends on it"},
        {"KLIBCFileUnlock", "what the lock was for is done; the platform lets go of it all the same"},
        {"KLIBPluginExit", "the event is over"},
        {"mkdir /run/lock", "another process may have made it; whether it is there shows at the open"},
        {"chmod /run/lock", "the directory may be another's; whether the lock can be had shows at the open"},
        {"fchmod /run/lock", "the lock is held all the same"},
        {"fstat /run/lock/kova/", "whether the mode has to be put right is not known; the lock is held all the same"},
        {"fcntl 37 ", "a lock that is not to be had is asked for again"},
        {"open /etc/kova/platform.conf", "what this machine does not say is not set"},
        {"fstat /etc/kova/platform.conf", "what this machine does not say is not set"},
        {"read /etc/kova/platform.conf", "what this machine does not say is not set"},
    };
    return all;
}

namespace {

// ---- what is special about some calls

/** This machine is a running node of a cluster. */
void cluster(world &) {
    write_file("/etc/kova/platform.conf",
               "ha_running=yes\nha_active=yes\nha_heartbeat_if=eth9\n"
               "ha_ip_eth0=10.9.0.1\nha_mask_eth0=255.255.0.0\n"
               "ha_ip_eth1=10.9.0.2\nha_mask_eth1=255.255.0.0\nha_mac_0=02:00:00:00:00:77\n");
}

/** A switch with a port over eth0 and a bond over both. */
void virtual_switch(world &it) {
    it.rig.replace_file("/sys/devices/virtual/net/ovs_bond0", "");
    it.rig.replace_file("/sys/devices/virtual/net/ovs_eth0", "");
    it.rig.replace_file("/sys/class/net/kova_ovs_bonds", "ovs_bond0 eth0 eth1\n");
    write_file(ifcfg("ovs_bond0"), "SLAVE_LIST=\"eth0 eth1\"\nBOND_MODE=balance-slb\n");
}

void without_link(world &it) {
    it.kernel.add("eth0", {.flags = IFF_UP, .ip = "192.168.1.10", .mask = "255.255.255.0"});
}

void bridge_port(world &it) {
    it.rig.replace_file("/sys/class/net/eth0/brport", "");
}

void bond_member(world &it) {
    it.kernel.add("eth0", {.flags = IFF_UP | IFF_SLAVE});
}

void down(world &it) {
    it.kernel.add("eth0", {.flags = IFF_BROADCAST});
    it.rig.replace_file("/sys/class/net/eth0/flags", "0x1002\n");
}

void duplicate(world &it) {
    it.rig.replace_file("/proc/net/if_inet6", "fe80000000000000000000000000000a 02 40 20 88     eth0\n");
}

void many_duplicates(world &it) {
    std::string lines;
    for (int i = 0; i < 17; ++i) {
        lines += "fe8000000000000000000000000000" + std::to_string(10 + i) + " 02 40 20 88     eth0\n";
    }
    it.rig.replace_file("/proc/net/if_inet6", lines);
}

void no_protocol(world &) {
    write_file(ifcfg("eth0"), "DEVICE=eth0\n");
}

void two_vlans(world &it) {
    it.kernel.load_vlan_module();
    it.kernel.add("eth0.10", {.ip = "192.168.10.10", .mask = "255.255.255.0", .row_device = "eth0"});
}

/** A fixed address and the switches of IPv6. */
void fixed_ipv6(world &it) {
    write_file(ifcfg("eth0"), "DEVICE=eth0\nIPV6INIT=static\nIPV6ADDR=2001:db8::9\nIPV6PREFIXLENG=64\n"
                              "IPV6_DEFAULTGW=fe80::9\n");
    it.rig.replace_file("/proc/sys/net/ipv6/conf/eth0/accept_ra", "1");
    it.rig.replace_file("/proc/sys/net/ipv6/conf/eth1/accept_ra", "1");
    for (const char *kind : {"client", "info"}) { // of one that has just begun
        write_file("/tmp/dhclient6-eth0-" + std::string(kind) + ".pid", "");
    }
}

void open_event(world &it) {
    KLIBPluginSDKInit("net", "net/test", &it.event);
}

void member_to_add(world &it) {
    it.bond = {};
}

void card_to_set(world &it) {
    it.card = {.nIPSource = 1, .szIfname = "eth0", .szIP = "192.168.1.20", .szMask = "255.255.255.0"};
    write_file("/etc/ppp/old_gateway.bak", "192.168.1.1\n");
    write_file("/etc/resolv.conf.bak", "nameserver 192.168.1.1\n");
    write_file("/usr/kova/service/ddns", "#!/bin/sh\n");
}

void dhcp_card_to_set(world &it) {
    card_to_set(it);
    it.card.nIPSource = 0;
}

// ---- the same for resolver, routes, host name and DHCP server

constexpr char kServers[] = "nameserver\t10.0.0.1\nnameserver\t10.0.0.2\n";

void default_route(world &it) {
    it.rig.replace_file("/proc/net/route", "Iface Destination Gateway Flags RefCnt Use Metric Mask MTU Window IRTT\n"
                                           "eth0 0001A8C0 00000000 0001 0 0 0 00FFFFFF 0 0 0\n"
                                           "eth0 00000000 0101A8C0 0003 0 0 0 00000000 0 0 0\n");
}

void gateway_conf(world &) {
    write_file("/etc/sysconfig/network", "NETWORKING=yes\nGATEWAY=192.168.1.1\n");
}

/** Two cards that can lose the route of their subnets. */
void two_without_link(world &it) {
    it.kernel.add("eth0", {.flags = IFF_UP});
    it.kernel.add("eth1", {.flags = IFF_UP});
}

/** Some servers are in use, others are configured, and the services that are told of a change are there. */
void resolver(world &) {
    write_file("/etc/resolv.conf", "nameserver\t192.168.1.1\n");
    write_file("/etc/resolv.conf.static", kServers);
    write_file("/etc/resolv.conf.option", "domain\texample.net\n");
    write_file("/etc/kovainfo.conf", "dns_mode=\"static\"\n");
    write_file("/usr/kova/service/ddns", "#!/bin/sh\n");
    write_file("/usr/kova/service/kovarelayd", "#!/bin/sh\n");
}

void automatic_resolver(world &it) {
    resolver(it);
    write_file("/etc/kovainfo.conf", "dns_mode=\"auto\"\n");
    write_file("/etc/iproute2/config/resolv4.conf", "nameserver\t10.1.0.1\n");
    write_file("/etc/iproute2/config/resolv6.conf", "nameserver\t2001:db8::53\n");
}

void host_names(world &) {
    write_file("/etc/hostname", "before\n");
    write_file("/etc/hosts", "127.0.0.1\tlocalhost\n");
}

void dhcp_switches(world &) {
    write_file("/etc/dhcpd/dhcpd.info", "enable=\"yes\"\n");
    for (const char *name : {"dhcpd-eth0", "dhcpd6-eth0", "dhcpd-eth1", "dhcpd-bond0"}) {
        write_file(std::string("/etc/dhcpd/") + name + ".info", "enable=\"yes\"\nbonding_backup_enable=\"no\"\n");
    }
}

void members_with_switches(world &it) {
    dhcp_switches(it);
    KLIBCSzListRemoveAll(it.list);
    KLIBCSzListPush(&it.list, "eth0");
    KLIBCSzListPush(&it.list, "eth1");
}

/** Subnets of both families, and everything else that goes with the name eth0. */
void dhcp_subnets(world &it) {
    dhcp_switches(it);
    const std::string v4 = "interface=eth0\ndhcp-range=set:eth00,10.1.0.10,10.1.0.99,255.255.255.0,600\n"
                           "dhcp-option=tag:eth00,option:router,10.1.0.1\n"
                           "dhcp-option=tag:eth00,option:domain-search,example.net\n"
                           "dhcp-option=tag:eth00,option:dns-server,10.1.0.2,10.1.0.3\n"
                           "dhcp-option=tag:eth00,option:mtu,9000\n"
                           "dhcp-option=tag:eth00,option:ntp-server,10.1.0.4,10.1.0.5\n";
    const std::string v6 = "interface=eth0\ndhcp-range=set:eth0v60,2001:db8::10,2001:db8::99,64,600\n"
                           "dhcp-option=tag:eth0v60,option6:dns-server,[2001:db8::53]\nenable-ra\n";
    write_file("/etc/dhcpd/dhcpd-eth0-subnet0.conf", v4);
    write_file("/etc/dhcpd/dhcpd-eth0-subnet1.conf", v4);
    write_file("/etc/dhcpd/dhcpd6-eth0-subnet0.conf", v6);
    write_file("/etc/dhcpd/dhcpd-eth0-office.conf", v4);
    for (const char *name : {"dhcpd-eth0-subnet0", "dhcpd6-eth0-subnet0", "dhcpd-eth0-office", "wpad-eth0"}) {
        write_file(std::string("/etc/dhcpd/") + name + ".info", "enable=\"yes\"\n");
    }
    write_file("/etc/dhcpd/dhcpd-eth0-static.conf", "dhcp-host=set:eth00,02:00:00:00:00:01,10.1.0.11\n");
    write_file("/etc/dhcpd/wpad-eth0.conf", "dhcp-option=tag:eth00,252,http://wpad.example.net/wpad.dat\n");
}

/** Puts an option without a list of its own before the others. */
DHCP_OPTION &add_option(world &it, int number, const char *name, const char *value) {
    auto *const option = static_cast<DHCP_OPTION *>(calloc(1, sizeof(DHCP_OPTION)));
    option->number = number;
    strcpy(option->name, name);
    strcpy(option->value, value);
    option->next = it.subnet.options;
    it.subnet.options = option;
    return *option;
}

void subnet_to_set(world &it) {
    it.subnet = {.enabled = 1,
                 .lease_time = 600,
                 .start_ip = "10.2.0.10",
                 .end_ip = "10.2.0.99",
                 .ifname = "eth0",
                 .domain = "example.net",
                 .dns1 = "10.2.0.2",
                 .dns2 = "10.2.0.3",
                 .netmask = "255.255.255.0",
                 .router = "10.2.0.1",
                 .tag = "office"};
    add_option(it, 26, "mtu", "9000");
    add_option(it, 42, "ntp-server", "").items = std::exchange(it.list, nullptr);
}

void subnet_to_change(world &it) {
    dhcp_subnets(it);
    subnet_to_set(it);
}

void v6_subnet_to_set(world &it) {
    it.subnet = {.enabled = 1,
                 .lease_time = 600,
                 .start_ip = "2001:db8::10",
                 .end_ip = "2001:db8::99",
                 .dns1 = "2001:db8::53",
                 .v6_mode = "stateful"};
}

void v6_subnet_to_change(world &it) {
    dhcp_subnets(it);
    it.subnet = {.enabled = 1, .lease_time = 900, .dns1 = "2001:db8::54", .v6_mode = "ra-stateless"};
}

void options_to_free(world &it) {
    add_option(it, 26, "mtu", "9000");
    add_option(it, 37, "tcp-ttl", "64");
}

void ranges_to_free(world &it) {
    for (int i = 0; i < 2; ++i) {
        auto *const range = static_cast<DHCP_RANGE *>(calloc(1, sizeof(DHCP_RANGE)));
        range->next = it.ranges;
        it.ranges = range;
    }
}

void local_boot_to_set(world &it) {
    it.boot = {.enabled = 1, .local_bootloader = "local.0"};
}

void remote_boot_to_change(world &it) {
    write_file("/etc/dhcpd/dhcpd-pxe-setting", "enable=\"yes\"\nis_remote_tftp=\"no\"\nlocal_bootloader=\"local.0\"\n"
                                               "remote_bootloader=\"old.0\"\nremote_tftp_server_ip=\"10.0.0.8\"\n");
    write_file("/etc/dhcpd/dhcpd-pxe.info", "enable=\"yes\"\n");
    write_file("/etc/dhcpd/dhcpd-pxe.conf", "dhcp-boot=tag:pxe,local.0\n");
    it.boot = {.enabled = 1, .is_remote_tftp = 1, .remote_bootloader = "remote.0", .remote_tftp_server_ip = "10.0.0.9"};
}

void vendor_to_set(world &it) {
    KLIBCSzHashSetValue(it.map, "1", "one");
    KLIBCSzHashSetValue(it.map, "43", "boot");
}

void vendors(world &) {
    write_file("/etc/dhcpd/dhcpd-vendor.conf", "dhcp-option=vendor:MSFT,1,first\ndhcp-option=vendor:PXEClient,43,x\n"
                                               "dhcp-option=vendor:MSFT,2,second\n");
}

void vendor_to_change(world &it) {
    vendors(it);
    vendor_to_set(it);
}

void lease_to_ask_for(world &it) {
    it.card = {.szIfname = "eth1"};
    write_file("/etc/dhclient/dhclient-script", "#!/bin/sh\n");
}

// ---- the same for VLANs, bonds, MTU, bridges and the PPPoE client

/** The VLAN eth0.10, as kernel and file have it. */
void vlan(world &it) {
    it.kernel.load_vlan_module();
    it.kernel.add("eth0.10", {.row_device = "eth0", .vlan_id = 10});
    it.rig.replace_file("/proc/net/vlan/config", "VLAN Dev name    | VLAN ID\nName-Type: VLAN_NAME_TYPE_RAW_PLUS_VID\n"
                                                 "eth0.10        | 10  | eth0\n");
    write_file(ifcfg("eth0"), "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=none\nIPV6INIT=off\n");
    write_file(ifcfg("eth0.10"), "DEVICE=eth0.10\nVLAN_ROW_DEVICE=eth0\nVLAN_ID=10\nONBOOT=yes\nBOOTPROTO=static\n"
                                 "IPADDR=192.168.1.10\nNETMASK=255.255.255.0\nIPV6INIT=auto\n");
    write_file("/etc/kovainfo.conf", "eth0_mtu=\"9000\"\neth0.10_mtu=\"9000\"\n");
}

/** A card with settings of both families, a stored MTU, and no VLAN. */
void vlan_to_make(world &it) {
    it.kernel.load_vlan_module();
    it.rig.replace_file("/proc/net/vlan/config",
                        "VLAN Dev name    | VLAN ID\nName-Type: VLAN_NAME_TYPE_RAW_PLUS_VID\n");
    write_file(ifcfg("eth0"), "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=192.168.1.10\nNETMASK=255.255.255.0\n"
                              "IPV6INIT=static\nIPV6ADDR=2001:db8::1\nIPV6PREFIXLENG=64\nIPV6DNS=2001:db8::53\n");
    write_file("/etc/kovainfo.conf", "eth0_mtu=\"9000\"\n");
    it.card = {.nIPSource = 1, .szIP = "192.168.1.10", .szMask = "255.255.255.0"};
}

void stored_mtu(world &) {
    write_file("/etc/kovainfo.conf", "eth0_mtu=\"1400\"\neth1_mtu=\"1400\"\n");
}

void mtu_of_switch(world &it) {
    virtual_switch(it);
    stored_mtu(it);
}

void bonds(world &it) {
    it.rig.replace_file("/sys/class/net/bonding_masters", "bond0\n");
}

/** A bond of both cards, as it would be asked for. */
void wanted_bond(world &it, const char *name, int mode) {
    it.bond = {};
    strcpy(it.bond.szName, name);
    it.bond.mode = mode;
    it.bond.cSlaves = 2;
    strcpy(it.bond.aszSlaves[0], "eth0");
    strcpy(it.bond.aszSlaves[1], "eth1");
}

/** Cards of no bond, the first with a lease, and a bond to be made of them. */
void bond_to_make(world &it) {
    wanted_bond(it, "bond1", KOVA_LINK_AGGR_8023AD);
    write_file(ifcfg("eth0"),
               "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=192.168.1.10\nNETMASK=255.255.255.0\n");
    write_file("/tmp/dhcpv4.leases.eth0", "lease { interface \"eth0\"; }\n");
}

/** The files of bond0, and a request for another mode of it. */
void bond_to_change(world &it) {
    wanted_bond(it, "bond0", KOVA_LINK_AGGR_BALANCE_RR);
    const std::string member = "USERCTL=no\nMASTER=bond0\nSLAVE=yes\n";
    const std::string address = "BOOTPROTO=static\nONBOOT=yes\nIPADDR=192.168.1.10\nNETMASK=255.255.255.0\n";
    write_file(ifcfg("bond0"), "DEVICE=bond0\n" + address + "USERCTL=no\nBONDING_OPTS=\"mode=4\"\n");
    write_file(ifcfg("eth0"), "DEVICE=eth0\n" + address + member);
    write_file(ifcfg("eth1"), "DEVICE=eth1\n" + address + member);
}

/** The same, with a member that has an address of its own. */
void bond_and_other_address(world &it) {
    bond_to_change(it);
    write_file(ifcfg("eth1"), "DEVICE=eth1\nIPADDR=192.168.1.11\nMASTER=bond0\nSLAVE=yes\n");
}

void bond_to_delete(world &it) {
    bond_to_change(it);
    it.bond.mode = KOVA_LINK_AGGR_UNKNOWN;
}

/** A bridge over eth0, in the kernel and in the files. */
void bridge(world &it) {
    it.kernel.add("br0", {.ip = "192.168.3.10", .mask = "255.255.255.0"});
    write_file("/tmp/fault-br0/flags", "0x1003\n");
    write_file("/tmp/fault-br0/bridge/state", "");
    write_file("/tmp/fault-br0/brif/eth0", "");
    it.rig.redirect("/sys/class/net/br0", "/tmp/fault-br0");
    bridge_port(it);
    write_file(ifcfg("br0"), "DEVICE=br0\nTYPE=bridge\nPRIMARY=eth0\nONBOOT=yes\nBOOTPROTO=static\n"
                             "IPADDR=192.168.3.10\nNETMASK=255.255.255.0\n");
    write_file(ifcfg("eth0"), "DEVICE=eth0\nBRIDGE=br0\nONBOOT=yes\n");
    it.card = {.nIPSource = 1, .blLinkUp = 1, .szIfname = "eth0", .szIP = "192.168.1.20", .szMask = "255.255.255.0"};
}

void local_lan_bridge(world &it) {
    bridge(it);
    KLIBCFileSetKeyValue(ifcfg("br0").c_str(), "LOCAL_LAN", "yes", "%s=%s\n");
}

/** A card that becomes the port of a bridge. */
void port_to_set(world &it) {
    it.card = {.blLinkUp = 1, .szIfname = "eth0"};
    it.bridge = {KLIB_BRIDGE_SLAVE, "eth0", "br0"};
}

void bridge_to_set(world &it) {
    it.card = {.nIPSource = 1, .blLinkUp = 1, .szIP = "192.168.3.10", .szMask = "255.255.255.0"};
    it.bridge = {KLIB_BRIDGE_LOCAL_LAN, "br0", "eth0"};
}

void dial_to_set(world &it) {
    it.dial = {"eth0", "alice", "secret", "1492", 1};
}

/** Other settings of the connection, which is switched off. */
void dial_settings(world &) {
    write_file("/etc/ppp/pppoe.conf", "ETH=eth0\nDEFAULTROUTE=yes\nUSER='bob'\nMTU=1400\n");
    write_file("/etc/ppp/pap-secrets", "'bob'\t*\tpassword\n");
    write_file("/etc/kovainfo.conf", "pppoe_enable=\"no\"\n");
}

void dial_to_change(world &it) {
    dial_settings(it);
    dial_to_set(it);
}

void dial_enabled(world &it) {
    dial_settings(it);
    write_file("/etc/kovainfo.conf", "pppoe_enable=\"yes\"\n");
    it.rig.redirect("/proc", "/tmp/fault-processes"); // nobody runs
    write_file("/tmp/fault-processes/version", "");
}

/** The connection's process is the only one. */
void run_connection(world &it) {
    it.rig.redirect("/proc", "/tmp/fault-connection");
    write_file("/tmp/fault-connection/4242/stat", "4242 (pppoe-connect) S 1\n");
    write_file("/tmp/fault-connection/4242/cmdline", std::string("pppoe-connect\0", 14));
}

void dialled(world &it) {
    dial_enabled(it);
    run_connection(it);
}

void dialled_but_off(world &it) {
    dial_settings(it);
    run_connection(it);
}

void connection_interface(world &it) {
    it.kernel.add("ppp0", {.ip = "10.64.0.7", .mask = "255.255.255.255"});
    it.rig.answer("/usr/sbin/pppoe-status", 0, "  ppp0      Link encap:Point-to-Point Protocol\n");
}

void noted_connection_interface(world &it) {
    connection_interface(it);
    write_file("/tmp/kovapppoe.intf", "ppp0");
}

constexpr char kRelay[] = "/etc/sysconfig/pppoe-relay/br0";

constexpr int kNoProcess = 2000000000; // beyond the highest the kernel gives out

/** A relay of the local LAN's bridge to be started. */
void relay(world &it) {
    local_lan_bridge(it);
    write_file(kRelay, "enable=yes\nserver=eth1\n");
    it.relay = {1, "eth0"};
    it.rig.redirect("/proc", "/tmp/fault-processes"); // nobody runs
    write_file("/tmp/fault-processes/version", "");
}

/** The only process is a relay of that bridge to a server, which ends when it is waited for. It is no real one, so that
 * nothing else ends it. */
void relay_to(world &it, const std::string &server) {
    relay(it);
    it.rig.redirect("/proc", "/tmp/fault-relay");
    const std::string line = "/usr/sbin/pppoe-relay -C br0 -S " + server + " ";
    std::string arguments = line;
    std::replace(arguments.begin(), arguments.end(), ' ', '\0');
    const std::string process = "/tmp/fault-relay/" + std::to_string(kNoProcess);
    write_file(process + "/stat", std::to_string(kNoProcess) + " (pppoe-relay) S 1\n");
    write_file(process + "/cmdline", arguments);
    it.rig.on_sleep([process](long) { std::filesystem::remove_all(process); });
}

void relay_that_runs(world &it) {
    relay_to(it, "eth1");
}

void relay_to_another(world &it) {
    relay_to(it, "eth0");
}

void relay_that_is_off(world &it) {
    relay_to(it, "eth1");
    write_file(kRelay, "enable=no\nserver=eth1\n");
}

/** Settings of no bridge yet. */
void relay_to_set(world &it) {
    it.relay = {1, "eth0"};
}

/** A listening port of either protocol and family, and two connected ones. */
void sockets(world &it) {
    it.rig.replace_file("/proc/net/tcp",
                        "  sl  local_address rem_address   st\n"
                        "   0: 00000000:0016 00000000:0000 0A\n   1: 00000000:0050 0A000001:1000 01\n");
    it.rig.replace_file("/proc/net/tcp6", "   0: 00000000000000000000000000000000:01BB "
                                          "00000000000000000000000000000000:0000 0A\n");
    it.rig.replace_file("/proc/net/udp",
                        "   0: 00000000:0035 00000000:0000 0A\n   1: 00000000:0043 0A000001:1000 01\n");
    it.rig.replace_file("/proc/net/udp6", "   0: 00000000000000000000000000000000:0222 "
                                          "00000000000000000000000000000000:0000 0A\n");
}

/** The topology with everything that it is told by. */
void topology(world &it) {
    it.rig.replace_file("/proc/net/vlan/config", "VLAN Dev name    | VLAN ID\nName-Type: VLAN_NAME_TYPE_RAW_PLUS_VID\n"
                                                 "eth0.10        | 10  | eth0\n");
    write_file("/etc/kovainfo.conf", "support_net_topology=\"yes\"\nnet_topology=\"router\"\n");
}

void open_port(world &it) {
    it.host.emplace();
}

// ---- the same for the tunnel client

/** A zone that is known already. */
void local_zone(world &) {
    setenv("TZ", "UTC0", 1);
    tzset();
}

/** An account with a user is stored, another is to be, and nobody runs. */
void tunnel_account(world &it) {
    it.tunnel = {0, "broker.example", "alice", "secret"};
    write_file("/etc/kova/service/kovatunnel.conf", "run=yes\n");
    write_file("/etc/kova/secret.key", std::string(32, 'k'));
    write_file("/etc/sysconfig/network-scripts/ifcfg-tun", "LOGIN=\"login\"\nSERVER=\"broker\"\nUSERID=\"bob\"\n");
    write_file("/etc/gogoc/.tunnel_passwd", std::string("password") + std::string(56, '\0'));
    it.rig.redirect("/proc", "/tmp/fault-processes");
    write_file("/tmp/fault-processes/version", "");
}

void tunnel_to_make(world &it) {
    tunnel_account(it);
    std::filesystem::remove("/etc/sysconfig/network-scripts/ifcfg-tun");
    std::filesystem::remove("/etc/gogoc/.tunnel_passwd");
}

/** The script brings the interface up. */
void tunnel_with_address(world &it) {
    tunnel_account(it);
    it.rig.replace_file("/proc/net/if_inet6", "20010db8000000000000000000000002 05 40 00 80      tun\n");
    write_file("/usr/kova/service/kovarelayd", "#!/bin/sh\n");
}

/** The client runs and gets no address. */
void tunnel_that_hangs(world &it) {
    tunnel_account(it);
    it.rig.redirect("/proc", "/tmp/fault-client");
    write_file("/tmp/fault-client/4242/stat", "4242 (gogoc) S 1\n");
    write_file("/tmp/fault-client/4242/cmdline", std::string("/usr/bin/gogoc\0-f\0", 18));
}

// ---- calls that are more than an expression

/** Looks a name up: nas01 is known to the resolver, every other to a host of the local network. */
long look_up(const char *name) {
    kova_test::fake_names names;
    names.add("nas01", {"10.0.0.1", "2001:db8::1"});
    KOVALOOKUPIP found[2];
    return KOVANetLookupIP(name, found, 2, 0);
}

long look_up_on_network(world &it) {
    it.rig.answer("/usr/bin/nmblookup", 0, "10.0.0.1 nas02<00>\n");
    return look_up("nas02");
}

long list_ports(world &it, int protocol) {
    int ports[8];
    it.number = 8;
    return KOVANetGetPortUsedInRange(ports, &it.number, 1, 1023, protocol);
}

long wake_on_loopback(world &) {
    const KLIBETHERWAKE request{{2, 0, 0, 0, 0, 1}, "lo"};
    return KLIBNetEtherWake(&request);
}

long list_vlans(world &it) {
    VLANINFO *found = nullptr;
    const long result = KLIBNetVlanEnum(&found, &it.number);
    free(found);
    return result;
}

/** The lock is given back even where it could not be had; there is nobody else's that could be lost by it. */
long give_back_a_lock(world &it, long result) {
    int &held = it.rig.held["named locks"];
    held = result < 0 && held == -1 ? 0 : held;
    return result;
}

long read_ipv6(world &it) {
    return KOVANetIPv6ConfGet("eth0", &it.number, it.addresses[0].szIP, sizeof it.addresses[0].szIP, &it.number,
                              it.addresses[1].szIP, sizeof it.addresses[1].szIP);
}

long list_served_interfaces(world &) {
    KLIBSZLIST *found = nullptr;
    const long result = DHCPInterfaceListGet(&found, 0);
    KLIBCSzListFree(found);
    return result;
}

long read_ranges(world &) {
    DHCP_RANGE *found = nullptr;
    const long result = DHCPGetInterfaceRanges("eth0", &found);
    DHCPRangeFree(found);
    return result;
}

long read_subnet(world &it) {
    const long result = DHCPTagConfGet("eth0", 0, 0, &it.subnet);
    DHCPOptionFree(std::exchange(it.subnet.options, nullptr));
    return result;
}

/** Settings that cannot be read are told in the record. */
long read_boot_switch(world &it) {
    return DHCPPXEConfGetEnable(&it.boot) < 0 ? -1 : it.boot.enabled;
}

long read_boot_settings(world &it) {
    return DHCPPXEConfGet(&it.boot) < 0 ? -1 : it.boot.enabled;
}

long reach_by_address(world &it) {
    kova_test::fake_names names;
    names.add("nas01", {"127.0.0.1"});
    return BlKLIBIsConnected("nas01", it.host->port(), 5);
}

long reach_on_local_network(world &it) {
    const kova_test::fake_names nobody;
    it.rig.answer("/usr/bin/nmblookup", 0, "127.0.0.1 nas01<00>\n");
    return BlKLIBIsConnected("nas01", it.host->port(), 5);
}

/** @return the topology when its description has the VLAN, else -1 */
long describe_topology(world &) {
    TOPOLOGYINFO info{};
    const int number = KLIBNetTopologyGet(&info);
    return strcmp(info.szIfname, "eth0.10") == 0 ? number : -1;
}

// ---- what functions get over by design

const tolerances cards{
    {"ioctl ", "an interface that the kernel does not describe is left out", kAnyResult},
    {"KOVAHAGetHeartbeatIF", "without a heartbeat there is none to leave out", kAnyResult},
    {"KLIBCFileGetKeyValue /etc/sysconfig/network-scripts/ifcfg-eth0 LOCAL_LAN", "an absent key says no", kAnyResult},
    {"KLIBCFileGetKeyValue /etc/sysconfig/network-scripts/ifcfg-eth1 LOCAL_LAN", "an absent key says no", kAnyResult},
    {"socket", "the address is not looked up", kAnyResult},
};
const tolerances protocol{
    {"KLIBCFileGetKeyValue /etc/sysconfig/network-scripts/ifcfg-", "a protocol that cannot be read is set to static",
     kAnyResult, "ifcfg-eth1"},
    {"KLIBCFileLock 0x105", "the inner question for the protocol answers no", kAnyResult},
};
const tolerances switch_ports{
    {"ioctl ", "a port that the kernel does not describe has no link"},
    {"socket", "a port that the kernel does not describe has no link"},
};
const tolerances announced{
    {"KLIBPlugin", "the change is made whether it is announced or not"},
    {"ioctl 0x8913 ", "the event tells no link then"},
    {"socket", "the event tells no link then"},
    {"fread /proc/net/if_inet6", "the event lists what could be read"},
};
const tolerances backed_up{
    {"KLIBCExec /bin/cp", "logged; the change is made without a backup", std::nullopt, ".tmp1700000000"},
    {"open /etc/sysconfig/network-scripts/ifcfg-eth0.tmp", "the copy keeps what the tool gave it"},
    {"stat /etc/sysconfig/network-scripts/ifcfg-", "the copy keeps what the tool gave it"},
    {"fchown /etc/sysconfig/network-scripts/ifcfg-eth0.tmp", "the copy keeps what the tool gave it"},
    {"fchmod /etc/sysconfig/network-scripts/ifcfg-eth0.tmp", "the copy keeps what the tool gave it"},
    {"fsync /etc/sysconfig/network-scripts/ifcfg-eth0.tmp", "the copy may be lost with the machine's power"},
    {"unlink /etc/sysconfig/network-scripts/ifcfg-", "logged; the copy stays", std::nullopt, ".tmp1700000000"},
    {"rename /etc/sysconfig/network-scripts/.ifcfg-", "neither can the copy be renamed; it stays", -1,
     ".tmp1700000000"},
    {"KLIBCExecl /sbin/stop dhcp-client", "logged; none may be running"},
};
const tolerances housekeeping{
    {"KLIBServiceReload ddns", "the card is set; the service asks again by itself"},
    {"unlink /etc/ppp/old_gateway.bak", "the card is set; a kept file may stay"},
    {"unlink /etc/resolv.conf.bak", "the card is set; a kept file may stay"},
};
const tolerances off_and_on{
    {"ioctl ", "another interface is left out of the list"},
    {"fopen /proc/net/if_inet6", "no address to remove was found"},
    {"fread /proc/net/if_inet6", "the end of the list"},
    {"", "what fails between off and on leaves IPv6 off, and says so", -1, "/disable_ipv6"},
};
const tolerances ipv6_mode{
    {"ioctl ", "another interface is left out of the list"},
    {"KLIBCFileGetKeyValue /etc/sysconfig/network-scripts/ifcfg-eth0", "logged; the mode before counts as unknown"},
    {"KLIBCReadPidFile /tmp/dhclient6-eth0-", "without a pid there is no client"},
    {"KLIBCExecl /sbin/ip -6 address del", "logged; the address of the mode before may be gone already"},
    {"fopen /proc/net/if_inet6", "there is nothing to wait for, and no duplicate was found"},
    {"fread /proc/net/if_inet6", "the end of the list"},
    {"", "there is no way back: what was done before the failure stays", -1, "/proc/sys/net/ipv6/conf/eth0/"},
    {"", "there is no way back: what was done before the failure stays", -1, "ifcfg-eth0"},
};
const tolerances ipv6_switches{
    {"ioctl ", "an interface that the kernel does not tell about is left alone"},
    {"KLIBCFileGetKeyValue /etc/sysconfig/network-scripts/ifcfg-", "logged; the interface is skipped"},
    {"", "interfaces before the one that fails are set", -1, "/accept_ra"},
};
const tolerances address_list{
    {"fread /proc/net/if_inet6", "a list of the kernel ends where it cannot be read on", kAnyResult},
    {"fopen /proc/net/if_inet6", "no address to remove was found", kAnyResult},
};
const tolerances calculator{
    {"KLIBCPclose", "a tool that gave no answer leaves the output as it was"},
    {"fread from /bin/ipcalc", "a tool that gave no answer leaves the output as it was"},
};
const tolerances route_update{
    {"KLIBCExecl /sbin/ip -4 route del", "the route may not be there"},
    {"KLIBCExecl /usr/kova/sbin/kovanetdtool", "the address is set; its rules follow with the next change"},
};
const tolerances port_count{
    {"fread /proc/sys/kernel/kova_internal_netif_num", "the shipped number stands in"},
    {"malloc", "the shipped number stands in"},
};
const tolerances kernel_bond{
    {"fopen /sys/class/net/bond0/bonding/slaves", "a bond whose members cannot be read is none"},
    {"fread /sys/class/net/bond0/bonding/slaves", "a bond whose members cannot be read is none"},
    {"KLIBCSzListPush", "a bond whose members cannot be read is none"},
    {"malloc", "a bond whose members cannot be read is none"},
    {"fopen /proc/net/bonding//bond0", "a partner that cannot be read is none"},
    {"fread /proc/net/bonding//bond0", "a partner that cannot be read is none"},
};
const tolerances block_steps{
    {"KLIBCFile", "reason and number are two keys; each is written whole", -1, "ifcfg-eth0"},
};
const tolerances interface_state{
    {"fopen /sys/class/net/eth0/flags", "the kernel itself refuses to rename what is up"},
    {"fread /sys/class/net/eth0/flags", "the kernel itself refuses to rename what is up"},
};
const tolerances told{
    {"KLIBPluginSDKInit", "the change is made whether it is announced or not"},
    {"KLIBPluginSetArg", "the change is made whether it is announced or not"},
    {"KLIBPluginAction", "the change is made whether it is announced or not"},
};
const tolerances dispatch{
    {"KLIBPluginHasInit", "logged; both phases run, and the call succeeds"},
    {"KLIBPluginSetArg", "logged; both phases run, and the call succeeds"},
    {"KLIBPluginAction", "logged; both phases run, and the call succeeds"},
};
const tolerances renamed{
    {"open /etc/ ", "the file is in its place; its name may be lost with the machine's power"},
    {"fsync /etc ", "the file is in its place; its name may be lost with the machine's power"},
};
const tolerances made_again{
    {"KLIBCFileExist", "a source that is not there has no lines", kAnyResult, "/etc/resolv.conf"},
    {"KLIBCFileCheckKeyValue /etc/kovainfo.conf", "what is not known to be static is automatic", std::nullopt,
     "/etc/resolv.conf"},
    {"KLIBCFileGetLine /etc/resolv.conf.option", "no line was found", std::nullopt, "/etc/resolv.conf"},
    {"fclose written /etc/resolv.conf", "what was written is on the disk already"},
    {"chmod /etc/resolv.conf", "logged; it was readable before it got its name"},
    {"KLIBServiceReload", "the file is made; the services are not waited for"},
    {"KLIBServiceIsRunning", "the file is made; the services are not waited for"},
};
const tolerances server_list{
    {"fopen /etc/resolv.conf", "logged; a file that cannot be opened has no servers"},
    {"fread /etc/resolv.conf", "the list ends where the file cannot be read on"},
};
const tolerances host_name{
    {"KOVAIsDockerHMX", "a machine that cannot tell is no container"},
};
const tolerances old_route{
    {"KLIBCExecl /sbin/route delete default", "there may be none"},
};
const tolerances route_tools{
    {"KLIBCExecl /sbin/ip route", "noted; the other tool is asked"},
    {"KLIBCExecl /sbin/route", "noted; nobody else is left to ask"},
};
const tolerances known_kind{
    {"fopen /proc/net/dev", "an interface whose kind cannot be told is left alone"},
    {"fread /proc/net/dev", "an interface whose kind cannot be told is left alone"},
    {"calloc", "an interface whose kind cannot be told is left alone"},
    {"KLIBCModuleIsLoad 8021q", "an interface whose kind cannot be told is left alone"},
};
const tolerances dhcp_switch{
    {"KLIBCFileCheckKeyValue /etc/dhcpd/", "a switch that cannot be read is off"},
};
const tolerances logged_switch{
    {"KLIBCFileSetKeyValue /etc/dhcpd/", "told in the log alone"},
};
const tolerances handed_on{
    {"KLIBCFileSetKeyValue /etc/dhcpd/", "a switch and what is kept of it are two keys; each is written whole", -1,
     ".info"},
    {"KLIBCExec /etc/rc.network", "the switches are handed on whether the server restarts or not"},
};
const tolerances script_status{
    {"KLIBCExec /etc/rc.network", "only the status 1 is the script's word that the server failed"},
};
const tolerances listed_files{
    {"calloc", "logged; the file is left out", kAnyResult},
};
const tolerances in_place{
    {"fwrite /etc/dhcpd/", "what the server reads is written in place", -1, "/etc/dhcpd/"},
};
const tolerances in_place_tagged{
    {"fwrite /etc/dhcpd/", "what the server reads is written in place", 0, "/etc/dhcpd/"},
};
const tolerances boot_steps{
    {"KLIBCFileSetKeyValue /etc/dhcpd/dhcpd-pxe", "the settings are several keys; each is written whole", -1,
     "dhcpd-pxe-setting"},
    {"KLIBCExec /bin/mkdir", "the switch is set before the rest", -1, "dhcpd-pxe-setting"},
};
const tolerances vendor_steps{
    {"KLIBCFileExist", "lines of a file that is not there need not go", kAnyResult, "dhcpd-vendor.conf"},
    {"KLIBCFileRemoveKey", "the old lines go before the new ones are added, each whole", -1, "dhcpd-vendor.conf"},
    {"KLIBCFileAddLine", "the old lines go before the new ones are added, each whole", -1, "dhcpd-vendor.conf"},
};

const tolerances nobody_there{
    {"KLIBCExecl /bin/ping", "a status of its own is the tool's word that nobody answers", 0},
};
const tolerances names_elsewhere{
    {"getaddrinfo ", "the local network is asked what the resolver does not tell"},
    {"fread from /usr/bin/nmblookup", "the answers that were read count"},
    {"KLIBCPclose", "the answers are read"},
};
const tolerances socket_tables{
    {"fopen /proc/net/", "logged; the other family's sockets are looked at"},
    {"fread /proc/net/", "logged; the other family's sockets are looked at"},
};

const tolerances vlan_question{
    {"ioctl 0x8982 ", "the kernel's word for what is no VLAN"},
};
const tolerances mtu_question{
    {"ioctl 0x8982 ", "the kernel's word for what is no VLAN", std::nullopt, "/etc/kovainfo.conf"},
    {"socket", "what cannot be asked about has no setting to keep", std::nullopt, "/etc/kovainfo.conf"},
    {"access /sys/devices/virtual/net/ovs_", "what is not known as the switch's is taken for itself", kAnyResult,
     "/etc/kovainfo.conf"},
    {"KLIBCFileSetKeyValue /etc/kovainfo.conf", "the settings of a VLAN and of the interface below it are two keys", -1,
     "/etc/kovainfo.conf"},
};
const tolerances switch_members{
    {"ioctl 0x8913 ", "a member that the kernel does not describe is left out", std::nullopt, "/etc/kovainfo.conf"},
    {"ioctl 0x8946 ", "a member that the kernel does not describe is left out", std::nullopt, "/etc/kovainfo.conf"},
};
const tolerances one_by_one{
    {"", "members are set one after the other, until one fails", -1, "/etc/kovainfo.conf"},
};
const tolerances link_state{
    {"ioctl 0x8946 ", "a link of unknown speed keeps its MTU"},
};
/** What is common to all changes of bonds. */
const tolerances bond_copies{
    {"KLIBCExec /bin/cp -f /etc/sysconfig/network-scripts/ifcfg-eth1 ", "the copy is to go back to; not looked at"},
    {"KLIBCExec /bin/cp -f /etc/sysconfig/network-scripts/ifcfg-eth0 /etc/sysconfig/network-scripts/ifcfg-eth0.saved",
     "the copy is to go back to; not looked at"},
    {"unlink /etc/sysconfig/network-scripts/ifcfg-eth", "logged; an old copy is written over, a new one stays",
     std::nullopt, ".saved"},
};
const char *const kMemberLines = "MASTER=bond0\nSLAVE=yes\n";
const char *const kAddressLines = "IPADDR=192.168.1.10\nNETMASK=255.255.255.0\n";
const tolerances new_bond{
    {"KLIBCExec /bin/cp -f /etc/sysconfig/network-scripts/ifcfg-eth0 /etc/sysconfig/network-scripts/ifcfg-bond1",
     "not looked at: what to begin with", std::nullopt, "ifcfg-bond1", "BOOTPROTO=dhcp\nDEVICE=bond1\n"},
    {"KLIBCFileGetKeyValue", "a protocol that cannot be read is none", std::nullopt, "ifcfg-bond1", "BOOTPROTO=dhcp\n"},
    {"", "what cannot be put back, as memory is gone for good, stays", -1, ".saved", "DEVICE=eth"},
};
const tolerances end_of_bond{
    {"KLIBCFileGetKeyValue", "a protocol that cannot be read is none, and so is the bond's address", kAnyResult,
     "ifcfg-eth"},
    {"KLIBCFileLock 0x105", "an address that cannot be read is none", kAnyResult, "ifcfg-eth1", "DEVICE=eth1\n"},
    {"", "the second member's protocol goes before its copy is made", -1, "ifcfg-eth1", kMemberLines},
    {"", "the first is left with the settings when nothing can be written any more", -1, "ifcfg-eth0", kAddressLines},
};
const tolerances other_bond{
    {"KLIBCFileGetKeyValue", "a protocol that cannot be read is none, and so is the bond's address", kAnyResult,
     "ifcfg-bond0", "BOOTPROTO=dhcp\n"},
    {"KLIBCFileGetKeyValue", "a protocol that cannot be read is none", kAnyResult, "ifcfg-eth0", "BOOTPROTO=dhcp\n"},
    {"KLIBCExec /bin/cp -f /etc/sysconfig/network-scripts/ifcfg-eth0 /etc/sysconfig/network-scripts/ifcfg-bond0",
     "not looked at: what to begin with", std::nullopt, "ifcfg-bond0", "BOOTPROTO=dhcp\nDEVICE=bond0\n"},
    {"", "how the old bond ends is not looked at: the new one's files count", kAnyResult, "ifcfg-eth1", kMemberLines},
    {"", "members stay apart, the first with the settings", -1, "ifcfg-eth0", kAddressLines},
    {"", "members stay apart, the first with the settings", -1, "ifcfg-eth1", "DEVICE=eth1\n"},
    {"", "members stay apart, the first with the settings", -1, "ifcfg-bond0", "gone"},
};
const tolerances vlan_steps{
    {"ioctl 0x8982 ", "the kernel's word for what is no VLAN", std::nullopt, "/etc/kovainfo.conf"},
    {"socket", "what cannot be asked about has no MTU to keep"},
    {"KLIBCExecv /etc/rc.network", "the files hold what is wanted, whatever the script answers"},
    {"KLIBCINFORemoveKey", "a setting of what is gone does no harm", std::nullopt, "/etc/kovainfo.conf"},
    {"unlink /etc/sysconfig/network-scripts/ifcfg-eth0.10", "not looked at: the interface is stopped", std::nullopt,
     "ifcfg-eth0.10"},
    {"open /etc/sysconfig/network-scripts/ ",
     "the file is in its place; its name may be lost with the machine's power"},
    {"fsync /etc/sysconfig/network-scripts ",
     "the file is in its place; its name may be lost with the machine's power"},
    {"fclose written /etc/sysconfig/network-scripts/", "what was written is on the disk already"},
};
const tolerances bond_steps{
    {"fopen /sys/class/net/bond1/bonding/slaves", "a bond whose members cannot be read is none"},
    {"KLIBCExecv /etc/rc.network", "the files hold what is wanted, whatever the script answers"},
    {"KLIBCExec /bin/cp -f /tmp/dhcpv4.leases.", "without the lease the client asks for one", std::nullopt,
     "/tmp/dhcpv4.leases."},
    {"KLIBCFileReplaceSubStr /tmp/dhcpv4.leases.", "without the lease the client asks for one", std::nullopt,
     "/tmp/dhcpv4.leases."},
};
const tolerances member_copies{
    {"KLIBCExec /bin/cp", "the copy is to go back to; not looked at", std::nullopt, ".saved"},
};
const tolerances own_copy{
    {"KLIBCExec /bin/cp", "the copy is for people; not looked at", std::nullopt, ".saved"},
};
const tolerances boot_protocol{
    {"KLIBCFileGetKeyValue", "a protocol that cannot be read counts as absent", std::nullopt, "ifcfg-eth0"},
};
const tolerances some_bonds{
    {"fopen /sys/class/net/bond0/bonding/slaves", "a bond whose members cannot be read is counted, not listed"},
    {"fread /sys/class/net/bond0/bonding/slaves", "a bond whose members cannot be read is counted, not listed"},
    {"KLIBCSzListPush eth", "a bond whose members cannot be read is counted, not listed"},
    {"malloc", "a bond whose members cannot be read is counted, not listed"},
};
const tolerances up_and_down{
    {"ioctl 0x8913 ", "taking it down and bringing it up are tried; the result is what the kernel says to the MTU"},
    {"ioctl 0x8914 ", "taking it down and bringing it up are tried; the result is what the kernel says to the MTU"},
    {"socket", "taking it down and bringing it up are tried; the result is what the kernel says to the MTU"},
};
const tolerances bridge_keys{
    {"KLIBCFileGetKeyValue", "logged; a key that cannot be read is empty"},
    {"KLIBCFileCheckKeyValue", "a switch that cannot be read is off"},
};
const tolerances dial_steps{
    {"KLIBCFileSetKeyValue /etc/ppp/pppoe.conf", "the settings are several keys; each is written whole", -1,
     "/etc/ppp/pppoe.conf"},
    {"unlink /etc/ppp/pap-secrets.tmp", "none is in the way; the open would tell of one"},
    {"open /etc/ppp/ ", "the file is in its place; its name may be lost with the machine's power"},
    {"fsync /etc/ppp ", "the file is in its place; its name may be lost with the machine's power"},
};
const tolerances dial_switch{
    {"KLIBCFileCheckKeyValue /etc/ppp/pppoe.conf DEFAULTROUTE", "a switch that cannot be read is off"},
};
const tolerances dial_stop{
    {"KLIBCExecl /usr/sbin/pppoe-stop", "the switch is off, whatever the script answers"},
};
const tolerances processes{
    {"KLIBCPs pppoe-connect > open /", "a process that cannot be looked at is gone", kAnyResult, "/etc/kovainfo.conf"},
    {"KLIBCPs pppoe-connect > fstat ", "a process that cannot be looked at is gone", kAnyResult, "/etc/kovainfo.conf"},
    {"KLIBCPs pppoe-connect > read ", "a process that cannot be looked at is gone", kAnyResult, "/etc/kovainfo.conf"},
    {"KLIBCPs pppoe-connect > readdir ", "the list ends where it cannot be read on", kAnyResult, "/etc/kovainfo.conf"},
};
const tolerances unknown_process{
    {"KLIBCPs pppoe-connect", "what cannot be found is not stopped"},
};
const tolerances noted_name{
    {"open /tmp/kovapppoe.intf", "a name that is not noted is asked for again", std::nullopt, "/tmp/kovapppoe.intf"},
    {"fread /tmp/kovapppoe.intf", "the end of the file: the name is read"},
    {"fstat /tmp/kovapppoe.intf", "a name that is not noted is asked for again"},
    {"fdopen /tmp/kovapppoe.intf", "a name that is not noted is asked for again"},
    {"unlink /tmp/kovapppoe.intf", "what is in the way shows at the open"},
    {"write /tmp/kovapppoe.intf", "a name that is not noted is asked for again"},
    {"KLIBCPclose", "the answer is read"},
};

const tolerances relay_directory{
    {"stat /etc/sysconfig/pppoe-relay/", "whether it is there shows at making it"},
};
const tolerances relay_made_empty{
    {"KLIBCFileTouch", "a new file is empty before it is written, which is no relay", -1, "pppoe-relay/br0"},
    {"KLIBCFileSetKeys", "a new file is empty before it is written, which is no relay", -1, "pppoe-relay/br0"},
    {"KLIBCSzHash", "a new file is empty before it is written, which is no relay", -1, "pppoe-relay/br0"},
};
const tolerances relay_switch{
    {"KLIBCFileCheckKeyValue", "a switch that cannot be read is off"},
    {"KLIBCFileGetKeyValue /etc/sysconfig/network-scripts/", "logged; a key that cannot be read is empty"},
    {"fopen /sys/class/net/br0/flags", "what is not known to be up is down"},
    {"fread /sys/class/net/br0/flags", "what is not known to be up is down"},
};
const tolerances relay_processes{
    {"KLIBCIsProcAlive", "a process that cannot be looked at is gone", kAnyResult},
    {"KLIBCKill /usr/sbin/pppoe-relay -C br0 > open", "a process that cannot be looked at is gone"},
    {"KLIBCKill /usr/sbin/pppoe-relay -C br0 > fstat", "a process that cannot be looked at is gone"},
    {"KLIBCKill /usr/sbin/pppoe-relay -C br0 > read", "a process that cannot be looked at is gone"},
};
const tolerances relay_files{
    {"unlink /etc/sysconfig/pppoe-relay/", "logged; the others go all the same", std::nullopt, "pppoe-relay/br0"},
};

const tolerances next_to_ask{
    {"getaddrinfo", "whoever the resolver does not tell of is asked for on the local network"},
};
const tolerances opened{
    {"send", "the connection came about"},
    {"KLIBCPclose", "the answer is read"},
};
const tolerances tunnel_files{
    {"fclose written /etc/gogoc/.tunnel_passwd.", "what was written is on the disk already"},
    {"open /etc/gogoc/ ", "the password is in its place"},
    {"fsync /etc/gogoc ", "the password is in its place"},
};
const tolerances tunnel_failure{
    {"pipe2 ", "the call fails in either case", -1},
    {"fork ", "the call fails in either case", -1},
    {"KLIBCKill /usr/bin/gogoc", "the call fails in either case", -1},
};
const tolerances tunnel_work{
    {"fork > unlink /etc/gogoc/gogoc.conf", "what cannot be deleted stays, its owner's alone", std::nullopt,
     "/etc/gogoc/gogoc.conf"},
    {"fork > ", "logged by the process of its own; what the tunnel is like is asked afterwards"},
    {"waitpid ", "a caller may ignore its children; whether the process is there shows at its end"},
    {"read pipe ", "asked again a second later"},
    {"KLIBCFileLockTimeByFile /etc/gogoc/gogoc.conf",
     "it keeps the file from being made meanwhile; it is deleted anyway"},
    {"unlink /etc/gogoc/gogoc.conf", "the process of its own has deleted it"},
    {"rename tsp-broker-list.txt", "logged; as a rule there is none"},
    {"fopen /proc/net/if_inet6", "what cannot be listed is no address, and without a client nothing more is checked"},
    {"fread /proc/net/if_inet6", "what cannot be listed is no address, and without a client nothing more is checked"},
    {"KLIBServiceIsRunning kovarelayd", "a relay that cannot be asked does not run"},
    {"KLIBServiceReload kovarelayd", "the tunnel is what it is, whatever the relay does"},
    {"KLIBCIsProcAlive /usr/bin/gogoc", "a process that cannot be looked at is gone", kAnyResult},
};

const char *const kOld[] = {"eth0"};
const char *const kNew[] = {"bond0"};
const uint32_t kMask[] = {255, 255, 0, 0};

} // namespace

/** Names the call's expression; "it" is the world it runs in. */
#define CALL(expression)                                                                                               \
    [](world &it) -> long {                                                                                            \
        (void)it;                                                                                                      \
        return (expression);                                                                                           \
    }

const std::vector<scenario> &scenarios() {
    static const std::vector<scenario> all{
        {"BlKLIBIsAtom", CALL(BlKLIBIsAtom("a")), pure},
        {"BlKLIBIsConnected", CALL(reach_by_address(it)), open_port, failure::zero, opened},
        {"BlKLIBIsConnected/local network", CALL(reach_on_local_network(it)), open_port, failure::zero, opened,
         next_to_ask},
        {"BlKLIBIsDomain", CALL(BlKLIBIsDomain("a.b")), pure},
        {"BlKLIBIsHostname", CALL(BlKLIBIsHostname("a")), pure},
        {"BlKLIBIsIpAddr", CALL(BlKLIBIsIpAddr("192.168.1.10")), pure},
        {"BlKLIBIsIpMask", CALL(BlKLIBIsIpMask(strcpy(it.text, "255.255.0.0"))), pure},
        {"BlKLIBIsValidIpMask", CALL(BlKLIBIsValidIpMask("192.168.1.10", "255.255.0.0")), pure},
        {"BlKLIBIsv6IpAddrValid", CALL(BlKLIBIsv6IpAddrValid("fe80::1/64")), pure},
        {"BlKOVALnxIsDHCP", CALL(BlKOVALnxIsDHCP("eth1")), failure::zero, protocol},
        {"BlKOVALnxIsDHCP/repair", CALL(BlKOVALnxIsDHCP("eth0")), no_protocol, failure::like_zero, protocol},
        {"DHCPDConfChangeInterface", CALL(DHCPDConfChangeInterface("eth0", "lan0")), dhcp_subnets},
        {"DHCPDLinkAggrSet/into", CALL(DHCPDLinkAggrSet(1, "bond0", it.list)), members_with_switches, handed_on},
        {"DHCPDLinkAggrSet/apart", CALL(DHCPDLinkAggrSet(0, "bond0", it.list)), members_with_switches, handed_on},
        {"DHCPGetInterfaceRanges", read_ranges, dhcp_subnets},
        {"DHCPInterfaceIsEnabled", CALL(DHCPInterfaceIsEnabled("eth0", 1)), dhcp_switches, failure::below_one},
        {"DHCPInterfaceListGet", list_served_interfaces, dhcp_switches, listed_files},
        {"DHCPInterfaceSetEnabled/new", CALL(DHCPInterfaceSetEnabled("eth0", 0, 1)), logged_switch},
        {"DHCPInterfaceSetEnabled/change", CALL(DHCPInterfaceSetEnabled("eth0", 1, 0)), dhcp_switches, logged_switch},
        {"DHCPIsEnabled", CALL(DHCPIsEnabled()), dhcp_switches, failure::zero},
        {"DHCPIsRangeConflict",
         CALL(DHCPIsRangeConflict("eth1", "10.1.0.0", "10.1.0.9", "255.255.255.128", it.text, 16)), dhcp_subnets,
         listed_files},
        {"DHCPOptionFree", CALL((DHCPOptionFree(std::exchange(it.subnet.options, nullptr)), 0)), options_to_free, pure},
        {"DHCPOptionIsListValue", CALL(DHCPOptionIsListValue(42)), pure},
        {"DHCPPXEConfGet", read_boot_settings, remote_boot_to_change},
        {"DHCPPXEConfGetEnable", read_boot_switch, remote_boot_to_change},
        {"DHCPPXEConfSet/new", CALL(DHCPPXEConfSet(&it.boot)), local_boot_to_set, boot_steps, in_place},
        {"DHCPPXEConfSet/change", CALL(DHCPPXEConfSet(&it.boot)), remote_boot_to_change, boot_steps, in_place},
        {"DHCPPXEConfSetEnable/new", CALL(DHCPPXEConfSetEnable(1)), boot_steps},
        {"DHCPPXEConfSetEnable/change", CALL(DHCPPXEConfSetEnable(0)), remote_boot_to_change, boot_steps},
        {"DHCPRangeFree", CALL((DHCPRangeFree(std::exchange(it.ranges, nullptr)), 0)), ranges_to_free, pure},
        {"DHCPServerRestart", CALL(DHCPServerRestart()), failure::not_zero, script_status},
        {"DHCPServerStart", CALL(DHCPServerStart()), failure::not_zero, script_status},
        {"DHCPTagConfGet/ipv4", read_subnet, dhcp_subnets, failure::below_one, dhcp_switch},
        {"DHCPTagConfGet/ipv6", CALL(DHCPTagConfGet("eth0", 0, 1, &it.subnet)), dhcp_subnets, failure::below_one,
         dhcp_switch},
        {"DHCPTagConfGetEnable", CALL(DHCPTagConfGetEnable("eth0", 0, 0, &it.number)), dhcp_subnets, failure::below_one,
         dhcp_switch},
        {"DHCPTagConfSet/new", CALL(DHCPTagConfSet("eth0", 0, 0, &it.subnet)), subnet_to_set, in_place},
        {"DHCPTagConfSet/change", CALL(DHCPTagConfSet("eth0", 0, 0, &it.subnet)), subnet_to_change, in_place},
        {"DHCPTagConfSet/ipv6", CALL(DHCPTagConfSet("eth0", 0, 1, &it.subnet)), v6_subnet_to_change, in_place},
        {"DHCPTagConfSetConfig/ipv4", CALL(DHCPTagConfSetConfig("eth0", 0, 0, &it.subnet)), subnet_to_change, in_place},
        {"DHCPTagConfSetConfig/ipv6", CALL(DHCPTagConfSetConfig("eth0", 0, 1, &it.subnet)), v6_subnet_to_set, in_place},
        {"DHCPTagConfSetEnable/new", CALL(DHCPTagConfSetEnable("eth0", 0, 0, 1)), in_place},
        {"DHCPTagConfSetEnable/change", CALL(DHCPTagConfSetEnable("eth0", 0, 1, 0)), dhcp_subnets, in_place},
        {"DHCPVendorCheckOptNum", CALL(DHCPVendorCheckOptNum("43")), pure},
        {"DHCPVendorEnum", CALL(DHCPVendorEnum(&it.list)), vendors},
        {"DHCPVendorGetVendor", CALL(DHCPVendorGetVendor("MSFT", &it.map)), vendors},
        {"DHCPVendorGetVendorOpt", CALL(DHCPVendorGetVendorOpt("MSFT", 2, it.text, sizeof it.text)), vendors,
         failure::below_one},
        {"DHCPVendorSetVendor/new", CALL(DHCPVendorSetVendor("MSFT", it.map)), vendor_to_set, vendor_steps},
        {"DHCPVendorSetVendor/change", CALL(DHCPVendorSetVendor("MSFT", it.map)), vendor_to_change, vendor_steps},
        {"DHCPVendorSetVendorOpt/new", CALL(DHCPVendorSetVendorOpt("MSFT", 2, "new")), vendor_steps},
        {"DHCPVendorSetVendorOpt/change", CALL(DHCPVendorSetVendorOpt("MSFT", 2, "new")), vendors, vendor_steps},
        {"DefaultGatewayGet", CALL(DefaultGatewayGet(it.text, sizeof it.text, it.names[0], sizeof it.names[0])),
         default_route},
        {"ErrKLIBIpMaskToSubnet", CALL(ErrKLIBIpMaskToSubnet(strcpy(it.text, "10.0.0.1/255.0.0.0"), it.names[0])),
         pure},
        {"ErrKLIBSubnetToIpMask", CALL(ErrKLIBSubnetToIpMask(strcpy(it.text, "10.0.0.1/8"), nullptr)), pure},
        {"KLIBDisablePPPoEOnIf", CALL(KLIBDisablePPPoEOnIf("eth0")), dialled, processes, dial_switch, dial_stop},
        {"KLIBIsIpInRange", CALL(KLIBIsIpInRange("10.0.0.2", "10.0.0.1", "10.0.0.3", 2)), pure},
        {"KLIBNETGetBridgeInfo/bridge", CALL(KLIBNETGetBridgeInfo("br0", &it.bridge)), bridge, failure::below_one,
         bridge_keys},
        {"KLIBNETGetBridgeInfo/port", CALL(KLIBNETGetBridgeInfo("eth0", &it.bridge)), bridge, failure::below_one,
         bridge_keys},
        {"KLIBNETGetBridgeInfoByTopology", CALL(KLIBNETGetBridgeInfoByTopology("br0", &it.bridge, 2)), pure},
        {"KLIBNETSetTopologyConfigs", CALL(KLIBNETSetTopologyConfigs(&gTopologyInfo[KLIB_TOPOLOGY_BRIDGE])), topology},
        {"KLIBNetBridgeIfIsMaster", CALL(KLIBNetBridgeIfIsMaster("br0")), bridge, failure::zero},
        {"KLIBNetBridgeIfIsSlave", CALL(KLIBNetBridgeIfIsSlave("eth0")), bridge_port, failure::zero},
        {"KLIBNetBridgeSlaveEnum", CALL(KLIBNetBridgeSlaveEnum("br0", it.list)), bridge, failure::below_one},
        {"KLIBNetDHCPServerRestart", CALL(KLIBNetDHCPServerRestart())},
        {"KLIBNetEnumBridge/bridges", CALL(KLIBNetEnumBridge(it.list, KLIB_BRIDGE_MASTER)), bridge, failure::below_one,
         bridge_keys},
        {"KLIBNetEnumBridge/local LAN", CALL(KLIBNetEnumBridge(it.list, KLIB_BRIDGE_LOCAL_LAN)), local_lan_bridge,
         failure::below_one},
        {"KLIBNetEtherWake", wake_on_loopback},
        {"KLIBNetGetIfCfg", CALL(KLIBNetGetIfCfg("eth0", "IPADDR", it.text, sizeof it.text))},
        {"KLIBNetGetInterfaceInfo", CALL(KLIBNetGetInterfaceInfo(it.records, 32, 2)), two_vlans, cards},
        {"KLIBNetGetInterfaceInfo/cluster", CALL(KLIBNetGetInterfaceInfo(it.records, 32, 5)), cluster, cards},
        {"KLIBNetGetLocalLanConfig", CALL(KLIBNetGetLocalLanConfig(it.names, &it.number))},
        {"KLIBNetGetMacAddr", CALL(KLIBNetGetMacAddr(1, it.text, sizeof it.text)), cards},
        {"KLIBNetGetMacAddr/cluster", CALL(KLIBNetGetMacAddr(0, it.text, sizeof it.text)), cluster, cards},
        {"KLIBNetGetMacAddrByInterface", CALL(KLIBNetGetMacAddrByInterface("eth0", it.text, sizeof it.text))},
        {"KLIBNetIFChgPluginSetArgs", CALL(KLIBNetIFChgPluginSetArgs(it.event, kOld, 1, kNew, 1, 0)), open_event},
        {"KLIBNetIFIsLocalLan", CALL(KLIBNetIFIsLocalLan("eth0")), failure::zero},
        {"KLIBNetISetIfFlags", CALL(KLIBNetISetIfFlags("eth0", IFF_PROMISC, 1))},
        {"KLIBNetIfDown", CALL(KLIBNetIfDown("eth0"))},
        {"KLIBNetIfLinkDownEvent", CALL(KLIBNetIfLinkDownEvent("eth0"))},
        {"KLIBNetIfLinkUpEvent", CALL(KLIBNetIfLinkUpEvent("eth0"))},
        {"KLIBNetIfUp", CALL(KLIBNetIfUp("eth0"))},
        {"KLIBNetInterfaceEnum", CALL(KLIBNetInterfaceEnum(it.records, 32, 0)), cards},
        {"KLIBNetInterfaceEnum/cluster", CALL(KLIBNetInterfaceEnum(it.records, 32, 6)), cluster, cards},
        {"KLIBNetOVSGetOriginalIf", CALL(KLIBNetOVSGetOriginalIf("ovs_eth0", it.text, sizeof it.text)), pure},
        {"KLIBNetOVSIfIsMaster", CALL(KLIBNetOVSIfIsMaster("ovs_bond0")), virtual_switch, failure::zero},
        {"KLIBNetOVSIfIsSlave", CALL(KLIBNetOVSIfIsSlave("eth1")), virtual_switch, failure::zero},
        {"KLIBNetReInitIf", CALL(KLIBNetReInitIf("eth0"))},
        {"KLIBNetSetIfCfg", CALL(KLIBNetSetIfCfg("eth0", "IPADDR", "192.168.1.11"))},
        {"KLIBNetStatFree", CALL((KLIBNetStatFree(nullptr), 0)), pure},
        {"KLIBNetStatGetAll", CALL(KLIBNetStatGetAll(it.statistics, 32))},
        {"KLIBNetStatGetSingle", CALL(KLIBNetStatGetSingle("eth0", it.statistics))},
        {"KLIBNetStatInit",
         [](world &) -> long {
             NETSTAT *records = KLIBNetStatInit(2);
             KLIBNetStatFree(records);
             return records != nullptr;
         },
         failure::zero},
        {"KLIBNetTopologyGet", CALL(describe_topology(it)), topology, failure::below_one},
        {"KLIBNetVlanCreate", CALL(KLIBNetVlanCreate("eth0", 10, &it.card)), vlan_to_make, vlan_steps, dispatch},
        {"KLIBNetVlanEnum", list_vlans, vlan},
        {"KLIBNetVlanExist", CALL(KLIBNetVlanExist(nullptr)), vlan, failure::zero},
        {"KLIBNetVlanGet", CALL(KLIBNetVlanGet("eth0.10", &it.vlan)), vlan, failure::below_one},
        {"KLIBNetVlanGetByRowDev", CALL(KLIBNetVlanGetByRowDev("eth0", 10, &it.vlan)), vlan, failure::below_one},
        {"KLIBNetVlanRemove", CALL(KLIBNetVlanRemove("eth0.10")), vlan, vlan_steps, dispatch},
        {"KLIBNetVlanValidId", CALL(KLIBNetVlanValidId(10)), pure},
        {"KLIBServicePlugin", CALL(KLIBServicePlugin(1, KLIB_SERVICE_IP_CHANGE)), dispatch},
        {"KLIBServiceStopBeforeIPChange", CALL(KLIBServiceStopBeforeIPChange())},
        {"KOVAConfGetMTUValue", CALL(KOVAConfGetMTUValue("eth0", it.text, sizeof it.text)), stored_mtu},
        {"KOVAConfGetMTUValue/switch port", CALL(KOVAConfGetMTUValue("ovs_eth0", it.text, sizeof it.text)),
         mtu_of_switch},
        {"KOVAConfSetMTUValue", CALL(KOVAConfSetMTUValue("9000", "eth0")), stored_mtu, mtu_question},
        {"KOVAConfSetMTUValue/VLAN", CALL(KOVAConfSetMTUValue("1400", "eth0.10")), vlan, mtu_question},
        {"KOVAConfSetMTUValue/switch port", CALL(KOVAConfSetMTUValue("9000", "ovs_eth0")), mtu_of_switch, mtu_question},
        {"KOVAExternalIPGet", CALL(KOVAExternalIPGet(it.text, sizeof it.text))},
        {"KOVAGetMTU", CALL(KOVAGetMTU("eth0")), failure::below_one},
        {"KOVAGetMTUSetting", CALL(KOVAGetMTUSetting("eth0")), failure::below_one},
        {"KOVAGetMTUSetting/switch bond", CALL(KOVAGetMTUSetting("ovs_bond0")), virtual_switch, failure::below_one,
         switch_ports},
        {"KOVAGetMTUSetting/switch port", CALL(KOVAGetMTUSetting("ovs_eth0")), virtual_switch, failure::below_one},
        {"KOVAIGetDHCPTestNetInfo", CALL(KOVAIGetDHCPTestNetInfo(&it.card)), lease_to_ask_for},
        {"KOVAIIpConflict", CALL(KOVAIIpConflict("eth0", "192.168.1.20")), nobody_there},
        {"KOVAILnxGetIP", CALL(KOVAILnxGetIP("eth0", it.text, sizeof it.text))},
        {"KOVAILnxGetIPFromCfg", CALL(KOVAILnxGetIPFromCfg("eth0", it.text, sizeof it.text))},
        {"KOVAILnxSetIPNetmask", CALL(KOVAILnxSetIPNetmask("eth0", "192.168.1.20", "255.255.255.0")), backed_up,
         announced},
        {"KOVALnxGetHostname", CALL(KOVALnxGetHostname(it.text))},
        {"KOVALnxIPv6FlushAddr", CALL(KOVALnxIPv6FlushAddr("eth0")), off_and_on},
        {"KOVALnxIPv6ProcAction/enable", CALL(KOVALnxIPv6ProcAction("eth0", 0)), off_and_on},
        {"KOVALnxIPv6ProcAction/disable", CALL(KOVALnxIPv6ProcAction("eth0", 1)), off_and_on},
        {"KOVALnxSetHostname", CALL(KOVALnxSetHostname("kova")), host_names, renamed, host_name},
        {"KOVALnxV6IPGet", CALL(KOVALnxV6IPGet("eth0", it.addresses, 16)), address_list},
        {"KOVANetApplyPPPoERelayConfig/start", CALL(KOVANetApplyPPPoERelayConfig("br0")), relay, relay_switch,
         relay_processes, relay_directory},
        {"KOVANetApplyPPPoERelayConfig/runs", CALL(KOVANetApplyPPPoERelayConfig("br0")), relay_that_runs, relay_switch,
         relay_processes, relay_directory},
        {"KOVANetApplyPPPoERelayConfig/restart", CALL(KOVANetApplyPPPoERelayConfig("br0")), relay_to_another,
         relay_switch, relay_processes, relay_directory},
        {"KOVANetApplyPPPoERelayConfig/stop", CALL(KOVANetApplyPPPoERelayConfig("br0")), relay_that_is_off,
         relay_switch, relay_processes, relay_directory},
        {"KOVANetApplyPPPoERelayConfigAll", CALL(KOVANetApplyPPPoERelayConfigAll()), relay, relay_switch,
         relay_processes, relay_directory},
        {"KOVANetBondIPConflict", CALL(KOVANetBondIPConflict("bond0", it.text, sizeof it.text)), bond_and_other_address,
         kernel_bond},
        {"KOVANetCalBroadcast", CALL(KOVANetCalBroadcast("192.168.1.10/24", it.text, sizeof it.text)), calculator},
        {"KOVANetCalNetwork", CALL(KOVANetCalNetwork("192.168.1.10/24", it.text, sizeof it.text)), calculator},
        {"KOVANetClearPPPoERelayConfigAll", CALL(KOVANetClearPPPoERelayConfigAll()), relay, relay_files},
        {"KOVANetDNSChangeHook", CALL(KOVANetDNSChangeHook(KLIB_PLUGIN_POST, it.list))},
        {"KOVANetDNSFileSet", CALL(KOVANetDNSFileSet(it.list, it.list)), resolver, told, renamed, made_again},
        {"KOVANetDNSGet", CALL(give_back_a_lock(it, KOVANetDNSGet(it.text, sizeof it.text))), resolver, server_list},
        {"KOVANetDNSListGet", CALL(give_back_a_lock(it, KOVANetDNSListGet(&it.list))), resolver, server_list},
        {"KOVANetDNSListSet/new", CALL(KOVANetDNSListSet(it.list)), told, renamed, made_again},
        {"KOVANetDNSListSet/change", CALL(KOVANetDNSListSet(it.list)), automatic_resolver, told, renamed, made_again},
        {"KOVANetDNSModeSet/static", CALL(KOVANetDNSModeSet("static")), automatic_resolver, told, renamed, made_again},
        {"KOVANetDNSModeSet/auto", CALL(KOVANetDNSModeSet("auto")), automatic_resolver, told, renamed, made_again},
        {"KOVANetDNSSet", CALL(KOVANetDNSSet("10.0.0.3")), resolver, told, renamed, made_again},
        {"KOVANetDNSUpdate/static", CALL(KOVANetDNSUpdate()), resolver, told, renamed, made_again},
        {"KOVANetDNSUpdate/auto", CALL(KOVANetDNSUpdate()), automatic_resolver, told, renamed, made_again},
        {"KOVANetDefaultGatewayGet", CALL(KOVANetDefaultGatewayGet(it.text, sizeof it.text)), default_route},
        {"KOVANetDefaultGatewayGetConf", CALL(KOVANetDefaultGatewayGetConf(it.text, sizeof it.text)), gateway_conf},
        {"KOVANetDefaultGatewayInterfaceGet", CALL(KOVANetDefaultGatewayInterfaceGet(it.text, sizeof it.text)),
         default_route},
        {"KOVANetDefaultGatewaySet", CALL(KOVANetDefaultGatewaySet("192.168.1.1")), old_route},
        {"KOVANetDefaultGatewaySetConf/new", CALL(KOVANetDefaultGatewaySetConf("192.168.1.2"))},
        {"KOVANetDefaultGatewaySetConf/change", CALL(KOVANetDefaultGatewaySetConf("192.168.1.2")), gateway_conf},
        {"KOVANetDefaultGatewaySetConf/none", CALL(KOVANetDefaultGatewaySetConf("")), gateway_conf},
        {"KOVANetDnsConfigChangeHook", CALL(KOVANetDnsConfigChangeHook(KLIB_PLUGIN_POST, "eth0", it.list))},
        {"KOVANetDisableBridgeSlave", CALL(KOVANetDisableBridgeSlave(&it.card)), bridge, own_copy},
        {"KOVANetEnumCard", CALL(KOVANetEnumCard(2)), cards},
        {"KOVANetFlushIP/ipv4", CALL(KOVANetFlushIP("-4", "eth0"))},
        {"KOVANetFlushIP/ipv6", CALL(KOVANetFlushIP("-6", "eth0")), off_and_on},
        {"KOVANetGatewayConfigChangeHook",
         CALL(KOVANetGatewayConfigChangeHook(KLIB_PLUGIN_POST, "ipv4", "eth0", "10.0.0.1", "10.0.0.2"))},
        {"KOVANetGetAddrType", CALL(KOVANetGetAddrType("fe80::1")), pure},
        {"KOVANetGetBridgeConfig/bridge", CALL(KOVANetGetBridgeConfig("br0", &it.card, &it.bridge)), bridge,
         bridge_keys},
        {"KOVANetGetBridgeConfig/port", CALL(KOVANetGetBridgeConfig("eth0", &it.card, &it.bridge)), bridge,
         bridge_keys},
        {"KOVANetGetCard1", CALL(KOVANetGetCard1(0, nullptr, &it.card)), failure::below_one, cards, protocol},
        {"KOVANetGetCard1/address", CALL(KOVANetGetCard1(0, "192.168.2.10", &it.card)), failure::below_one, cards,
         protocol},
        {"KOVANetGetCard1Ex/cluster", CALL(KOVANetGetCard1Ex(0, "10.9.0.2", 0x12, &it.card)), cluster,
         failure::below_one, cards, protocol},
        {"KOVANetGetDhcpServerConf", CALL(KOVANetGetDhcpServerConf("office", "eth0", &it.subnet)), dhcp_subnets,
         failure::zero, dhcp_switch},
        {"KOVANetGetEthInfo", CALL(KOVANetGetEthInfo(&it.ethernet, "eth0"))},
        {"KOVANetGetEthInfo/switch bond", CALL(KOVANetGetEthInfo(&it.ethernet, "ovs_bond0")), virtual_switch,
         switch_ports},
        {"KOVANetGetEthInfo/switch port", CALL(KOVANetGetEthInfo(&it.ethernet, "ovs_eth0")), virtual_switch},
        {"KOVANetGetIfBlock", CALL(KOVANetGetIfBlock("eth0", &it.number))},
        {"KOVANetGetPPPoERelayConfig", CALL(KOVANetGetPPPoERelayConfig("br0", &it.relay)), relay, relay_directory,
         relay_switch},
        {"KOVANetGetPPPoERelayConfig/new", CALL(KOVANetGetPPPoERelayConfig("br0", &it.relay)), relay_directory,
         relay_switch},
        {"KOVANetGetPortUsedInRange/tcp", [](world &it) { return list_ports(it, 1); }, sockets, socket_tables},
        {"KOVANetGetPortUsedInRange/udp", [](world &it) { return list_ports(it, 2); }, sockets, socket_tables},
        {"KOVANetHostnameChangeHook", CALL(KOVANetHostnameChangeHook("kova"))},
        {"KOVANetIFGetIPConfig", CALL(KOVANetIFGetIPConfig("eth0", &it.card)), protocol},
        {"KOVANetIFGetIPConfig/dhcp", CALL(KOVANetIFGetIPConfig("eth1", &it.card)), protocol},
        {"KOVANetIFGetInfo", CALL(KOVANetIFGetInfo("eth0", it.records, &it.card)), protocol},
        {"KOVANetIFGetInfoEx/cluster", CALL(KOVANetIFGetInfoEx("eth0", 0x12, it.records, &it.card)), cluster, protocol},
        {"KOVANetIP2If", CALL(KOVANetIP2If("192.168.2.10", it.text, sizeof it.text)), failure::below_one, cards},
        {"KOVANetIPChangePreHook", CALL(KOVANetIPChangePreHook(1, "eth0", "fe80::1", "fe80::2", 64))},
        {"KOVANetIPv6ConfGet", CALL(read_ipv6(it)), fixed_ipv6, failure::below_one, cards},
        {"KOVANetIPv6ConfSet/auto", CALL(KOVANetIPv6ConfSet(NET_IPV6_AUTO, "eth0", nullptr, 0, nullptr)), fixed_ipv6,
         failure::not_zero, ipv6_mode},
        {"KOVANetIPv6ConfSet/off", CALL(KOVANetIPv6ConfSet(NET_IPV6_OFF, "eth0", nullptr, 0, nullptr)), fixed_ipv6,
         failure::not_zero, ipv6_mode},
        {"KOVANetIPv6ConfSet/dhcp", CALL(KOVANetIPv6ConfSet(NET_IPV6_DHCP, "eth0", nullptr, 0, nullptr)), fixed_ipv6,
         failure::not_zero, ipv6_mode},
        {"KOVANetIPv6ConfSet/static", CALL(KOVANetIPv6ConfSet(NET_IPV6_STATIC, "eth0", "2001:db8::5", 64, nullptr)),
         fixed_ipv6, failure::not_zero, announced, ipv6_mode},
        {"KOVANetIPv6ConfSet/gateway", CALL(KOVANetIPv6ConfSet(NET_IPV6_STATIC, "eth0", "2001:db8::5", 64, "fe80::1")),
         fixed_ipv6, failure::not_zero, announced, ipv6_mode},
        {"KOVANetIPv6ConfSet/auto_dhcp", CALL(KOVANetIPv6ConfSet(NET_IPV6_AUTO_DHCP, "eth0", nullptr, 0, nullptr)),
         fixed_ipv6, failure::not_zero, ipv6_mode},
        {"KOVANetIPv6IPAction", CALL(KOVANetIPv6IPAction(0, "eth0", "fe80::2", 64, nullptr)), announced},
        {"KOVANetIPv6IPAction/gateway", CALL(KOVANetIPv6IPAction(0, "eth0", "fe80::2", 64, "fe80::1")),
         failure::not_zero},
        {"KOVANetIPv6IsSameSubnet", CALL(KOVANetIPv6IsSameSubnet("fe80::1", "fe80::2", 64)), pure},
        {"KOVANetIPv6RemoveDADFailedIP", CALL(KOVANetIPv6RemoveDADFailedIP("eth0", it.addresses, 16)), duplicate,
         address_list},
        {"KOVANetIPv6RemoveDADFailedIP/many", CALL(KOVANetIPv6RemoveDADFailedIP("eth0", it.addresses, 16)),
         many_duplicates, address_list},
        {"KOVANetIfIsBondingPassive", CALL(KOVANetIfIsBondingPassive("eth0")), bond_member, failure::zero},
        {"KOVANetIfIsBondingPassive/switch", CALL(KOVANetIfIsBondingPassive("eth1")), virtual_switch, failure::zero,
         switch_ports},
        {"KOVANetIfIsLink", CALL(KOVANetIfIsLink("eth0"))},
        {"KOVANetIfIsLink/switch bond", CALL(KOVANetIfIsLink("ovs_bond0")), virtual_switch, switch_ports},
        {"KOVANetIfIsLink/switch port", CALL(KOVANetIfIsLink("ovs_eth0")), virtual_switch},
        {"KOVANetIfIsStaticIP", CALL(KOVANetIfIsStaticIP("eth0")), failure::zero},
        {"KOVANetInternalLanNumGet", CALL(KOVANetInternalLanNumGet()), port_count},
        {"KOVANetIpv6Init", CALL(KOVANetIpv6Init()), fixed_ipv6, ipv6_switches},
        {"KOVANetIsDevTypeMatch", CALL(KOVANetIsDevTypeMatch("eth0", 2)), failure::zero, cards},
        {"KOVANetIsIFUp", CALL(KOVANetIsIFUp("eth0")), failure::zero},
        {"KOVANetIsIfBridgeType", CALL(KOVANetIsIfBridgeType("br0", KLIB_BRIDGE_MASTER)), bridge, failure::zero,
         bridge_keys},
        {"KOVANetIsPortRangeUsed/tcp", CALL(KOVANetIsPortRangeUsed(400, 500, 1)), sockets, failure::zero,
         socket_tables},
        {"KOVANetIsPortRangeUsed/udp", CALL(KOVANetIsPortRangeUsed(540, 550, 2)), sockets, failure::zero,
         socket_tables},
        {"KOVANetIsPrivateIP", CALL(KOVANetIsPrivateIP("10.0.0.1")), pure},
        {"KOVANetIsSamePPPoERelayConfig", CALL(KOVANetIsSamePPPoERelayConfig(&it.relay, &it.relay)), pure},
        {"KOVANetIsSameSubnet", CALL(KOVANetIsSameSubnet("10.0.0.1", "10.0.0.2", "255.0.0.0")), pure},
        {"KOVANetLinkAggrConfDel", CALL(KOVANetLinkAggrConfDel(&it.bond)), bond_to_delete, bond_copies, end_of_bond},
        {"KOVANetLinkAggrConfSetSlave/join", CALL(KOVANetLinkAggrConfSetSlave("eth0", 1, &it.bond)), bond_to_make,
         member_copies},
        {"KOVANetLinkAggrConfSetSlave/leave", CALL(KOVANetLinkAggrConfSetSlave("eth0", 0, nullptr)), bond_to_change,
         member_copies, boot_protocol},
        {"KOVANetLinkAggrConfUpdateBootProto",
         CALL(KOVANetLinkAggrConfUpdateBootProto("/etc/sysconfig/network-scripts/ifcfg-eth1", it.map)), boot_protocol},
        {"KOVANetLinkAggrEnum", CALL(KOVANetLinkAggrEnum(it.list)), bonds, failure::below_one, some_bonds},
        {"KOVANetLinkAggrExist", CALL(KOVANetLinkAggrExist()), bonds, failure::below_one},
        {"KOVANetLinkAggrGet", CALL(KOVANetLinkAggrGet("bond0", &it.bond)), kernel_bond},
        {"KOVANetLinkAggrGet/switch", CALL(KOVANetLinkAggrGet("ovs_bond0", &it.bond)), virtual_switch,
         failure::not_zero, switch_ports},
        {"KOVANetLinkAggrModeToString", CALL(KOVANetLinkAggrModeToString(KOVA_LINK_AGGR_8023AD) != nullptr), pure},
        {"KOVANetLinkAggrOptSlsaveAdd", CALL(KOVANetLinkAggrOptSlsaveAdd(&it.bond, "eth0")), member_to_add, pure},
        {"KOVANetLinkAggrPhyGet", CALL(KOVANetLinkAggrPhyGet("bond0", it.list))},
        {"KOVANetLinkAggrSet/make", CALL(KOVANetLinkAggrSet(&it.bond)), bond_to_make, bond_steps, dispatch, bond_copies,
         new_bond},
        {"KOVANetLinkAggrSet/change", CALL(KOVANetLinkAggrSet(&it.bond)), bond_to_change, bond_steps, kernel_bond,
         bond_copies, other_bond},
        {"KOVANetLinkAggrSet/delete", CALL(KOVANetLinkAggrSet(&it.bond)), bond_to_delete, bond_steps, dispatch,
         kernel_bond, bond_copies, end_of_bond},
        {"KOVANetLinkAggrStringToMode", CALL(KOVANetLinkAggrStringToMode("balance-rr")), pure},
        {"KOVANetLookupIP/resolver", [](world &) { return look_up("nas01"); }, failure::zero},
        {"KOVANetLookupIP/network", look_up_on_network, failure::zero, names_elsewhere},
        {"KOVANetMTUChangeHook", CALL(KOVANetMTUChangeHook("eth0", "9000"))},
        {"KOVANetNetmaskToPrefix", CALL(KOVANetNetmaskToPrefix("255.0.0.0")), pure},
        {"KOVANetNtoa", CALL(KOVANetNtoa(1) != nullptr), pure},
        {"KOVANetRenameEth", CALL(KOVANetRenameEth("eth0", "lan0")), down, interface_state},
        {"KOVANetSetBridgeConfig/port", CALL(KOVANetSetBridgeConfig(&it.card, &it.bridge)), port_to_set, own_copy},
        {"KOVANetSetBridgeConfig/bridge", CALL(KOVANetSetBridgeConfig(&it.card, &it.bridge)), bridge_to_set, own_copy},
        {"KOVANetSetCard1/static", CALL(KOVANetSetCard1(&it.card, nullptr)), card_to_set, backed_up, announced,
         housekeeping},
        {"KOVANetSetCard1/dhcp", CALL(KOVANetSetCard1(&it.card, nullptr)), dhcp_card_to_set, backed_up, housekeeping},
        {"KOVANetSetDhcpServerConfigFiles/new", CALL(KOVANetSetDhcpServerConfigFiles(&it.subnet, 1)), subnet_to_set,
         failure::zero, in_place_tagged},
        {"KOVANetSetDhcpServerConfigFiles/change", CALL(KOVANetSetDhcpServerConfigFiles(&it.subnet, 1)),
         subnet_to_change, failure::zero, in_place_tagged},
        {"KOVANetSetIP/ipv4", CALL(KOVANetSetIP("-4", "eth0", "192.168.1.20", 24, "add")), announced},
        {"KOVANetSetIP/ipv4 without link", CALL(KOVANetSetIP("-4", "eth0", "192.168.1.10", 24, "add")), without_link,
         announced, calculator, route_update},
        {"KOVANetSetIP/ipv4 del", CALL(KOVANetSetIP("-4", "eth0", "192.168.1.10", 24, "del"))},
        {"KOVANetSetIP/ipv6", CALL(KOVANetSetIP("-6", "eth0", "2001:db8::1", 64, "add")), announced},
        {"KOVANetSetIfBlock", CALL(KOVANetSetIfBlock("eth0", 1, 1)), block_steps},
        {"KOVANetSetMTUEth", CALL(KOVANetSetMTUEth("9000", "eth0")), vlan_question, up_and_down},
        {"KOVANetSetMTUEth/VLAN", CALL(KOVANetSetMTUEth("9000", "eth0.10")), vlan, vlan_question, up_and_down},
        {"KOVANetSetMTUEth/switch bond", CALL(KOVANetSetMTUEth("9000", "ovs_bond0")), virtual_switch, vlan_question,
         up_and_down, switch_members},
        {"KOVANetSetMTUEth/switch port", CALL(KOVANetSetMTUEth("9000", "ovs_eth0")), virtual_switch, vlan_question,
         up_and_down},
        {"KOVANetSetMTUValue", CALL(KOVANetSetMTUValue("9000", "eth0")), stored_mtu, mtu_question, up_and_down,
         link_state, announced},
        {"KOVANetSetMTUValue/switch bond", CALL(KOVANetSetMTUValue("9000", "ovs_bond0")), mtu_of_switch, mtu_question,
         up_and_down, switch_members, announced, one_by_one},
        {"KOVANetSetMTUValue/switch port", CALL(KOVANetSetMTUValue("9000", "ovs_eth0")), mtu_of_switch, mtu_question,
         up_and_down, link_state, announced},
        {"KOVANetSetPPPoERelayConfig/new", CALL(KOVANetSetPPPoERelayConfig("br0", &it.relay)), relay_to_set,
         relay_directory, relay_made_empty},
        {"KOVANetSetPPPoERelayConfig/change", CALL(KOVANetSetPPPoERelayConfig("br0", &it.relay)), relay,
         relay_directory},
        {"KOVANetStaticDNSListGet", CALL(KOVANetStaticDNSListGet(&it.list)), resolver, server_list},
        {"KOVAPPPoECheckStatus/up", CALL(KOVAPPPoECheckStatus(1)), dialled, failure::below_one, processes},
        {"KOVAPPPoECheckStatus/down", CALL(KOVAPPPoECheckStatus(1)), dial_enabled, processes},
        {"KOVAPPPoECheckStatus/off", CALL(KOVAPPPoECheckStatus(0)), dialled_but_off, unknown_process, dial_stop},
        {"KOVAPPPoEService/start", CALL(KOVAPPPoEService(1)), dial_settings},
        {"KOVAPPPoEService/stop", CALL(KOVAPPPoEService(0)), dial_enabled, dial_stop},
        {"KOVAPPPoeIntfGet", CALL(KOVAPPPoeIntfGet(it.text, sizeof it.text)), connection_interface, noted_name},
        {"KOVAPPPoeIntfGet/noted", CALL(KOVAPPPoeIntfGet(it.text, sizeof it.text)), noted_connection_interface,
         noted_name},
        {"KOVAPPPoeNetInfoGet", CALL(KOVAPPPoeNetInfoGet(it.text, sizeof it.text, it.names[0], sizeof it.names[0])),
         connection_interface, noted_name},
        {"KOVASchedGetNowIndex", CALL(KOVASchedGetNowIndex()), local_zone, pure},
        {"KOVATunnelConfigGet", CALL(KOVATunnelConfigGet(&it.tunnel)), tunnel_account},
        {"KOVATunnelConfigSet/new", CALL(KOVATunnelConfigSet(&it.tunnel)), tunnel_to_make, tunnel_files},
        {"KOVATunnelConfigSet/change", CALL(KOVATunnelConfigSet(&it.tunnel)), tunnel_account, tunnel_files},
        {"KOVATunnelExecute/start", CALL(KOVATunnelExecute(KOVA_TUNNEL_START, &it.tunnel)), tunnel_with_address,
         tunnel_files, tunnel_work},
        {"KOVATunnelExecute/stored", CALL(KOVATunnelExecute(KOVA_TUNNEL_RESTART, nullptr)), tunnel_with_address,
         tunnel_files, tunnel_work},
        {"KOVATunnelExecute/stop", CALL(KOVATunnelExecute(KOVA_TUNNEL_STOP, nullptr)), tunnel_account, tunnel_files,
         tunnel_work},
        {"KOVATunnelExecute/hanging", CALL(KOVATunnelExecute(KOVA_TUNNEL_RESTART, &it.tunnel)), tunnel_that_hangs,
         failure::like_zero, tunnel_files, tunnel_work, tunnel_failure},
        {"NetRoutetableCheck", CALL(NetRoutetableCheck()), two_without_link, cards, protocol, known_kind, route_tools},
        {"NetRoutetableEdit/add", CALL(NetRoutetableEdit(NET_ROUTE_ADD, "10.0.0.1", "255.0.0.0", "eth0")), route_tools},
        {"NetRoutetableEdit/delete", CALL(NetRoutetableEdit(NET_ROUTE_DELETE, "10.0.0.1", "255.0.0.0", "eth0")),
         route_tools},
        {"NetRoutetableHandler/add", CALL(NetRoutetableHandler(NET_ROUTE_ADD, "eth0")), cards, protocol, known_kind,
         route_tools},
        {"NetRoutetableHandler/dhcp", CALL(NetRoutetableHandler(NET_ROUTE_DELETE, "eth1")), cards, protocol, known_kind,
         route_tools},
        {"PPPoEConfigGet", CALL(PPPoEConfigGet(&it.dial)), dial_settings, dial_switch},
        {"PPPoEConfigSet/new", CALL(PPPoEConfigSet(&it.dial)), dial_to_set, dial_steps},
        {"PPPoEConfigSet/change", CALL(PPPoEConfigSet(&it.dial)), dial_to_change, dial_steps},
        {"cKLIBICalMask", CALL(cKLIBICalMask(kMask)), pure},
        {"cKLIBISepIP", CALL(cKLIBISepIP("10.0.0.1", reinterpret_cast<uint32_t *>(it.text))), pure},
    };
    return all;
}

} // namespace fault
