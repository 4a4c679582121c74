#include "layers.h"

#include "system.h"

#include <sys/stat.h>
#include <unistd.h>

namespace kova {

namespace fs = std::filesystem;

namespace {

// A new directory looks like the one of the host that it covers. An ordinary user's box cannot give files away: there
// the owner stays the user.
void make_like_host(const fs::path &target, const fs::path &directory, mode_t mode) {
    require(mkdir(target.c_str(), 0755) == 0, "cannot make the directory " + target.string());
    struct stat host;
    if (stat(directory.c_str(), &host) == 0 && S_ISDIR(host.st_mode)) {
        mode = host.st_mode & 07777;
        if (chown(target.c_str(), host.st_uid, host.st_gid) != 0 && errno != EINVAL && errno != EPERM) {
            require(false, "cannot give " + target.string() + " its owner");
        }
    }
    require(chmod(target.c_str(), mode) == 0, "cannot give " + target.string() + " its mode");
}

bool is_link_of_host(const fs::path &path) {
    return fs::is_symlink(fs::symlink_status(path));
}

} // namespace

upper_layers::upper_layers(fs::path folder, const fs::path &root) : folder_(std::move(folder)) {
    layers_["/"] = root;
}

fs::path upper_layers::add(const fs::path &directory) {
    fs::path layer = folder_ / std::to_string(layers_.size());
    make_like_host(layer, directory, 0755);
    layers_[directory] = layer;
    return layer;
}

fs::path upper_layers::place(const fs::path &directory) const {
    fs::path point = directory;
    while (!layers_.count(point)) {
        point = point.parent_path();
    }
    const fs::path &layer = layers_.at(point);
    return point == directory ? layer : layer / directory.lexically_relative(point);
}

fs::path upper_layers::cover(const fs::path &directory, mode_t mode) {
    const fs::path real = fs::weakly_canonical(directory);
    fs::path target = place(real);
    if (!fs::exists(target)) {
        cover(real.parent_path());
        make_like_host(target, real, mode);
    }
    return target;
}

void upper_layers::copy_entry(const fs::directory_entry &from, const fs::path &directory) {
    const fs::path target = cover(directory) / from.path().filename();
    if (from.is_symlink()) {
        fs::remove(target);
        fs::copy_symlink(from.path(), target);
    } else if (from.is_regular_file()) {
        fs::remove(target); // never through a link that is there
        fs::copy_file(from.path(), target);
    }
}

void upper_layers::copy_tree(const fs::path &from, const fs::path &to, unreadable policy) {
    const auto options =
        policy == unreadable::skip ? fs::directory_options::skip_permission_denied : fs::directory_options::none;
    for (const fs::directory_entry &entry : fs::directory_iterator(from, options)) {
        const fs::path target = to / entry.path().filename();
        if (to == "/" && entry.is_symlink() && is_link_of_host(target)) {
            continue; // both have the same usual link, bin -> usr/bin
        }
        if (entry.is_directory() && !entry.is_symlink()) {
            cover(target, static_cast<mode_t>(entry.status().permissions()));
            copy_tree(entry.path(), target, policy);
        } else if (policy == unreadable::fail || entry.is_symlink() || access(entry.path().c_str(), R_OK) == 0) {
            copy_entry(entry, to);
        }
    }
}

} // namespace kova
