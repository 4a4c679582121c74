// Reading all interfaces of a machine.
#include "rows.h"
#include "world.h"

#include <array>
#include <cstring>
#include <fcntl.h>
#include <kovanetsdk/iface.h>
#include <kovanetsdk/stats.h>
#include <linux/if_vlan.h>
#include <linux/sockios.h>
#include <memory>
#include <net/if.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/utsname.h>
#include <unistd.h>

namespace kova {

namespace {

constexpr int kMany = 1000; // interfaces of a machine full of virtual ones
constexpr int kCards = 32;  // the most that an enumeration looks at
constexpr int kLogicalCards = 2;
constexpr char kCounters[] = "/proc/net/dev";

// ---- counters

sides counters_against(const measure &theirs) {
    const auto world = std::make_shared<interfaces>(kMany, interfaces::state::down);
    const std::shared_ptr<NETSTAT> records{KLIBNetStatInit(kMany), KLIBNetStatFree};
    return {timed([world, records] {
                require_done(KLIBNetStatGetAll(records.get(), kMany) == kMany, "KLIBNetStatGetAll failed");
            }),
            theirs};
}

sides counters_against_floor() {
    return counters_against(timed([] { read_whole(kCounters); }));
}

sides counters_against_ip() {
    return counters_against(time_of_run({"ip", "-j", "-s", "link"}));
}

// ---- cards

void read_cards() {
    IFINFO records[kCards];
    // every one but the loopback
    require_done(KLIBNetGetInterfaceInfo(records, kCards, kLogicalCards) == kCards - 1,
                 "KLIBNetGetInterfaceInfo failed");
}

/** Reads a small file the way configuration files are read, if it is there. */
void read_if_there(const std::string &path) {
    char text[65536];
    struct stat status;
    const unique_fd file{open(path.c_str(), O_RDONLY | O_CLOEXEC)};
    if (file.get() >= 0) {
        require(fstat(file.get(), &status) == 0, path);
        while (read(file.get(), text, sizeof text) > 0) {
        }
    }
}

bool has_vlans() {
    if (access("/sys/module/8021q", F_OK) == 0) {
        return true;
    }
    utsname system;
    require(uname(&system) == 0, "uname");
    read_if_there("/proc/modules");
    read_if_there(std::string("/lib/modules/") + system.release + "/modules.builtin");
    return access("/proc/net/vlan/config", F_OK) == 0;
}

/** A name with the paths that tell whether its interface belongs to a bridge or a virtual switch. */
struct card {
    std::string name;
    std::string bridge_port = "/sys/class/net/" + name + "/brport";
    std::string switch_port = "/sys/devices/virtual/net/ovs_" + name;
};

void ask_about_card(int socket, const card &one, bool vlans) {
    ifreq request = {};
    memcpy(request.ifr_name, one.name.c_str(), one.name.size() + 1);
    require(ioctl(socket, SIOCGIFFLAGS, &request) == 0, "flags");
    if (vlans) {
        vlan_ioctl_args below = {};
        below.cmd = GET_VLAN_REALDEV_NAME_CMD;
        memcpy(below.device1, one.name.c_str(), one.name.size() + 1);
        require_done(ioctl(socket, SIOCGIFVLAN, &below) < 0, "an interface is a VLAN");
    }
    if ((request.ifr_flags & IFF_LOOPBACK) != 0) {
        return;
    }
    require_done(access(one.bridge_port.c_str(), R_OK) < 0 && access(one.switch_port.c_str(), R_OK) < 0,
                 "an interface is a port");
    require_done(open("/sys/class/net/kova_ovs_bonds", O_RDONLY | O_CLOEXEC) < 0, "there is a virtual switch");
    for (const unsigned long command : {SIOCGIFHWADDR, SIOCGIFADDR, SIOCGIFNETMASK}) {
        require(ioctl(socket, command, &request) == 0 || errno == EADDRNOTAVAIL, "an address");
    }
}

/** The requests of the enumeration, with names and paths ready made and the answers thrown away. */
void ask_about_cards(const std::vector<card> &cards) {
    const bool vlans = has_vlans();
    read_if_there("/etc/kova/platform.conf"); // whether there is a cluster
    read_whole(kCounters);
    const unique_fd requests{socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0)};
    for (const card &one : cards) {
        ask_about_card(requests.get(), one, vlans);
    }
}

std::vector<card> all_cards() {
    std::array<NETSTAT, kCards> records;
    const int count = KLIBNetStatGetAll(records.data(), kCards);
    require_done(count == kCards, "KLIBNetStatGetAll failed");
    std::vector<card> cards;
    for (const NETSTAT &record : records) {
        cards.push_back({record.szIfname});
    }
    return cards;
}

sides cards_against_floor() {
    const auto world = std::make_shared<interfaces>(kCards, interfaces::state::addressed);
    return {timed([world] { read_cards(); }), timed([cards = all_cards()] { ask_about_cards(cards); })};
}

sides cards_against_ip() {
    const auto world = std::make_shared<interfaces>(kCards, interfaces::state::addressed);
    return {timed([world] { read_cards(); }), time_of_run({"ip", "-j", "addr"})};
}

} // namespace

contests interface_contests() {
    const std::string counters = "KLIBNetStatGetAll, 1,000 interfaces";
    const std::string cards = "KLIBNetGetInterfaceInfo, 32 interfaces";
    return {
        {"counters", "floor", counters, "bare read of /proc/net/dev", 1.3, 200, counters_against_floor},
        {"counters", "ip", counters, "ip -j -s link", 0.2, 20, counters_against_ip},
        {"cards", "floor", cards, "the same kernel requests, bare", 1.3, 300, cards_against_floor},
        {"cards", "ip", cards, "ip -j addr", std::nullopt, 50, cards_against_ip},
    };
}

} // namespace kova
