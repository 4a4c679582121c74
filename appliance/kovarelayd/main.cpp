// kovarelayd: passes the questions of hosts that ask the appliance for a name on to its own name servers, in the
// foreground (job "kovarelayd"). It takes UDP questions on the address in /etc/kova/kovarelayd.conf
// (listen=ADDRESS:PORT, 127.0.0.1:53 unless set), asks the servers of /etc/resolv.conf one after the other until one
// answers, and reads them anew on SIGHUP.
#include "questions.h"

#include <arpa/inet.h>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <kova/core.h>
#include <kovanetsdk/dns.h>
#include <netdb.h>
#include <poll.h>
#include <string>
#include <sys/signalfd.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

namespace kova {
namespace {

constexpr char kSettings[] = "/etc/kova/kovarelayd.conf";
constexpr char kPidFile[] = "/run/kova/kovarelayd.pid";
constexpr uint16_t kNameServicePort = 53;
constexpr size_t kMaxMessage = 65535;

/** Reads "ADDRESS:PORT". */
bool read_listen_address(sockaddr_in &address) {
    char text[64] = "";
    if (KLIBCFileGetKeyValue(kSettings, "listen", text, sizeof text, 0) <= 0) {
        snprintf(text, sizeof text, "127.0.0.1:%d", kNameServicePort);
    }
    char *const colon = strrchr(text, ':');
    if (colon == nullptr) {
        return false;
    }
    *colon = '\0';
    char *end = nullptr;
    const unsigned long port = strtoul(colon + 1, &end, 10);
    address = {};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<uint16_t>(port));
    return inet_pton(AF_INET, text, &address.sin_addr) == 1 && *end == '\0' && port > 0 && port <= UINT16_MAX;
}

/** An address as a socket of both families takes it; link-local ones are written with their interface. */
bool read_server(const char *text, sockaddr_in6 &server) {
    in_addr ipv4;
    const std::string mapped = (inet_pton(AF_INET, text, &ipv4) == 1 ? "::ffff:" : "") + std::string(text);
    addrinfo wanted{};
    wanted.ai_family = AF_INET6;
    wanted.ai_socktype = SOCK_DGRAM;
    wanted.ai_flags = AI_NUMERICHOST;
    addrinfo *found = nullptr;
    if (getaddrinfo(mapped.c_str(), nullptr, &wanted, &found) != 0) {
        return false;
    }
    memcpy(&server, found->ai_addr, sizeof server);
    server.sin6_port = htons(kNameServicePort);
    freeaddrinfo(found);
    return true;
}

class relay {
public:
    bool open();
    void load();
    void run();

private:
    void take_question();
    void take_answer();
    void send_on(const question &asked);
    [[nodiscard]] bool is_known(const sockaddr_in6 &server) const;

