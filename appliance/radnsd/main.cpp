// radnsd IF SCRIPT: listens for the name servers that the routers on a link announce, in the foreground, and runs the
// script with "interface" and "servers" (addresses joined by blanks) in its environment whenever they change. A server
// lives as long as its router said. Asks the routers once at the start, so that nobody waits for their next turn.
#include "advertisement.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <net/if.h>
#include <netinet/icmp6.h>
#include <optional>
#include <poll.h>
#include <spawn.h>
#include <string>
#include <sys/socket.h>
#include <sys/wait.h>
#include <syslog.h>
#include <unistd.h>

namespace kova {
namespace {

using timer = std::chrono::steady_clock;
using std::chrono::seconds;

constexpr size_t kMaxServers = 8; // of one link: a resolver asks three, and a link may be hostile
constexpr int kMaxQuestions = 3;
constexpr seconds kBetweenQuestions{4};
constexpr seconds kRetry{1};
constexpr int kHopLimit = 255; // what a router has forwarded has less

struct known_server {
    in6_addr address;
    timer::time_point end;
};

class listener {
public:
    listener(const char *interface, const char *script) : interface_(interface), script_(script) {}
    bool open();
    /** Until a call of the system fails. */
    void run();

private:
    void ask();
    void receive();
    void learn(const announced_server &announced);
    void forget_ended();
    void tell_change();
    [[nodiscard]] std::string list() const;
    [[nodiscard]] bool run_script(const std::string &servers) const;
    [[nodiscard]] int wait_ms() const;

