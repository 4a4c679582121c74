// Reading all interfaces of a machine.
#include "rows.h"
#include "world.h"

#include <array>
#include <cstring>
#include <fcntl.h>
#include <kovanetsdk/iface.h>
#include <kovanetsdk/stats.h>
#include <memory>
#include <net/if.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

namespace kova {

namespace {

constexpr int kMany = 1000; // interfaces of a machine full of virtual ones
constexpr int kCards = 32;  // the most that an enumeration looks at
constexpr int kLogicalCards = 2;
constexpr char kCounters[] = "/proc/net/dev";

// ---- counters

sides counters_against(std::function<void(void)> theirs) {
    const auto world = std::make_shared<interfaces>(kMany, interfaces::state::down);
    const std::shared_ptr<NETSTAT> records{KLIBNetStatInit(kMany), KLIBNetStatFree};
    return {timed([world, records] {
                require_done(KLIBNetStatGetAll(records.get(), kMany) == kMany, "KLIBNetStatGetAll failed");
            }),
            timed(std::move(theirs))};
}

sides counters_against_floor() {
    return counters_against([] { read_whole(kCounters); });
}

sides counters_against_ip() {
    const auto ip = std::make_shared<silent_program>(std::vector<std::string>{"ip", "-j", "-s", "link"});
    return counters_against([ip] { ip->run(); });
}

// ---- cards

int read_cards() {
    IFINFO records[kCards];
    return KLIBNetGetInterfaceInfo(records, kCards, kLogicalCards);
}

void read_file(const char *path) {
    struct stat status;
    char text[65536];
    const unique_fd file = open_file(path, O_RDONLY);
    require(fstat(file.get(), &status) == 0 && read(file.get(), text, sizeof text) >= 0 &&
                read(file.get(), text, sizeof text) == 0,
            path);
}

/** What is asked about the machine before its interfaces: VLAN support, and the cluster's state. */
void ask_about_machine() {
    const int modules = open("/proc/modules", O_RDONLY | O_CLOEXEC);
    close(modules);
    for (const char *path : {"/sys/module/8021q", "/proc/net/vlan/config"}) {
        (void)!access(path, F_OK);
    }
    read_file("/etc/kova/platform.conf");
}

/** A name with the paths that tell whether its interface belongs to a bridge or a virtual switch. */
struct card {
    std::string name;
    std::string bridge_port = "/sys/class/net/" + name + "/brport";
    std::string switch_port = "/sys/devices/virtual/net/ovs_" + name;
};

void ask_about_card(int socket, const card &one) {
    ifreq request = {};
    memcpy(request.ifr_name, one.name.c_str(), one.name.size() + 1);
    require(ioctl(socket, SIOCGIFFLAGS, &request) == 0, "flags");
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
    ask_about_machine();
    read_whole(kCounters);
    const unique_fd requests{socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0)};
    for (const card &one : cards) {
        ask_about_card(requests.get(), one);
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

sides cards_against(std::function<void(void)> theirs, const std::shared_ptr<interfaces> &world) {
    // every one but the loopback
    return {timed([world] { require_done(read_cards() == kCards - 1, "KLIBNetGetInterfaceInfo failed"); }),
            timed(std::move(theirs))};
}

sides cards_against_floor() {
    const auto world = std::make_shared<interfaces>(kCards, interfaces::state::addressed);
    return cards_against([cards = all_cards()] { ask_about_cards(cards); }, world);
}

sides cards_against_ip() {
    const auto world = std::make_shared<interfaces>(kCards, interfaces::state::addressed);
    const auto ip = std::make_shared<silent_program>(std::vector<std::string>{"ip", "-j", "addr"});
    return cards_against([ip] { ip->run(); }, world);
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
