#include "kova/core.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <climits>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <string_view>

#include "common/report.h"
#include "common/views.h"
#include "kovacore/line_source.h"

using namespace kova;
using std::string_view;

namespace {

constexpr size_t kCommandLineMax = 16384;

string_view base_name(string_view path) {
    const size_t slash = path.rfind('/');
    if (slash != string_view::npos)
        path.remove_prefix(slash + 1);
    return path;
}

/** @return the number a text consists of, -1 for anything else and for one no process can have */
pid_t parse_pid(string_view text) {
    pid_t pid = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), pid);
    return error == std::errc{} && end == text.data() + text.size() && pid > 0 ? pid : -1;
}

bool is_digits(const char *text) {
    return text[strspn(text, "0123456789")] == '\0';
}

/** Reads a file of a process. @return its size; below 0 when the process is gone */
ssize_t read_proc(pid_t pid, const char *file, char *buffer, size_t size) {
    char path[64];
    snprintf(path, sizeof path, "/proc/%d/%s", pid, file);
    const unique_fd fd = open_regular(path);
    return fd ? read_some(fd.get(), buffer, size) : -1;
}

bool is_alive(pid_t pid) {
    char text[512];
    const ssize_t size = read_proc(pid, "stat", text, sizeof text);
    if (size <= 0)
        return false;
    // "pid (name) state ...", and a name may hold anything
    const string_view stat{text, static_cast<size_t>(size)};
    const size_t name_end = stat.rfind(')');
    return name_end + 2 < stat.size() && stat[name_end + 2] != 'Z' && stat[name_end + 2] != 'X';
}

bool is_interpreter(string_view name) {
    constexpr string_view kNames[] = {"sh", "ash", "bash", "dash", "ksh", "zsh", "busybox"};
    return std::find(std::begin(kNames), std::end(kNames), name) != std::end(kNames) || begins_with(name, "python") ||
           begins_with(name, "perl");
}

/** The arguments of a process, each ended by a NUL. */
class command_line {
public:
    explicit command_line(pid_t pid) {
        const ssize_t got = read_proc(pid, "cmdline", text_, sizeof text_ - 1);
        size_ = got > 0 ? static_cast<size_t>(got) : 0;
        text_[size_] = '\0';
        find_script();
    }

    /** The first argument, without the dash of a login shell. */
    [[nodiscard]] string_view program() const { return text_ + (text_[0] == '-' ? 1 : 0); }
    /** The script that an interpreter runs; "" for any other process. */
    [[nodiscard]] string_view script() const { return text_ + script_; }

    /** @return whether it is this command, with more arguments or not, with an interpreter before it or not */
    [[nodiscard]] bool runs(string_view command) const { return matches(0, command) || matches(script_, command); }

private:
    void find_script() {
        script_ = size_;
        if (!is_interpreter(base_name(program())))
            return;
        size_t at = strlen(text_) + 1;
        while (at < size_ && text_[at] == '-') {
            if (strcmp(text_ + at, "-c") == 0 || strcmp(text_ + at, "-m") == 0)
                return;
            at += strlen(text_ + at) + 1;
        }
        script_ = std::min(at, size_);
    }

    [[nodiscard]] bool matches(size_t at, string_view command) const {
        if (at + command.size() > size_ || text_[at + command.size()] != '\0')
            return false;
        return std::equal(command.begin(), command.end(), text_ + at,
                          [](char wanted, char found) { return wanted == (found == '\0' ? ' ' : found); });
    }

    size_t size_;
    size_t script_; // where it begins, or size_
    char text_[kCommandLineMax];
};

/** The name of the executable; "" when it may not be looked at. */
class executable_name {
public:
    explicit executable_name(pid_t pid) {
        char link[64];
        snprintf(link, sizeof link, "/proc/%d/exe", pid);
        const ssize_t length = readlink(link, path_, sizeof path_ - 1);
        path_[length > 0 ? length : 0] = '\0';
    }
    [[nodiscard]] string_view get() const {
        constexpr string_view kDeleted = " (deleted)";
        string_view name = base_name(path_);
        if (ends_in(name, kDeleted))
            name.remove_suffix(kDeleted.size());
        return name;
    }

private:
    char path_[PATH_MAX];
};

/** What the kernel calls a process; the only name of its own threads. */
string_view kernel_name(pid_t pid, char (&buffer)[32]) {
    const ssize_t size = read_proc(pid, "comm", buffer, sizeof buffer);
    string_view name{buffer, size > 0 ? static_cast<size_t>(size) : 0};
    if (name.ends_with('\n'))
        name.remove_suffix(1);
    return name;
}

bool has_name(pid_t pid, string_view name) {
    char buffer[32];
    const command_line command{pid};
    if (command.program().empty())
        return kernel_name(pid, buffer) == name;
    return base_name(command.program()) == name || base_name(command.script()) == name ||
           executable_name{pid}.get() == name;
}

int copy_text(string_view text, char *to, int size) {
    const size_t length = std::min(text.size(), static_cast<size_t>(size) - 1);
    memcpy(to, text.data(), length);
    to[length] = '\0';
    return 0;
}

/** Calls for every process, until the call says that it is enough. @return false when they cannot be listed */
template<class Visit> bool for_each_listed(Visit visit) {
    DIR *directory = opendir("/proc");
    if (directory == nullptr)
        return false;
    bool goes_on = true;
    while (const dirent *entry = goes_on ? readdir(directory) : nullptr) {
        const pid_t pid = parse_pid(entry->d_name);
        goes_on = pid <= 0 || visit(pid);
    }
    closedir(directory);
    return true;
}

