/**
 * @file
 * The other side of TCP connections, on loopback, and what stands between: connect, ppoll, getsockopt and send can
 * fail.
 */
#pragma once

#include "support/rig.h"

#include <optional>
#include <poll.h>

namespace kova_test {

/** An owned socket. */
class test_socket {
public:
    explicit test_socket(int fd = -1) : fd_(fd) {}
    test_socket(test_socket &&other) noexcept : fd_(std::exchange(other.fd_, -1)) {}
    test_socket &operator=(test_socket &&other) noexcept {
        std::swap(fd_, other.fd_);
        return *this;
    }
    test_socket(const test_socket &) = delete;
    test_socket &operator=(const test_socket &) = delete;
    ~test_socket();
    [[nodiscard]] int get() const { return fd_; }

private:
    int fd_;
};

/** Listens on an address of the loopback network while it lives. */
class listener {
public:
    /** @param port  0 for any that is free */
    explicit listener(const std::string &address = "127.0.0.1", int port = 0);
    [[nodiscard]] int port() const { return port_; }
    /** Connections that are asked for from now on get no answer. */
    void stop_answering();
    /** All that came over the connection that waits longest, up to its end; nothing when there is none. */
    std::optional<std::string> received();

private:
    [[nodiscard]] test_socket connected() const;

    std::string address_;
    test_socket socket_;
    int port_ = 0;
    std::vector<test_socket> in_the_way_;
};

/** A port of 127.0.0.1 on which nobody listens. */
int closed_port();

/** Stands in for ppoll while it is set: the socket asked about, and the limit in milliseconds. */
extern std::function<int(pollfd &asked, long ms)> on_poll;

} // namespace kova_test
