// kovanet monitor: change events and link changes as they happen.
#include "errors.h"
#include "interrupt.h"
#include "link_changes.h"
#include "objects.h"
#include "table.h"
#include "words.h"

#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace kova {
namespace {

constexpr char kNotes[] = "/run/kova/events"; // written by a plug-in of every event
constexpr int kLookEveryMs = 100;

// ---- events, as the plug-in notes them

/** A file that others add lines to, and put a new one in the place of when it is full. */
class growing_file {
public:
    explicit growing_file(const char *path) : path_(path) {
        if (reopen()) {
            lseek(fd_, 0, SEEK_END);
        }
    }
    growing_file(const growing_file &) = delete;
    growing_file &operator=(const growing_file &) = delete;
    ~growing_file() { close_file(); }

    /** What was added since the last time. */
    std::string added() {
        std::string text = rest();
        struct stat now {};
        if (stat(path_, &now) == 0 && (fd_ < 0 || now.st_ino != inode_)) {
            text += rest(); // added between the first look and the change of files
            if (reopen()) {
                text += rest();
            }
        }
        return text;
    }

private:
    std::string rest() const {
        std::string text;
        char buffer[4096];
        ssize_t size = 0;
        while (fd_ >= 0 && (size = read(fd_, buffer, sizeof buffer)) > 0) {
            text.append(buffer, static_cast<size_t>(size));
        }
        if (size < 0 && errno != EINTR) {
            read_failed();
        }
        return text;
    }

    /** Without it, all goes on without events that nobody would miss. */
    [[noreturn]] void read_failed() const {
        throw failure{kCallFailed, textf("cannot read the events in %s: %s", path_, strerror(errno))};
    }

    bool reopen() {
        close_file();
        fd_ = open(path_, O_RDONLY | O_CLOEXEC | O_NONBLOCK);
        struct stat status {};
        if (fd_ < 0 && errno != ENOENT) { // there is none before the first event
            read_failed();
        }
        if (fd_ >= 0 && fstat(fd_, &status) == 0) {
            inode_ = status.st_ino;
        }
        return fd_ >= 0;
    }

    void close_file() {
        if (fd_ >= 0) {
            close(fd_);
        }
        fd_ = -1;
    }

    const char *path_;
    int fd_ = -1;
    ino_t inode_ = 0;
};

/** Turns notes into records; the beginning of a note waits for its end. */
class note_reader {
public:
    std::vector<json> take(const std::string &text) {
        std::vector<json> records;
        unread_ += text;
        for (size_t end = 0; (end = unread_.find("\n\n")) != std::string::npos; unread_.erase(0, end + 2)) {
            // a note without arguments has an empty line of them
            records.push_back(record_of(unread_.substr(0, end)));
            unread_.erase(end + 2, unread_.find_first_not_of('\n', end + 2) - (end + 2));
        }
        return records;
    }

private:
    static json record_of(const std::string &note) {
        json record{{"time", nullptr}, {"source", "event"}, {"event", nullptr}, {"phase", nullptr}};
        json arguments = json::object();
        for (size_t at = 0; at < note.size();) {
            const size_t end = std::min(note.find('\n', at), note.size());
            const std::string line = note.substr(at, end - at);
            const size_t equals = line.find('=');
            if (equals != std::string::npos) {
                put(record, arguments, line.substr(0, equals), line.substr(equals + 1));
            }
            at = end + 1;
        }
        record["arguments"] = arguments;
        return record;
    }

    static void put(json &record, json &arguments, const std::string &key, const std::string &value) {
        if (key == "PLUGIN_TIME") {
            record["time"] = std::round(strtod(value.c_str(), nullptr) * 1e3) / 1e3;
        } else if (key == "PLUGIN_EVENT") {
            record["event"] = value;
        } else if (key == "PLUGIN_PHASE") {
            record["phase"] = value;
        } else {
            arguments[key] = value;
        }
    }

    std::string unread_;
};

// ---- link changes, as the kernel tells them

double now() {
    timespec time{};
    clock_gettime(CLOCK_REALTIME, &time);
    return std::round((static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) / 1e9) * 1e3) / 1e3;
}

const char *event_of(const link_change &change) {
    switch (change.what) {
    case link_change::kAdded:
        return "interface added";
    case link_change::kRemoved:
        return "interface removed";
    case link_change::kRenamed:
        return "interface renamed";
    default:
        return change.link_changed ? (change.link ? "link up" : "link down")
                                   : (change.up ? "switched on" : "switched off");
    }
}

json record_of(const link_change &change) {
    json arguments{{"IFNAME", change.name}};
    if (change.what == link_change::kRenamed) {
        arguments["ORIGIN_IFNAME"] = change.old_name;
    }
    return {{"time", now()},
            {"source", "kernel"},
            {"event", event_of(change)},
            {"phase", nullptr},
            {"arguments", arguments}};
}

// ---- both

/** The time of day to the millisecond. */
std::string time_text(const json &record) {
    if (record["time"].is_null()) {
        return "-";
    }
    const double time = record["time"];
    const auto seconds = static_cast<time_t>(time);
    tm local{};
    localtime_r(&seconds, &local);
    return textf("%02d:%02d:%02d.%03d", local.tm_hour, local.tm_min, local.tm_sec,
                 static_cast<int>(std::lround((time - static_cast<double>(seconds)) * 1e3)) % 1000);
}

void tell(const json &record, bool as_json) {
    if (as_json) {
        print_json(record);
    } else {
        std::string arguments;
        for (const auto &[key, value] : record["arguments"].items()) {
            arguments += " " + key + "=" + printable(value.get<std::string>());
        }
        printf("%s %s%s%s\n", time_text(record).c_str(), field(record, "event").c_str(),
               record["phase"].is_null() ? "" : (" " + field(record, "phase")).c_str(), arguments.c_str());
    }
    flush_output();
}

struct monitor_words {
    std::optional<std::string> count; /**< what is told before the end */
};

void monitor(const monitor_words &words, bool as_json) {
    constexpr int64_t kMost = 1000000000;
    const int64_t count = words.count ? number_within("--count", *words.count, 1, kMost) : 0;
    stop_on_signals();
    link_watcher links;
    growing_file notes{kNotes};
    note_reader reader;
    for (int64_t told = 0; !is_interrupted();) {
        std::vector<json> records;
        for (const link_change &change : links.wait(kLookEveryMs)) {
            records.push_back(record_of(change));
        }
        for (const json &record : reader.take(notes.added())) {
            records.push_back(record);
        }
        for (const json &record : records) {
            tell(record, as_json);
            if (++told == count) {
                return;
            }
        }
    }
}

} // namespace

void add_monitor(CLI::App &object, const global_options &options) {
    auto &words = words_of<monitor_words>();
    object.add_option("--count", words.count, "end after N changes")->option_text("N");
    object.callback([&words, &options] { monitor(words, options.json); });
}

} // namespace kova