/** Calls for every living process. @return false when the processes cannot be listed */
template<class Visit> bool for_each_process(Visit visit) {
    return for_each_listed([&](pid_t pid) {
        if (is_alive(pid))
            visit(pid);
        return true;
    });
}

/** Pids, of which no more are remembered than there is room for. */
class pid_memory {
public:
    /** @return whether it is a new one */
    bool add(pid_t pid) {
        const auto end = pids_.begin() + count_;
        if (std::find(pids_.begin(), end, pid) != end)
            return false;
        if (end != pids_.end())
            pids_[static_cast<size_t>(count_++)] = pid;
        return true;
    }

private:
    std::array<pid_t, 64> pids_{};
    std::ptrdiff_t count_ = 0;
};

/** The search for the processes of a command line. One that goes to the background ends and goes on as another, which a
 * list of all may lack: there is something new to find as long as a list holds other processes that are ending than the
 * one before. */
class command_search {
public:
    explicit command_search(string_view command) : command_(command) {}

    /** Calls once for each of them, but this process, until the call says that it is enough. */
    template<class Visit> void run(Visit visit) {
        constexpr int kMostLists = 10;
        for (int i = 0; i < kMostLists && look(visit); ++i) {
        }
    }

private:
    enum class kind { other, wanted, ending };

    [[nodiscard]] kind kind_of(pid_t pid) const {
        const command_line command{pid};
        if (command.program().empty()) // or one of the kernel's own, which stay
            return kind::ending;
        if (pid == getpid() || !command.runs(command_))
            return kind::other;
        return is_alive(pid) ? kind::wanted : kind::ending;
    }

    /** @return whether another look may find more */
    template<class Visit> bool look(Visit visit) {
        const int64_t ending_before = ending_;
        bool is_enough = false;
        bool has_new = false;
        ending_ = 0;
        for_each_listed([&](pid_t pid) {
            const kind found = kind_of(pid);
            ending_ += found == kind::ending ? pid : 0;
            if (found == kind::wanted && visited_.add(pid)) {
                has_new = true;
                is_enough = !visit(pid);
            }
            return !is_enough;
        });
        return !is_enough && (has_new || ending_ != ending_before);
    }

    string_view command_;
    pid_memory visited_;
    int64_t ending_ = 0; // the sum of their pids on the last list
};

/** Calls for every living process, but this one, that a pid or a command line names, until the call says that
 * it is enough. */
template<class Visit> void for_each_match(const char *process, Visit visit) {
    if (is_digits(process)) {
        const pid_t pid = parse_pid(process);
        if (pid > 0 && pid != getpid() && is_alive(pid))
            visit(pid);
        return;
    }
    command_search{process}.run(visit);
}

} // namespace

int KLIBCPs(const char *szName, pid_t *pPid, int cPid, int flags) {
    if (is_empty(szName) || cPid < 0 || flags != 0)
        return fail(HERE, kErrArgument);

    int count = 0;
    const bool listed = for_each_process([&](pid_t pid) {
        if (!has_name(pid, szName))
            return;
        if (pPid != nullptr && count < cPid)
            pPid[count] = pid;
        count++;
    });
    return listed ? count : fail(HERE, kErrFileOpen);
}

int KLIBCReadPidFile(const char *szPath) {
    if (is_empty(szPath))
        return fail(HERE, kErrArgument);

    constexpr string_view kBlanks = " \t\r\n";
    char buffer[64];
    const unique_fd fd = open_regular(szPath);
    const ssize_t size = fd ? read_some(fd.get(), buffer, sizeof buffer) : 0;
    string_view text{buffer, static_cast<size_t>(std::max<ssize_t>(size, 0))};
    text.remove_prefix(std::min(text.find_first_not_of(kBlanks), text.size()));
    return std::max(parse_pid({text.data(), std::min(text.find_first_of(kBlanks), text.size())}), 0);
}

int KLIBCProcGetByPid(pid_t pid, char *szName, int cbName) {
    if (pid < 1 || szName == nullptr || cbName < 1)
        return fail(HERE, kErrArgument);

    szName[0] = '\0';
    if (!is_alive(pid))
        return fail(HERE, kErrNotFound);
    const command_line command{pid};
    const executable_name executable{pid};
    char buffer[32];
    if (command.program().empty())
        return copy_text(kernel_name(pid, buffer), szName, cbName);
    if (!command.script().empty())
        return copy_text(base_name(command.script()), szName, cbName);
    // one executable under many names goes by the name it was called
    const bool called = executable.get().empty() || is_interpreter(executable.get());
    return copy_text(called ? base_name(command.program()) : executable.get(), szName, cbName);
}

int KLIBCIsProcAlive(const char *szProc) {
    if (is_empty(szProc))
        return fail(HERE, kErrArgument), 0;
    int alive = 0;
    for_each_match(szProc, [&](pid_t) {
        alive = 1;
        return false;
    });
    return alive;
}

int KLIBCKill(const char *szProc, int signal) {
    if (is_empty(szProc) || signal < 0 || signal >= NSIG || (is_digits(szProc) && parse_pid(szProc) < 0))
        return fail(HERE, kErrArgument);

    bool refused = false;
    for_each_match(szProc, [&](pid_t pid) {
        refused |= kill(pid, signal) < 0 && errno != ESRCH;
        return true;
    });
    return refused ? fail(HERE, kErrSyscall) : 0;
}
