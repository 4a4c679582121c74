#include "questions.h"

#include <algorithm>
#include <sys/random.h>

namespace kova {
namespace {

constexpr size_t kHead = 12;        // of a message
constexpr uint8_t kIsAnswer = 0x80; // in the third byte

uint16_t number_of(std::span<const uint8_t> message) {
    return static_cast<uint16_t>(message[0] << 8 | message[1]);
}

void set_number(std::span<uint8_t> message, uint16_t number) {
    message[0] = static_cast<uint8_t>(number >> 8);
    message[1] = static_cast<uint8_t>(number);
}

bool is_message(std::span<const uint8_t> message, bool is_answer) {
    return message.size() >= kHead && ((message[2] & kIsAnswer) != 0) == is_answer;
}

} // namespace

const question *question_table::add(const sockaddr_in &client, std::span<const uint8_t> message) {
    uint16_t number = 0;
    if (!is_message(message, false) || waiting_.size() >= kMaxWaiting ||
        getrandom(&number, sizeof number, 0) != static_cast<ssize_t>(sizeof number)) {
        return nullptr;
    }
    const auto [place, is_new] = waiting_.try_emplace(number);
    if (!is_new) {
        return nullptr; // the client asks again
    }
    place->second = {
        client, number_of(message), {message.begin(), message.end()}, 0, std::chrono::steady_clock::now() + kPatience};
    set_number(place->second.message, number);
    return &place->second;
}

std::optional<sockaddr_in> question_table::answer(std::span<uint8_t> message) {
    const auto asked = is_message(message, true) ? waiting_.find(number_of(message)) : waiting_.end();
    if (asked == waiting_.end()) {
        return std::nullopt;
    }
    set_number(message, asked->second.client_id);
    const sockaddr_in client = asked->second.client;
    waiting_.erase(asked);
    return client;
}

int question_table::wait_ms() const {
    if (waiting_.empty()) {
        return -1;
    }
    auto first = std::chrono::steady_clock::time_point::max();
    for (const auto &[number, asked] : waiting_) {
        first = std::min(first, asked.late);
    }
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(first - std::chrono::steady_clock::now());
    return static_cast<int>(std::max<std::chrono::milliseconds>(left, std::chrono::milliseconds{0}).count());
}

} // namespace kova
