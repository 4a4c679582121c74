#include <kovanetsdk/addr.h>

#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"

#include <cerrno>
#include <cstring>
#include <sys/socket.h>

namespace {

using namespace kova;

/** The frame as it goes over the wire; two fixed bytes stand where a source address would begin. */
struct wake_frame {
    unsigned char destination[6];
    unsigned char fixed[2];
    unsigned char synchronisation[6];
    unsigned char target[16][6];
};
static_assert(sizeof(wake_frame) == 110);

wake_frame frame_for(const unsigned char (&mac)[6]) {
    wake_frame frame{};
    memset(frame.destination, 0xFF, sizeof frame.destination);
    frame.fixed[0] = 0x08;
    frame.fixed[1] = 0x42;
    memset(frame.synchronisation, 0xFF, sizeof frame.synchronisation);
    for (int i = 0; i < 16; ++i) {
        memcpy(frame.target[i], mac, sizeof mac);
    }
    return frame;
}

/** The kernel takes the name of the interface in place of an address. */
sockaddr address_of(const char *szIfname) {
    sockaddr address{};
    copy_text(address.sa_data, szIfname);
    return address;
}

} // namespace

extern "C" int KLIBNetEtherWake(const KLIBETHERWAKE *pWake) {
    if (refuses_null(HERE, "pWake", pWake)) {
        return -1;
    }
    constexpr int kProtocol = 10;
    const descriptor socket_held{socket(AF_PACKET, SOCK_PACKET | SOCK_CLOEXEC, kProtocol)};
    if (!socket_held.is_held()) {
        return fail(HERE, NET_ERR_FILE_OPEN, -1, "Fail to open packet socket, errno=[%d/%m]", errno);
    }
    const int yes = 1;
    if (setsockopt(socket_held.get(), SOL_SOCKET, SO_BROADCAST, &yes, sizeof yes) < 0) {
        return fail(HERE, NET_ERR_EXEC, -1, "Fail to allow broadcast, errno=[%d/%m]", errno);
    }
    const field_text ifname{pWake->szIfname};
    const wake_frame frame = frame_for(pWake->abMac);
    const sockaddr address = address_of(ifname.c_str());
    if (sendto(socket_held.get(), &frame, sizeof frame, 0, &address, sizeof address) !=
        static_cast<ssize_t>(sizeof frame)) {
        return fail(HERE, NET_ERR_EXEC, -1, "Fail to send to [%s], errno=[%d/%m]", address.sa_data, errno);
    }
    return 0;
}
