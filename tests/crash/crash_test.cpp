/**
 * @file
 * Every operation that writes a file is killed at each of its system calls in turn, and the order in which it puts
 * things on the disk is looked at. Whenever it ends, the file is the old one or the new one, whole, with the right mode
 * and owner; no lock stays held; what is left over is one hidden file that the next run removes.
 */
#include "disk_order.h"
#include "operations.h"
#include "platform_test.h"
#include "tracer.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <gtest/gtest.h>
#include <map>
#include <optional>
#include <sys/stat.h>
#include <unistd.h>

namespace kova_test {

namespace {

namespace fs = std::filesystem;

constexpr unsigned kOldMode = 0640;
constexpr uid_t kOldOwner = 1234;
constexpr gid_t kOldGroup = 5678;
constexpr char kLocks[] = "/run/lock/kova";

/** What an operation finds. */
struct surroundings {
    const char *name;
    bool has_file = true;
    bool is_open_ended = false; ///< the last line has no newline
    bool is_big = false;
    bool is_link = false; ///< the path is a symbolic link to the file
    bool has_locks = true;
};
constexpr surroundings kSurroundings[] = {
    {.name = "present"},
    {.name = "missing", .has_file = false},
    {.name = "openEnded", .is_open_ended = true},
    {.name = "big", .is_big = true},
    {.name = "link", .is_link = true},
    {.name = "linkToNothing", .has_file = false, .is_link = true},
    {.name = "firstLock", .has_locks = false},
    {.name = "firstLockAndFile", .has_file = false, .has_locks = false},
};

struct crash_case {
    const operation *what;
    const surroundings *where;
};

bool is_sensible(const operation &what, const surroundings &where) {
    const bool takes_file = what.files != works_on::kMissingFile;
    const bool takes_none = what.files == works_on::kAnyFile || what.files == works_on::kMissingFile;
    const bool is_plain = !where.is_big && !where.is_open_ended && !where.is_link && where.has_locks;
    return (where.has_file ? takes_file : takes_none) && (is_plain || !what.is_built_of_others);
}

std::vector<crash_case> all_cases() {
    std::vector<crash_case> cases;
    for (const operation &what : operations()) {
        for (const surroundings &where : kSurroundings) {
            if (is_sensible(what, where)) {
                cases.push_back({&what, &where});
            }
        }
    }
    return cases;
}

/** Kill points by operation, for the table at the end. */
std::map<std::string, std::string> kill_points;

struct summary : testing::Environment {
    void TearDown() override {
        for (const auto &[name, points] : kill_points) {
            printf("kill points of %s:%s\n", name.c_str(), points.c_str());
        }
    }
};

/** Content of a file; nothing when there is none. */
using content = std::optional<std::string>;

content content_of(const std::string &path) {
    return access(path.c_str(), F_OK) == 0 ? content{read_file(path)} : std::nullopt;
}

/** Whether everybody could take every lock now: the next operation does not wait. */
bool are_locks_free() {
    bool free = true;
    for (const std::string &name : fs::exists(kLocks) ? names_in(kLocks) : std::vector<std::string>{}) {
        const int fd = open((std::string{kLocks} + "/" + name).c_str(), O_RDWR | O_CLOEXEC);
        struct flock lock = {};
        lock.l_type = F_WRLCK;
        lock.l_whence = SEEK_SET;
        free = free && fd >= 0 && fcntl(fd, F_OFD_SETLK, &lock) == 0;
        close(fd);
    }
    return free;
}

unsigned mode_of(const std::string &path) {
    struct stat status = {};
    return stat(path.c_str(), &status) == 0 ? status.st_mode & 07777 : 0;
}

/** Tools that the library starts: here they succeed at once. */
void replace_tools() {
    for (const char *tool :
         {"/etc/rc.network", "/sbin/ip", "/sbin/ifconfig", "/sbin/start", "/sbin/stop", "/usr/kova/bin/kovafirewall",
          "/usr/kova/bin/tctool", "/usr/kova/service/ddns", "/usr/kova/sbin/kovanetdtool"}) {
        fs::create_directories(fs::path{tool}.parent_path());
        fs::remove(tool);
        fs::create_symlink("/bin/true", tool);
    }
}

class crash : public testing::TestWithParam<crash_case> {
protected:
    static void SetUpTestSuite() { replace_tools(); }

    crash()
        : what_(*GetParam().what), where_(*GetParam().where),
          path_(what_.path.empty() ? "/tmp/crash/file" : what_.path),
          file_(where_.is_link ? fs::path{path_}.parent_path() / "linked" / fs::path{path_}.filename()
                               : fs::path{path_}) {
        fs::create_directories(fs::path{path_}.parent_path());
        write_file("/etc/kovainfo.conf", "", 0644); // every appliance has one
        fs::remove(path_);
        strangers_ = names_in(fs::path{path_}.parent_path());
        before_ = where_.has_file ? content{first_text()} : std::nullopt;
    }
    ~crash() override { clear(); }

