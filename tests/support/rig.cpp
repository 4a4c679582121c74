#include "support/fault_points.h"

#include <algorithm>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <kova/core.h>
#include <sstream>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

namespace kova_test {

namespace fs = std::filesystem;

test_rig *current_rig = nullptr;

namespace {

void append(std::ostringstream &out, const char *title, const texts &lines) {
    for (const std::string &line : lines) {
        out << title << ": " << line << "\n";
    }
}

std::string level_name(int level) {
    switch (level) {
    case LOG_ERR:
        return "ERR";
    case LOG_WARNING:
        return "WARNING";
    case LOG_INFO:
        return "INFO";
    case LOG_DEBUG:
        return "DEBUG";
    default:
        return "level " + std::to_string(level);
    }
}

std::string join(const texts &words) {
    std::string line;
    for (const std::string &word : words) {
        line += (line.empty() ? "" : " ") + word;
    }
    return line;
}

bool begins_with_words(const std::string &line, const std::string &beginning) {
    return line.rfind(beginning, 0) == 0 && (line.size() == beginning.size() || line[beginning.size()] == ' ');
}

/** Where what begins at a position and consists of such characters ends. */
template<typename Test> size_t end_of(const std::string &line, size_t at, Test is_part) {
    while (at < line.size() && is_part(static_cast<unsigned char>(line[at]))) {
        ++at;
    }
    return at;
}

/**
 * A log line with N in place of its line numbers: "unit:12 ", "function(12)", "function (12)", "unit function(12)" or
 * "(unit:12:" at the beginning, and "unit:12]" of a lower error anywhere. By hand, as a line may be very long and
 * expressions are slow.
 */
std::string without_line_numbers(const std::string &line) {
    const auto is_name = [](unsigned char c) { return isalnum(c) != 0 || c == '_' || c == '.' || c == '/'; };
    const auto is_digit = [](unsigned char c) { return isdigit(c) != 0; };
    const size_t name = end_of(line, line.rfind('(', 0) == 0 ? 1 : 0, is_name);
    const size_t second = end_of(line, name, [](unsigned char c) { return c == ' '; });
    const size_t bracket = end_of(line, second, is_name); // "unit function(12)": behind the function
    std::string shown;
    for (size_t at = 0; at < line.size();) {
        shown += line[at];
        const size_t end = end_of(line, at + 1, is_digit);
        const char behind = end < line.size() ? line[end] : '\0';
        const bool is_place = line[at] == ':' && (behind == ']' || (at == name && (behind == ' ' || behind == ':')));
        const bool is_function = line[at] == '(' && (at == second || at == bracket) && behind == ')';
        const bool is_line_number = end > at + 1 && (is_place || is_function);
        shown += is_line_number ? "N" : "";
        at = is_line_number ? end : at + 1;
    }
    return shown;
}

} // namespace

std::string outcome::str() const {
    std::ostringstream out;
    out << "result: " << result << "\n";
    out << "register: 0x" << std::hex << std::uppercase << code << std::dec << " " << unit << "\n";
    append(out, "log", log);
    append(out, "command", commands);
    append(out, "event", events);
    append(out, "lock", locks);
    for (const long slept : sleeps) {
        out << "sleep: " << slept << "\n";
    }
    return out.str();
}

outcome refusal(const std::string &unit, const std::string &condition, long result) {
    return {.result = result,
            .code = 0xD00,
            .unit = unit,
            .log = {"ERR " + unit + ":N Invaild Argument (" + condition + ")=[0]"}};
}

void expect_outcome(const char *file, int line, const outcome &got, const outcome &expected) {
    const ::testing::ScopedTrace trace(file, line, "the call whose outcome is compared");
    EXPECT_EQ(expected.str(), got.str());
}

outcome test_rig::observe(const std::function<long()> &call) {
    now = {};
    KLIBCErrSetEx(0, "", 0);
    is_observing = true;
    now.result = call();
    release_forked();
    is_observing = false;
    now.code = KLIBCErrGet();
    now.unit = KLIBCErrorGetFile();
    return now;
}

void test_rig::answer(const std::string &command, int status, const std::string &output,
                      const std::function<void()> &effect) {
    replies_[command] = {status, output, effect, false};
}

void test_rig::let_run(const std::string &command) {
    replies_[command] = {0, "", {}, true};
}

void test_rig::fail(const std::string &operation, int nth) {
    EXPECT_TRUE(fault_operations().count(operation)) << operation << " is nothing that the rig can make fail";
    failures_[operation] = {nth - 1, false};
}

void test_rig::fail_from(const std::string &operation, int nth) {
    fail(operation, nth);
    failures_[operation].stays = true;
}

void test_rig::before(const std::string &operation, const std::function<void()> &look) {
    EXPECT_TRUE(fault_operations().count(operation)) << operation << " is nothing that the rig stands before";
    looks_[operation] = look;
}

void test_rig::answer_ioctl(ioctl_answer answer) {
    on_ioctl = std::move(answer);
}

void test_rig::answer_gethostname(std::function<int(char *, size_t)> answer) {
    on_gethostname = std::move(answer);
}

void test_rig::redirect(const std::string &path, const std::string &other) {
    redirects_[path] = other;
}

void test_rig::replace_file(const std::string &path, const std::string &content) {
    const std::string other = "/tmp/replaced-" + std::to_string(++files_);
    write_file(other, content);
    redirect(path, other);
}

void test_rig::hide(const std::string &path) {
    redirect(path, "/tmp/absent" + path);
}

void test_rig::on_sleep(const std::function<void(long)> &effect) {
    during_sleep = effect;
}

void test_rig::note_log(int level, const std::string &line) {
    std::string shown = without_line_numbers(line);
    if (!shown.empty() && shown.back() == '\n') {
        shown.pop_back();
    }
    now.log.push_back(level_name(level) + " " + shown);
}

int test_rig::note_command(const texts &words, std::string *output) {
    const std::string line = join(words);
    now.commands.push_back(line);
    const reply *best = nullptr;
    size_t longest = 0;
    for (const auto &[beginning, candidate] : replies_) {
        if (begins_with_words(line, beginning) && beginning.size() >= longest) {
            best = &candidate;
            longest = beginning.size();
        }
    }
    static const texts harmless{"/bin/cp", "/bin/mv", "/bin/mkdir", "/bin/rm"};
    if (best == nullptr) {
        return std::find(harmless.begin(), harmless.end(), words[0]) != harmless.end() ? -2 : 0;
    }
    if (best->is_real) {
        return -2;
    }
    if (best->effect) {
        best->effect();
    }
    if (output != nullptr) {
        *output = best->output;
    }
    return best->status;
}

bool test_rig::is_failing(const std::string &operation) {
    const auto look = looks_.find(operation);
    if (is_observing && look != looks_.end()) {
        is_observing = false; // what it does is not the call's
        look->second();
        is_observing = true;
    }
    if (!is_observing || failures_.empty()) {
        return false;
    }
    const auto found = failures_.find(operation);
    if (found == failures_.end() || found->second.skip-- > 0) {
        return false;
    }
    if (found->second.stays) {
        found->second.skip = 0;
    } else {
        failures_.erase(found);
    }
    return true;
}

texts test_rig::failures_left() const {
    texts left;
    for (const auto &[operation, how] : failures_) {
        for (const std::string &text :
             {operation, std::to_string(how.skip), std::string(how.stays ? "stays" : "once")}) {
            left.push_back(text);
        }
    }
    return left;
}

void test_rig::keep_failures(const texts &left) {
    failures_.clear();
    for (size_t i = 0; i + 2 < left.size(); i += 3) {
        failures_[left[i]] = {std::stoi(left[i + 1]), left[i + 2] == "stays"};
    }
}

std::string test_rig::redirected(const char *path) const {
    const std::string asked = path;
    for (auto known = redirects_.rbegin(); known != redirects_.rend(); ++known) { // the longest path first
        const auto &[from, to] = *known;
        if (asked.rfind(from, 0) == 0 && (asked.size() == from.size() || asked[from.size()] == '/')) {
            return to + asked.substr(from.size());
        }
    }
    return asked;
}

std::string test_rig::asked_for(const std::string &path) const {
    for (const auto &[from, to] : redirects_) {
        if (to == path) {
            return from;
        }
    }
    return path;
}

texts open_descriptors() {
    texts found;
    for (const auto &entry : fs::directory_iterator("/proc/self/fd")) {
        std::error_code gone;
        const std::string target = fs::read_symlink(entry.path(), gone).string();
        if (!gone) { // the iterator's own is gone by now
            found.push_back(target);
        }
    }
    std::erase_if(found, [](const std::string &target) { return target.rfind("/proc/", 0) == 0; });
    std::sort(found.begin(), found.end());
    return found;
}

void lay_out_clean_appliance() {
    for (const char *path : {"/etc/sysconfig", "/etc.defaults", "/etc/kova", "/etc/kovainfo.conf", "/etc/dhclient",
                             "/etc/ppp", "/etc/resolv.conf.bak", "/run/ddns", "/run/lock/kova", "/usr/kova",
                             "/etc/dhcpd", "/etc/iproute2/config", "/etc/gogoc"}) {
        fs::remove_all(path);
    }
    for (const char *path : {"/etc/sysconfig/network-scripts", "/etc.defaults", "/etc/kova", "/etc/dhclient/ipv4",
                             "/etc/ppp", "/etc/gogoc", "/run/ddns"}) {
        fs::create_directories(path);
    }
}

void unit_test::SetUp() {
    lay_out_clean_appliance();
    descriptors_ = open_descriptors();
    current_rig = &rig;
}

void unit_test::TearDown() {
    current_rig = nullptr;
    EXPECT_EQ(descriptors_, open_descriptors()) << "descriptors left open, or closed too often";
    for (const auto &[kind, count] : rig.held) {
        EXPECT_EQ(0, count) << kind << " left open, or closed too often";
    }
}

void write_file(const std::string &path, const std::string &content) {
    fs::create_directories(fs::path(path).parent_path());
    std::ofstream(path, std::ios::binary | std::ios::trunc) << content;
    ASSERT_EQ(content, read_file(path));
}

std::string read_file(const std::string &path) {
    std::ifstream file(path, std::ios::binary);
    if (!file) {
        return "<absent>";
    }
    std::ostringstream content;
    content << file.rdbuf();
    return content.str();
}

texts list_dir(const std::string &path) {
    texts names;
    for (const auto &entry : fs::directory_iterator(path)) {
        names.push_back(entry.path().filename().string());
    }
    std::sort(names.begin(), names.end());
    return names;
}

unsigned mode_of(const std::string &path) {
    return fs::exists(path) ? static_cast<unsigned>(fs::status(path).permissions()) : 0;
}

std::string ifcfg(const std::string &ifname) {
    return "/etc/sysconfig/network-scripts/ifcfg-" + ifname;
}

void shell(const std::string &line) {
    // NOLINTNEXTLINE(cert-env33-c): a test's own line
    ASSERT_EQ(0, system(line.c_str())) << line;
}

std::string long_text(size_t length, char byte) {
    std::string text;
    text.assign(length, byte);
    return text;
}

lock_elsewhere::lock_elsewhere(uint32_t word) {
    int ready[2];
    if (pipe(ready) != 0) {
        ADD_FAILURE() << "pipe";
        return;
    }
    holder_ = fork();
    if (holder_ == 0) {
        const char answer = KLIBCFileLock(word, 5) == 0 ? 'y' : 'n';
        (void)!write(ready[1], &answer, 1);
        pause();
        _exit(0);
    }
    char answer = 'n';
    close(ready[1]);
    EXPECT_EQ(1, read(ready[0], &answer, 1));
    EXPECT_EQ('y', answer);
    close(ready[0]);
}

lock_elsewhere::~lock_elsewhere() {
    kill(holder_, SIGKILL);
    waitpid(holder_, nullptr, 0);
}

const texts &bad_names() {
    static const texts names{
        "eth 0", "eth/0",  "/etc/passwd",  "../../etc/passwd", ".",    "..", "eth0\n", "eth0\nIPADDR=1",
        "\x01",  "eth0\t", long_text(256), long_text(4096),    "a\x7f"};
    return names;
}

} // namespace kova_test
