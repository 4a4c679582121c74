#include "private_root.h"

#include "host_mounts.h"
#include "layers.h"
#include "system.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <fcntl.h>
#include <filesystem>
#include <optional>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace kova {

namespace fs = std::filesystem;

namespace {

// The new root grows in memory over /tmp: every system has that directory, and the box gets its own one anyway. What
// the caller names below the host's /tmp is opened before and reached through descriptors.
const fs::path kStage = "/tmp";
const fs::path kRoot = kStage / "root";
const fs::path kUpper = kStage / "upper";
const fs::path kWork = kStage / "work";

constexpr unsigned long kKernelFlags = MS_NOSUID | MS_NODEV | MS_NOEXEC;

// A directory of the host, reachable whatever is mounted over it.
struct host_directory {
    fs::path path;
    unique_fd fd;
};

std::vector<host_directory> open_directories(const std::vector<std::string> &paths) {
    std::vector<host_directory> directories;
    directories.reserve(paths.size());
    for (const std::string &path : paths) {
        directories.push_back({fs::canonical(path), open_file(path, O_PATH | O_DIRECTORY)});
    }
    return directories;
}

// Directories that the box makes anew instead of showing the host's.
bool is_below_own_directory(const fs::path &path) {
    constexpr std::array own{"proc", "sys", "dev", "run", "tmp"};
    const std::string top = path.relative_path().begin()->string();
    return std::find(own.begin(), own.end(), top) != own.end();
}

// ---- layers

// One directory of the host that the box shows through an overlay.
struct overlay {
    fs::path point; // where it is, on the host as in the box
    fs::path lower; // where the host's directory can be reached
    fs::path upper; // what is written above it
};

// One overlay cannot be laid over "/" itself with its layer below, so every directory at the top gets its own; so does
// every mount below, because an overlay shows only the file system that its lower directory is on.
std::vector<overlay> overlays_of_system() {
    std::vector<overlay> overlays;
    for (const fs::directory_entry &entry : fs::directory_iterator("/")) {
        if (entry.is_directory() && !entry.is_symlink() && !is_below_own_directory(entry.path())) {
            overlays.push_back({entry.path(), entry.path(), {}});
        }
    }
    for (const fs::path &point : host_mount_points()) {
        if (point != "/" && point.parent_path() != "/" && fs::is_directory(point) && !is_below_own_directory(point)) {
            overlays.push_back({point, point, {}});
        }
    }
    return overlays;
}

// Of the host's /tmp and /run only the working directory is kept, so that programs in it can be run from there too.
std::optional<host_directory> temporary_working_directory() {
    std::error_code gone;
    const fs::path directory = fs::current_path(gone);
    const std::string parent = directory.parent_path().relative_path().string() + "/";
    if (gone || (!parent.starts_with("tmp/") && !parent.starts_with("run/"))) {
        return std::nullopt;
    }
    return host_directory{directory, open_file(".", O_PATH | O_DIRECTORY)};
}

// A container's /etc/resolv.conf and the like are mounts of single files: an overlay would show what is below them.
void copy_mounted_files(upper_layers &layers) {
    for (const fs::path &point : host_mount_points()) {
        if (fs::is_regular_file(point) && !is_below_own_directory(point) && access(point.c_str(), R_OK) == 0) {
            layers.copy_entry(fs::directory_entry(point), point.parent_path());
        }
    }
}

// To an ordinary user the files of others stay foreign in an overlay, so what an appliance has to change is copied.
void make_writable_for_user(upper_layers &layers) {
    layers.copy_tree("/etc", "/etc", unreadable::skip);
    for (const char *directory : {"/usr/bin", "/usr/sbin", "/usr/lib", "/usr/share", "/var/cache", "/var/lib/dhcp",
                                  "/var/lib/misc", "/var/log", "/var/spool", "/var/tmp"}) {
        layers.cover(directory);
    }
}

// ---- mounts

std::string overlay_escaped(const fs::path &path) {
    std::string escaped;
    for (const char c : path.string()) {
        if (c == '\\' || c == ':' || c == ',') {
            escaped += '\\';
        }
        escaped += c;
    }
    return escaped;
}

void bind_with(const fs::path &source, const fs::path &target, std::uint64_t set, std::uint64_t clear) {
    bind_mount(source, target);
    struct mount_attr attributes = {};
    attributes.attr_set = set;
    attributes.attr_clr = clear;
    require(mount_setattr(AT_FDCWD, target.c_str(), AT_RECURSIVE, &attributes, sizeof attributes) == 0,
            "cannot set what may be written in " + target.string());
}

void bind_read_only(const fs::path &source, const fs::path &target) {
    bind_with(source, target, MOUNT_ATTR_RDONLY, 0);
}

void bind_writable(const fs::path &source, const fs::path &target) {
    bind_with(source, target, 0, MOUNT_ATTR_RDONLY);
}

void mount_overlay(const overlay &layer, bool mapped) {
    const fs::path target = kRoot / layer.point.relative_path();
    const fs::path work = kWork / layer.upper.filename();
    make_directories(target);
    make_directories(work);
    const std::string options = "lowerdir=" + overlay_escaped(layer.lower) + ",upperdir=" + layer.upper.string() +
                                ",workdir=" + work.string() + (mapped ? ",userxattr" : "");
    if (mount("overlay", target.c_str(), "overlay", 0, options.c_str()) == 0) {
        return;
    }
    // some file systems cannot lie below an overlay; they can still be looked at when nothing is to be written there
    require(fs::is_empty(layer.upper), "cannot lay an overlay over " + layer.point.string());
    bind_read_only(layer.lower, target);
}

void copy_top_links() {
    for (const fs::directory_entry &entry : fs::directory_iterator("/")) {
        if (entry.is_symlink()) {
            fs::copy_symlink(entry.path(), kRoot / entry.path().filename());
        }
    }
}

void mount_devices() {
    const fs::path dev = kRoot / "dev";
    mount_new("tmpfs", dev, MS_NOSUID, "mode=755");
    for (const char *name : {"null", "zero", "full", "random", "urandom", "tty", "net/tun", "ppp", "fuse"}) {
        const fs::path host = fs::path("/dev") / name;
        if (fs::exists(host)) {
            make_directories((dev / name).parent_path());
            write_file(dev / name, "");
            bind_mount(host, dev / name);
        }
    }
    constexpr std::array<std::array<const char *, 2>, 5> links{{{"fd", "/proc/self/fd"},
                                                                {"stdin", "/proc/self/fd/0"},
                                                                {"stdout", "/proc/self/fd/1"},
                                                                {"stderr", "/proc/self/fd/2"},
                                                                {"ptmx", "pts/ptmx"}}};
    for (const auto &[name, target] : links) {
        fs::create_symlink(target, dev / name);
    }
    make_directories(dev / "pts");
    make_directories(dev / "shm");
    mount_new("devpts", dev / "pts", MS_NOSUID | MS_NOEXEC, "newinstance,ptmxmode=0666,mode=620");
    mount_new("tmpfs", dev / "shm", MS_NOSUID | MS_NODEV, "mode=1777");
}

// Root in a box is the host's root to the kernel: of the kernel's own settings only those of this box's namespaces may
// be written, and the one that only costs time.
void protect_kernel_settings() {
    const fs::path proc = kRoot / "proc";
    for (const char *hosts : {"sys", "sysrq-trigger"}) {
        if (fs::exists(proc / hosts)) {
            bind_read_only(proc / hosts, proc / hosts);
        }
    }
    for (const char *own : {"sys/net", "sys/kernel/hostname", "sys/kernel/domainname", "sys/vm/drop_caches"}) {
        bind_writable(proc / own, proc / own);
    }
}

void mount_kernel_directories(bool mapped) {
    for (const char *name : {"proc", "sys", "dev"}) {
        make_directories(kRoot / name);
    }
    mount_new("proc", kRoot / "proc", kKernelFlags);
    mount_new("sysfs", kRoot / "sys", kKernelFlags);
    mount_devices();
    if (!mapped) {
        protect_kernel_settings();
    }
}

void mount_own_directories(const fs::path &run, const fs::path &tmp) {
    make_directories(kRoot / "run");
    make_directories(kRoot / "tmp");
    require(chmod(tmp.c_str(), 01777) == 0, "cannot open /tmp to all");
    bind_mount(run, kRoot / "run");
    bind_mount(tmp, kRoot / "tmp");
    make_directories(kRoot / "run/lock");
    // `ip netns exec` mounts a sysfs in place of /sys; a user may do that only while another whole one is mounted
    make_directories(kRoot / "run/.sysfs");
    mount_new("sysfs", kRoot / "run/.sysfs", kKernelFlags);
}

void mount_shares(const std::vector<host_directory> &shares) {
    for (const host_directory &share : shares) {
        const fs::path target = kRoot / share.path.relative_path();
        make_directories(target);
        bind_mount(path_of(share.fd), target);
    }
}

void change_root() {
    require(chdir(kRoot.c_str()) == 0, "cannot enter the new root");
    // with the same directory for both, the old root ends up over the new one, where it is taken off
    require(syscall(SYS_pivot_root, ".", ".") == 0, "cannot change the root");
    require(umount2(".", MNT_DETACH) == 0, "cannot leave the host's root");
}

} // namespace

