/**
 * @file
 * What objects tell of themselves, for the commands that tell of several. The caller holds the configuration lock where
 * it wants one view of them all.
 */
#pragma once

#include "interfaces.h"

namespace kova {

/** What kovanet gateway show prints, and so on. */
json gateway_record();
json dns_record();
json hostname_record();
json dhcp_server_record();
/** What kovanet pppoe-relay show prints of all bridges that have settings. */
json pppoe_relay_records();
/** The state in what kovanet tunnel show prints: "up", "connecting" or "down". */
std::string tunnel_state();
/** Whether the PPPoE connection is to be there, now and after a start. */
bool is_pppoe_switched_on();
/** The rows of kovanet addr list for one interface. */
json address_rows(const IFINFO &info);

} // namespace kova
