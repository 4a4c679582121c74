/**
 * @file
 * The way to a tunnel broker: datagrams over IPv4, and the conversation that ends in an address. docs/tunnel-broker.md
 * describes it.
 */
#pragma once

#include "settings.h"

#include <cstdint>
#include <netinet/in.h>
#include <span>
#include <string>
#include <vector>

namespace kova {

/** How a login ends. */
enum class login {
    accepted,
    refused,     /**< by the broker: trying again is no use */
    referred,    /**< to other brokers */
    unreachable, /**< nobody answers */
    interrupted, /**< by a signal */
};

class broker {
public:
    broker() = default;
    broker(const broker &) = delete;
    broker &operator=(const broker &) = delete;
    ~broker();

    /** @return whether the name is known and there is a way to it */
    bool open(const std::string &server);
    /** @param stop  descriptor that becomes readable when the login is to end */
    login log_in(const tunnel_settings &settings, int stop);

    [[nodiscard]] int fd() const { return fd_; }
    [[nodiscard]] const in6_addr &address() const { return address_; }
    [[nodiscard]] unsigned prefix() const { return prefix_; }
    [[nodiscard]] const std::vector<std::string> &others() const { return others_; }
    /** What a broker that refuses says. */
    [[nodiscard]] const std::string &reason() const { return reason_; }

    void say(const std::string &words) const;
    void send_packet(std::span<const uint8_t> packet) const;

    /** One datagram: words, or a packet; neither when it is none of ours. */
    struct message {
        std::string words;
        std::span<const uint8_t> packet;
        bool is_lost = false; /**< nobody listens there any more */
    };
    message receive();

private:
    /** @return whether the answer ends the login */
    bool take_answer(const tunnel_settings &settings, const std::string &words, login &end);
    bool take_address(const std::string &address, const std::string &prefix);

    int fd_ = -1;
    std::string question_;
    in6_addr address_ = {};
    unsigned prefix_ = 0;
    std::vector<std::string> others_;
    std::string reason_;
    uint8_t buffer_[65536] = {};
};

} // namespace kova
