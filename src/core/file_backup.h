/**
 * @file
 * A file that is put back when a change of several steps fails.
 */
#pragma once

#include "core/report.h"
#include "core/text.h"

namespace kova {

/**
 * Holds a copy of a file, "<file>.tmp<seconds>", and moves it back over the file unless the new one is kept. Reports
 * under its owner's place. A file that could not be copied changes without a backup: nothing is moved or deleted then.
 */
class file_backup {
public:
    file_backup(const place &at, const path_text &file);
    file_backup(const file_backup &) = delete;
    file_backup &operator=(const file_backup &) = delete;
    ~file_backup();

    /** The change succeeded: deletes the copy. */
    void keep_new();

private:
    place at_;
    path_text file_;
    path_text copy_;
    bool is_made_ = false;
};

} // namespace kova