    const char *interface_;
    const char *script_;
    int socket_ = -1;
    std::vector<known_server> servers_;
    std::optional<std::string> told_; // nothing: the script does not know yet
    int questions_ = 0;
    timer::time_point next_question_ = timer::now();
    timer::time_point next_try_ = timer::now();
};

bool set_option(int fd, int level, int option, const void *value, socklen_t size) {
    return setsockopt(fd, level, option, value, size) == 0;
}

bool listener::open() {
    constexpr int kOn = 1;
    icmp6_filter only_advertisements;
    ICMP6_FILTER_SETBLOCKALL(&only_advertisements);
    ICMP6_FILTER_SETPASS(ND_ROUTER_ADVERT, &only_advertisements);
    socket_ = socket(AF_INET6, SOCK_RAW | SOCK_CLOEXEC | SOCK_NONBLOCK, IPPROTO_ICMPV6);
    return socket_ >= 0 &&
           set_option(socket_, SOL_SOCKET, SO_BINDTODEVICE, interface_, static_cast<socklen_t>(strlen(interface_))) &&
           set_option(socket_, IPPROTO_ICMPV6, ICMP6_FILTER, &only_advertisements, sizeof only_advertisements) &&
           set_option(socket_, IPPROTO_IPV6, IPV6_RECVHOPLIMIT, &kOn, sizeof kOn) &&
           set_option(socket_, IPPROTO_IPV6, IPV6_MULTICAST_HOPS, &kHopLimit, sizeof kHopLimit);
}

/** Asks all routers of the link. Fails while the interface has no usable address, and is tried again then. */
void listener::ask() {
    nd_router_solicit question{};
    question.nd_rs_type = ND_ROUTER_SOLICIT;
    sockaddr_in6 routers{};
    routers.sin6_family = AF_INET6;
    routers.sin6_scope_id = if_nametoindex(interface_);
    inet_pton(AF_INET6, "ff02::2", &routers.sin6_addr);
    const bool is_sent = sendto(socket_, &question, sizeof question, 0, reinterpret_cast<const sockaddr *>(&routers),
                                sizeof routers) == static_cast<ssize_t>(sizeof question);
    questions_ += is_sent ? 1 : 0;
    next_question_ = timer::now() + (is_sent ? kBetweenQuestions : kRetry);
}

/** The hop limit that came with a message, -1 when none did. */
int hop_limit_of(msghdr &message) {
    for (cmsghdr *head = CMSG_FIRSTHDR(&message); head != nullptr; head = CMSG_NXTHDR(&message, head)) {
        if (head->cmsg_level == IPPROTO_IPV6 && head->cmsg_type == IPV6_HOPLIMIT) {
            int limit = -1;
            memcpy(&limit, CMSG_DATA(head), sizeof limit);
            return limit;
        }
    }
    return -1;
}

void listener::receive() {
    uint8_t bytes[65536];
    alignas(cmsghdr) char control[CMSG_SPACE(sizeof(int))];
    sockaddr_in6 from{};
    iovec into{bytes, sizeof bytes};
    msghdr message{};
    message.msg_name = &from;
    message.msg_namelen = sizeof from;
    message.msg_iov = &into;
    message.msg_iovlen = 1;
    message.msg_control = control;
    message.msg_controllen = sizeof control;
    const ssize_t size = recvmsg(socket_, &message, 0);
    if (size <= 0 || hop_limit_of(message) != kHopLimit || !IN6_IS_ADDR_LINKLOCAL(&from.sin6_addr)) {
        return;
    }
    const auto announced = announced_servers({bytes, static_cast<size_t>(size)});
    if (!announced) {
        return;
    }
    questions_ = kMaxQuestions; // answered
    for (const announced_server &server : *announced) {
        learn(server);
    }
}

void listener::learn(const announced_server &announced) {
    const auto known = std::find_if(servers_.begin(), servers_.end(), [&announced](const known_server &server) {
        return IN6_ARE_ADDR_EQUAL(&server.address, &announced.address);
    });
    const auto end =
        announced.lifetime == kForever ? timer::time_point::max() : timer::now() + seconds{announced.lifetime};
    if (known != servers_.end()) {
        known->end = end;
    } else if (servers_.size() < kMaxServers) {
        servers_.push_back({announced.address, end});
    }
}

void listener::forget_ended() {
    std::erase_if(servers_, [now = timer::now()](const known_server &server) { return server.end <= now; });
}

/** The addresses as a resolver takes them: one of the link alone needs the interface with it. */
std::string listener::list() const {
    std::string addresses;
    for (const known_server &server : servers_) {
        char text[INET6_ADDRSTRLEN];
        inet_ntop(AF_INET6, &server.address, text, sizeof text);
        addresses += (addresses.empty() ? "" : " ") + std::string(text);
        addresses += IN6_IS_ADDR_LINKLOCAL(&server.address) ? "%" + std::string(interface_) : "";
    }
    return addresses;
}

bool listener::run_script(const std::string &servers) const {
    std::string interface = "interface=" + std::string(interface_);
    std::string addresses = "servers=" + servers;
    std::string script = script_;
    char *const arguments[] = {script.data(), nullptr};
    char *const environment[] = {interface.data(), addresses.data(), nullptr};
    pid_t child = -1;
    int status = -1;
    return posix_spawn(&child, script_, nullptr, nullptr, arguments, environment) == 0 &&
           waitpid(child, &status, 0) == child && status == 0;
}

void listener::tell_change() {
    const std::string servers = list();
    if (servers == told_ || timer::now() < next_try_) {
        return;
    }
    syslog(LOG_INFO, "%s: name servers: %s", interface_, servers.empty() ? "none" : servers.c_str());
    if (run_script(servers)) {
        told_ = servers;
    } else {
        syslog(LOG_ERR, "%s failed", script_);
        next_try_ = timer::now() + kRetry;
    }
}

/** How long there is nothing to do but to listen. */
int listener::wait_ms() const {
    auto next = timer::time_point::max();
    for (const known_server &server : servers_) {
        next = std::min(next, server.end);
    }
    if (questions_ < kMaxQuestions) {
        next = std::min(next, next_question_);
    }
    if (list() != told_) {
        next = std::min(next, next_try_);
    }
    constexpr std::chrono::hours kLong{1};
    const auto left = std::clamp<timer::duration>(next - timer::now(), seconds{0}, kLong);
    return static_cast<int>(std::chrono::ceil<std::chrono::milliseconds>(left).count());
}

void listener::run() {
    pollfd source{socket_, POLLIN, 0};
    for (;;) {
        if (questions_ < kMaxQuestions && next_question_ <= timer::now()) {
            ask();
        }
        forget_ended();
        tell_change();
        if (poll(&source, 1, wait_ms()) < 0 && errno != EINTR) {
            return;
        }
        if (source.revents != 0) {
            receive();
        }
    }
}

} // namespace
} // namespace kova

int main(int argc, char **argv) {
    if (argc != 3 || strlen(argv[1]) >= IF_NAMESIZE) {
        fputs("usage: radnsd IF SCRIPT\n", stderr);
        return 2;
    }
    openlog("radnsd", LOG_PID, LOG_DAEMON);
    kova::listener listener{argv[1], argv[2]};
    if (listener.open()) {
        listener.run();
    }
    syslog(LOG_ERR, "%s: cannot listen: %m", argv[1]);
    fprintf(stderr, "radnsd: %s: cannot listen: %s\n", argv[1], strerror(errno));
    return 1;
}
