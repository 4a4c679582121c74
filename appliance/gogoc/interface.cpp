#include "interface.h"

#include <cstring>
#include <fcntl.h>
#include <linux/if_tun.h>
#include <linux/ipv6.h>
#include <net/if.h>
#include <net/route.h>
#include <sys/ioctl.h>
#include <unistd.h>

namespace kova {
namespace {

/** What every path that carries IPv6 lets through. */
constexpr int kMtu = 1280;
/** Behind routes that routers announce and that are set by hand. */
constexpr unsigned kLastResort = 4096;

ifreq request_about(const std::string &name) {
    ifreq request{};
    name.copy(request.ifr_name, sizeof request.ifr_name - 1);
    return request;
}

bool set_mtu(int control, const std::string &name) {
    ifreq request = request_about(name);
    request.ifr_mtu = kMtu;
    return ioctl(control, SIOCSIFMTU, &request) == 0;
}

bool set_up(int control, const std::string &name) {
    ifreq request = request_about(name);
    if (ioctl(control, SIOCGIFFLAGS, &request) != 0) {
        return false;
    }
    request.ifr_flags = static_cast<short>(request.ifr_flags | IFF_UP);
    return ioctl(control, SIOCSIFFLAGS, &request) == 0;
}

bool add_address(int control, int index, const in6_addr &address, unsigned prefix) {
    in6_ifreq request{};
    request.ifr6_addr = address;
    request.ifr6_prefixlen = prefix;
    request.ifr6_ifindex = index;
    return ioctl(control, SIOCSIFADDR, &request) == 0;
}

bool add_default_route(int control, int index) {
    in6_rtmsg route{};
    route.rtmsg_metric = kLastResort;
    route.rtmsg_flags = RTF_UP;
    route.rtmsg_ifindex = index;
    return ioctl(control, SIOCADDRT, &route) == 0;
}

} // namespace

tunnel_interface::~tunnel_interface() {
    close(fd_);
}

bool tunnel_interface::open(const std::string &name, const in6_addr &address, unsigned prefix) {
    fd_ = ::open("/dev/net/tun", O_RDWR | O_CLOEXEC | O_NONBLOCK);
    ifreq request = request_about(name);
    request.ifr_flags = IFF_TUN | IFF_NO_PI;
    return fd_ >= 0 && ioctl(fd_, TUNSETIFF, &request) == 0 && configure(name, address, prefix);
}

bool tunnel_interface::configure(const std::string &name, const in6_addr &address, unsigned prefix) const {
    const int control = socket(AF_INET6, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    const auto index = static_cast<int>(if_nametoindex(name.c_str()));
    const bool is_configured = control >= 0 && set_mtu(control, name) && set_up(control, name) &&
                               add_address(control, index, address, prefix) && add_default_route(control, index);
    close(control);
    return is_configured;
}

} // namespace kova
