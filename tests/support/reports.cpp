#include "support/reports.h"

#include <istream>
#include <ostream>
#include <unistd.h>

namespace kova_test {

void write_texts(std::ostream &out, const texts &lines) {
    out << lines.size() << "\n";
    for (const std::string &line : lines) {
        out << line.size() << " " << line << "\n";
    }
}

texts read_texts(std::istream &in) {
    size_t number = 0;
    in >> number;
    texts lines(number);
    for (std::string &line : lines) {
        size_t size = 0;
        in >> size;
        in.get();
        line.resize(size);
        in.read(line.data(), static_cast<std::streamsize>(size));
    }
    return lines;
}

void send(int fd, const std::string &text) {
    for (size_t sent = 0; sent < text.size();) {
        const ssize_t written = write(fd, text.data() + sent, text.size() - sent);
        if (written <= 0) {
            _exit(3);
        }
        sent += static_cast<size_t>(written);
    }
}

std::string receive(int fd) {
    std::string text;
    char buffer[65536];
    for (ssize_t got = read(fd, buffer, sizeof buffer); got > 0; got = read(fd, buffer, sizeof buffer)) {
        text.append(buffer, static_cast<size_t>(got));
    }
    return text;
}

} // namespace kova_test
