/**
 * @file
 * A file that takes the place of another one whole: a reader finds the old one or the new one.
 */
#pragma once

#include "core/guards.h"

#include <climits>
#include <sys/types.h>

namespace kova {

/** Written beside its target, then renamed over it; deleted when that does not come about. errno tells why. */
class replacement_file {
public:
    explicit replacement_file(const char *target);
    /** Written under a name of its own in the target's directory, made from a template that ends in "XXXXXX". */
    replacement_file(const char *target, const char *path_template);
    replacement_file(const replacement_file &) = delete;
    replacement_file &operator=(const replacement_file &) = delete;
    ~replacement_file();

    [[nodiscard]] bool is_open() const { return stream_.is_held(); }
    [[nodiscard]] FILE *get() const { return stream_.get(); }
    /** Everything is written: gives the file its mode, readable by all, and brings it to the disk. */
    [[nodiscard]] bool finish(mode_t mode = 0644) const;
    /** Renames the finished file over its target. Where the directory cannot be synced, it is in place all the same. */
    [[nodiscard]] bool replace();

private:
    const char *target_;
    char path_[PATH_MAX];
    stream stream_;
    bool is_temporary_ = false;
};

/**
 * Brings what was renamed to a path to the disk, as far as the file system of its directory can. The file is in its
 * place whatever comes of it.
 */
void sync_directory_of(const char *path);

} // namespace kova
