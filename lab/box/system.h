// The system calls a box is made of, as calls that throw std::system_error with a text that says what failed.
#ifndef KOVA_LAB_BOX_SYSTEM_H
#define KOVA_LAB_BOX_SYSTEM_H

#include <string>
#include <utility>
#include <vector>

namespace kova {

// Owner of a descriptor.
class unique_fd {
public:
    explicit unique_fd(int fd = -1) : fd_(fd) {}
    unique_fd(unique_fd &&other) noexcept : fd_(std::exchange(other.fd_, -1)) {}
    unique_fd &operator=(unique_fd &&other) noexcept {
        std::swap(fd_, other.fd_);
        return *this;
    }
    ~unique_fd();
    int get() const { return fd_; }

private:
    int fd_;
};

// Throws std::system_error with errno and the text when ok is false.
void require(bool ok, const std::string &what);

// Opens with O_CLOEXEC.
unique_fd open_file(const std::string &path, int flags);
// A path that names what a descriptor refers to, also when a mount hides its own path.
std::string path_of(const unique_fd &fd);
void write_file(const std::string &path, const std::string &text);
// Makes a directory and those above it.
void make_directories(const std::string &path);

void mount_new(const std::string &type, const std::string &target, unsigned long flags,
               const std::string &options = "");
// Binds a file or directory with everything mounted below it.
void bind_mount(const std::string &source, const std::string &target);

// Runs a program of the system with a text as its standard input; a status other than 0 is thrown as an error.
void run_program(const std::vector<std::string> &arguments, const std::string &input);
// The vector that execvp wants, valid as long as the texts are.
std::vector<char *> argument_vector(const std::vector<std::string> &arguments);
// An exit status as shells count it: 128 + signal for a process that was killed.
int exit_status(int wait_status);

} // namespace kova

#endif
