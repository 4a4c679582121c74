#include "support/connections.h"

#include "support/fault_points.h"

#include <arpa/inet.h>
#include <dlfcn.h>
#include <sys/socket.h>
#include <unistd.h>

namespace kova_test {

std::function<int(pollfd &asked, long ms)> on_poll;

namespace {

sockaddr_in address_of(const std::string &text, int port) {
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(static_cast<uint16_t>(port));
    EXPECT_EQ(1, inet_pton(AF_INET, text.c_str(), &address.sin_addr)) << text;
    return address;
}

} // namespace

test_socket::~test_socket() {
    if (fd_ >= 0) {
        close(fd_);
    }
}

listener::listener(const std::string &address, int port)
    : address_(address), socket_(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
    const int on = 1;
    constexpr int kMostWaiting = 16;
    sockaddr_in at = address_of(address, port);
    socklen_t size = sizeof at;
    setsockopt(socket_.get(), SOL_SOCKET, SO_REUSEADDR, &on, sizeof on);
    const bool works = bind(socket_.get(), reinterpret_cast<sockaddr *>(&at), sizeof at) == 0 &&
                       listen(socket_.get(), kMostWaiting) == 0 &&
                       getsockname(socket_.get(), reinterpret_cast<sockaddr *>(&at), &size) == 0;
    EXPECT_TRUE(works) << "cannot listen on " << address << ": " << strerror(errno);
    port_ = ntohs(at.sin_port);
}

test_socket listener::connected() const {
    test_socket made{socket(AF_INET, SOCK_STREAM | SOCK_NONBLOCK | SOCK_CLOEXEC, 0)};
    const sockaddr_in at = address_of(address_, port_);
    const int result = connect(made.get(), reinterpret_cast<const sockaddr *>(&at), sizeof at);
    EXPECT_TRUE(result == 0 || errno == EINPROGRESS) << strerror(errno);
    return made;
}

void listener::stop_answering() {
    EXPECT_EQ(0, listen(socket_.get(), 0));
    bool is_full = false;
    for (int tries = 0; tries < 32 && !is_full; ++tries) {
        in_the_way_.push_back(connected());
        pollfd asked{in_the_way_.back().get(), POLLOUT, 0};
        constexpr int kLongEnoughOnLoopback = 300; // milliseconds, on a busy machine
        is_full = poll(&asked, 1, kLongEnoughOnLoopback) == 0;
    }
    EXPECT_TRUE(is_full);
}

std::optional<std::string> listener::received() {
    pollfd waiting{socket_.get(), POLLIN, 0};
    if (poll(&waiting, 1, 0) != 1) {
        return std::nullopt;
    }
    const test_socket one{accept(socket_.get(), nullptr, nullptr)};
    std::string all;
    char bytes[16];
    for (ssize_t got = 1; got > 0;) {
        got = recv(one.get(), bytes, sizeof bytes, 0);
        EXPECT_GE(got, 0) << strerror(errno);
        all.append(bytes, static_cast<size_t>(std::max<ssize_t>(got, 0)));
    }
    return all;
}

int closed_port() {
    const listener gone;
    return gone.port();
}

} // namespace kova_test

using kova_test::can_fail;
using kova_test::current_rig;
using kova_test::fault_point;
using kova_test::is_in_code_under_test;

namespace {

template<typename Function> Function *real(const char *name) {
    return reinterpret_cast<Function *>(dlsym(RTLD_NEXT, name));
}

/** Whether the sweep's plan, or a test, wants a call of the library to fail. */
bool is_failing(const char *operation, const void *caller) {
    const bool is_counted = is_in_code_under_test(caller);
    const fault_point point{operation, is_counted, [] { return std::string(); }};
    return point.fails() || (current_rig != nullptr && current_rig->is_failing(operation));
}

int failure(int error) {
    errno = error;
    return -1;
}

const bool known[] = {can_fail("connect"), can_fail("ppoll"), can_fail("getsockopt"), can_fail("SO_ERROR"),
                      can_fail("send")};

} // namespace

extern "C" int connect(int fd, const sockaddr *to, socklen_t size) {
    return is_failing("connect", __builtin_return_address(0)) ? failure(ENETUNREACH)
                                                              : real<decltype(connect)>("connect")(fd, to, size);
}

extern "C" int ppoll(pollfd *asked, nfds_t number, const timespec *limit, const sigset_t *mask) {
    if (is_failing("ppoll", __builtin_return_address(0))) {
        return failure(ENOMEM);
    }
    return kova_test::on_poll ? kova_test::on_poll(*asked, limit->tv_sec * 1000 + limit->tv_nsec / 1000000)
                              : real<decltype(ppoll)>("ppoll")(asked, number, limit, mask);
}

extern "C" int getsockopt(int fd, int level, int option, void *value, socklen_t *size) noexcept {
    if (is_failing("getsockopt", __builtin_return_address(0))) {
        return failure(ENOBUFS);
    }
    const int result = real<int(int, int, int, void *, socklen_t *)>("getsockopt")(fd, level, option, value, size);
    if (option == SO_ERROR && is_failing("SO_ERROR", nullptr)) {
        *static_cast<int *>(value) = ECONNREFUSED;
    }
    return result;
}

extern "C" ssize_t send(int fd, const void *bytes, size_t size, int flags) {
    return is_failing("send", __builtin_return_address(0)) ? failure(EPIPE)
                                                           : real<decltype(send)>("send")(fd, bytes, size, flags);
}
