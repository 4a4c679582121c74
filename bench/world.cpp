#include "world.h"

#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <sys/wait.h>
#include <unistd.h>

namespace kova {

namespace {

constexpr char kGroup[] = "7"; // of the interfaces made here
std::string disk;

/** Number of the interfaces there are. */
int interface_count() {
    const auto names = std::filesystem::directory_iterator{"/sys/class/net"};
    return static_cast<int>(std::distance(begin(names), end(names)));
}

/** The commands that make a pair of interfaces, each the other's peer. */
void add_pair(std::ostream &commands, int number, interfaces::state wanted) {
    const std::string lan = "lan" + std::to_string(number);
    const std::string wan = "wan" + std::to_string(number);
    commands << "link add " << lan << " group " << kGroup << " type veth peer name " << wan << "\n";
    if (wanted == interfaces::state::down) {
        return;
    }
    int host = 1;
    for (const std::string &name : {lan, wan}) {
        commands << "addr add 10.7." << number << "." << host++ << "/24 dev " << name << "\nlink set " << name
                 << " up\n";
    }
}

} // namespace

void require_done(bool done, const char *what) {
    if (!done) {
        throw std::runtime_error(what);
    }
}

void read_whole(const char *path) {
    char part[65536];
    const unique_fd file = open_file(path, O_RDONLY);
    ssize_t got;
    do {
        got = read(file.get(), part, sizeof part);
    } while (got > 0);
    require(got == 0, path);
}

interfaces::interfaces(int count, state wanted) {
    const std::string batch = "/tmp/interfaces";
    std::ostringstream commands;
    const int pairs = (count - interface_count()) / 2;
    for (int i = 1; i <= pairs; ++i) {
        add_pair(commands, i, wanted);
    }
    write_file(batch, commands.str());
    run_program({"ip", "-batch", batch}, "");
    require_done(interface_count() == count, "the number of interfaces cannot be had");
}

interfaces::~interfaces() {
    try {
        run_program({"ip", "link", "del", "group", kGroup}, "");
    } catch (const std::exception &error) {
        fprintf(stderr, "%s\n", error.what()); // the box takes them along
    }
}

void set_disk(const std::string &directory) {
    disk = directory;
}

disk_directory::disk_directory() : path_(disk + "/bench.XXXXXX") {
    require(mkdtemp(path_.data()) != nullptr, "cannot make a directory in " + disk);
}

disk_directory::~disk_directory() {
    std::error_code ignored;
    std::filesystem::remove_all(path_, ignored);
}

silent_program::silent_program(std::vector<std::string> arguments) : arguments_(std::move(arguments)) {
    posix_spawn_file_actions_init(&actions_);
    posix_spawn_file_actions_addopen(&actions_, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
}

silent_program::~silent_program() {
    posix_spawn_file_actions_destroy(&actions_);
}

void silent_program::run() const {
    pid_t pid;
    errno = posix_spawnp(&pid, arguments_[0].c_str(), &actions_, nullptr, argument_vector(arguments_).data(), environ);
    require(errno == 0, "cannot start " + arguments_[0]);
    int status;
    require(waitpid(pid, &status, 0) == pid, "cannot wait for " + arguments_[0]);
    require_done(status == 0, (arguments_[0] + " failed").c_str());
}

measure time_of_run(std::vector<std::string> arguments) {
    const auto program = std::make_shared<silent_program>(std::move(arguments));
    return timed([program] { program->run(); });
}

} // namespace kova
