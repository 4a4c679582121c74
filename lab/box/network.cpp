#include "network.h"

#include <fcntl.h>
#include <filesystem>
#include <sched.h>
#include <sys/mount.h>

namespace kova {

namespace {

const std::string kOwnNamespace = "/proc/self/ns/net";

void new_network_namespace() {
    require(unshare(CLONE_NEWNET) == 0, "cannot make a network namespace");
}

// Addresses are usable and routers asked at once: duplicate detection alone would cost a second per address. Only links
// that are made afterwards take these values over.
void make_ipv6_quick() {
    const std::string folder = "/proc/sys/net/ipv6/conf/default/";
    if (!std::filesystem::exists(folder)) {
        return; // a kernel without IPv6
    }
    for (const char *key : {"accept_dad", "dad_transmits", "router_solicitation_delay"}) {
        write_file(folder + key, "0");
    }
}

void make_ipv6_quick_in(const unique_fd &other_side) {
    const unique_fd own = open_file(kOwnNamespace, O_RDONLY);
    require(setns(other_side.get(), CLONE_NEWNET) == 0, "cannot enter the other side's network namespace");
    make_ipv6_quick();
    require(setns(own.get(), CLONE_NEWNET) == 0, "cannot return to the box's network namespace");
}

// Gives the other side the name under which `ip netns` finds it; shared, as `ip netns add` expects it.
void name_other_side(const unique_fd &other_side) {
    const std::string names = "/run/netns";
    make_directories(names);
    bind_mount(names, names);
    require(mount("", names.c_str(), nullptr, MS_SHARED | MS_REC, nullptr) == 0, "cannot share " + names);
    write_file(names + "/net", "");
    bind_mount(path_of(other_side), names + "/net");
}

} // namespace

unique_fd enter_network_namespace(const box_options &options) {
    new_network_namespace();
    if (!options.network) {
        return unique_fd{};
    }
    unique_fd other_side = open_file(kOwnNamespace, O_RDONLY);
    new_network_namespace();
    return other_side;
}

void wire_network(const box_options &options, const unique_fd &other_side) {
    make_ipv6_quick();
    std::string here = "link set lo up\n";
    if (!options.network) {
        run_program({"ip", "-batch", "-"}, here);
        return;
    }
    make_ipv6_quick_in(other_side);
    name_other_side(other_side);

    // The two ends get different numbers: the kernel may put off by a second what happens to a link whose peer has its
    // own number, which it takes for a link without one. Process 1 of the box is this one.
    std::string there = here;
    int number = 101;
    for (const std::string &link : options.links) {
        there +=
            "link add " + link + " index " + std::to_string(number++) + " type veth peer name " + link + " netns 1\n";
        there += "link set " + link + " up\n";
        here += "link set " + link + " up\n";
    }
    run_program({"ip", "-n", "net", "-batch", "-"}, there);
    run_program({"ip", "-batch", "-"}, here);
}

} // namespace kova
