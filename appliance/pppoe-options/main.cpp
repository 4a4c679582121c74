// pppoe-options: prints the settings of the PPPoE client, its password among them, as options of pppd. They are for a
// pipe to pppd, never for a command line or a file.
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <kova/core.h>
#include <kovanetsdk/pppoe.h>
#include <string>
#include <strings.h>

namespace kova {
namespace {

/** A word as pppd reads it back, whatever it holds. */
std::string quoted(const std::string &text) {
    std::string word = "\"";
    for (const char byte : text) {
        if (byte == '"' || byte == '\\') {
            word += '\\';
        }
        word += byte;
    }
    return word + '"';
}

/** An MTU, or what the link allows when none is set; "" for what is none. */
std::string mtu_of(const std::string &text) {
    constexpr char kMost[] = "1492"; // an Ethernet frame without the headers of PPPoE and PPP
    constexpr size_t kMostDigits = 5;
    if (text.empty()) {
        return kMost;
    }
    const bool is_number = text.size() <= kMostDigits && text.find_first_not_of("0123456789") == std::string::npos;
    return is_number ? text : "";
}

int complain(const char *text) {
    fprintf(stderr, "pppoe-options: %s\n", text);
    return 1;
}

int print_options() {
    PPPOE_CONF conf;
    if (PPPoEConfigGet(&conf) < 0) {
        return complain("cannot read /etc/ppp/pppoe.conf and /etc/ppp/pap-secrets");
    }
    const std::string mtu = mtu_of(conf.szMTU);
    if (*conf.szIfname == '\0' || *conf.szUser == '\0') {
        return complain("/etc/ppp/pppoe.conf: no interface (ETH) or no user (USER)");
    }
    if (mtu.empty()) {
        return complain("/etc/ppp/pppoe.conf: MTU is not a number");
    }
    std::string options = quoted(std::string("nic-") + conf.szIfname) + "\nuser " + quoted(conf.szUser) +
                          "\npassword " + quoted(conf.szPassword) + "\nmtu " + mtu + "\nmru " + mtu + '\n';
    if (conf.blDefaultRoute != 0) {
        options += "defaultroute\nreplacedefaultroute\nusepeerdns\n"; // its name servers are reached over its route
    }
    explicit_bzero(&conf, sizeof conf);
    const bool is_written = fputs(options.c_str(), stdout) >= 0 && fflush(stdout) == 0;
    explicit_bzero(options.data(), options.size());
    return is_written ? 0 : complain("nobody takes the options");
}

} // namespace
} // namespace kova

int main() {
    return kova::print_options();
}
