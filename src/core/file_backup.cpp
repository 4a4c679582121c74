#include "core/file_backup.h"

#include "core/guards.h"

#include <cstring>
#include <ctime>
#include <sys/stat.h>

namespace kova {

namespace {

/** The tool makes its copy as its caller's and under the caller's umask. */
void give_owner_and_mode(const char *from, const char *to) {
    struct stat status;
    if (stat(from, &status) == 0 && chown(to, status.st_uid, status.st_gid) == 0) {
        chmod(to, status.st_mode & 07777);
    }
}

} // namespace

file_backup::file_backup(const place &at, const path_text &file)
    : at_(at), file_(file), copy_("%s.tmp%ld", file.c_str(), static_cast<long>(time(nullptr))) {
    const int status = KLIBCExec("/bin/cp", "-f", file_.c_str(), copy_.c_str(), nullptr);
    is_made_ = status == 0;
    if (is_made_) {
        give_owner_and_mode(file_.c_str(), copy_.c_str());
    } else {
        at_.begin = lead::unit;
        // a tool that ran and failed leaves no errno
        log_info(at_, "copy (%s, %s) failed.(strerror=%s)", file_.c_str(), copy_.c_str(),
                 strerror(status < 0 ? errno : 0));
    }
    at_.begin = lead::function_colon;
}

file_backup::~file_backup() {
    const errno_keeper keep;
    if (is_made_ && rename(copy_.c_str(), file_.c_str()) != 0) {
        log_err(at_, "rename fail.");
    }
}

void file_backup::keep_new() {
    if (is_made_ && unlink(copy_.c_str()) != 0) {
        log_info(at_, "unlink fail.");
    }
    is_made_ = false;
}

} // namespace kova