    [[nodiscard]] std::string directory() const { return fs::path{file_}.parent_path(); }

    /** Everything as before the operation, with this in the file. */
    void lay_out(const content &text) {
        clear();
        if (where_.is_link) {
            fs::create_directory(directory());
            fs::create_symlink(fs::path{"linked"} / fs::path{file_}.filename(), path_);
        }
        if (text) {
            write_file(file_, *text, kOldMode);
            ASSERT_EQ(0, chown(file_.c_str(), kOldOwner, kOldGroup));
        }
        if (!where_.has_locks) {
            fs::remove_all(kLocks);
        }
    }

    [[nodiscard]] bool call() const {
        umask(077); // the modes of what is made do not depend on it
        return what_.call(path_.c_str());
    }

    /** What the file holds after a whole run that finds this in it. */
    content after(const content &text) {
        lay_out(text);
        EXPECT_EQ(0, in_child([this] { return call() ? 0 : 1; }));
        return shown(content_of(file_));
    }

    /** What the file holds after the first of what the operation does to it in several parts. */
    content after_parts(size_t count) {
        lay_out(before_);
        for (size_t part = 0; part < count; ++part) {
            EXPECT_EQ(0, in_child([this, part] { return what_.parts[part](path_.c_str()) ? 0 : 1; }));
        }
        return shown(content_of(file_));
    }

    /** What may be found at any time. */
    std::vector<content> versions() {
        std::vector<content> all = {before_, after(before_)};
        for (size_t count = 1; count <= what_.parts.size(); ++count) {
            all.push_back(after_parts(count));
        }
        const bool changes = what_.files != works_on::kNoFile && !(what_.puts_back && before_);
        EXPECT_EQ(changes, all[0] != all[1]) << "whether it changes the file";
        return all;
    }

    /** @return whether the operation came as far as its nth stop, and was killed there */
    bool kill_at(int stop) {
        const traced_end end = trace([this] { return call(); }, [&stop](const system_call &) { return --stop > 0; });
        EXPECT_TRUE(end == traced_end::kKilled || end == traced_end::kSucceeded) << "untraceable, or it failed";
        return end == traced_end::kKilled;
    }

    void expect_one_of(const std::vector<content> &versions) {
        const content found = shown(content_of(file_));
        const bool is_known = std::find(versions.begin(), versions.end(), found) != versions.end();
        EXPECT_TRUE(is_known) << "neither old nor new: " << found.value_or("(no file)").substr(0, 1000);
    }

    void expect_mode_and_owner() {
        struct stat status = {};
        if (stat(file_.c_str(), &status) < 0) {
            return;
        }
        const bool is_new = !where_.has_file || (what_.makes_anew && status.st_uid == geteuid());
        EXPECT_EQ(is_new ? what_.mode : kOldMode, status.st_mode & 07777);
        EXPECT_EQ(is_new ? geteuid() : kOldOwner, status.st_uid);
        EXPECT_EQ(is_new ? getegid() : kOldGroup, status.st_gid);
        EXPECT_EQ(1U, status.st_nlink);
        EXPECT_EQ(where_.is_link, fs::is_symlink(path_));
    }

    /** Whether a name is that of a temporary that nobody else takes away. */
    [[nodiscard]] bool is_unique_temporary(const std::string &name) const {
        return std::any_of(what_.temporaries.begin(), what_.temporaries.end(), [&name](const std::string &beginning) {
            return name.starts_with(beginning) && name.size() == beginning.size() + strlen("XXXXXX");
        });
    }

    [[nodiscard]] std::vector<std::string> unique_temporaries() const {
        std::vector<std::string> found = names_in(directory());
        std::erase_if(found, [this](const std::string &name) { return !is_unique_temporary(name); });
        return found;
    }

    /** Names beside the file that were not there before: of its backups, and of everything else. */
    [[nodiscard]] std::vector<std::string> leftovers(bool of_backups) const {
        const std::string backup = fs::path{file_}.filename().string() + ".tmp";
        std::vector<std::string> found;
        for (const std::string &name : names_in(directory())) {
            if (is_unique_temporary(name)) {
                continue;
            }
            const bool is_other = std::find(what_.others.begin(), what_.others.end(), name) != what_.others.end();
            const bool is_known = is_other || file_ == directory() + "/" + name ||
                                  (!where_.is_link && std::binary_search(strangers_.begin(), strangers_.end(), name));
            if (!is_known && name.starts_with(backup) == of_backups) {
                found.push_back(name);
            }
        }
        return found;
    }

