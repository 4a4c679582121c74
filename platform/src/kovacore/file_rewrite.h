/** @file Replaces the text of a file as a whole: whoever reads it, and whatever ends the writer, sees old or new. */
#ifndef KOVA_PLATFORM_FILE_REWRITE_H
#define KOVA_PLATFORM_FILE_REWRITE_H

#include <climits>
#include <string_view>
#include <sys/stat.h>

#include "common/guard.h"
#include "kovacore/file_lock.h"

namespace kova {

/** A text in memory that grows. Running out of memory is remembered and asked for once, at the end. */
class text_buffer {
public:
    void add(std::string_view text);
    void add_line(std::string_view line);
    bool read_all(int fd, size_t size_hint);

    [[nodiscard]] std::string_view view() const { return {data_.get(), size_}; }
    [[nodiscard]] bool out_of_memory() const { return out_of_memory_; }

private:
    bool reserve(size_t size);

    heap_ptr<char> data_;
    size_t size_ = 0;
    size_t capacity_ = 0;
    bool out_of_memory_ = false;
};

/**
 * One rewrite: open, add() the new text, commit() or create(). Other writers of the file wait from open() to the end of
 * the object. Failures go to the error register.
 */
class file_rewrite {
public:
    /** Files above this size are refused. */
    static constexpr size_t kSizeMax = size_t{64} * 1024 * 1024;

    /** Locks and reads the file. @return 0, also when the file is missing; -1 */
    int open(const char *path);

    [[nodiscard]] bool existed() const { return existed_; }
    [[nodiscard]] std::string_view old_text() const { return old_.view(); }
    text_buffer &fresh() { return fresh_; }

    /** Puts the new text in place; nothing is written when it is the old one. @return 0 or -1 */
    int commit();
    /** Makes a missing file of the new text, also an empty one; a file that somebody has made stays. @return 0 or -1 */
    int create(mode_t mode);

private:
    int read_old();
    int fill_temporary(int fd, mode_t mode_of_new);
    int put_in_place(mode_t mode_of_new, unsigned rename_flags);

    char path_[PATH_MAX];
    scoped_lock lock_;
    bool existed_ = false;
    struct stat status_ = {};
    text_buffer old_;
    text_buffer fresh_;
};

} // namespace kova

#endif
