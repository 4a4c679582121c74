// kova-box: runs a command in a throw-away appliance of namespaces and memory over the system it is started on.
#include "guest.h"
#include "guest_init.h"
#include "init.h"
#include "supervisor.h"

#include <CLI/CLI.hpp>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <iterator>
#include <unistd.h>

namespace {

// Interface names go into commands, so what is not a plain name is refused here.
std::string refuse_link_name(const std::string &name) {
    const bool plain = !name.empty() && name.size() < 16 && name[0] != '-' && name != "." && name != ".." &&
                       std::all_of(name.begin(), name.end(), [](unsigned char c) { return isgraph(c) && c != '/'; });
    return plain ? "" : "not an interface name: " + name;
}

std::string refuse_size(const std::string &size) {
    const std::size_t digits = size.find_first_not_of("0123456789");
    const std::string unit = digits == std::string::npos ? "" : size.substr(digits);
    const bool known = unit.empty() || unit == "k" || unit == "m" || unit == "g" || unit == "%";
    return digits != 0 && !size.empty() && known ? "" : "not a size such as 512m, 1g or 20%: " + size;
}

std::string refuse_hostname(const std::string &name) {
    return name.empty() || name.size() > 64 ? "a host name has 1 to 64 characters" : "";
}

std::string text_of(const std::string &path) {
    std::ifstream file(path);
    return {std::istreambuf_iterator<char>(file), {}};
}

// Reads the command line into the options. Throws CLI::Error, also for --help.
void parse(CLI::App &app, int argc, char **argv, kova::box_options &options) {
    std::string ovs_bonds;
    int internal_lan_ports = 0;
    bool no_network = false;
    app.footer("What follows -- is the command: kova-box [OPTIONS] -- COMMAND [ARG...]");
    app.add_option("--tree", options.trees, "directory copied over the root; later ones win")
        ->type_name("DIR")
        ->expected(1)
        ->take_all()
        ->check(CLI::ExistingDirectory);
    app.add_option("--share", options.shares, "directory that stays the host's own inside, to be written to")
        ->type_name("DIR")
        ->expected(1)
        ->take_all()
        ->check(CLI::ExistingDirectory);
    app.add_option("--link", options.links, "interface wired to the namespace \"net\" (eth0)")
        ->type_name("NAME")
        ->expected(1)
        ->take_all()
        ->check(refuse_link_name);
    app.add_flag("--no-network", no_network, "loopback only");
    app.add_flag("--guest", options.guest, "on a kernel of its own, which has every kind of interface");
    app.add_option("--kernel", options.kernel, "kernel of the guest")->type_name("FILE")->capture_default_str();
    app.add_option("--boot-limit", options.boot_limit, "time for the guest to become ready")
        ->type_name("SECONDS")
        ->check(CLI::Range(1, 3600))
        ->capture_default_str();
    app.add_option("--limit", options.limit, "time for the command; after it, it is ended and the status is 124")
        ->type_name("SECONDS")
        ->check(CLI::Range(1, 1000000));
    app.add_option("--size", options.size, "limit of what can be written inside")
        ->check(refuse_size)
        ->capture_default_str();
    app.add_option("--name", options.hostname, "host name")->check(refuse_hostname)->capture_default_str();
    app.add_option("--ovs-bonds", ovs_bonds, "file shown as /sys/class/net/kova_ovs_bonds")
        ->type_name("FILE")
        ->check(CLI::ExistingFile);
    auto *ports = app.add_option("--internal-lan-ports", internal_lan_ports,
                                 "number shown in /proc/sys/kernel/kova_internal_netif_num")
                      ->type_name("N")
                      ->check(CLI::NonNegativeNumber);

    // the command's own arguments are nothing to interpret
    char **const separator = std::find_if(argv, argv + argc, [](const char *word) { return strcmp(word, "--") == 0; });
    app.parse(static_cast<int>(separator - argv), argv);
    options.command.assign(std::min(separator + 1, argv + argc), argv + argc);
    if (options.command.empty()) {
        throw CLI::ValidationError("a command is needed after --");
    }
    options.network = !no_network;
    if (!ovs_bonds.empty()) {
        options.ovs_bonds = text_of(ovs_bonds);
    }
    if (ports->count() > 0) {
        options.internal_lan_ports = internal_lan_ports;
    }
}

int run(int argc, char **argv) {
    CLI::App app{"Runs a command in a throw-away appliance; nothing of it stays on this system."};
    kova::box_options options;
    try {
        parse(app, argc, argv, options);
    } catch (const CLI::Success &help) {
        return app.exit(help);
    }
    return options.guest ? kova::run_guest(options, {argv, argv + argc}) : kova::run_box(options);
}

} // namespace

int main(int argc, char **argv) {
    try {
        if (getpid() == 1 && argc > 1 && strcmp(argv[1], kova::kGuestInit) == 0) {
            kova::guest_init();
        }
        return run(argc, argv);
    } catch (const std::exception &error) {
        fprintf(stderr, "kova-box: %s\n", error.what());
        return kova::kNoBox;
    } catch (...) {
        return kova::kNoBox;
    }
}
