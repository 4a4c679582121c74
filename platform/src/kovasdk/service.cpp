#include "kova/service.h"

#include <algorithm>
#include <climits>
#include <cstdio>
#include <cstring>

#include "common/report.h"

using namespace kova;

namespace {

constexpr int kNameMax = 64;

bool is_name_character(char c) {
    return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || strchr("-_.@+", c) != nullptr;
}

/** A name becomes a part of a path: it must not lead anywhere else. */
bool is_bad_name(const char *name) {
    if (is_empty(name) || *name == '.' || *name == '-')
        return true;
    const size_t length = strlen(name);
    return length > kNameMax || !std::all_of(name, name + length, is_name_character);
}

/** Runs the service's script. @return its status, or -1 with the code set when there is none */
int run_script(const char *service, const char *verb) {
    char path[PATH_MAX];
    snprintf(path, sizeof path, "/usr/kova/service/%s", service);
    if (!KLIBCFileExist(path))
        return fail(HERE, kErrNotFound);
    return KLIBCExec(path, verb, nullptr, nullptr, nullptr);
}

} // namespace

int KLIBServiceReload(const char *szService) {
    if (is_bad_name(szService))
        return fail(HERE, kErrArgument);
    const int status = run_script(szService, "reload");
    return status > 0 ? fail(HERE, kErrExec) : status;
}

int KLIBServiceIsRunning(const char *szService) {
    if (is_bad_name(szService))
        return fail(HERE, kErrArgument);
    const register_keeper keep;
    return run_script(szService, "status") == 0 ? 1 : 0;
}

int KLIBServicectlJobStop(const char *szJob) {
    if (is_bad_name(szJob))
        return fail(HERE, kErrArgument);
    return KLIBCExec("/sbin/stop", szJob, nullptr, nullptr, nullptr) == 0 ? 0 : fail(HERE, kErrExec);
}

int KLIBServicecfgRunKeyGet(const char *szService, int *pRun) {
    if (is_bad_name(szService) || pRun == nullptr)
        return fail(HERE, kErrArgument);

    char path[PATH_MAX];
    snprintf(path, sizeof path, "/etc/kova/service/%s.conf", szService);
    const int result = KLIBCFileCheckKeyValue(path, "run", "yes", 0);
    if (result < 0)
        return -1;
    *pRun = result;
    return 0;
}
