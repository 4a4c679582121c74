/**
 * @file
 * What the kernel is asked about interfaces. The only place with ioctl and its request records.
 */
#pragma once

#include "core/guards.h"

#include <cstdint>
#include <net/if.h>
#include <netinet/in.h>

namespace kova {

/** Link settings of an Ethernet interface. */
struct link_settings {
    uint32_t supported;
    uint16_t speed_low;
    uint16_t speed_high;
    uint8_t duplex;
};

/**
 * A datagram socket for interface requests. Every request gives 0, or -1 with errno; a name that the kernel cannot have
 * (16 characters and more) is ENODEV without asking, so that no shorter name answers for it.
 */
class interface_socket {
public:
    interface_socket();
    [[nodiscard]] bool is_open() const { return socket_.is_held(); }

    [[nodiscard]] int flags(const char *szIfname, unsigned &flags) const;
    [[nodiscard]] int set_flags(const char *szIfname, unsigned flags) const;
    /** IPv4 address in network byte order. */
    [[nodiscard]] int address(const char *szIfname, uint32_t &address) const;
    [[nodiscard]] int netmask(const char *szIfname, uint32_t &netmask) const;
    [[nodiscard]] int hardware_address(const char *szIfname, unsigned char (&mac)[6]) const;
    [[nodiscard]] int mtu(const char *szIfname, int &mtu) const;
    [[nodiscard]] int set_mtu(const char *szIfname, int mtu) const;
    [[nodiscard]] int rename(const char *szOld, const char *szNew) const;
    /** The interface below a VLAN; fails for what is no VLAN. */
    [[nodiscard]] int vlan_row_device(const char *szIfname, char (&device)[IFNAMSIZ]) const;
    [[nodiscard]] int vlan_id(const char *szIfname, uint32_t &id) const;
    [[nodiscard]] int ethernet_settings(const char *szIfname, link_settings &settings) const;
    [[nodiscard]] int ethernet_link(const char *szIfname, bool &has_link) const;

private:
    descriptor socket_;
};

/** Answers of KLIBNetOVSIfIsMaster: no interface of the virtual switch, one over a single port, a bond. */
enum ovs_role { kOvsNone = 0, kOvsPort = 1, kOvsBond = 2 };

/** Error code for the errno of a failed request: whether the interface is unknown or the request failed. */
[[nodiscard]] uint32_t request_code(int error);

/** An address in network byte order as dotted text. */
using address_text = char[INET_ADDRSTRLEN];
void write_address(uint32_t address, address_text &text);

} // namespace kova
