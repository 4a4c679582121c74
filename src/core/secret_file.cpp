#include "core/secret_file.h"

#include <fcntl.h>

namespace kova {

stream create_secret_file(const char *path) {
    unlink(path);
    constexpr mode_t kOwnerOnly = 0600;
    descriptor fd{open(path, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kOwnerOnly)};
    stream file{fd.is_held() ? fdopen(fd.get(), "w") : nullptr};
    if (file.is_held()) {
        (void)fd.give_up();
    }
    return file;
}

} // namespace kova
