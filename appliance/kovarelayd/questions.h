/**
 * @file
 * The questions that wait for an answer.
 */
#pragma once

#include <chrono>
#include <cstdint>
#include <map>
#include <netinet/in.h>
#include <optional>
#include <span>
#include <vector>

namespace kova {

struct question {
    sockaddr_in client;
    uint16_t client_id; /**< the message's number as the client chose it */
    std::vector<uint8_t> message;
    size_t attempt; /**< counts the servers asked before */
    std::chrono::steady_clock::time_point late;
};

/** Holds each question under a number nobody can guess, as the answer names nothing else of it. */
class question_table {
public:
    /** Notes a question; the message gets its new number. Nothing for what is no question, or when too many wait. */
    const question *add(const sockaddr_in &client, std::span<const uint8_t> message);
    /** Takes out the question of an answer, which gets the client's number back. */
    std::optional<sockaddr_in> answer(std::span<uint8_t> message);
    /** Calls for each question whose server is silent, to be asked of the next one; gives the oldest up. */
    template<typename Ask> void for_each_late(Ask ask) {
        const auto now = std::chrono::steady_clock::now();
        for (auto one = waiting_.begin(); one != waiting_.end();) {
            question &asked = one->second;
            if (asked.late > now) {
                ++one;
            } else if (++asked.attempt == kMaxAttempts) {
                one = waiting_.erase(one);
            } else {
                asked.late = now + kPatience;
                ask(asked);
                ++one;
            }
        }
    }
    /** How long no question is late, -1 without end. */
    [[nodiscard]] int wait_ms() const;

private:
    static constexpr std::chrono::seconds kPatience{1};
    static constexpr size_t kMaxAttempts = 6;
    static constexpr size_t kMaxWaiting = 1024;

    std::map<uint16_t, question> waiting_;
};

} // namespace kova
