/**
 * @file
 * Network configuration of the appliance: everything, in one include.
 */
#ifndef KOVANETSDK_KOVANETSDK_H
#define KOVANETSDK_KOVANETSDK_H

#include <kovanetsdk/addr.h>
#include <kovanetsdk/bridge.h>
#include <kovanetsdk/core.h>
#include <kovanetsdk/dhcp.h>
#include <kovanetsdk/dns.h>
#include <kovanetsdk/events.h>
#include <kovanetsdk/hostname.h>
#include <kovanetsdk/iface.h>
#include <kovanetsdk/ipv6.h>
#include <kovanetsdk/link.h>
#include <kovanetsdk/pppoe.h>
#include <kovanetsdk/routing.h>
#include <kovanetsdk/stats.h>
#include <kovanetsdk/tunnel.h>

#endif
