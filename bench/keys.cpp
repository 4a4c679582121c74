// Changing and reading one key of a configuration file on a real disk.
#include "rows.h"
#include "world.h"

#include <cstdio>
#include <fcntl.h>
#include <kova/core.h>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>

namespace kova {

namespace {

constexpr char kText[] = "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\nIPV6INIT=auto\nNETMASK=255.255.255.0\n"
                         "MTU=1500\nPRIMARY=yes\nIPADDR=";
constexpr const char *kValues[] = {"192.168.1.10\n", "192.168.1.11\n"};
constexpr char kLock[] = "/run/lock/bench";

/** Interface file whose address changes at every step, so that there is always something to write. */
class changing_file {
public:
    explicit changing_file(const char *name) : path_(directory_.file(name)) { write_file(path_, text()); }

    [[nodiscard]] const std::string &path() const { return path_; }
    void set_by_library() {
        std::string value = next_value();
        value.pop_back();
        require_done(KLIBCFileSetKeyValue(path_.c_str(), "IPADDR", value.c_str(), "%s=%s\n") == 0,
                     "KLIBCFileSetKeyValue failed");
    }
    void set_by_system_calls();
    void set_by_sed() {
        const std::string value = next_value();
        silent_program{{"sed", "-i", "s/^IPADDR=.*/IPADDR=" + value.substr(0, value.size() - 1) + "/", path_}}.run();
    }

private:
    const char *next_value() { return kValues[++step_ % 2]; }
    [[nodiscard]] std::string text() const { return std::string(kText) + kValues[step_ % 2]; }

    disk_directory directory_;
    std::string path_;
    unsigned step_ = 0;
};

/** Open, lock, read, write, sync, rename, sync of the directory: no less makes a change that a power cut cannot halve.
 */
void changing_file::set_by_system_calls() {
    next_value();
    const unique_fd lock = open_file(kLock, O_RDWR | O_CREAT);
    struct flock all = {};
    all.l_type = F_WRLCK;
    require(fcntl(lock.get(), F_OFD_SETLK, &all) == 0, "cannot lock");
    read_whole(path_.c_str());

    const std::string temporary = path_ + ".new";
    const std::string fresh = text();
    const unique_fd file = open_file(temporary, O_WRONLY | O_CREAT | O_EXCL);
    require(write(file.get(), fresh.data(), fresh.size()) == static_cast<ssize_t>(fresh.size()), "cannot write");
    require(fchmod(file.get(), 0644) == 0 && fsync(file.get()) == 0, "cannot sync");
    require(rename(temporary.c_str(), path_.c_str()) == 0, "cannot rename");
    const unique_fd folder = open_file(path_.substr(0, path_.rfind('/')), O_RDONLY | O_DIRECTORY);
    require(fsync(folder.get()) == 0, "cannot sync");
}

sides rewrite_against(void (changing_file::*theirs)()) {
    const auto our_file = std::make_shared<changing_file>("ifcfg-eth0");
    const auto their_file = std::make_shared<changing_file>("ifcfg-eth0");
    return {timed([our_file] { our_file->set_by_library(); }),
            timed([their_file, theirs] { ((*their_file).*theirs)(); })};
}

sides rewrite_against_floor() {
    return rewrite_against(&changing_file::set_by_system_calls);
}

sides rewrite_against_sed() {
    return rewrite_against(&changing_file::set_by_sed);
}

sides read_against_floor() {
    constexpr int kTimes = 100;
    const auto file = std::make_shared<changing_file>("ifcfg-eth0");
    return {timed(kTimes,
                  [file] {
                      char value[64];
                      require_done(KLIBCFileGetKeyValue(file->path().c_str(), "IPADDR", value, sizeof value, 0) > 0,
                                   "KLIBCFileGetKeyValue failed");
                  }),
            timed(kTimes, [file] { read_whole(file->path().c_str()); })};
}

} // namespace

contests key_contests() {
    const std::string rewrite = "KLIBCFileSetKeyValue, a file on disk";
    return {
        {"key-set", "floor", rewrite, "read, lock, write, fsync, rename, fsync", 1.3, 60, rewrite_against_floor},
        {"key-set", "sed", rewrite, "sed -i, which syncs nothing", std::nullopt, 40, rewrite_against_sed},
        {"key-get", "floor", "KLIBCFileGetKeyValue", "open, read, close", std::nullopt, 60, read_against_floor},
    };
}

} // namespace kova
