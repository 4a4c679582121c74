#include "support/kernel.h"

#include <arpa/inet.h>
#include <cerrno>
#include <cstring>
#include <linux/sockios.h>
#include <netinet/in.h>
#include <sys/ioctl.h>

namespace kova_test {

namespace {

int failed(int error) {
    errno = error;
    return -1;
}

int give_address(ifreq &record, const std::string &text) {
    if (text.empty()) {
        return failed(EADDRNOTAVAIL);
    }
    sockaddr_in address{};
    address.sin_family = AF_INET;
    EXPECT_EQ(1, inet_pton(AF_INET, text.c_str(), &address.sin_addr)) << text;
    memcpy(&record.ifr_addr, &address, sizeof address);
    return 0;
}

} // namespace

kernel_interfaces::kernel_interfaces(test_rig &rig, const std::map<std::string, kernel_interface> &interfaces)
    : interfaces_(interfaces) {
    rig.answer_ioctl([this](unsigned long request, void *argument) { return answer(request, argument); });
}

int kernel_interfaces::answer(unsigned long request, void *argument) {
    auto &record = *static_cast<ifreq *>(argument);
    const auto found = interfaces_.find(record.ifr_name);
    if (found == interfaces_.end()) {
        return failed(ENODEV);
    }
    kernel_interface &interface = found->second;
    switch (request) {
    case SIOCGIFFLAGS:
        record.ifr_flags = static_cast<short>(interface.flags);
        return 0;
    case SIOCGIFADDR:
        return give_address(record, interface.ip);
    case SIOCGIFNETMASK:
        return give_address(record, interface.mask);
    case SIOCGIFHWADDR:
        memcpy(record.ifr_hwaddr.sa_data, "\x02\0\0\0\0\1", 6);
        return 0;
    case SIOCSIFFLAGS:
        interface.flags = interface.refusal == 0 ? static_cast<unsigned short>(record.ifr_flags) : interface.flags;
        break;
    case SIOCSIFNAME:
        interface.renamed = interface.refusal == 0 ? record.ifr_newname : "";
        break;
    default:
        return failed(EOPNOTSUPP);
    }
    return interface.refusal == 0 ? 0 : failed(interface.refusal);
}

} // namespace kova_test
