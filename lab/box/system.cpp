#include "system.h"

#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <stdexcept>
#include <sys/mount.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>

namespace kova {

unique_fd::~unique_fd() {
    if (fd_ >= 0) {
        close(fd_);
    }
}

void require(bool ok, const std::string &what) {
    if (!ok) {
        throw std::system_error(errno, std::generic_category(), what);
    }
}

unique_fd open_file(const std::string &path, int flags) {
    unique_fd fd{open(path.c_str(), flags | O_CLOEXEC, 0644)};
    require(fd.get() >= 0, "cannot open " + path);
    return fd;
}

std::string path_of(const unique_fd &fd) {
    return "/proc/self/fd/" + std::to_string(fd.get());
}

void write_file(const std::string &path, const std::string &text) {
    const unique_fd fd = open_file(path, O_WRONLY | O_CREAT | O_TRUNC);
    require(write(fd.get(), text.data(), text.size()) == static_cast<ssize_t>(text.size()), "cannot write " + path);
}

void make_directories(const std::string &path) {
    std::error_code error;
    std::filesystem::create_directories(path, error);
    if (error) {
        throw std::system_error(error, "cannot make the directory " + path);
    }
}

void mount_new(const std::string &type, const std::string &target, unsigned long flags, const std::string &options) {
    const char *data = options.empty() ? nullptr : options.c_str();
    require(mount(type.c_str(), target.c_str(), type.c_str(), flags, data) == 0,
            "cannot mount " + type + " on " + target);
}

void bind_mount(const std::string &source, const std::string &target) {
    require(mount(source.c_str(), target.c_str(), nullptr, MS_BIND | MS_REC, nullptr) == 0,
            "cannot bind " + source + " to " + target);
}

std::vector<char *> argument_vector(const std::vector<std::string> &arguments) {
    std::vector<char *> vector;
    vector.reserve(arguments.size() + 1);
    for (const std::string &argument : arguments) {
        vector.push_back(const_cast<char *>(argument.c_str()));
    }
    vector.push_back(nullptr);
    return vector;
}

int exit_status(int wait_status) {
    return WIFSIGNALED(wait_status) ? 128 + WTERMSIG(wait_status) : WEXITSTATUS(wait_status);
}

void run_program(const std::vector<std::string> &arguments, const std::string &input) {
    int ends[2];
    require(pipe2(ends, O_CLOEXEC) == 0, "cannot make a pipe");
    const unique_fd reader{ends[0]};
    unique_fd writer{ends[1]};
    // before the start, so that a program that ends early cannot kill the box by a closed pipe
    require(write(writer.get(), input.data(), input.size()) == static_cast<ssize_t>(input.size()),
            "cannot fill a pipe");
    writer = unique_fd{};

    const pid_t child = fork();
    require(child >= 0, "cannot start " + arguments[0]);
    if (child == 0) {
        dup2(reader.get(), STDIN_FILENO);
        execvp(arguments[0].c_str(), argument_vector(arguments).data());
        _exit(127);
    }
    int status = 0;
    require(waitpid(child, &status, 0) == child, "cannot wait for " + arguments[0]);
    if (status != 0) {
        throw std::runtime_error(arguments[0] + " failed with status " + std::to_string(exit_status(status)));
    }
}

} // namespace kova
