// What a box is to be made of: the command line of kova-box, checked.
#ifndef KOVA_LAB_BOX_OPTIONS_H
#define KOVA_LAB_BOX_OPTIONS_H

#include <optional>
#include <string>
#include <vector>

namespace kova {

struct box_options {
    std::vector<std::string> trees;         // directories copied over the root, later ones win
    std::vector<std::string> shares;        // host directories that stay the host's own inside
    std::vector<std::string> links{"eth0"}; // names of the veth pairs
    std::string hostname = "appliance";
    std::string size = "1g";               // limit of everything written inside, as tmpfs takes it
    std::optional<std::string> ovs_bonds;  // text of /sys/class/net/kova_ovs_bonds
    std::optional<int> internal_lan_ports; // number in /proc/sys/kernel/kova_internal_netif_num
    bool network = true;                   // false: loopback only, no other side
    bool guest = false;                    // on a kernel of its own
    std::string kernel = "/usr/bin/linux.uml";
    unsigned boot_limit = 300; // seconds for the guest to become ready
    unsigned limit = 0;        // seconds for the command, 0 for any time
    std::vector<std::string> command;
};

} // namespace kova

#endif
