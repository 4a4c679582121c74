// gogoc: client of an IPv6 tunnel broker, started by "/etc/gogoc/rc.tun". It reads its configuration once, at its
// start, and runs in the background; the process that was started ends when the tunnel is up (0) or will not be (1).
#include "broker.h"
#include "interface.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <fstream>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/signalfd.h>
#include <sys/stat.h>
#include <syslog.h>
#include <unistd.h>

namespace kova {
namespace {

constexpr char kPidFile[] = "/run/kova/gogoc.pid";

/** How a tunnel ends. */
enum class end { stopped, refused, lost };

class client {
public:
    client(const tunnel_settings &settings, int ready) : settings_(settings), ready_(ready) {
        sigset_t stops;
        sigemptyset(&stops);
        for (const int number : {SIGTERM, SIGINT, SIGHUP}) {
            sigaddset(&stops, number);
        }
        sigprocmask(SIG_BLOCK, &stops, nullptr);
        stop_ = signalfd(-1, &stops, SFD_CLOEXEC | SFD_NONBLOCK);
    }
    client(const client &) = delete;
    client &operator=(const client &) = delete;
    ~client() { close(stop_); }

    /** Keeps a tunnel up, or tries to, as long as that is of use. */
    void run();

private:
    end try_brokers();
    end try_broker(const std::string &server, std::vector<std::string> &others);
    end carry(broker &server);
    void note_others(const std::vector<std::string> &others) const;
    void say_ready();
    /** @return whether the time passed without a signal */
    [[nodiscard]] bool wait(int seconds) const;

    const tunnel_settings &settings_;
    int ready_;
    int stop_ = -1;
};

bool client::wait(int seconds) const {
    constexpr int kMsPerSecond = 1000;
    pollfd source{stop_, POLLIN, 0};
    return poll(&source, 1, seconds * kMsPerSecond) == 0;
}

void client::say_ready() {
    if (ready_ >= 0) {
        (void)!write(ready_, "", 1);
        close(ready_);
        ready_ = -1;
        (void)!chdir("/"); // what it was started in is not kept busy
    }
}

void client::note_others(const std::vector<std::string> &others) const {
    if (ready_ < 0 || settings_.broker_list.empty()) {
        return;
    }
    std::ofstream file(settings_.broker_list);
    for (const std::string &other : others) {
        file << other << "\n";
    }
}

/** Carries packets between interface and broker. */
end client::carry(broker &server) {
    tunnel_interface device;
    if (!device.open(settings_.interface, server.address(), server.prefix())) {
        syslog(LOG_ERR, "cannot make the interface %s: %m", settings_.interface.c_str());
        server.say("bye");
        return end::refused;
    }
    syslog(LOG_INFO, "the tunnel is up");
    say_ready();
    using clock = std::chrono::steady_clock;
    constexpr int kMissedSigns = 3;
    const std::chrono::seconds interval{settings_.keepalive_interval};
    const int wait_ms = interval.count() > 0 ? static_cast<int>(std::chrono::milliseconds(interval).count()) : -1;
    auto next_sign = clock::now() + interval;
    int unanswered = 0;
    uint8_t packet[65536];
    for (;;) {
        pollfd sources[] = {{device.fd(), POLLIN, 0}, {server.fd(), POLLIN, 0}, {stop_, POLLIN, 0}};
        if (poll(sources, std::size(sources), wait_ms) < 0 && errno != EINTR) {
            return end::lost;
        }
        if (sources[2].revents != 0) {
            server.say("bye");
            return end::stopped;
        }
        if ((sources[0].revents & POLLERR) != 0) {
            return end::lost; // somebody deleted it
        }
        const ssize_t size = read(device.fd(), packet, sizeof packet);
        if (size > 0) {
            server.send_packet({packet, static_cast<size_t>(size)});
        }
        if (sources[1].revents != 0) {
            const broker::message message = server.receive();
            unanswered = 0;
            if (message.is_lost || message.words == "bye") {
                return end::lost;
            }
            if (!message.packet.empty()) {
                (void)!write(device.fd(), message.packet.data(), message.packet.size());
            }
        }
        if (wait_ms > 0 && clock::now() >= next_sign) {
            if (++unanswered > kMissedSigns) {
                return end::lost;
            }
            server.say("ping");
            next_sign += interval;
        }
    }
}

end client::try_broker(const std::string &server, std::vector<std::string> &others) {
    broker asked;
    if (!asked.open(server)) {
        syslog(LOG_WARNING, "no way to the tunnel broker");
        return end::lost;
    }
    switch (asked.log_in(settings_, stop_)) {
    case login::accepted:
        return carry(asked);
    case login::refused:
        syslog(LOG_ERR, "the tunnel broker refuses: %.80s", asked.reason().c_str());
        return end::refused;
    case login::referred:
        others = asked.others();
        note_others(others);
        return end::lost;
    case login::interrupted:
        return end::stopped;
    default:
        syslog(LOG_WARNING, "the tunnel broker does not answer");
        return end::lost;
    }
}

/** The broker of the settings, then those that it refers to, which are not asked for others. */
end client::try_brokers() {
    std::vector<std::string> others;
    end result = try_broker(settings_.server, others);
    for (const std::string &other : others) {
        std::vector<std::string> ignored;
        result = try_broker(other, ignored);
        if (result != end::lost) {
            break;
        }
    }
    return result;
}

void client::run() {
    int delay = settings_.retry_delay;
    while (try_brokers() == end::lost && settings_.retries && wait(delay)) {
        delay = std::min(2 * delay, settings_.retry_delay_max);
    }
}

bool write_pid_file() {
    mkdir("/run/kova", 0755);
    std::ofstream file(kPidFile);
    file << getpid() << "\n";
    file.close();
    return file.good();
}

/** Waits for a sign from the process in the background. @return whether the tunnel is up */
bool wait_for_tunnel(int ready) {
    char sign = 0;
    ssize_t got = 0;
    do {
        got = read(ready, &sign, 1);
    } while (got < 0 && errno == EINTR);
    return got == 1;
}

int start(const char *path) {
    prctl(PR_SET_DUMPABLE, 0); // a core would hold the password
    tunnel_settings settings;
    if (!read_settings(path, settings)) {
        syslog(LOG_ERR, "no broker in %s", path);
        return 1;
    }
    int ready[2];
    if (pipe2(ready, O_CLOEXEC) != 0) {
        return 1;
    }
    const pid_t background = fork();
    if (background != 0) {
        close(ready[1]);
        return background > 0 && wait_for_tunnel(ready[0]) ? 0 : 1;
    }
    close(ready[0]);
    setsid();
    if (!write_pid_file()) {
        syslog(LOG_ERR, "cannot write %s: %m", kPidFile);
        return 1;
    }
    client{settings, ready[1]}.run();
    unlink(kPidFile);
    return 0;
}

} // namespace
} // namespace kova

int main(int argc, char **argv) {
    if (argc != 3 || strcmp(argv[1], "-f") != 0) {
        fputs("usage: gogoc -f FILE\n", stderr);
        return 2;
    }
    openlog("gogoc", LOG_PID, LOG_USER);
    return kova::start(argv[2]);
}
