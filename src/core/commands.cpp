#include "core/commands.h"

#include "core/text.h"

namespace kova {

namespace {

int dhcp_client_job(const char *program, const char *szIfname) {
    const path_text interface { "IFACE=%s", szIfname };
    return run(program, "dhcp-client", interface.c_str());
}

} // namespace

int start_dhcp_client(const char *szIfname) {
    return dhcp_client_job("/sbin/start", szIfname);
}

int stop_dhcp_client(const char *szIfname) {
    return dhcp_client_job("/sbin/stop", szIfname);
}

} // namespace kova
