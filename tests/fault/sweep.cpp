#include "fault/sweep.h"

#include "support/reports.h"

#include <array>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <sstream>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace fault {

namespace fs = std::filesystem;
using kova_test::fault_plan;
using kova_test::fault_points;
using kova_test::operation_of;
using kova_test::read_texts;
using kova_test::receive;
using kova_test::rig_at_work;
using kova_test::send;
using kova_test::write_texts;

namespace {

// ---- files

/** Where functions write: whole trees, and files directly in a directory. */
constexpr const char *kTrees[] = {"/etc/sysconfig", "/etc.defaults",  "/etc/kova",     "/etc/dhclient",
                                  "/etc/ppp",       "/etc/dhcpd",     "/etc/iproute2", "/etc/gogoc",
                                  "/run/ddns",      "/run/lock/kova", "/usr/kova"};
constexpr const char *kDirectories[] = {"/etc", "/tmp"};

/** What changes when a file is touched, without reading it. */
using signature = std::array<int64_t, 4>;

signature signature_of(const std::string &path) {
    struct stat status = {};
    if (lstat(path.c_str(), &status) != 0) {
        return {};
    }
    return {static_cast<int64_t>(status.st_ino), status.st_size, status.st_ctim.tv_sec, status.st_ctim.tv_nsec};
}

/** Owner, mode and content; what has not been touched since the first run is not read again. */
std::string describe(const std::string &path) {
    static std::map<std::string, std::pair<signature, std::string>> known;
    const signature touched = signature_of(path);
    const auto found = known.find(path);
    if (found != known.end() && found->second.first == touched) {
        return found->second.second;
    }
    struct stat status = {};
    lstat(path.c_str(), &status);
    std::ostringstream text;
    text << status.st_uid << ":" << status.st_gid << " " << std::oct << status.st_mode << "\n";
    text << (S_ISLNK(status.st_mode) ? fs::read_symlink(path).string() : kova_test::read_file(path));
    known[path] = {touched, text.str()};
    return text.str();
}

std::map<std::string, std::string> watched_files() {
    std::map<std::string, std::string> files;
    const auto add = [&](const fs::directory_entry &entry) {
        if (!entry.is_directory()) {
            files[entry.path()] = describe(entry.path());
        }
    };
    for (const char *directory : kDirectories) {
        for (const auto &entry : fs::directory_iterator(directory)) {
            add(entry);
        }
    }
    for (const char *root : kTrees) {
        std::error_code absent;
        for (const auto &entry : fs::recursive_directory_iterator(root, absent)) {
            add(entry);
        }
    }
    return files;
}

struct kept_file {
    signature touched;
    std::string content;
    fs::perms mode;
};

/** Brings the files directly in the watched directories to what they were before the first run. */
void restore_directories() {
    static std::map<std::string, kept_file> pristine;
    static bool is_read = false;
    for (const char *directory : kDirectories) {
        for (const auto &entry : fs::directory_iterator(directory)) {
            if (!is_read && entry.is_regular_file()) {
                pristine[entry.path()] = {signature_of(entry.path()), kova_test::read_file(entry.path()),
                                          entry.status().permissions()};
            } else if (is_read && entry.is_regular_file() && pristine.count(entry.path()) == 0) {
                fs::remove(entry.path());
            }
        }
    }
    is_read = true;
    for (auto &[path, file] : pristine) {
        if (signature_of(path) != file.touched) {
            kova_test::write_file(path, file.content);
            fs::permissions(path, file.mode);
            file.touched = signature_of(path);
        }
    }
}

/** Files that are not as they were, by path; "gone" for one that is no more. */
std::map<std::string, std::string> changes(const std::map<std::string, std::string> &before) {
    std::map<std::string, std::string> changed;
    std::map<std::string, std::string> now = watched_files();
    for (const auto &[path, content] : before) {
        now.try_emplace(path, "gone");
    }
    for (const auto &[path, content] : now) {
        const auto was = before.find(path);
        const bool is_lock = path.rfind("/run/lock/kova/", 0) == 0; // they stay, and are empty
        if (!is_lock && (was == before.end() ? content != "gone" : was->second != content)) {
            changed[path] = (was == before.end() ? "new " : "") + content;
        }
    }
    return changed;
}

// ---- one run

void write_files(std::ostream &out, const std::map<std::string, std::string> &files) {
    texts lines;
    for (const auto &[path, content] : files) {
        lines.push_back(path);
        lines.push_back(content);
    }
    write_texts(out, lines);
}

std::map<std::string, std::string> read_files(std::istream &in) {
    const texts lines = read_texts(in);
    std::map<std::string, std::string> files;
    for (size_t i = 0; i + 1 < lines.size(); i += 2) {
        files[lines[i]] = lines[i + 1];
    }
    return files;
}

/** What a call left open, or took away too often. */
texts leaks(const kova_test::test_rig &rig, const fault_points &points, const texts &descriptors) {
    texts wrong;
    for (const auto &[kind, count] : rig.held) {
        if (count != 0) {
            wrong.push_back(kind + (count > 0 ? " left open: " : " closed too often: ") +
                            std::to_string(std::abs(count)));
        }
    }
    texts now = kova_test::open_descriptors();
    texts more;
    texts less;
    std::set_difference(now.begin(), now.end(), descriptors.begin(), descriptors.end(), std::back_inserter(more));
    std::set_difference(descriptors.begin(), descriptors.end(), now.begin(), now.end(), std::back_inserter(less));
    for (const std::string &target : more) {
        wrong.push_back("descriptor left open: " + target);
    }
    for (const std::string &target : less) {
        wrong.push_back("descriptor closed that was not the call's: " + target);
    }
    size_t lost = 0;
    for (const void *block : points.blocks) {
        lost += kova_test::is_kept_by_variable(block) ? 0 : 1;
    }
    if (lost != 0) {
        wrong.push_back("blocks of memory lost: " + std::to_string(lost));
    }
    if (waitpid(-1, nullptr, WNOHANG) != -1) {
        wrong.emplace_back("a child was not waited for");
    }
    return wrong;
}

std::string run_here(const scenario &one, const fault_plan &plan) {
    std::ostringstream out;
    world here;
    kova_test::current_rig = &here.rig;
    one.lay_out(here);
    fault_points points{plan};
    const auto before = watched_files();
    const texts descriptors = kova_test::open_descriptors();

    kova_test::current_points = &points;
    kova_test::outcome got = here.rig.observe([&] { return one.call(here); });
    {
        const rig_at_work guard;
        here.release();
    }
    kova_test::current_points = nullptr;

    texts wrong = leaks(here.rig, points, descriptors);
    if (::testing::Test::HasFailure()) {
        wrong.emplace_back("an expectation of the rig does not hold, see above");
    }
    out << got.result << "\n";
    write_texts(out, points.met);
    write_texts(out, points.failed);
    write_texts(out, wrong);
    std::map<std::string, std::string> changed;
    for (const auto &[path, content] : changes(before)) {
        changed[here.rig.asked_for(path)] = content;
    }
    write_files(out, changed);
    return out.str();
}

std::string end_of(pid_t child) {
    int status = 0;
    waitpid(child, &status, 0);
    if (WIFSIGNALED(status)) {
        return std::string(WTERMSIG(status) == SIGALRM ? "hangs: " : "crashes: ") + strsignal(WTERMSIG(status));
    }
    return WEXITSTATUS(status) != 0 ? "exits with " + std::to_string(WEXITSTATUS(status)) : "";
}

// ---- what a run with a failure has to be like

bool says_failure(failure how, long result) {
    switch (how) {
    case failure::below_zero:
        return result < 0;
    case failure::zero:
    case failure::like_zero:
        return result == 0;
    case failure::below_one:
        return result < 1;
    case failure::not_zero:
        return result != 0;
    }
    return false;
}

bool is_about(const tolerance &entry, const std::string &point) {
    return (" > " + point + " ").find(" > " + entry.at) != std::string::npos;
}

const tolerance *tolerance_of(const scenario &one, const std::string &point) {
    for (const tolerances *entries : {&tolerated_everywhere(), &one.tolerated}) {
        for (const tolerance &entry : *entries) {
            if (is_about(entry, point)) {
                return &entry;
            }
        }
    }
    return nullptr;
}

/** The failure is in the result, or every failed point is tolerated and the result is the one named for it. */
void check_result(const scenario &one, const report &clean, const report &got, texts &wrong) {
    for (const std::string &point : got.failed) {
        const tolerance *const entry = tolerance_of(one, point);
        if (entry == nullptr) {
            if (!says_failure(one.fails_with, got.result)) {
                wrong.push_back("the result " + std::to_string(got.result) + " hides the failure");
                return;
            }
            continue;
        }
        const long expected = entry->result.value_or(clean.result);
        if (expected != kAnyResult && got.result != expected && !says_failure(one.fails_with, got.result)) {
            wrong.push_back("the result is " + std::to_string(got.result) + ", but " + std::to_string(expected) +
                            " is named for it: " + entry->reason);
            return;
        }
    }
}

/** Whether a file may be in between after such failures; where a result is named with it, that has to be told, too. */
bool may_be_in_between(const scenario &one, const report &got, const std::string &path, const std::string &content) {
    return std::any_of(one.tolerated.begin(), one.tolerated.end(), [&](const tolerance &entry) {
        const bool is_met = std::any_of(got.failed.begin(), got.failed.end(),
                                        [&](const std::string &point) { return is_about(entry, point); });
        const bool is_told = entry.result.value_or(kAnyResult) == kAnyResult || *entry.result == got.result;
        return is_met && is_told && !entry.file.empty() && path.find(entry.file) != std::string::npos &&
               content.find(entry.holds) != std::string::npos;
    });
}

/** Every file is as it was, as a clean run leaves it, or as the scenario says. */
void check_files(const scenario &one, const report &clean, const report &got, texts &wrong) {
    for (const auto &[path, content] : got.changed) {
        const auto meant = clean.changed.find(path);
        const bool is_meant = meant != clean.changed.end() && meant->second == content;
        if (!is_meant && !may_be_in_between(one, got, path, content)) {
            wrong.push_back(path + " is neither as before nor as meant: " + content);
        }
    }
}

std::string way_text(const fault_plan &plan) {
    switch (plan.how) {
    case fault_plan::way::onwards:
        return " fails, and every one behind it";
    case fault_plan::way::otherwise:
        return " exits with 1";
    default:
        return " fails";
    }
}

void judge(const scenario &one, const report &clean, const fault_plan &plan, texts &all) {
    const report got = run(one, plan);
    texts wrong = got.wrong;
    if (!got.crash.empty()) {
        wrong.push_back(got.crash);
    } else if (got.failed.empty() || got.failed[0] != clean.met[plan.chosen]) {
        wrong.emplace_back("the point is not met again: the call is not the same twice");
    } else {
        check_result(one, clean, got, wrong);
        check_files(one, clean, got, wrong);
    }
    for (const std::string &line : wrong) {
        all.push_back(one.name + ", point " + std::to_string(plan.chosen + 1) + " of " +
                      std::to_string(clean.met.size()) + " [" + clean.met[plan.chosen] + "]" + way_text(plan) + ": " +
                      line);
    }
}

} // namespace

