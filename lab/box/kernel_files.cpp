#include "kernel_files.h"

#include "system.h"

#include <filesystem>

namespace kova {

namespace fs = std::filesystem;

namespace {

const fs::path kNetClass = "/sys/class/net";
const fs::path kOwnNetClass = "/run/.class_net";
const fs::path kKernelKeys = "/proc/sys/kernel";
const fs::path kRealKernelKeys = "/run/.sys_kernel";

// An overlay keeps showing interfaces as they come and go. The file stays changeable in the directory below.
void show_ovs_bonds(const std::string &text) {
    make_directories(kOwnNetClass);
    write_file(kOwnNetClass / "kova_ovs_bonds", text);
    mount_new("overlay", kNetClass, 0, "lowerdir=" + kOwnNetClass.string() + ":" + kNetClass.string());
}

// Entries of /proc/sys cannot lie below an overlay; links into a second mount of the real ones do.
void show_internal_lan_ports(int ports) {
    make_directories(kRealKernelKeys);
    bind_mount(kKernelKeys, kRealKernelKeys);
    mount_new("tmpfs", kKernelKeys, 0, "mode=755");
    for (const fs::directory_entry &entry : fs::directory_iterator(kRealKernelKeys)) {
        fs::create_symlink(entry.path(), kKernelKeys / entry.path().filename());
    }
    write_file(kKernelKeys / "kova_internal_netif_num", std::to_string(ports) + "\n");
}

} // namespace

void add_kernel_files(const box_options &options) {
    if (options.ovs_bonds) {
        show_ovs_bonds(*options.ovs_bonds);
    }
    if (options.internal_lan_ports) {
        show_internal_lan_ports(*options.internal_lan_ports);
    }
}

} // namespace kova
