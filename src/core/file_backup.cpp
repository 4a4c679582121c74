#include "core/file_backup.h"

#include "core/guards.h"
#include "core/replacement_file.h"

#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <sys/stat.h>

namespace kova {

namespace {

/** The tool makes its copy as its caller's, under the caller's umask, and does not wait until it is on the disk. */
void complete_copy(const char *from, const char *to) {
    const descriptor copy{open(to, O_RDONLY | O_CLOEXEC)};
    struct stat status;
    if (copy.is_held() && stat(from, &status) == 0 && fchown(copy.get(), status.st_uid, status.st_gid) == 0) {
        fchmod(copy.get(), status.st_mode & 07777);
    }
    fsync(copy.get());
}

} // namespace

file_backup::file_backup(const place &at, const path_text &file)
    : at_(at), file_(file), copy_("%s.tmp%ld", file.c_str(), static_cast<long>(time(nullptr))) {
    const int status = KLIBCExec("/bin/cp", "-f", file_.c_str(), copy_.c_str(), nullptr);
    is_made_ = status == 0;
    if (is_made_) {
        complete_copy(file_.c_str(), copy_.c_str());
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
    if (!is_made_) {
        return;
    }
    if (rename(copy_.c_str(), file_.c_str()) != 0) {
        log_err(at_, "rename fail.");
        return;
    }
    sync_directory_of(file_.c_str());
}

void file_backup::keep_new() {
    if (is_made_ && unlink(copy_.c_str()) != 0) {
        log_info(at_, "unlink fail.");
    }
    is_made_ = false;
}

} // namespace kova
