#include "core/file_backup.h"

#include "core/guards.h"

#include <cstring>
#include <ctime>

namespace kova {

namespace {

/** Runs the copy; a tool that says no leaves no errno of its own, so that none of an earlier call is reported. */
bool copy_file(const char *from, const char *to) {
    errno = 0;
    return KLIBCExec("/bin/cp", "-f", from, to, nullptr) == 0;
}

} // namespace

file_backup::file_backup(const place &at, const path_text &file)
    : at_(at), file_(file), copy_("%s.tmp%ld", file.c_str(), static_cast<long>(time(nullptr))),
      is_made_(copy_file(file_.c_str(), copy_.c_str())) {
    at_.begin = lead::unit;
    if (!is_made_) {
        log_info(at_, "copy (%s, %s) failed.(strerror=%s)", file_.c_str(), copy_.c_str(), strerror(errno));
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
