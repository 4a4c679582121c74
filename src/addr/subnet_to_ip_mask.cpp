#include <kovanetsdk/addr.h>

#include "core/report.h"
#include "core/text.h"

#include <cstdlib>
#include <cstring>

using namespace kova;

namespace {

/** Room that a caller's text has at least. */
constexpr size_t kSubnetSize = 64;

/** A text cut in two at its first "/". */
class split_subnet {
public:
    explicit split_subnet(const char *szSubnet) {
        copy_text(text_, szSubnet);
        char *const slash = strchr(text_, '/');
        if (slash != nullptr && strlen(szSubnet) < sizeof text_) {
            *slash = '\0';
            second_ = slash + 1;
        }
    }
    /** False for a text that is too long for any subnet. */
    [[nodiscard]] bool is_split() const { return second_ != nullptr; }
    [[nodiscard]] const char *address() const { return text_; }
    /** What stands behind the "/". */
    [[nodiscard]] const char *second() const { return second_; }

private:
    char text_[kSubnetSize];
    const char *second_ = nullptr;
};

bool read_parts(const char *szIP, uint32_t (&part)[4]) {
    return cKLIBISepIP(szIP, part) == 4 && part[0] <= 255 && part[1] <= 255 && part[2] <= 255 && part[3] <= 255;
}

/** @return 1 to 32, or 0 for what is no prefix length */
int read_prefix(const char *szPrefix) {
    char *end = nullptr;
    const long prefix = strtol(szPrefix, &end, 0);
    return *end == '\0' && prefix >= 1 && prefix <= 32 ? static_cast<int>(prefix) : 0;
}

/** The four parts of a mask, or of an address cut to its network. */
struct dotted {
    uint32_t part[4];

    static dotted mask(int prefix) {
        const uint32_t value = UINT32_MAX << (32 - prefix);
        return {{value >> 24, value >> 16 & 255, value >> 8 & 255, value & 255}};
    }
    [[nodiscard]] dotted network(const dotted &mask) const {
        return {{part[0] & mask.part[0], part[1] & mask.part[1], part[2] & mask.part[2], part[3] & mask.part[3]}};
    }
};

} // namespace

extern "C" int ErrKLIBSubnetToIpMask(char *szSubnet, char *szIpMask) {
    if (refuses_null_text(HERE, "szSubnet", szSubnet) ||
        refuses(HERE, strchr(szSubnet, '/') != nullptr, "((void *)0) != strchr(szSubnet, '/')")) {
        return -1;
    }
    const split_subnet subnet{szSubnet};
    dotted ip;
    const int prefix = subnet.is_split() && read_parts(subnet.address(), ip.part) ? read_prefix(subnet.second()) : 0;
    if (prefix == 0) {
        return fail_quietly(HERE, NET_ERR_BAD_ADDRESS, -1);
    }
    const dotted mask = dotted::mask(prefix);
    const dotted network = ip.network(mask);
    snprintf(szIpMask != nullptr ? szIpMask : szSubnet, kSubnetSize, "%u.%u.%u.%u/%u.%u.%u.%u", network.part[0],
             network.part[1], network.part[2], network.part[3], mask.part[0], mask.part[1], mask.part[2], mask.part[3]);
    return 0;
}

extern "C" int ErrKLIBIpMaskToSubnet(char *szIpMask, char *szSubnet) {
    if (refuses_null_text(HERE, "szIpMask", szIpMask) ||
        refuses(HERE, strchr(szIpMask, '/') != nullptr, "((void *)0) != strchr(szIpMask, '/')")) {
        return -1;
    }
    const split_subnet subnet{szIpMask};
    dotted ip;
    dotted mask;
    const bool is_read =
        subnet.is_split() && read_parts(subnet.address(), ip.part) && read_parts(subnet.second(), mask.part);
    const int prefix = is_read ? cKLIBICalMask(mask.part) : 0;
    if (prefix == 0) {
        return fail_quietly(HERE, NET_ERR_BAD_ADDRESS, -1);
    }
    const dotted network = ip.network(mask);
    snprintf(szSubnet != nullptr ? szSubnet : szIpMask, kSubnetSize, "%u.%u.%u.%u/%d", network.part[0], network.part[1],
             network.part[2], network.part[3], prefix);
    return 0;
}
