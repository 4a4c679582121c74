/**
 * @file
 * What a machine that loses power would find: whether every file is on the disk before it gets its name, and the name
 * before the operation says that it is done.
 */
#pragma once

#include "tracer.h"

#include <set>
#include <string>
#include <vector>

namespace kova_test {

/** Watches the files of one directory through the system calls of an operation. */
class disk_order {
public:
    disk_order(std::string directory, std::string target)
        : directory_(std::move(directory)), target_(std::move(target)) {}

    /** To be called at every stop. */
    void note(const system_call &call);

    /** What was done to the files, in order: "write .file", "sync .file", "name .file file", "sync directory". */
    [[nodiscard]] const std::vector<std::string> &steps() const { return steps_; }
    /** What power loss could break, empty when nothing. To be called when the operation has ended. */
    [[nodiscard]] std::vector<std::string> dangers() const;

private:
    [[nodiscard]] std::string name_of(const std::string &path) const;
    void note_change(const std::string &path);
    void note_mode(const system_call &call, const std::string &path, uint64_t mode);
    void note_sync(const std::string &path);
    void note_name(const std::string &from, const std::string &to);
    void note_removal(const std::string &path);

    std::string directory_;
    std::string target_;
    std::set<std::string> synced_;
    std::set<std::string> changed_;
    bool has_new_names_ = false;
    bool is_mode_there_ = false; ///< the file that gets a mode has it already
    std::vector<std::string> steps_;
    std::vector<std::string> dangers_;
};

} // namespace kova_test
