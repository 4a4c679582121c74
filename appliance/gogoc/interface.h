/**
 * @file
 * The tunnel's interface.
 */
#pragma once

#include <netinet/in.h>
#include <string>

namespace kova {

/** A device whose packets this process carries; gone when it is closed. */
class tunnel_interface {
public:
    tunnel_interface() = default;
    tunnel_interface(const tunnel_interface &) = delete;
    tunnel_interface &operator=(const tunnel_interface &) = delete;
    ~tunnel_interface();

    /** Makes it, with an address and, behind all others, the IPv6 default route. errno tells why not. */
    bool open(const std::string &name, const in6_addr &address, unsigned prefix);
    [[nodiscard]] int fd() const { return fd_; }

private:
    [[nodiscard]] bool configure(const std::string &name, const in6_addr &address, unsigned prefix) const;

    int fd_ = -1;
};

} // namespace kova
