#include "support/fake_kernel.h"

#include <arpa/inet.h>
#include <cerrno>
#include <cstring>
#include <linux/ethtool.h>

namespace kova_test {

namespace {

int failed(int error) {
    errno = error;
    return -1;
}

int put_address(const std::string &text, sockaddr &place) {
    if (text.empty()) {
        return failed(EADDRNOTAVAIL);
    }
    sockaddr_in address = {};
    address.sin_family = AF_INET;
    inet_pton(AF_INET, text.c_str(), &address.sin_addr);
    memcpy(&place, &address, sizeof place);
    return 0;
}

int answer_ethernet(const fake_interface &device, void *data) {
    const uint32_t command = *static_cast<uint32_t *>(data);
    if (device.failing.count(command)) {
        return failed(device.failing.at(command));
    }
    if (command == ETHTOOL_GSET) {
        auto &settings = *static_cast<ethtool_cmd *>(data);
        settings.supported = device.supported;
        settings.speed = static_cast<uint16_t>(device.speed);
        settings.speed_hi = static_cast<uint16_t>(device.speed >> 16);
        settings.duplex = device.duplex;
        return 0;
    }
    static_cast<ethtool_value *>(data)->data = device.has_link ? 1 : 0;
    return command == ETHTOOL_GLINK ? 0 : failed(EOPNOTSUPP);
}

} // namespace

fake_kernel::fake_kernel(test_rig &rig) : rig_(rig) {
    rig.replace_file("/proc/net/dev", "\n\n");
    rig.hide("/sys/class/net/kova_ovs_bonds");
    rig.replace_file("/proc/modules", "");
    for (const char *trace : {"/sys/module/8021q", "/proc/net/vlan", "/lib/modules"}) {
        rig.hide(trace); // the machine the tests run on may well have VLANs
    }
    rig.answer_ioctl([this](unsigned long request, void *argument) { return answer(request, argument); });
}

fake_interface &fake_kernel::add(const std::string &name, const fake_interface &device) {
    devices_[name] = device;
    list_devices();
    return devices_[name];
}

void fake_kernel::remove(const std::string &name) {
    devices_.erase(name);
    list_devices();
}

void fake_kernel::list_devices() {
    std::string list = "Inter-|   Receive                                                |  Transmit\n"
                       " face |bytes    packets errs drop fifo frame compressed multicast|bytes    packets errs\n";
    for (const auto &[known, unused] : devices_) {
        list += known + ": 1 2 0 0 0 0 0 0 3 4 0 0 0 0 0 0\n";
    }
    rig_.replace_file("/proc/net/dev", list);
}

void fake_kernel::load_vlan_module() {
    rig_.replace_file("/proc/modules", "8021q 45056 0 - Live 0x0000000000000000\n");
}

std::optional<int> fake_kernel::answer(unsigned long request, void *argument) {
    if (request == SIOCGIFVLAN) {
        return answer_vlan(*static_cast<vlan_ioctl_args *>(argument));
    }
    if (request < 0x8900 || request > 0x89ff) {
        return std::nullopt; // no interface request
    }
    auto &record = *static_cast<ifreq *>(argument);
    const auto found = devices_.find(record.ifr_name);
    if (found == devices_.end()) {
        return failed(ENODEV);
    }
    if (found->second.failing.count(request)) {
        return failed(found->second.failing.at(request));
    }
    return answer_about(found->second, request, record);
}

int fake_kernel::answer_vlan(vlan_ioctl_args &vlan) const {
    const auto found = devices_.find(vlan.device1);
    if (found == devices_.end() || found->second.row_device.empty()) {
        return failed(found == devices_.end() ? ENODEV : EINVAL);
    }
    if (vlan.cmd == GET_VLAN_VID_CMD) {
        vlan.u.VID = found->second.vlan_id;
        return found->second.vlan_id < 0 ? failed(EINVAL) : 0;
    }
    EXPECT_EQ(GET_VLAN_REALDEV_NAME_CMD, vlan.cmd);
    snprintf(vlan.u.device2, sizeof vlan.u.device2, "%s", found->second.row_device.c_str());
    return 0;
}

int fake_kernel::answer_about(fake_interface &device, unsigned long request, ifreq &record) {
    switch (request) {
    case SIOCGIFFLAGS:
        record.ifr_flags = static_cast<short>(device.flags);
        return 0;
    case SIOCSIFFLAGS:
        device.flags = static_cast<unsigned short>(record.ifr_flags);
        changes.push_back(std::string(record.ifr_name) + ((device.flags & IFF_UP) != 0 ? " up" : " down"));
        return 0;
    case SIOCSIFMTU:
        device.mtu = record.ifr_mtu;
        changes.push_back(std::string(record.ifr_name) + " mtu " + std::to_string(record.ifr_mtu));
        return 0;
    case SIOCSIFNAME:
        return 0;
    case SIOCGIFADDR:
        return put_address(device.ip, record.ifr_addr);
    case SIOCGIFNETMASK:
        return put_address(device.mask, record.ifr_netmask);
    case SIOCGIFHWADDR: {
        const unsigned char mac[6] = {2, 0, 0, 0, 0, device.last_mac_byte};
        memcpy(record.ifr_hwaddr.sa_data, mac, sizeof mac);
        return 0;
    }
    case SIOCGIFMTU:
        record.ifr_mtu = device.mtu;
        return 0;
    case SIOCETHTOOL:
        return answer_ethernet(device, record.ifr_data);
    default:
        return failed(EOPNOTSUPP);
    }
}

} // namespace kova_test
