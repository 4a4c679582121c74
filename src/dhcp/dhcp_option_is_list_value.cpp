#include <kovanetsdk/dhcp.h>

#include "dhcp/dhcp_option.h"

#include <algorithm>
#include <cstring>
#include <iterator>

namespace kova {

namespace {

constexpr uint64_t kUnbounded = UINT64_MAX;

constexpr option_kind kOptions[] = {
    {7, option_rule::addresses, "log-server", 0, 0},
    {9, option_rule::addresses, "lpr-server", 0, 0},
    {13, option_rule::number, "boot-file-size", 0, 65536},
    {16, option_rule::address, "swap-server", 0, 0},
    {17, option_rule::text, "root-path", 0, 0},
    {18, option_rule::text, "extension-path", 0, 0},
    {19, option_rule::number, "ip-forward-enable", 0, 1},
    {20, option_rule::number, "non-local-source-routing", 0, 1},
    {21, option_rule::addresses_and_masks, "policy-filter", 0, 0},
    {22, option_rule::number, "max-datagram-reassembly", 576, 65536},
    {23, option_rule::number, "default-ttl", 1, 255},
    {26, option_rule::number, "mtu", 68, 65536},
    {27, option_rule::number, "all-subnets-local", 0, 1},
    {31, option_rule::number, "router-discovery", 0, 1},
    {32, option_rule::address, "router-solicitation", 0, 0},
    {34, option_rule::number, "trailer-encapsulation", 0, 1},
    {35, option_rule::number, "arp-timeout", 0, kUnbounded},
    {36, option_rule::number, "ethernet-encap", 0, 1},
    {37, option_rule::number, "tcp-ttl", 1, 255},
    {38, option_rule::number, "tcp-keepalive", 0, kUnbounded},
    {40, option_rule::text, "nis-domain", 0, 0},
    {41, option_rule::addresses, "nis-server", 0, 0},
    {42, option_rule::addresses, "ntp-server", 0, 0},
    {44, option_rule::addresses, "netbios-ns", 0, 0},
    {45, option_rule::addresses, "netbios-dd", 0, 0},
    {46, option_rule::node_type, "netbios-nodetype", 0, 0},
    {47, option_rule::text, "netbios-scope", 0, 0},
    {48, option_rule::addresses, "x-windows-fs", 0, 0},
    {49, option_rule::addresses, "x-windows-dm", 0, 0},
    {58, option_rule::number, "T1", 0, kUnbounded},
    {59, option_rule::number, "T2", 0, kUnbounded},
    {64, option_rule::text, "nis+-domain", 0, 0},
    {65, option_rule::addresses, "nis+-server", 0, 0},
    {68, option_rule::addresses, "mobile-ip-home", 0, 0},
    {69, option_rule::addresses, "smtp-server", 0, 0},
    {70, option_rule::addresses, "pop3-server", 0, 0},
    {71, option_rule::addresses, "nntp-server", 0, 0},
    {74, option_rule::addresses, "irc-server", 0, 0},
    {120, option_rule::addresses, "sip-server", 0, 0},
    {121, option_rule::routes, "classless-static-route", 0, 0},
};
constexpr option_kind kUnsupported = {0, option_rule::none, "", 0, 0};

} // namespace

const option_kind &option_of(int number) {
    const auto *const found =
        std::find_if(std::begin(kOptions), std::end(kOptions), [=](const auto &kind) { return kind.number == number; });
    return found == std::end(kOptions) ? kUnsupported : *found;
}

const option_kind &option_of(const char *name) {
    const auto *const found = std::find_if(std::begin(kOptions), std::end(kOptions),
                                           [=](const auto &kind) { return strcmp(kind.name, name) == 0; });
    return found == std::end(kOptions) ? kUnsupported : *found;
}

} // namespace kova

using namespace kova;

extern "C" int DHCPOptionIsListValue(unsigned int number) {
    return number <= INT32_MAX && option_of(static_cast<int>(number)).takes_list() ? 1 : 0;
}

extern "C" void DHCPOptionFree(DHCP_OPTION *head) {
    while (head != nullptr) {
        DHCP_OPTION *const next = head->next;
        KLIBCSzListFree(head->items);
        free(head);
        head = next;
    }
}
