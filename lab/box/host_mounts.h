// What is mounted on the host.
#ifndef KOVA_LAB_BOX_HOST_MOUNTS_H
#define KOVA_LAB_BOX_HOST_MOUNTS_H

#include <filesystem>
#include <vector>

namespace kova {

// The mount points that can be seen, each once, a directory before those below it.
std::vector<std::filesystem::path> host_mount_points();

} // namespace kova

#endif
