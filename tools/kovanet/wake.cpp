// kovanet wake: wakes a sleeping host by its hardware address.
#include "errors.h"
#include "interfaces.h"
#include "objects.h"

#include <algorithm>
#include <kovanetsdk/addr.h>
#include <net/if.h>

namespace kova {
namespace {

struct wake_words {
    std::string name;
    std::string mac;
};

/** Whether a text has pairs of hexadecimal digits with ":" or "-" between them. */
bool has_form_of_mac(const std::string &text) {
    constexpr size_t kLength = 17;
    for (size_t i = 0; i < text.size(); ++i) {
        const std::string allowed = i % 3 == 2 ? ":-" : "0123456789abcdefABCDEF";
        if (allowed.find(text[i]) == std::string::npos) {
            return false;
        }
    }
    return text.size() == kLength;
}

/** The bytes of "52:54:00:12:34:56". Ends the program for a text that is no address of one host. */
void read_mac(const std::string &text, unsigned char (&mac)[6]) {
    const std::string invalid = "hardware address \"" + text + "\" is not valid: ";
    if (!has_form_of_mac(text)) {
        throw failure{kNo, invalid + "it looks like 52:54:00:12:34:56"};
    }
    for (size_t i = 0; i < sizeof mac; ++i) {
        mac[i] = static_cast<unsigned char>(std::stoi(text.substr(3 * i, 2), nullptr, 16));
    }
    if ((mac[0] & 1) != 0 ||
        std::all_of(std::begin(mac), std::end(mac), [](unsigned char byte) { return byte == 0; })) {
        throw failure{kNo, invalid + "no single host has it"};
    }
}

/** Ends the program for an interface over which the library cannot wake anybody. */
void require_usable(const std::string &name) {
    constexpr size_t kMostCharacters = 13;
    const IFINFO info = require_interface(name);
    if (name.size() > kMostCharacters) {
        throw failure{kNo, name + " cannot be used: its name has more than 13 characters"};
    }
    if ((info.nFlags & IFF_LOOPBACK) != 0) {
        throw failure{kNo, name + " is the loopback, with no other host behind it"};
    }
    if ((info.nFlags & IFF_UP) == 0) {
        throw failure{kNo, name + " is down; first: kovanet link up " + name};
    }
}

void wake(const wake_words &words) {
    require_root("waking a host");
    KLIBETHERWAKE request{};
    read_mac(words.mac, request.abMac);
    require_usable(words.name);
    words.name.copy(request.szIfname, sizeof request.szIfname - 1);
    clear_error();
    if (KLIBNetEtherWake(&request) < 0) {
        call_failed("cannot wake " + words.mac + " over " + words.name);
    }
}

} // namespace

void add_wake(CLI::App &object, const global_options &) {
    auto &words = words_of<wake_words>();
    object.add_option("IF", words.name, "interface that the host is behind")->required();
    object.add_option("MAC", words.mac, "its hardware address")->required();
    object.callback([&words] { wake(words); });
}

} // namespace kova
