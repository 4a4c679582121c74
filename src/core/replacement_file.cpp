#include "core/replacement_file.h"

#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>

namespace kova {

namespace {

/** A rename is on the disk when its directory is. Cuts the path off behind its last slash. */
void sync_directory_of(char *path) {
    strrchr(path, '/')[1] = '\0';
    const descriptor directory{open(path, O_RDONLY | O_DIRECTORY | O_CLOEXEC)};
    if (directory.is_held()) {
        fsync(directory.get());
    }
}

} // namespace

replacement_file::replacement_file(const char *target) : target_(target) {
    const int length = snprintf(path_, sizeof path_, "%s.XXXXXX", target);
    if (length < static_cast<int>(sizeof path_)) {
        *stream_.out() = KLIBCFileTempFileOpen(path_);
    }
    is_temporary_ = stream_.is_held();
}

replacement_file::~replacement_file() {
    if (is_temporary_) {
        const errno_keeper keep;
        unlink(path_);
    }
}

bool replacement_file::finish() const {
    constexpr mode_t kReadableByAll = 0644;
    const int fd = fileno(stream_.get());
    return ferror(stream_.get()) == 0 && fflush(stream_.get()) == 0 && fchmod(fd, kReadableByAll) == 0 &&
           fsync(fd) == 0;
}

bool replacement_file::replace() {
    is_temporary_ = rename(path_, target_) != 0;
    if (is_temporary_) {
        return false;
    }
    sync_directory_of(path_);
    return true;
}

} // namespace kova
