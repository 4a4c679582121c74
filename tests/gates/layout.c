/* Every byte of the records is part of the interface: offsets and sizes, the same on every 64-bit machine. */
#include <kovanetsdk/kovanetsdk.h>
#include <stddef.h>

#define AT(record, field, offset) _Static_assert(offsetof(record, field) == (offset), #record "." #field)
#define SIZE(record, size) _Static_assert(sizeof(record) == (size), #record)

AT(NETINFO, nIPSource, 0);
AT(NETINFO, blLinkUp, 4);
AT(NETINFO, szIfname, 8);
AT(NETINFO, abMac, 24);
AT(NETINFO, szIP, 30);
AT(NETINFO, szMask, 50);
SIZE(NETINFO, 72);

AT(IFINFO, szIfname, 0);
AT(IFINFO, abMac, 16);
AT(IFINFO, szIP, 22);
AT(IFINFO, nLink, 88);
AT(IFINFO, nFlags, 92);
AT(IFINFO, szMask, 96);
SIZE(IFINFO, 116);

AT(ETHINFO, nSpeed, 0);
AT(ETHINFO, nDuplex, 4);
AT(ETHINFO, nMTU, 8);
AT(ETHINFO, nSupported, 12);
AT(ETHINFO, nBestSpeed, 16);
AT(ETHINFO, nBestDuplex, 20);
AT(ETHINFO, szBestMode, 24);
SIZE(ETHINFO, 40);

AT(NETSTAT, blValid, 0);
AT(NETSTAT, szIfname, 4);
AT(NETSTAT, nRxBytes, 24);
AT(NETSTAT, nTxBytes, 32);
AT(NETSTAT, nRxPackets, 40);
AT(NETSTAT, nTxPackets, 48);
SIZE(NETSTAT, 56);

AT(DHCP_TAG_CONF, enabled, 0);
AT(DHCP_TAG_CONF, reserved, 4);
AT(DHCP_TAG_CONF, lease_time, 8);
AT(DHCP_TAG_CONF, start_ip, 12);
AT(DHCP_TAG_CONF, end_ip, 58);
AT(DHCP_TAG_CONF, ifname, 104);
AT(DHCP_TAG_CONF, domain, 120);
AT(DHCP_TAG_CONF, dns1, 4216);
AT(DHCP_TAG_CONF, dns2, 4262);
AT(DHCP_TAG_CONF, dns_more, 4308);
AT(DHCP_TAG_CONF, netmask, 8404);
AT(DHCP_TAG_CONF, router, 8450);
AT(DHCP_TAG_CONF, reserved_text, 8496);
AT(DHCP_TAG_CONF, tag, 12592);
AT(DHCP_TAG_CONF, v6_mode, 12612);
AT(DHCP_TAG_CONF, options, 12632);
SIZE(DHCP_TAG_CONF, 12640);

AT(DHCP_RANGE, start, 0);
AT(DHCP_RANGE, end, 16);
AT(DHCP_RANGE, netmask, 32);
AT(DHCP_RANGE, next, 48);
SIZE(DHCP_RANGE, 56);

AT(KOVAV6IP, szIP, 0);
AT(KOVAV6IP, nPrefixLength, 48);
AT(KOVAV6IP, nScope, 52);
AT(KOVAV6IP, nFlags, 56);
SIZE(KOVAV6IP, 60);

AT(KOVALOOKUPIP, szIP, 0);
AT(KOVALOOKUPIP, nFamily, 48);
SIZE(KOVALOOKUPIP, 52);

AT(KLIBETHERWAKE, abMac, 0);
AT(KLIBETHERWAKE, szIfname, 6);
SIZE(KLIBETHERWAKE, 22);

AT(KOVALINKAGGROPT, szName, 0);
AT(KOVALINKAGGROPT, mode, 16);
AT(KOVALINKAGGROPT, blNoPartner, 20);
AT(KOVALINKAGGROPT, cSlaves, 24);
AT(KOVALINKAGGROPT, aszSlaves, 28);
SIZE(KOVALINKAGGROPT, 540);

AT(DHCP_OPTION, number, 0);
AT(DHCP_OPTION, name, 4);
AT(DHCP_OPTION, value, 56);
AT(DHCP_OPTION, items, 1080);
AT(DHCP_OPTION, next, 1088);
SIZE(DHCP_OPTION, 1096);

AT(DHCP_PXE_CONF, enabled, 0);
AT(DHCP_PXE_CONF, is_remote_tftp, 4);
AT(DHCP_PXE_CONF, local_bootloader, 8);
AT(DHCP_PXE_CONF, remote_bootloader, 4104);
AT(DHCP_PXE_CONF, remote_tftp_server_ip, 8200);
SIZE(DHCP_PXE_CONF, 8220);

AT(BRIDGEINFO, nType, 0);
AT(BRIDGEINFO, szIfname, 4);
AT(BRIDGEINFO, szPeer, 20);
SIZE(BRIDGEINFO, 36);

AT(VLANINFO, szIfname, 0);
AT(VLANINFO, szRowDevice, 16);
AT(VLANINFO, vlanId, 32);
SIZE(VLANINFO, 36);

AT(PPPOE_CONF, szIfname, 0);
AT(PPPOE_CONF, szUser, 16);
AT(PPPOE_CONF, szPassword, 272);
AT(PPPOE_CONF, szMTU, 304);
AT(PPPOE_CONF, blDefaultRoute, 312);
SIZE(PPPOE_CONF, 316);

AT(PPPOE_RELAY_CONF, blEnabled, 0);
AT(PPPOE_RELAY_CONF, szServer, 4);
SIZE(PPPOE_RELAY_CONF, 20);

AT(TOPOLOGYINFO, nTopology, 0);
AT(TOPOLOGYINFO, szName, 4);
AT(TOPOLOGYINFO, szIfname, 68);
AT(TOPOLOGYINFO, blClient, 84);
AT(TOPOLOGYINFO, nIFInfoRow, 88);
SIZE(TOPOLOGYINFO, 92);

AT(TUNNEL_CONF, blAnonymous, 0);
AT(TUNNEL_CONF, szServer, 1);
AT(TUNNEL_CONF, szUserId, 257);
AT(TUNNEL_CONF, szPassword, 513);
SIZE(TUNNEL_CONF, 545);

AT(KOVABONDDESC, szKernelMode, 0);
AT(KOVABONDDESC, szName, 8);
AT(KOVABONDDESC, szOptions, 16);
SIZE(KOVABONDDESC, 24);

AT(KLIBSZLIST, nCapacity, 0);
AT(KLIBSZLIST, nItem, 4);
