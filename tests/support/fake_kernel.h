/**
 * @file
 * A made-up kernel: lists its interfaces in /proc/net/dev and answers every interface request about them.
 */
#pragma once

#include "support/rig.h"

#include <linux/if.h>
#include <linux/if_vlan.h>
#include <linux/sockios.h>

namespace kova_test {

struct fake_interface {
    unsigned flags = IFF_UP | IFF_RUNNING;
    std::string ip{};
    std::string mask{};
    std::string row_device{}; ///< of a VLAN
    int vlan_id = -1;         ///< -1 cannot be asked for
    int mtu = 1500;
    unsigned char last_mac_byte = 1; ///< of 02:00:00:00:00:xx
    unsigned supported = 0;          ///< link modes
    unsigned speed = 1000;           ///< both halves
    unsigned char duplex = 1;
    bool has_link = true;
    std::map<unsigned long, int> failing{}; ///< errno by interface request, or by command of the Ethernet tool
};

class fake_kernel {
public:
    explicit fake_kernel(test_rig &rig);
    /** Adds an interface, or replaces the one of that name. */
    fake_interface &add(const std::string &name, const fake_interface &device = {});
    /** Makes the module of the VLANs loaded. */
    void load_vlan_module();

    /** Takes an interface away. */
    void remove(const std::string &name);
    /** The interface of a name, with what was set by requests. */
    const fake_interface &at(const std::string &name) const { return devices_.at(name); }

    texts changes; ///< what requests set, in order: "eth0 down", "eth0 mtu 9000", "eth0 up"

private:
    std::optional<int> answer(unsigned long request, void *argument);
    int answer_about(fake_interface &device, unsigned long request, ifreq &record);
    int answer_vlan(vlan_ioctl_args &vlan) const;
    void list_devices();

    test_rig &rig_;
    std::map<std::string, fake_interface> devices_;
};

} // namespace kova_test
