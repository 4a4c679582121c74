#include "ipv6/dhcp6_client.h"

#include "core/text.h"

#include <cstring>
#include <initializer_list>
#include <kova/core.h>
#include <sys/stat.h>
#include <unistd.h>

namespace kova {

namespace {

/** Long enough for the name of every interface that there is. */
using job_key = built_text<32>;

/** Whether root or this process's user wrote a file: everybody may make one in /tmp. */
bool is_trusted(const char *path) {
    struct stat status;
    return lstat(path, &status) == 0 && S_ISREG(status.st_mode) && (status.st_uid == 0 || status.st_uid == geteuid());
}

bool is_running(const char *szIfname, const char *kind) {
    const path_text pid_file{"/tmp/dhclient6-%s-%s.pid", szIfname, kind};
    const int pid = is_trusted(pid_file.c_str()) ? KLIBCReadPidFile(pid_file.c_str()) : -1;
    char name[64];
    return pid > 0 && KLIBCProcGetByPid(pid, name, sizeof name) >= 0 && strcmp(name, "dhclient") == 0;
}

int run_job_tool(const char *tool, const char *szIfname, const char *kind) {
    const job_key interface { "IFACE=%s", szIfname };
    const job_key action{"ACTION=%s", kind};
    const char *const arguments[] = {tool, "dhcp-client6", interface.c_str(), action.c_str(), nullptr};
    return KLIBCExecv(arguments[0], arguments, 1);
}

} // namespace

const char *running_dhcp6_client(const char *szIfname) {
    for (const char *const kind : {kDhcp6Client, kDhcp6Info}) {
        if (is_running(szIfname, kind)) {
            return kind;
        }
    }
    return nullptr;
}

int start_dhcp6_client(const char *szIfname, const char *kind) {
    return run_job_tool("/sbin/start", szIfname, kind);
}

int stop_dhcp6_client(const char *szIfname, const char *kind) {
    return run_job_tool("/sbin/stop", szIfname, kind);
}

} // namespace kova
