#include <kovanetsdk/hostname.h>

#include "core/guards.h"
#include "core/replacement_file.h"
#include "core/report.h"
#include "core/text.h"

#include <cstring>
#include <fcntl.h>
#include <kova/dhmx.h>
#include <kovanetsdk/events.h>
#include <sys/stat.h>

using namespace kova;

namespace {

constexpr size_t kHostnameSize = 64; // with the terminator
constexpr char kHostname[] = "/etc/hostname";
constexpr char kHosts[] = "/etc/hosts";

/** Makes a file that all may read and that is on the disk afterwards. @return 0 or the code of the failure */
uint32_t write_file(const char *path, const char *text) {
    stream file{fopen(path, "we")};
    if (!file.is_held()) {
        return NET_ERR_FILE_OPEN;
    }
    const bool is_written = fputs(text, file.get()) >= 0 && fflush(file.get()) == 0 &&
                            fchmod(fileno(file.get()), 0644) == 0 && fsync(fileno(file.get())) == 0;
    const bool is_closed = fclose(file.give_up()) == 0;
    return is_written && is_closed ? 0 : NET_ERR_FILE_WRITE;
}

/** Puts a new file in the place of one in /etc. @return 0 or the code of the failure, with errno */
uint32_t replace_file(const char *path, const char *text) {
    char fresh[1024];
    if (KLIBCFileITmpName(path, fresh, sizeof fresh) < 0) {
        return KLIBCErrGet();
    }
    uint32_t code = write_file(fresh, text);
    if (code == 0 && rename(fresh, path) != 0) {
        code = NET_ERR_RENAME;
    }
    if (code != 0) {
        const errno_keeper keep;
        unlink(fresh);
        return code;
    }
    sync_directory_of(path);
    return 0;
}

/** Whether what is at a path, if anything, is a file that could be opened for writing. */
bool is_writable(const char *path) {
    return descriptor{open(path, O_WRONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC)}.is_held() || errno == ENOENT;
}

int write_hostname(const char *szHostname) {
    const built_text<kHostnameSize + 1> line{"%s\n", szHostname};
    const uint32_t code = is_writable(kHostname) ? replace_file(kHostname, line.c_str()) : NET_ERR_FILE_OPEN;
    if (code == NET_ERR_FILE_OPEN) {
        return fail(HERE, code, -1, "fopen failed: %m");
    }
    return code == 0 ? 0 : fail_quietly(HERE, code, -1);
}

int write_hosts(const char *szHostname) {
    const built_text<512> text{"# Any manual change will be lost if the host name is changed or system upgrades.\n"
                               "127.0.0.1\tlocalhost\n::1\t\tlocalhost\n"
                               "127.0.0.1\t%s\n::1\t\t%s\n",
                               szHostname, szHostname};
    const uint32_t code = replace_file(kHosts, text.c_str());
    return code == 0 ? 0 : fail_quietly(HERE, code, -1);
}

/** So that the log carries the new name. */
int reload_logger() {
    return KLIBCExec("/sbin/initctl", "reload", "syslog-ng", nullptr, nullptr) == 0 ? 0 : -1;
}

} // namespace

extern "C" int KOVALnxSetHostname(const char *szHostname) {
    if (refuses_text(HERE, "szHostname", szHostname)) {
        return -1;
    }
    if (strnlen(szHostname, kHostnameSize) == kHostnameSize) {
        return fail_quietly(HERE, NET_ERR_OUT_OF_RANGE, -1);
    }
    const named_lock lock{kConfigExclusive};
    if (!lock.is_held()) {
        return fail_lock(HERE, lock.result());
    }
    if (KOVAIsDockerHMX() == 1) {
        return 0;
    }
    if (sethostname(szHostname, strlen(szHostname) + 1) != 0) {
        return fail_quietly(HERE, NET_ERR_SYSCALL, -1);
    }
    if (write_hostname(szHostname) < 0 || write_hosts(szHostname) < 0 || reload_logger() < 0) {
        return -1;
    }
    return KOVANetHostnameChangeHook(szHostname) < 0 ? -1 : 0;
}
