#include "support/fault_points.h"

#include <climits>
#include <cstdio>
#include <cstring>
#include <link.h>
#include <map>
#include <unistd.h>

namespace kova_test {

fault_points *current_points = nullptr;

std::set<std::string> &fault_operations() {
    static std::set<std::string> names;
    return names;
}

// ---- which code a call comes from

namespace {

struct range {
    uintptr_t begin;
    uintptr_t end;

    [[nodiscard]] bool holds(const void *address) const {
        const auto number = reinterpret_cast<uintptr_t>(address);
        return begin <= number && number < end;
    }
};

/** The segments of the objects that matter. */
struct segments {
    std::vector<range> program, library, c_library;
    std::vector<range> variables; ///< of the library, the platform and the C library
};

int collect(dl_phdr_info *object, size_t, void *out) {
    auto &found = *static_cast<segments *>(out);
    const bool is_program = object->dlpi_name[0] == '\0';
    const bool is_library = strstr(object->dlpi_name, "/libkova") != nullptr;
    const bool is_c_library = strstr(object->dlpi_name, "/libc.so") != nullptr;
    auto &ranges = is_program ? found.program : is_library ? found.library : found.c_library;
    for (int i = 0; (is_program || is_library || is_c_library) && i < object->dlpi_phnum; ++i) {
        const ElfW(Phdr) &header = object->dlpi_phdr[i];
        const uintptr_t begin = object->dlpi_addr + header.p_vaddr;
        if (header.p_type == PT_LOAD && (header.p_flags & PF_X) != 0) {
            ranges.push_back({begin, begin + header.p_memsz});
        } else if (header.p_type == PT_LOAD && (header.p_flags & PF_W) != 0 && !is_program) {
            found.variables.push_back({begin, begin + header.p_memsz});
        }
    }
    return 0;
}

const segments &loaded() {
    const rig_at_work guard; // also while its end is registered, which may ask for memory
    static const segments found = [] {
        segments all;
        dl_iterate_phdr(collect, &all);
        return all;
    }();
    return found;
}

bool is_in(const std::vector<range> &ranges, const void *address) {
    return std::any_of(ranges.begin(), ranges.end(), [&](const range &one) { return one.holds(address); });
}

} // namespace

bool is_in_code_under_test(const void *caller) {
    return current_points != nullptr && rig_at_work::depth == 0 &&
           (is_in(loaded().library, caller) || is_in(loaded().program, caller));
}

bool allocates_for_code_under_test(const void *caller) {
    return current_points != nullptr && rig_at_work::depth == 0 &&
           (is_in(loaded().library, caller) || is_in(loaded().c_library, caller));
}

bool is_kept_by_variable(const void *block) {
    for (const range &variables : loaded().variables) {
        const uintptr_t first = (variables.begin + sizeof(void *) - 1) / sizeof(void *) * sizeof(void *);
        for (uintptr_t at = first; at + sizeof(void *) <= variables.end; at += sizeof(void *)) {
            const void *held = nullptr;
            memcpy(&held, reinterpret_cast<const void *>(at), sizeof held);
            if (held == block) {
                return true;
            }
        }
    }
    return false;
}

std::string path_of(int fd) {
    char target[PATH_MAX];
    const ssize_t length = readlink(("/proc/self/fd/" + std::to_string(fd)).c_str(), target, sizeof target);
    std::string path = length < 0 ? "nothing" : std::string(target, static_cast<size_t>(length));
    path.resize(std::min(path.size(), path.find(":["))); // the number of a socket or pipe is another in each run
    return current_rig != nullptr ? current_rig->asked_for(path) : path;
}

// ---- points

bool fault_points::meets(const std::string &operation, const std::string &detail) {
    const size_t number = met.size();
    const std::string call = operation + (detail.empty() ? "" : " " + detail);
    std::string label;
    for (const std::string &outer : within_) {
        label += outer + " > ";
    }
    label += call;
    met.push_back(label);
    within_.push_back(call);
    if (number == plan_.chosen) {
        chosen_operation_ = operation;
    }
    const bool is_later = plan_.how == fault_plan::way::onwards && number > plan_.chosen;
    const bool is_chosen = plan_.how != fault_plan::way::none && number == plan_.chosen;
    if (!is_chosen && !(is_later && operation == chosen_operation_)) {
        return false;
    }
    failed.push_back(label);
    return true;
}

std::string operation_of(const std::string &point) {
    const size_t outer = point.rfind(" > ");
    const std::string call = outer == std::string::npos ? point : point.substr(outer + 3);
    return call.substr(0, call.find(' '));
}

void fault_points::adopt(const texts &also_met, const texts &also_failed) {
    const bool is_chosen_there = met.size() <= plan_.chosen && plan_.chosen < met.size() + also_met.size();
    if (is_chosen_there) {
        const std::string &chosen = also_met[plan_.chosen - met.size()];
        chosen_operation_ = operation_of(chosen);
    }
    met.insert(met.end(), also_met.begin(), also_met.end());
    failed.insert(failed.end(), also_failed.begin(), also_failed.end());
}

// ---- streams

namespace {

struct watched_stream {
    FILE *stream;
    std::string path;
    std::string mode;
    char buffer[BUFSIZ]; ///< ready, so that the first read has nothing to allocate
};

/** By the stream that the code under test has. */
std::map<FILE *, watched_stream *> streams;

ssize_t read_watched(void *cookie, char *to, size_t size) {
    const auto &one = *static_cast<const watched_stream *>(cookie);
    const fault_point point{"fread", true, [&] { return one.path; }};
    const rig_at_work guard;
    if (point.fails()) {
        errno = EIO;
        return -1;
    }
    return read(fileno(one.stream), to, size);
}

ssize_t write_watched(void *cookie, const char *from, size_t size) {
    const auto &one = *static_cast<const watched_stream *>(cookie);
    const fault_point point{"fwrite", true, [&] { return one.path; }};
    const rig_at_work guard;
    if (point.fails()) {
        errno = ENOSPC;
        return 0; // what a stream of this kind takes for a failure
    }
    return write(fileno(one.stream), from, size);
}

int close_watched(void *cookie) {
    const rig_at_work guard;
    auto *const one = static_cast<watched_stream *>(cookie);
    const int result = fclose(one->stream);
    delete one;
    return result;
}

} // namespace

FILE *watched(FILE *stream, const char *mode, const std::string &path) {
    if (current_points == nullptr || stream == nullptr) {
        return stream;
    }
    const rig_at_work guard;
    auto *const one = new watched_stream{stream, path, mode, ""};
    FILE *const shown = fopencookie(one, mode, {read_watched, write_watched, nullptr, close_watched});
    setvbuf(shown, one->buffer, _IOFBF, sizeof one->buffer);
    streams[shown] = one;
    current_rig->held["streams"] += 1;
    return shown;
}

FILE *behind(FILE *shown) {
    const auto found = streams.find(shown);
    return found != streams.end() ? found->second->stream : shown;
}

std::string stream_text(FILE *shown) {
    const auto found = streams.find(shown);
    if (found == streams.end()) {
        return path_of(fileno(shown));
    }
    return (found->second->mode[0] == 'r' ? "read " : "written ") + found->second->path;
}

void forget(FILE *shown) {
    const rig_at_work guard;
    if (streams.erase(shown) != 0) {
        current_rig->held["streams"] -= 1;
    }
}

} // namespace kova_test