    int clients_ = -1;
    int upstream_ = -1;
    int reload_ = -1;
    std::vector<sockaddr_in6> servers_;
    question_table questions_;
    uint8_t message_[kMaxMessage] = {};
};

bool relay::open() {
    sockaddr_in address;
    if (!read_listen_address(address)) {
        errno = EINVAL;
        return false;
    }
    sigset_t reloads;
    sigemptyset(&reloads);
    sigaddset(&reloads, SIGHUP);
    sigprocmask(SIG_BLOCK, &reloads, nullptr);
    constexpr int kBothFamilies = 0;
    reload_ = signalfd(-1, &reloads, SFD_CLOEXEC | SFD_NONBLOCK);
    clients_ = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    upstream_ = socket(AF_INET6, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0);
    return reload_ >= 0 && clients_ >= 0 && upstream_ >= 0 &&
           setsockopt(upstream_, IPPROTO_IPV6, IPV6_V6ONLY, &kBothFamilies, sizeof kBothFamilies) == 0 &&
           bind(clients_, reinterpret_cast<const sockaddr *>(&address), sizeof address) == 0;
}

/** Reads the servers; those of before stay when the file cannot be read because the network is being changed. */
void relay::load() {
    KLIBSZLIST *list = KLIBCSzListAlloc(16);
    if (list == nullptr || KOVANetDNSListGet(&list) < 0) {
        syslog(LOG_ERR, "cannot read the name servers (0x%X)", KLIBCErrGet());
        KLIBCSzListFree(list);
        return;
    }
    servers_.clear();
    std::string names;
    for (int i = 0; const char *text = KLIBCSzListGet(list, i); ++i) {
        sockaddr_in6 server;
        if (read_server(text, server)) {
            servers_.push_back(server);
            names += " " + std::string(text);
        }
    }
    KLIBCSzListFree(list);
    syslog(LOG_INFO, "name servers:%s", names.empty() ? " none" : names.c_str());
}

void relay::send_on(const question &asked) {
    if (servers_.empty()) {
        return;
    }
    const sockaddr_in6 &server = servers_[asked.attempt % servers_.size()];
    sendto(upstream_, asked.message.data(), asked.message.size(), 0, reinterpret_cast<const sockaddr *>(&server),
           sizeof server);
}

void relay::take_question() {
    sockaddr_in client{};
    socklen_t length = sizeof client;
    const ssize_t size =
        recvfrom(clients_, message_, sizeof message_, 0, reinterpret_cast<sockaddr *>(&client), &length);
    if (size > 0) {
        if (const question *asked = questions_.add(client, {message_, static_cast<size_t>(size)})) {
            send_on(*asked);
        }
    }
}

bool relay::is_known(const sockaddr_in6 &server) const {
    for (const sockaddr_in6 &known : servers_) {
        if (known.sin6_port == server.sin6_port && IN6_ARE_ADDR_EQUAL(&known.sin6_addr, &server.sin6_addr)) {
            return true;
        }
    }
    return false;
}

void relay::take_answer() {
    sockaddr_in6 server{};
    socklen_t length = sizeof server;
    const ssize_t size =
        recvfrom(upstream_, message_, sizeof message_, 0, reinterpret_cast<sockaddr *>(&server), &length);
    if (size <= 0 || !is_known(server)) {
        return;
    }
    const std::span<uint8_t> answer{message_, static_cast<size_t>(size)};
    if (const auto client = questions_.answer(answer)) {
        sendto(clients_, answer.data(), answer.size(), 0, reinterpret_cast<const sockaddr *>(&*client), sizeof *client);
    }
}

void relay::run() {
    pollfd sources[] = {{clients_, POLLIN, 0}, {upstream_, POLLIN, 0}, {reload_, POLLIN, 0}};
    for (;;) {
        if (poll(sources, std::size(sources), questions_.wait_ms()) < 0 && errno != EINTR) {
            return;
        }
        signalfd_siginfo signal;
        if (read(reload_, &signal, sizeof signal) == static_cast<ssize_t>(sizeof signal)) {
            syslog(LOG_INFO, "reload");
            load();
        }
        take_question();
        take_answer();
        questions_.for_each_late([this](const question &late) { send_on(late); });
    }
}

bool write_pid_file() {
    mkdir("/run/kova", 0755);
    FILE *const file = fopen(kPidFile, "we");
    const bool is_written = file != nullptr && fprintf(file, "%d\n", getpid()) > 0;
    return file != nullptr && fclose(file) == 0 && is_written;
}

} // namespace
} // namespace kova

int main(int argc, char **) {
    if (argc != 1) {
        fputs("usage: kovarelayd\n", stderr);
        return 2;
    }
    openlog("kovarelayd", LOG_PID, LOG_DAEMON);
    kova::relay relay;
    if (relay.open() && kova::write_pid_file()) {
        relay.load();
        relay.run();
    }
    syslog(LOG_ERR, "cannot relay: %m");
    fprintf(stderr, "kovarelayd: cannot relay: %s\n", strerror(errno));
    return 1;
}
