#include <kovanetsdk/dhcp.h>

#include "core/report.h"

using namespace kova;

namespace {

constexpr char kRestart[] = "nat-restart-dhcp";

int run_network_script(const char *verb) {
    return KLIBCExec("/etc/rc.network", verb, nullptr, nullptr, nullptr);
}

/** Only status 1 is the script's word that the server failed; a script that could not be run tells nothing. */
int check_status(const place &at, int status) {
    return status == 1 ? fail_keeping_code(at, 1, "Failed to restart DHCP SERVER") : 0;
}

} // namespace

extern "C" int DHCPServerStart(void) {
    return check_status(HERE, run_network_script("nat-start-dhcp"));
}

extern "C" int DHCPServerRestart(void) {
    return check_status(HERE, run_network_script(kRestart));
}

extern "C" int KLIBNetDHCPServerRestart(void) {
    return run_network_script(kRestart) == 0 ? 0 : -1;
}
