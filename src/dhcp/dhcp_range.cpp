#include <kovanetsdk/dhcp.h>

#include "core/guards.h"
#include "core/report.h"
#include "core/text.h"
#include "dhcp/dhcpd_files.h"
#include "dhcp/fragment.h"

#include <arpa/inet.h>
#include <cstring>

using namespace kova;

namespace {

struct range_list_kind {
    static DHCP_RANGE *none() { return nullptr; }
    static void release(DHCP_RANGE *head) { DHCPRangeFree(head); }
};
using range_list = owner<range_list_kind>;

bool is_missing(const char *text) {
    return text == nullptr || *text == '\0';
}

/** An IPv4 address as a number. @return whether the text is one */
bool to_number(const char *text, uint32_t &number) {
    in_addr address{};
    if (inet_pton(AF_INET, text, &address) != 1) {
        return false;
    }
    number = ntohl(address.s_addr);
    return true;
}

/** Whether the fields are tag, start, end, netmask and lease time of a range. */
bool is_range(const comma_fields &fields) {
    if (fields.count() != 5 || *fields[1] == '\0' || *fields[2] == '\0' || *fields[3] == '\0') {
        return false;
    }
    uint32_t start = 0;
    uint32_t end = 0;
    if (!to_number(fields[1], start) || !to_number(fields[2], end)) {
        log_err(HERE, "Failed to convert IPs [%s, %s] to in_addr", fields[1], fields[2]);
        return false;
    }
    return start <= end;
}

/** Reads the range of one fragment into a new node. @return 0; -1, logged */
int read_range(const char *ifname, unsigned subnet, const path_text &path, heap<DHCP_RANGE> &node) {
    char value[1024];
    if (KLIBCFileGetKeyValue(path.c_str(), daemon_key::kRange, value, sizeof value, 0) <= 0 || value[0] == '\0') {
        return fail_keeping_code(HERE, -1, "Failed to get dhcp ranges from subnet [%u] in interface [%s]", subnet,
                                 ifname);
    }
    const comma_fields fields{value};
    if (!fields.is_held()) {
        return fail_keeping_code(HERE, -1, "KLIBCSzListAlloc() failed");
    }
    if (!is_range(fields)) {
        return fail_keeping_code(HERE, -1, "Wrong dhcp-range key in subnet [%u] in interface [%s]", subnet, ifname);
    }
    node.reset(static_cast<DHCP_RANGE *>(malloc(sizeof(DHCP_RANGE))));
    if (node == nullptr) {
        return fail_keeping_code(HERE, -1, "malloc() failed");
    }
    *node = {};
    copy_text(node->start, fields[1]);
    copy_text(node->end, fields[2]);
    copy_text(node->netmask, fields[3]);
    return 0;
}

/** First and last address of a subnet. */
struct span {
    uint32_t first, last;
    [[nodiscard]] bool contains(const span &other) const { return other.last <= last && first <= other.first; }
};

span subnet_of(uint32_t address, uint32_t mask) {
    return {address & mask, address | ~mask};
}

bool overlaps(const char *start, const char *netmask, const DHCP_RANGE &range) {
    uint32_t wanted = 0;
    uint32_t served = 0;
    uint32_t wanted_mask = 0;
    uint32_t served_mask = 0;
    if (!to_number(start, wanted) || !to_number(range.start, served) || !to_number(netmask, wanted_mask) ||
        !to_number(range.netmask, served_mask)) {
        log_err(HERE, "Failed to convert IPs [%s, %s, %s, %s] to in_addr", start, range.start, netmask, range.netmask);
        return false;
    }
    const span one = subnet_of(wanted, wanted_mask);
    const span other = subnet_of(served, served_mask);
    return one.contains(other) || other.contains(one);
}

/** @return 1 when the subnet overlaps one of the interface, 0 when not, -1 when its ranges cannot be read */
int overlaps_interface(const char *other, const char *start, const char *netmask) {
    if (*other != '\0' && !is_interface_name(other)) {
        return 0; // a file of another making, whose name no subnet can have
    }
    range_list ranges;
    if (DHCPGetInterfaceRanges(other, ranges.out()) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get DHCP ranges for interface [%s]", other);
    }
    for (const DHCP_RANGE *range = ranges.get(); range != nullptr; range = range->next) {
        if (overlaps(start, netmask, *range)) {
            return 1;
        }
    }
    return 0;
}

} // namespace

extern "C" void DHCPRangeFree(DHCP_RANGE *head) {
    while (head != nullptr) {
        const heap<DHCP_RANGE> gone{head};
        head = head->next;
    }
}

extern "C" int DHCPGetInterfaceRanges(const char *ifname, DHCP_RANGE **head) {
    if (ifname == nullptr || !is_interface_name(ifname)) {
        return fail_keeping_code(HERE, -1, "Wrong interface name [%s]", ifname);
    }
    if (head == nullptr || *head != nullptr) {
        return fail_keeping_code(HERE, -1, "Wrong dhcp range storage");
    }
    range_list ranges;
    DHCP_RANGE **end = ranges.out();
    unsigned subnet = 0;
    for (;; ++subnet) {
        const path_text path = subnet_conf_path(kTypeV4, ifname, subnet);
        if (KLIBCFileExist(path.c_str()) != 1) {
            break;
        }
        heap<DHCP_RANGE> node;
        if (read_range(ifname, subnet, path, node) < 0) {
            return -1;
        }
        *end = node.release();
        end = &(*end)->next;
    }
    *head = ranges.give_up();
    return static_cast<int>(subnet);
}

extern "C" int DHCPIsRangeConflict(const char *ifname, const char *start, const char *end, const char *netmask,
                                   char *conflict_if, unsigned int size) {
    if (is_missing(ifname) || is_missing(start) || is_missing(end) || is_missing(netmask) ||
        (conflict_if != nullptr && size == 0)) {
        return fail_keeping_code(HERE, -1, "Parameters error");
    }
    if (conflict_if != nullptr) {
        memset(conflict_if, 0, size);
    }
    string_list interfaces;
    const int count = DHCPInterfaceListGet(interfaces.out(), kTypeV4);
    if (count < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get interface list");
    }
    for (int i = 0; i < count; ++i) {
        const char *const other = KLIBCSzListGet(interfaces.get(), i);
        if (is_missing(other)) {
            return fail_keeping_code(HERE, -1, "Failed to get interface from interface list");
        }
        const int found = strcmp(other, ifname) == 0 ? 0 : overlaps_interface(other, start, netmask);
        if (found > 0 && conflict_if != nullptr) {
            snprintf(conflict_if, size, "%s", other);
        }
        if (found != 0) {
            return found;
        }
    }
    return 0;
}
