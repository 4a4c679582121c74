#include "platform_test.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>

#include <csignal>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace fs = std::filesystem;

namespace kova_test {

void write_file(const std::string &path, std::string_view text, unsigned mode) {
    fs::create_directories(fs::path{path}.parent_path());
    std::ofstream{path, std::ios::binary | std::ios::trunc} << text;
    chmod(path.c_str(), mode);
}

std::string read_file(const std::string &path) {
    std::ifstream file{path, std::ios::binary};
    if (!file)
        return "(no file)";
    return {std::istreambuf_iterator<char>{file}, {}};
}

std::vector<std::string> names_in(const std::string &directory) {
    std::vector<std::string> names;
    for (const auto &entry : fs::directory_iterator{directory})
        names.push_back(entry.path().filename());
    std::sort(names.begin(), names.end());
    return names;
}

std::vector<std::string> texts_of(const KLIBSZLIST *list) {
    std::vector<std::string> texts;
    for (uint32_t i = 0; i < list->nItem; i++)
        texts.emplace_back(KLIBCSzListGet(list, static_cast<int>(i)));
    return texts;
}

std::vector<std::string> open_descriptors() {
    std::vector<std::string> descriptors;
    for (int fd = 0; fd < 1024; fd++) {
        std::error_code error;
        const fs::path target = fs::read_symlink("/proc/self/fd/" + std::to_string(fd), error);
        if (!error)
            descriptors.push_back(std::to_string(fd) + " " + target.string());
    }
    return descriptors;
}

void mark_register() {
    KLIBCErrSetEx(kMark, "mark", 1);
}

pid_t start_child(const std::function<int()> &function) {
    fflush(nullptr);
    const pid_t pid = fork();
    if (pid == 0)
        _exit(function());
    return pid;
}

int wait_for(pid_t pid) {
    int status = 0;
    if (waitpid(pid, &status, 0) != pid)
        return -1;
    return WIFSIGNALED(status) ? 128 + WTERMSIG(status) : WEXITSTATUS(status);
}

int in_child(const std::function<int()> &function) {
    return wait_for(start_child(function));
}

bool eventually(const std::function<bool()> &condition, int seconds) {
    for (int i = 0; i < seconds * 100; i++) {
        if (condition())
            return true;
        usleep(10 * 1000);
    }
    return condition();
}

double seconds_of(const std::function<void()> &function) {
    const auto start = std::chrono::steady_clock::now();
    function();
    return std::chrono::duration<double>{std::chrono::steady_clock::now() - start}.count();
}

platform_test::platform_test() {
    char name[] = "/tmp/platform-test-XXXXXX";
    directory_ = mkdtemp(name);
    mark_register();
}

platform_test::~platform_test() {
    fs::remove_all(directory_);
}

kept_file::kept_file(std::string path) : path_(std::move(path)), existed_(fs::exists(path_)) {
    if (!existed_)
        return;
    mode_ = static_cast<unsigned>(fs::status(path_).permissions());
    text_ = read_file(path_);
}

kept_file::~kept_file() {
    if (existed_)
        write_file(path_, text_, mode_);
    else
        fs::remove(path_);
}

} // namespace kova_test

/** For a sanitizer build: memory that runs out is something to test, not an error. */
extern "C" const char *__asan_default_options() {
    return "allocator_may_return_null=1";
}

int main(int argc, char **argv) {
    if (getenv("KOVA_BOX") == nullptr) {
        fprintf(stderr, "These tests write to /etc and /run: run them inside the box, as ./test does.\n");
        return 2;
    }
    testing::InitGoogleTest(&argc, argv);
    return RUN_ALL_TESTS();
}
