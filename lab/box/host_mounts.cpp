#include "host_mounts.h"

#include <fstream>
#include <set>
#include <sstream>
#include <string>

namespace kova {

namespace {

// The kernel writes blanks, tabs, newlines and backslashes as three octal digits after a backslash.
std::string without_escapes(const std::string &text) {
    std::string plain;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] == '\\' && i + 3 < text.size()) {
            plain += static_cast<char>(std::stoi(text.substr(i + 1, 3), nullptr, 8));
            i += 3;
        } else {
            plain += text[i];
        }
    }
    return plain;
}

} // namespace

std::vector<std::filesystem::path> host_mount_points() {
    std::set<std::filesystem::path> points;
    std::ifstream table("/proc/self/mountinfo");
    for (std::string line; std::getline(table, line);) {
        std::istringstream fields(line);
        std::string id, parent, device, root, point;
        fields >> id >> parent >> device >> root >> point;
        points.insert(without_escapes(point));
    }
    std::error_code hidden;
    std::vector<std::filesystem::path> seen;
    for (const std::filesystem::path &point : points) {
        if (std::filesystem::exists(point, hidden)) {
            seen.push_back(point);
        }
    }
    return seen;
}

} // namespace kova