void enter_private_root(const box_options &options, bool mapped) {
    require(mount("", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0, "cannot part from the host's mounts");
    const std::vector<host_directory> trees = open_directories(options.trees);
    const std::vector<host_directory> shares = open_directories(options.shares);
    const std::optional<host_directory> kept = temporary_working_directory();
    std::vector<overlay> overlays = overlays_of_system();

    mount_new("tmpfs", kStage, MS_NODEV, "mode=755,size=" + options.size);
    for (const fs::path &directory : {kRoot, kUpper, kWork}) {
        make_directories(directory);
    }
    upper_layers layers(kUpper, kRoot);
    for (overlay &system : overlays) {
        system.upper = layers.add(system.point);
    }
    const fs::path run = layers.add("/run");
    const fs::path tmp = layers.add("/tmp");

    copy_mounted_files(layers);
    if (mapped) {
        make_writable_for_user(layers);
    }
    copy_top_links();
    for (const host_directory &tree : trees) {
        layers.copy_tree(path_of(tree.fd), "/", unreadable::fail);
    }

    bind_mount(kRoot, kRoot); // only a mount point can become the root
    for (const overlay &system : overlays) {
        mount_overlay(system, mapped);
    }
    mount_kernel_directories(mapped);
    mount_own_directories(run, tmp);
    if (kept) {
        mount_overlay({kept->path, path_of(kept->fd), layers.add(kept->path)}, mapped);
    }
    mount_shares(shares);
    change_root();
}

} // namespace kova
