#include "support/rig.h"

#include <arpa/inet.h>
#include <kovanetsdk/addr.h>
#include <linux/if_packet.h>
#include <net/if.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

using namespace kova_test;

namespace {

/** Two interfaces at the ends of one cable, the second of them listened to. */
class cable {
public:
    explicit cable(const std::string &name) : name_(name) {
        shell("ip link add " + name + " type veth peer name kv1 && ip link set " + name + " up && ip link set kv1 up");
        socket_ = socket(AF_PACKET, SOCK_RAW | SOCK_CLOEXEC | SOCK_NONBLOCK, htons(0x0003));
        sockaddr_ll end{};
        end.sll_family = AF_PACKET;
        end.sll_protocol = htons(0x0003);
        end.sll_ifindex = static_cast<int>(if_nametoindex("kv1"));
        EXPECT_EQ(0, bind(socket_, reinterpret_cast<const sockaddr *>(&end), sizeof end));
    }
    cable(const cable &) = delete;
    cable &operator=(const cable &) = delete;
    ~cable() {
        close(socket_);
        shell("ip link del " + name_);
    }

    /** The next frame that begins like one that wakes; "" when there is none. The kernel's own come and go. */
    [[nodiscard]] std::string next() const {
        for (;;) {
            pollfd waiting{socket_, POLLIN, 0};
            char bytes[2048];
            const ssize_t size = poll(&waiting, 1, 0) == 1 ? recv(socket_, bytes, sizeof bytes, 0) : -1;
            if (size < 0) {
                return "";
            }
            if (size >= 8 && bytes[6] == 0x08 && bytes[7] == 0x42) {
                return {bytes, static_cast<size_t>(size)};
            }
        }
    }

private:
    std::string name_;
    int socket_;
};

std::string wake_frame(const std::string &mac) {
    std::string frame = long_text(6, '\xff') + "\x08\x42" + long_text(6, '\xff');
    for (int i = 0; i < 16; ++i) {
        frame += mac;
    }
    return frame;
}

class net_ether_wake : public unit_test {
protected:
    outcome wake(const std::string &ifname) {
        memset(request.szIfname, 0, sizeof request.szIfname);
        memcpy(request.szIfname, ifname.data(), ifname.size());
        return rig.observe([&] { return KLIBNetEtherWake(&request); });
    }
    static outcome failed(unsigned code, const std::string &log) {
        return {.result = -1, .code = code, .unit = "net_ether_wake", .log = {"ERR net_ether_wake:N " + log}};
    }

    KLIBETHERWAKE request{{0x00, 0x11, 0x32, 0xab, 0xcd, 0xff}, ""};
    const std::string mac{"\x00\x11\x32\xab\xcd\xff", 6};
};

TEST_F(net_ether_wake, KLIBNetEtherWake_frame_goesOutByteForByte) {
    const cable link{"kv0"};
    EXPECT_OUTCOME(wake("kv0"), {.result = 0});
    const std::string frame = link.next();
    EXPECT_EQ(110U, frame.size());
    EXPECT_EQ(wake_frame(mac), frame);
    EXPECT_EQ("", link.next()) << "more than one frame";
}

TEST_F(net_ether_wake, KLIBNetEtherWake_nameOfThirteenCharacters_isUsedWhole) {
    const cable link{"kv0abcdefghij"};
    EXPECT_OUTCOME(wake("kv0abcdefghij"), {.result = 0});
    EXPECT_EQ(wake_frame(mac), link.next());
}

TEST_F(net_ether_wake, KLIBNetEtherWake_longerName_isCutToThirteenCharacters) {
    const cable link{"kv0abcdefghij"};
    EXPECT_OUTCOME(wake("kv0abcdefghijk"), {.result = 0});
    EXPECT_EQ(wake_frame(mac), link.next());
    EXPECT_OUTCOME(wake("kv0abcdefghijklm"), {.result = 0}); // nothing ends the field
    EXPECT_EQ(wake_frame(mac), link.next());
}

TEST_F(net_ether_wake, KLIBNetEtherWake_unknownInterface_is2A00) {
    EXPECT_OUTCOME(wake("kv7"), failed(0x2A00, "Fail to send to [kv7], errno=[19/No such device]"));
    EXPECT_OUTCOME(wake(""), failed(0x2A00, "Fail to send to [], errno=[19/No such device]"));
}

TEST_F(net_ether_wake, KLIBNetEtherWake_interfaceThatIsDown_is2A00) {
    const cable link{"kv0"};
    shell("ip link set kv0 down");
    EXPECT_OUTCOME(wake("kv0"), failed(0x2A00, "Fail to send to [kv0], errno=[100/Network is down]"));
    EXPECT_EQ("", link.next());
}

TEST_F(net_ether_wake, KLIBNetEtherWake_noSocket_is900) {
    rig.fail("socket");
    EXPECT_OUTCOME(wake("kv0"), failed(0x900, "Fail to open packet socket, errno=[24/Too many open files]"));
}

TEST_F(net_ether_wake, KLIBNetEtherWake_broadcastRefused_is2A00AndSendsNothing) {
    const cable link{"kv0"};
    rig.fail("setsockopt");
    EXPECT_OUTCOME(wake("kv0"), failed(0x2A00, "Fail to allow broadcast, errno=[92/Protocol not available]"));
    EXPECT_EQ("", link.next());
}

TEST_F(net_ether_wake, KLIBNetEtherWake_failedSend_is2A00) {
    rig.fail("sendto");
    EXPECT_OUTCOME(wake("kv0"), failed(0x2A00, "Fail to send to [kv0], errno=[105/No buffer space available]"));
}

TEST_F(net_ether_wake, KLIBNetEtherWake_noRequest_isRefused) {
    EXPECT_OUTCOME(rig.observe([] { return KLIBNetEtherWake(nullptr); }), refusal("net_ether_wake", "NULL != pWake"));
}

} // namespace
