#include <kovanetsdk/stats.h>

#include "core/host_names.h"

#include <algorithm>
#include <cstdint>
#include <ctime>
#include <poll.h>
#include <sys/socket.h>

using namespace kova;

namespace {

/** A connection to be tried: port, and seconds that an address has for it. */
struct attempt {
    int port;
    int limit;
};

int64_t clock_ms() {
    timespec now;
    clock_gettime(CLOCK_MONOTONIC, &now);
    return int64_t{now.tv_sec} * 1000 + now.tv_nsec / 1000000;
}

/** Waits for the end of the connecting, of which a signal is none. @return whether it came within the limit */
bool wait_for_end(int fd, int seconds) {
    pollfd socket{.fd = fd, .events = POLLIN | POLLOUT | POLLPRI, .revents = 0};
    const int64_t end = clock_ms() + int64_t{seconds} * 1000;
    int ready = -1;
    int64_t left = 0;
    do {
        left = std::max<int64_t>(end - clock_ms(), 0);
        const timespec limit{.tv_sec = left / 1000, .tv_nsec = left % 1000 * 1000000};
        ready = ppoll(&socket, 1, &limit, nullptr);
    } while (ready < 0 && errno == EINTR && left > 0);
    return ready > 0 && (socket.revents & (POLLIN | POLLOUT | POLLHUP | POLLERR)) != 0;
}

bool is_connected(int fd) {
    int error = 0;
    socklen_t size = sizeof error;
    return getsockopt(fd, SOL_SOCKET, SO_ERROR, &error, &size) == 0 && error == 0;
}

bool answers(const attempt &wanted, const addrinfo &at) {
    const descriptor fd{socket(at.ai_family, at.ai_socktype | SOCK_NONBLOCK | SOCK_CLOEXEC, at.ai_protocol)};
    if (!fd.is_held()) {
        return false;
    }
    const bool is_immediate = connect(fd.get(), at.ai_addr, at.ai_addrlen) == 0;
    if (!is_immediate && (errno != EINPROGRESS || !wait_for_end(fd.get(), wanted.limit) || !is_connected(fd.get()))) {
        return false;
    }
    (void)send(fd.get(), "", 1, MSG_NOSIGNAL); // to a listener that is gone again it may be too late
    return true;
}

bool answers_by_resolver(const char *szHost, const attempt &wanted) {
    const built_text<12> port{"%d", wanted.port};
    addrinfo hints{};
    hints.ai_socktype = SOCK_STREAM;
    address_list found;
    if (getaddrinfo(szHost, port.c_str(), &hints, found.out()) != 0) {
        return false;
    }
    for (const addrinfo *at = found.get(); at != nullptr; at = at->ai_next) {
        if (answers(wanted, *at)) {
            return true;
        }
    }
    return false;
}

bool answers_by_netbios(const char *szHost, const attempt &wanted) {
    netbios_answers found{HERE, szHost};
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<uint16_t>(wanted.port));
    addrinfo at{};
    at.ai_family = AF_INET;
    at.ai_socktype = SOCK_STREAM;
    at.ai_addr = reinterpret_cast<sockaddr *>(&address);
    at.ai_addrlen = sizeof address;
    while (found.next(address.sin_addr)) {
        if (answers(wanted, at)) {
            return true;
        }
    }
    return false;
}

} // namespace

extern "C" int BlKLIBIsConnected(const char *szHost, int nPort, int nTimeout) {
    constexpr int kHighestPort = 65535;
    if (szHost == nullptr) {
        return fail(HERE, NET_ERR_BAD_PARAMETER, 0, "bad parameter, szHost is NULL");
    }
    if (refuses_text(HERE, "szHost", szHost) ||
        refuses(HERE, 0 < nPort && nPort <= kHighestPort, "(0 < nPort && nPort <= 65535)") ||
        refuses(HERE, 0 <= nTimeout, "0 <= nTimeout")) {
        return 0;
    }
    const attempt wanted{.port = nPort, .limit = nTimeout};
    return answers_by_resolver(szHost, wanted) || answers_by_netbios(szHost, wanted) ? 1 : 0;
}
