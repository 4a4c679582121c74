#include "kova/service.h"

#include <algorithm>
#include <climits>
#include <cstdio>
#include <cstring>
#include <sys/stat.h>

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

constexpr const char *kRunKeyDirectory = "/etc/kova/service";
constexpr const char *kRunKey = "run";

using run_key_path = char[PATH_MAX];

/** @return false for a name that is none */
bool make_run_key_path(const char *service, run_key_path &path) {
    if (is_bad_name(service))
        return false;
    snprintf(path, sizeof path, "%s/%s.conf", kRunKeyDirectory, service);
    return true;
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
    run_key_path path;
    if (!make_run_key_path(szService, path) || pRun == nullptr)
        return fail(HERE, kErrArgument);
    const int result = KLIBCFileCheckKeyValue(path, kRunKey, "yes", 0);
    if (result < 0)
        return -1;
    *pRun = result == 1 ? KLIB_SERVICE_RUN : KLIB_SERVICE_DO_NOT_RUN;
    return 0;
}

int KLIBServicecfgRunKeySet(const char *szService, int nRun) {
    run_key_path path;
    if (!make_run_key_path(szService, path) || (nRun != KLIB_SERVICE_RUN && nRun != KLIB_SERVICE_DO_NOT_RUN))
        return fail(HERE, kErrArgument);
    mkdir(kRunKeyDirectory, 0755);
    return KLIBCFileSetKeyValue(path, kRunKey, nRun == KLIB_SERVICE_RUN ? "yes" : "no", "%s=%s\n");
}
