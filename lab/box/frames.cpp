#include "frames.h"

#include "system.h"

#include <array>
#include <cerrno>
#include <cstdint>
#include <cstring>
#include <unistd.h>

namespace kova {

namespace {

// Reads as many bytes as there is room for. Returns false when the line ends before.
bool read_exactly(int fd, char *data, std::size_t size) {
    while (size > 0) {
        const ssize_t got = read(fd, data, size);
        if (got <= 0 && (got == 0 || errno != EINTR)) {
            return false;
        }
        data += std::max<ssize_t>(got, 0);
        size -= static_cast<std::size_t>(std::max<ssize_t>(got, 0));
    }
    return true;
}

// ---- packing: no text of a job holds a NUL, so each one ends with it; a list begins with its length

void add(std::string &packed, const std::string &text) {
    packed.append(text).push_back('\0');
}

void add(std::string &packed, const std::vector<std::string> &list) {
    add(packed, std::to_string(list.size()));
    for (const std::string &text : list) {
        add(packed, text);
    }
}

std::string take(std::string_view &packed) {
    const std::string text(packed.substr(0, packed.find('\0')));
    packed.remove_prefix(text.size() + 1);
    return text;
}

std::vector<std::string> take_list(std::string_view &packed) {
    std::vector<std::string> list(std::stoul(take(packed)));
    for (std::string &text : list) {
        text = take(packed);
    }
    return list;
}

} // namespace

void write_all(int fd, std::string_view data) {
    while (!data.empty()) {
        const ssize_t put = write(fd, data.data(), data.size());
        require(put >= 0 || errno == EINTR, "cannot write");
        data.remove_prefix(static_cast<std::size_t>(std::max<ssize_t>(put, 0)));
    }
}

void send_frame(int fd, char kind, std::string_view data) {
    const auto size = static_cast<std::uint32_t>(data.size());
    std::string text(1 + sizeof size, kind);
    memcpy(&text[1], &size, sizeof size);
    write_all(fd, text.append(data));
}

std::optional<frame> receive_frame(int fd) {
    std::array<char, 1 + sizeof(std::uint32_t)> header;
    if (!read_exactly(fd, header.data(), header.size())) {
        return std::nullopt;
    }
    std::uint32_t size = 0;
    memcpy(&size, &header[1], sizeof size);
    frame received{header[0], std::string(size, '\0')};
    if (!read_exactly(fd, received.data.data(), size)) {
        return std::nullopt;
    }
    return received;
}

std::string pack(const guest_job &job) {
    std::string packed;
    add(packed, job.arguments);
    add(packed, job.environment);
    add(packed, job.shares);
    add(packed, job.directory);
    add(packed, std::to_string(job.mask));
    add(packed, job.terminal ? "1" : "0");
    add(packed, job.same_output ? "1" : "0");
    return packed;
}

guest_job unpack(const std::string &text) {
    std::string_view packed = text;
    guest_job job;
    job.arguments = take_list(packed);
    job.environment = take_list(packed);
    job.shares = take_list(packed);
    job.directory = take(packed);
    job.mask = static_cast<unsigned>(std::stoul(take(packed)));
    job.terminal = take(packed) == "1";
    job.same_output = take(packed) == "1";
    return job;
}

} // namespace kova
