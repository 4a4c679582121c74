#include "core/replacement_file.h"

#include "core/text.h"

#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>

namespace kova {

void sync_directory_of(const char *path) {
    const path_text name{"%.*s", static_cast<int>(strrchr(path, '/') + 1 - path), path};
    const descriptor directory{open(name.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)};
    if (directory.is_held()) {
        fsync(directory.get());
    }
}

replacement_file::replacement_file(const char *target) : target_(target) {
    const int length = snprintf(path_, sizeof path_, "%s.XXXXXX", target);
    if (length < static_cast<int>(sizeof path_)) {
        *stream_.out() = KLIBCFileTempFileOpen(path_);
    }
    is_temporary_ = stream_.is_held();
}

replacement_file::replacement_file(const char *target, const char *path_template) : target_(target) {
    if (copy_whole(path_, sizeof path_, path_template)) {
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

bool replacement_file::finish(mode_t mode) const {
    const int fd = fileno(stream_.get());
    return ferror(stream_.get()) == 0 && fflush(stream_.get()) == 0 && fchmod(fd, mode) == 0 && fsync(fd) == 0;
}

bool replacement_file::replace() {
    is_temporary_ = rename(path_, target_) != 0;
    if (is_temporary_) {
        return false;
    }
    sync_directory_of(target_);
    return true;
}

} // namespace kova