report run(const scenario &one, const fault_plan &plan) {
    int ends[2];
    if (pipe(ends) != 0) {
        return {.crash = "there is no pipe"};
    }
    kova_test::lay_out_clean_appliance();
    restore_directories();
    static const auto known = watched_files(); // the processes of the runs need not read them all
    fflush(nullptr);
    const pid_t child = fork();
    if (child == 0) {
        constexpr unsigned kLimitSeconds = 300; // of a call that takes less than one
        close(ends[0]);
        alarm(kLimitSeconds);
        const std::string text = run_here(one, plan);
        fflush(nullptr);
        send(ends[1], text);
        _exit(0);
    }
    close(ends[1]);
    std::istringstream in{receive(ends[0])};
    close(ends[0]);
    report got{.crash = end_of(child)};
    in >> got.result;
    got.met = read_texts(in);
    got.failed = read_texts(in);
    got.wrong = read_texts(in);
    got.changed = read_files(in);
    return got;
}

texts sweep(const scenario &one, const report &clean) {
    texts wrong;
    if (one.fails_with != failure::like_zero && says_failure(one.fails_with, clean.result)) {
        wrong.push_back(one.name + " answers " + std::to_string(clean.result) + " although nothing fails");
    }
    std::set<std::string> begun; // operations, each within its outermost call
    for (size_t number = 0; number < clean.met.size(); ++number) {
        const std::string &point = clean.met[number];
        judge(one, clean, {fault_plan::way::once, number}, wrong);
        if (begun.insert(point.substr(0, point.find(" > ")) + " > " + operation_of(point)).second) {
            judge(one, clean, {fault_plan::way::onwards, number}, wrong);
        }
        if (point.rfind("KLIBCExec", 0) == 0) {
            judge(one, clean, {fault_plan::way::otherwise, number}, wrong);
        }
    }
    return wrong;
}

} // namespace fault
