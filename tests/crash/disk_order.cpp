#include "disk_order.h"

#include <fcntl.h>
#include <filesystem>
#include <sys/stat.h>
#include <sys/syscall.h>

namespace kova_test {

namespace fs = std::filesystem;

namespace {

bool makes_or_empties(uint64_t flags) {
    return (flags & O_CREAT) != 0 || (flags & O_TRUNC) != 0;
}

} // namespace

/** The name of a file of the directory, empty for any other. */
std::string disk_order::name_of(const std::string &path) const {
    const fs::path real = fs::weakly_canonical(fs::path{path}.parent_path()) / fs::path{path}.filename();
    return real.parent_path() == directory_ ? real.filename().string() : "";
}

void disk_order::note_change(const std::string &path) {
    const std::string name = name_of(path);
    if (name.empty()) {
        return;
    }
    if (name == target_) {
        dangers_.push_back(name + " is changed in place");
    }
    steps_.push_back("write " + name);
    changed_.insert(name);
    synced_.erase(name);
}

/** A mode that the file had already is no change. */
void disk_order::note_mode(const system_call &call, const std::string &path, uint64_t mode) {
    if (!call.has_returned) {
        struct stat status = {};
        is_mode_there_ = stat(path.c_str(), &status) == 0 && (status.st_mode & 07777) == mode;
    } else if (call.result >= 0 && !is_mode_there_) {
        note_change(path);
    }
}

void disk_order::note_sync(const std::string &path) {
    if (path == directory_) {
        steps_.emplace_back("sync directory");
        has_new_names_ = false;
        return;
    }
    const std::string name = name_of(path);
    if (!name.empty()) {
        steps_.push_back("sync " + name);
        synced_.insert(name);
        changed_.erase(name);
    }
}

void disk_order::note_name(const std::string &from, const std::string &to) {
    const std::string old_name = name_of(from);
    const std::string new_name = name_of(to);
    if (old_name.empty() && new_name.empty()) {
        return;
    }
    steps_.push_back("name " + old_name + " " + new_name);
    has_new_names_ = true;
    if (synced_.erase(old_name) == 0) {
        dangers_.push_back(new_name + " gets its name before its content is on the disk");
    }
    changed_.erase(old_name);
    changed_.erase(new_name);
    synced_.insert(new_name);
}

void disk_order::note_removal(const std::string &path) {
    changed_.erase(name_of(path));
    synced_.erase(name_of(path));
}

void disk_order::note(const system_call &call) {
#ifdef SYS_chmod
    if (call.number == SYS_chmod) {
        return note_mode(call, call.text(0), call.arguments[1]);
    }
#endif
    if (call.number == SYS_fchmodat) {
        return note_mode(call, call.text(1), call.arguments[2]);
    }
    if (!call.has_returned || call.result < 0) {
        return;
    }
    switch (call.number) {
#ifdef SYS_open // machines that came later have only the calls that end in "at"
    case SYS_open:
        return makes_or_empties(call.arguments[1]) ? note_change(call.text(0)) : void();
    case SYS_creat:
    case SYS_chown:
        return note_change(call.text(0));
    case SYS_rename:
    case SYS_link:
        return note_name(call.text(0), call.text(1));
    case SYS_unlink:
        return note_removal(call.text(0));
#endif
    case SYS_openat:
        return makes_or_empties(call.arguments[2]) ? note_change(call.text(1)) : void();
    case SYS_fchownat:
        return note_change(call.text(1));
    case SYS_truncate:
        return note_change(call.text(0));
    case SYS_write:
    case SYS_writev:
    case SYS_pwrite64:
    case SYS_pwritev:
    case SYS_ftruncate:
    case SYS_fchmod:
    case SYS_fchown:
        return note_change(call.file(0));
    case SYS_fsync:
    case SYS_fdatasync:
        return note_sync(call.file(0));
#ifdef SYS_renameat
    case SYS_renameat:
#endif
    case SYS_renameat2:
    case SYS_linkat:
        return note_name(call.text(1), call.text(3));
    case SYS_unlinkat:
        return note_removal(call.text(1));
    default:
        return;
    }
}

std::vector<std::string> disk_order::dangers() const {
    std::vector<std::string> all = dangers_;
    if (has_new_names_) {
        all.emplace_back("the directory is not on the disk at the end");
    }
    for (const std::string &name : changed_) {
        all.push_back(name + " is not on the disk at the end");
    }
    return all;
}

} // namespace kova_test
