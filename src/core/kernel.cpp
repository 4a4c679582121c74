#include "core/kernel.h"

#include <arpa/inet.h>
#include <cstring>
#include <kovanetsdk/core.h>
#include <linux/ethtool.h>
#include <linux/if_vlan.h>
#include <linux/sockios.h>
#include <sys/ioctl.h>
#include <sys/socket.h>

namespace kova {

namespace {

/** Whether a name fits a request; sets errno when not. */
bool has_request_name(const char *szIfname) {
    if (strlen(szIfname) < IFNAMSIZ) {
        return true;
    }
    errno = ENODEV;
    return false;
}

/** Sends a request about an interface; the answer is in the record. */
int request(const descriptor &socket, unsigned long command, const char *szIfname, ifreq &record) {
    if (!has_request_name(szIfname)) {
        return -1;
    }
    memcpy(record.ifr_name, szIfname, strlen(szIfname) + 1);
    return ioctl(socket.get(), command, &record) < 0 ? -1 : 0;
}

int request_address(const descriptor &socket, unsigned long command, const char *szIfname, uint32_t &address) {
    ifreq record = {};
    if (request(socket, command, szIfname, record) < 0) {
        return -1;
    }
    sockaddr_in answer;
    memcpy(&answer, &record.ifr_addr, sizeof answer);
    address = answer.sin_addr.s_addr;
    return 0;
}

/** Sends an Ethernet tool request whose command stands at the record's beginning. */
int ethernet_request(const descriptor &socket, const char *szIfname, void *request_data) {
    ifreq record = {};
    record.ifr_data = static_cast<char *>(request_data);
    return request(socket, SIOCETHTOOL, szIfname, record);
}

/** Asks about a VLAN; the answer is in the record. */
int vlan_request(const descriptor &socket, int command, const char *szIfname, vlan_ioctl_args &record) {
    if (!has_request_name(szIfname)) {
        return -1;
    }
    record.cmd = command;
    memcpy(record.device1, szIfname, strlen(szIfname) + 1);
    return ioctl(socket.get(), SIOCGIFVLAN, &record) < 0 ? -1 : 0;
}

} // namespace

interface_socket::interface_socket() : socket_(socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {}

int interface_socket::flags(const char *szIfname, unsigned &flags) const {
    ifreq record = {};
    if (request(socket_, SIOCGIFFLAGS, szIfname, record) < 0) {
        return -1;
    }
    flags = static_cast<unsigned short>(record.ifr_flags);
    return 0;
}

int interface_socket::set_flags(const char *szIfname, unsigned flags) const {
    ifreq record = {};
    record.ifr_flags = static_cast<short>(flags);
    return request(socket_, SIOCSIFFLAGS, szIfname, record);
}

int interface_socket::address(const char *szIfname, uint32_t &address) const {
    return request_address(socket_, SIOCGIFADDR, szIfname, address);
}

int interface_socket::netmask(const char *szIfname, uint32_t &netmask) const {
    return request_address(socket_, SIOCGIFNETMASK, szIfname, netmask);
}

int interface_socket::hardware_address(const char *szIfname, unsigned char (&mac)[6]) const {
    ifreq record = {};
    if (request(socket_, SIOCGIFHWADDR, szIfname, record) < 0) {
        return -1;
    }
    memcpy(mac, record.ifr_hwaddr.sa_data, sizeof mac);
    return 0;
}

int interface_socket::mtu(const char *szIfname, int &mtu) const {
    ifreq record = {};
    if (request(socket_, SIOCGIFMTU, szIfname, record) < 0) {
        return -1;
    }
    mtu = record.ifr_mtu;
    return 0;
}

int interface_socket::set_mtu(const char *szIfname, int mtu) const {
    ifreq record = {};
    record.ifr_mtu = mtu;
    return request(socket_, SIOCSIFMTU, szIfname, record);
}

int interface_socket::rename(const char *szOld, const char *szNew) const {
    ifreq record = {};
    if (!has_request_name(szNew)) {
        return -1;
    }
    memcpy(record.ifr_newname, szNew, strlen(szNew) + 1);
    return request(socket_, SIOCSIFNAME, szOld, record);
}

int interface_socket::vlan_row_device(const char *szIfname, char (&device)[IFNAMSIZ]) const {
    vlan_ioctl_args record = {};
    if (vlan_request(socket_, GET_VLAN_REALDEV_NAME_CMD, szIfname, record) < 0) {
        return -1;
    }
    memcpy(device, record.u.device2, sizeof device);
    device[sizeof device - 1] = '\0';
    return 0;
}

int interface_socket::vlan_id(const char *szIfname, uint32_t &id) const {
    vlan_ioctl_args record = {};
    if (vlan_request(socket_, GET_VLAN_VID_CMD, szIfname, record) < 0) {
        return -1;
    }
    id = static_cast<uint32_t>(record.u.VID);
    return 0;
}

int interface_socket::ethernet_settings(const char *szIfname, link_settings &settings) const {
    ethtool_cmd command = {};
    command.cmd = ETHTOOL_GSET;
    if (ethernet_request(socket_, szIfname, &command) < 0) {
        return -1;
    }
    settings = {command.supported, command.speed, command.speed_hi, command.duplex};
    return 0;
}

int interface_socket::ethernet_link(const char *szIfname, bool &has_link) const {
    ethtool_value command = {};
    command.cmd = ETHTOOL_GLINK;
    if (ethernet_request(socket_, szIfname, &command) < 0) {
        return -1;
    }
    has_link = command.data != 0;
    return 0;
}

uint32_t request_code(int error) {
    return error == ENODEV ? NET_ERR_SOCKET : NET_ERR_IOCTL;
}

void write_address(uint32_t address, address_text &text) {
    const in_addr binary{address};
    inet_ntop(AF_INET, &binary, text, sizeof text);
}

} // namespace kova
