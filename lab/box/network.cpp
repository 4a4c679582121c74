#include "network.h"

#include <fcntl.h>
#include <filesystem>
#include <sched.h>
#include <sstream>
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

// The command that makes a link from the other side. The two ends get different numbers: the kernel puts off by up to a
// second what happens to a link whose peer has the same number. Process 1 of the box is this one.
std::string add_link(const std::string &name, int number) {
    std::ostringstream command;
    command << "link add " << name << " index " << number << " type veth peer name " << name << " netns 1\n";
    return command.str();
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

    std::string there = here;
    int number = 101;
    for (const std::string &link : options.links) {
        const std::string bring_up = "link set " + link + " up\n";
        there += add_link(link, number++) + bring_up;
        here += bring_up;
    }
    run_program({"ip", "-n", "net", "-batch", "-"}, there);
    run_program({"ip", "-batch", "-"}, here);
}

} // namespace kova
