// What kova-box and the first process of a guest's kernel tell each other, over a line that carries plain bytes.
#ifndef KOVA_LAB_BOX_FRAMES_H
#define KOVA_LAB_BOX_FRAMES_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kova {

// inside -> outside
constexpr char kReady = 'r';  // the guest listens
constexpr char kOutput = 'o'; // of the command
constexpr char kErrors = 'e'; // standard error of the command
constexpr char kStatus = 'x'; // exit status in decimal; the last one

// outside -> inside
constexpr char kJob = 'j';   // packed guest_job; the first one
constexpr char kInput = 'i'; // for the command; an empty one is the end
constexpr char kSize = 'w';  // of the terminal: a struct winsize

struct frame {
    char kind;
    std::string data;
};

void send_frame(int fd, char kind, std::string_view data);
// Nothing at the end of the line.
std::optional<frame> receive_frame(int fd);
// Sends what a descriptor holds until its end, as frames of one kind.
void write_all(int fd, std::string_view data);

// What a guest is to do.
struct guest_job {
    std::vector<std::string> arguments;   // of kova-box inside
    std::vector<std::string> environment; // NAME=value
    std::vector<std::string> shares;      // host directories to be written to
    std::string directory;                // working directory
    unsigned mask = 022;                  // umask
    bool terminal = false;                // the command gets one
    bool same_output = false;             // standard error goes where standard output goes
};

std::string pack(const guest_job &job);
guest_job unpack(const std::string &text);

} // namespace kova

#endif
