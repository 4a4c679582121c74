#include "rules.h"

#include "errors.h"

#include <algorithm>
#include <arpa/inet.h>
#include <kovanetsdk/addr.h>

namespace kova {
namespace {

struct dotted {
    int count; /**< parts read, 4 for a whole text */
    uint32_t part[4];
};

dotted parts_of(const std::string &text) {
    dotted parts{};
    parts.count = cKLIBISepIP(text.c_str(), parts.part);
    return parts;
}

bool is_too_big(const dotted &parts) {
    return std::any_of(std::begin(parts.part), std::end(parts.part), [](uint32_t part) { return part > 255; });
}

bool is_control(unsigned char character) {
    return character < 33 || character == 127;
}

} // namespace

refusal refuse_address(const std::string &address) {
    if (BlKLIBIsIpAddr(address.c_str()) == 1) {
        return std::nullopt;
    }
    const dotted parts = parts_of(address);
    if (parts.count != 4) {
        return "an IPv4 address is four numbers with dots between them";
    }
    if (parts.part[0] == 0) {
        return "addresses that begin with 0 name no host";
    }
    if (parts.part[0] == 127) {
        return "addresses that begin with 127 are the machine's own loopback";
    }
    if (parts.part[0] > 223) {
        return "the first number of a host's address is at most 223";
    }
    return "each number of an address is at most 255";
}

refusal refuse_mask(const std::string &mask) {
    std::string normalised = mask; // the check rewrites it in place, in at most 16 bytes
    normalised.resize(std::max<size_t>(mask.size(), 16));
    if (BlKLIBIsIpMask(normalised.data()) == 1) {
        return std::nullopt;
    }
    const dotted parts = parts_of(mask);
    if (parts.count != 4) {
        return "a mask is four numbers with dots between them";
    }
    if (is_too_big(parts)) {
        return "each number of a mask is at most 255";
    }
    if (std::all_of(std::begin(parts.part), std::end(parts.part), [](uint32_t part) { return part == 0; })) {
        return "a mask has at least one bit set";
    }
    return "the set bits of a mask come first, without a gap";
}

refusal refuse_address_and_mask(const std::string &address, const std::string &mask) {
    if (BlKLIBIsValidIpMask(address.c_str(), mask.c_str()) == 1) {
        return std::nullopt;
    }
    if (refusal refused = refuse_address(address)) {
        return refused;
    }
    if (refusal refused = refuse_mask(mask)) {
        return refused;
    }
    return "the address is the broadcast address of its network";
}

refusal refuse_prefix(const std::string &prefix) {
    std::string input = prefix;
    char output[64];
    if (ErrKLIBSubnetToIpMask(input.data(), output) == 0) {
        return std::nullopt;
    }
    const size_t slash = prefix.find('/');
    if (slash == std::string::npos) {
        return "a prefix is an address, \"/\" and a length";
    }
    const dotted parts = parts_of(prefix.substr(0, slash));
    if (parts.count != 4) {
        return "an IPv4 address is four numbers with dots between them";
    }
    return is_too_big(parts) ? "each number of an address is at most 255"
                             : "the prefix length is a number from 1 to 32";
}

refusal refuse_ipv6(const std::string &address) {
    if (BlKLIBIsv6IpAddrValid(address.c_str()) == 1) {
        return std::nullopt;
    }
    const size_t slash = address.find('/');
    if (slash != std::string::npos && BlKLIBIsv6IpAddrValid(address.substr(0, slash).c_str()) == 1) {
        return "the prefix length is a number from 0 to 128";
    }
    return "an IPv6 address is up to eight groups of hexadecimal digits with \":\" between them, \"::\" at most once";
}

refusal refuse_hostname(const std::string &name) {
    if (BlKLIBIsHostname(name.c_str()) == 1) {
        return std::nullopt;
    }
    if (name.empty()) {
        return "a host name is not empty";
    }
    if (name.size() > 15) {
        return "a host name has at most 15 characters";
    }
    const auto first = static_cast<unsigned char>(name[0]);
    if (isalpha(first) == 0 && first != '_') {
        return "a host name begins with a letter or \"_\"";
    }
    return "a host name holds only letters, digits, \"-\" and \"_\"";
}

refusal refuse_new_hostname(const std::string &name) {
    const auto is_part = [](unsigned char c) { return isalnum(c) != 0 || c == '-' || c == '_' || c == '.'; };
    if (name.empty() || name.size() > 63) {
        return "a host name has 1 to 63 characters";
    }
    if (!std::all_of(name.begin(), name.end(), is_part)) {
        return "a host name holds only letters, digits, \"-\", \"_\" and \".\"";
    }
    if (name[0] == '-' || name[0] == '.') {
        return "a host name begins with a letter, a digit or \"_\"";
    }
    return std::nullopt;
}

refusal refuse_domain(const std::string &name) {
    if (BlKLIBIsDomain(name.c_str()) == 1) {
        return std::nullopt;
    }
    if (name.empty() || name.front() == '.' || name.back() == '.' || name.find("..") != std::string::npos) {
        return "no part of a domain name is empty";
    }
    return "a domain name holds no blanks, control characters or any of \"(),:;<>[\\]@";
}

refusal refuse_server(const std::string &address) {
    if (KOVANetGetAddrType(address.c_str()) != 0) {
        return std::nullopt;
    }
    return "a name server is an IPv4 address, four numbers with dots between them, or an IPv6 address";
}

refusal refuse_interface_name(const std::string &name) {
    if (name.empty() || name.size() > 15) {
        return "an interface name has 1 to 15 characters";
    }
    if (name == "." || name == ".." || name.find('/') != std::string::npos ||
        std::any_of(name.begin(), name.end(), is_control)) {
        return "an interface name holds no \"/\", blank or control character and is not \".\" or \"..\"";
    }
    return std::nullopt;
}

refusal refuse_new_interface_name(const std::string &name) {
    if (name.find_first_of("%:") != std::string::npos) {
        return "an interface is given no name with \"%\" or \":\"";
    }
    return refuse_interface_name(name);
}

refusal refuse_server_text(const std::string &text) {
    if (text.empty()) {
        return "it is empty";
    }
    if (std::any_of(text.begin(), text.end(),
                    [](char c) { return c != ' ' && is_control(static_cast<unsigned char>(c)); })) {
        return "it holds a control character";
    }
    if (text.find(',') != std::string::npos) {
        return "it holds \",\", which stands between the values in the server's file";
    }
    if (text.find('"') != std::string::npos) {
        return "it holds a double quote, which means something else in the server's file";
    }
    if (text.find(" #") != std::string::npos) {
        return "it holds \"#\" behind a blank, which begins a comment in the server's file";
    }
    if (text.front() == ' ' || text.back() == ' ') {
        return "it begins or ends with a blank, which the server would drop";
    }
    return std::nullopt;
}

refusal refuse_server_line(const std::string &line) {
    constexpr size_t kLongest = 1023;
    if (line.size() <= kLongest) {
        return std::nullopt;
    }
    return textf("it is %zu characters too long for a line of the server's file", line.size() - kLongest);
}

void require(const std::string &what, const refusal &refused) {
    if (refused) {
        throw failure{kNo, what + " is not valid: " + *refused};
    }
}

bool is_same_ipv6(const std::string &one, const std::string &other) {
    in6_addr first{};
    in6_addr second{};
    return inet_pton(AF_INET6, one.c_str(), &first) == 1 && inet_pton(AF_INET6, other.c_str(), &second) == 1 &&
           IN6_ARE_ADDR_EQUAL(&first, &second);
}

std::string plain_address(const std::string &address) {
    const dotted parts = parts_of(address);
    return textf("%u.%u.%u.%u", parts.part[0], parts.part[1], parts.part[2], parts.part[3]);
}

network network_of(const std::string &prefix) {
    std::string input = prefix;
    char output[64] = "";
    ErrKLIBSubnetToIpMask(input.data(), output);
    const std::string both = output;
    const size_t slash = std::min(both.find('/'), both.size());
    return {both.substr(0, slash), both.substr(std::min(slash + 1, both.size()))};
}

network fixed_address_of(const std::string &given) {
    const size_t slash = given.find('/');
    if (slash == std::string::npos) {
        throw failure{kUsage, "give the address with its prefix length, as ADDRESS/LENGTH"};
    }
    const std::string address = given.substr(0, slash);
    require("address \"" + address + "\"", refuse_address(address));
    require("prefix \"" + given + "\"", refuse_prefix(given));
    const std::string mask = network_of(given).mask;
    require("address \"" + address + "\" with mask \"" + mask + "\"", refuse_address_and_mask(address, mask));
    return {plain_address(address), mask};
}

} // namespace kova