    /** At most one hidden file, a backup where one is made, and a temporary of each kind, open to no more than the
     * file. */
    void expect_few_leftovers() {
        const std::vector<std::string> temporaries = unique_temporaries();
        EXPECT_LE(temporaries.size(), what_.temporaries.size()) << testing::PrintToString(temporaries);
        for (const std::string &name : temporaries) {
            EXPECT_EQ(0U, mode_of(directory() + "/" + name) & ~what_.mode) << name;
        }
        const std::vector<std::string> hidden = leftovers(false);
        EXPECT_LE(hidden.size(), 1U) << testing::PrintToString(hidden);
        for (const std::string &name : hidden) {
            EXPECT_EQ('.', name.front()) << name << " could be taken for a file of its own";
        }
        if (!what_.keeps_backup) {
            EXPECT_EQ(std::vector<std::string>{}, leftovers(true));
        }
    }

    void expect_open_to_readers() {
        if (!fs::exists(kLocks)) {
            return; // nothing took a lock yet
        }
        EXPECT_EQ(0755U, mode_of(kLocks));
        for (const std::string &name : names_in(kLocks)) {
            EXPECT_EQ(0644U, mode_of(std::string{kLocks} + "/" + name)) << name;
        }
    }

    /** The next run is as good as one on a clean machine, and takes the leftovers away. */
    void expect_next_run_undisturbed() {
        const content found = content_of(file_);
        EXPECT_EQ(0, in_child([this] { return call() ? 0 : 1; })) << "the next run failed";
        const content then = shown(content_of(file_));
        expect_mode_and_owner();
        expect_open_to_readers();
        if (then != shown(found)) {
            EXPECT_EQ(std::vector<std::string>{}, leftovers(false)) << "a run that wrote left it where it was";
        }
        if (!next_.contains(found)) {
            next_[found] = after(found);
        }
        EXPECT_EQ(next_[found], then);
    }

    const operation &what_;
    const surroundings &where_;
    std::string path_; ///< given to the operation
    std::string file_; ///< where the content really is
    content before_;

private:
    [[nodiscard]] std::string first_text() const {
        std::string text = what_.text;
        if (where_.is_big) {
            for (int line = 0; line < 2500; ++line) {
                text += "FILLER" + std::to_string(line) + "=value of this line\n";
            }
        }
        if (where_.is_open_ended) {
            text.pop_back();
        }
        return text;
    }

    [[nodiscard]] content shown(const content &text) const {
        return what_.is_random && text ? content{std::to_string(text->size()) + " bytes"} : text;
    }

    void clear() {
        for (const std::string &name : names_in(fs::path{path_}.parent_path())) {
            if (!std::binary_search(strangers_.begin(), strangers_.end(), name)) {
                fs::remove_all(fs::path{path_}.parent_path() / name);
            }
        }
    }

    std::vector<std::string> strangers_;
    std::map<content, content> next_;
};

std::string name_of(const crash_case &tried) {
    return tried.what->name + "_" + tried.where->name;
}

void PrintTo(const crash_case &tried, std::ostream *out) {
    *out << name_of(tried);
}

} // namespace

TEST_P(crash, processKilled_leavesOldOrNew) {
    const std::vector<content> all = versions();
    int points = 0;
    lay_out(before_);
    while (!HasFailure() && kill_at(points + 1)) {
        ++points;
        SCOPED_TRACE("killed at stop " + std::to_string(points));
        expect_one_of(all);
        expect_mode_and_owner();
        expect_few_leftovers();
        EXPECT_TRUE(are_locks_free());

        if (!what_.is_built_of_others) {
            kill_at(points); // once more, over what lies there now: it does not pile up
            expect_few_leftovers();
        }
        expect_next_run_undisturbed();
        lay_out(before_);
    }
    EXPECT_GE(points, what_.floor) << "killed less often than it was written for";
    RecordProperty("kill_points", points);
    kill_points[what_.name] += " " + std::string{where_.name} + " " + std::to_string(points);
}

TEST_P(crash, powerLost_nameComesAfterContent) {
    lay_out(before_);
    disk_order order{directory(), fs::path{file_}.filename()};
    const auto note = [&order](const system_call &made) {
        order.note(made);
        return true;
    };
    ASSERT_EQ(traced_end::kSucceeded, trace([this] { return call(); }, note));
    EXPECT_EQ(std::vector<std::string>{}, order.dangers()) << testing::PrintToString(order.steps());
    const auto names_it = [this](const std::string &step) {
        return step.ends_with(" " + fs::path{file_}.filename().string());
    };
    EXPECT_EQ(what_.files != works_on::kNoFile, std::any_of(order.steps().begin(), order.steps().end(), names_it))
        << "nothing was seen: " << testing::PrintToString(order.steps());
}

INSTANTIATE_TEST_SUITE_P(writers, crash, testing::ValuesIn(all_cases()),
                         [](const auto &tried) { return name_of(tried.param); });

static const auto *const kSummary = testing::AddGlobalTestEnvironment(new summary);

} // namespace kova_test
