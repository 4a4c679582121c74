#include "broker.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cerrno>
#include <chrono>
#include <crypt.h>
#include <cstring>
#include <netdb.h>
#include <poll.h>
#include <sstream>
#include <sys/socket.h>
#include <unistd.h>

namespace kova {
namespace {

constexpr char kPort[] = "3653";
/** What a datagram of words begins with; a packet begins with its version, 6. */
constexpr uint8_t kWords = 0;
constexpr int kAskAgainMs = 1000;
constexpr std::chrono::seconds kAnswerLimit{120};

/** What proves that the password is known, without telling it: its hash with the broker's own salt. */
std::string proof_of(const std::string &password, const std::string &salt) {
    crypt_data work{};
    const char *const hash = crypt_r(password.c_str(), ("$5$" + salt + "$").c_str(), &work);
    const char *const end = hash != nullptr && *hash == '$' ? strrchr(hash, '$') : nullptr;
    std::string proof = end != nullptr ? end + 1 : "";
    explicit_bzero(&work, sizeof work);
    return proof;
}

bool is_salt(const std::string &text) {
    const auto is_usual = [](unsigned char byte) { return isalnum(byte) != 0 || byte == '.' || byte == '/'; };
    constexpr size_t kLongest = 16;
    return !text.empty() && text.size() <= kLongest && std::all_of(text.begin(), text.end(), is_usual);
}

} // namespace

broker::~broker() {
    close(fd_);
}

bool broker::open(const std::string &server) {
    const size_t colon = server.find(':');
    const std::string host = server.substr(0, colon);
    const std::string port = colon != std::string::npos ? server.substr(colon + 1) : kPort;
    addrinfo wanted{};
    wanted.ai_family = AF_INET;
    wanted.ai_socktype = SOCK_DGRAM;
    addrinfo *found = nullptr;
    if (getaddrinfo(host.c_str(), port.c_str(), &wanted, &found) != 0) {
        return false;
    }
    close(fd_);
    fd_ = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    const bool is_open = fd_ >= 0 && connect(fd_, found->ai_addr, found->ai_addrlen) == 0;
    freeaddrinfo(found);
    return is_open;
}

void broker::say(const std::string &words) const {
    const std::string datagram = std::string(1, static_cast<char>(kWords)) + words;
    (void)!send(fd_, datagram.data(), datagram.size(), 0);
}

void broker::send_packet(std::span<const uint8_t> packet) const {
    (void)!send(fd_, packet.data(), packet.size(), 0);
}

broker::message broker::receive() {
    const ssize_t size = recv(fd_, buffer_, sizeof buffer_, 0);
    if (size <= 0) {
        return {.words = "", .packet = {}, .is_lost = size < 0 && errno == ECONNREFUSED};
    }
    const std::span<const uint8_t> datagram{buffer_, static_cast<size_t>(size)};
    if (datagram[0] == kWords) {
        return {.words = {datagram.begin() + 1, datagram.end()}, .packet = {}};
    }
    constexpr int kVersionShift = 4;
    constexpr int kIpv6 = 6;
    return {.words = "", .packet = datagram[0] >> kVersionShift == kIpv6 ? datagram : std::span<const uint8_t>{}};
}

bool broker::take_address(const std::string &address, const std::string &prefix) {
    constexpr unsigned long kLongest = 128;
    const unsigned long length = strtoul(prefix.c_str(), nullptr, 10);
    prefix_ = static_cast<unsigned>(length);
    return length >= 1 && length <= kLongest && inet_pton(AF_INET6, address.c_str(), &address_) == 1 &&
           !IN6_IS_ADDR_MULTICAST(&address_) && !IN6_IS_ADDR_UNSPECIFIED(&address_);
}

bool broker::take_answer(const tunnel_settings &settings, const std::string &words, login &end) {
    std::istringstream in{words};
    std::string what;
    std::string first;
    std::string second;
    in >> what;
    if (what == "refused") {
        std::getline(in >> std::ws, reason_);
        end = login::refused;
        return true;
    }
    in >> first >> second;
    if (what == "challenge" && !settings.user.empty() && is_salt(first)) {
        question_ = "login " + first + " " + proof_of(settings.password, first) + " " + settings.user;
        say(question_);
    } else if (what == "tunnel" && take_address(first, second)) {
        end = login::accepted;
        return true;
    } else if (what == "refer") {
        for (std::istringstream names{words.substr(what.size())}; names >> first;) {
            others_.push_back(first);
        }
        end = login::referred;
        return true;
    }
    return false;
}

login broker::log_in(const tunnel_settings &settings, int stop) {
    question_ = settings.user.empty() ? "hello anonymous" : "hello user";
    login end = login::unreachable;
    using clock = std::chrono::steady_clock;
    for (const auto last = clock::now() + kAnswerLimit; clock::now() < last;) {
        say(question_);
        pollfd sources[] = {{fd_, POLLIN, 0}, {stop, POLLIN, 0}};
        if (poll(sources, std::size(sources), kAskAgainMs) < 0) {
            continue;
        }
        if (sources[1].revents != 0) {
            return login::interrupted;
        }
        while (sources[0].revents != 0) {
            const message answer = receive();
            if (answer.is_lost || (!answer.words.empty() && take_answer(settings, answer.words, end))) {
                return end;
            }
            if (answer.words.empty()) {
                break;
            }
        }
    }
    return end;
}

} // namespace kova
