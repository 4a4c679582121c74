#include "core/commands.h"

#include "core/text.h"

namespace kova {

namespace {

int dhcp_client_job(const char *program, const char *szIfname) {
    const path_text interface { "IFACE=%s", szIfname };
    return run(program, "dhcp-client", interface.c_str());
}

/** At most 33 names: a bond and its members. */
void run_network_script(const char *verb, const char *const *names, int count) {
    constexpr int kMostNames = 33;
    const char *arguments[2 + kMostNames + 1] = {"/etc/rc.network", verb};
    for (int i = 0; i < count && i < kMostNames; ++i) {
        arguments[2 + i] = names[i];
    }
    (void)KLIBCExecv(arguments[0], arguments, 1);
}

} // namespace

void stop_interfaces(const char *const *names, int count) {
    run_network_script("stop", names, count);
}

void start_interfaces(const char *const *names, int count) {
    run_network_script("start", names, count);
}

int start_dhcp_client(const char *szIfname) {
    return dhcp_client_job("/sbin/start", szIfname);
}

int stop_dhcp_client(const char *szIfname) {
    return dhcp_client_job("/sbin/stop", szIfname);
}

} // namespace kova
