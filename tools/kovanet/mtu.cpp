// kovanet mtu: the largest packets of the interfaces, in use and configured.
#include "composition.h"
#include "confirm.h"
#include "errors.h"
#include "objects.h"
#include "words.h"

#include <cstdio>
#include <kovanetsdk/routing.h>
#include <net/if.h>

namespace kova {
namespace {

/** A number, 0 for what is none or no MTU. */
int mtu_of(const std::string &text) {
    constexpr int64_t kMost = 99999;
    return static_cast<int>(decimal_in(text, 0, kMost).value_or(0));
}

std::string configured_mtu(const std::string &name) {
    char value[64] = "";
    clear_error();
    if (KOVAConfGetMTUValue(name.c_str(), value, sizeof value) < 0) {
        call_failed("cannot read the configured MTU of " + name);
    }
    return value;
}

json describe(const std::string &name) {
    json row;
    row["name"] = name;
    row["mtu"] = known_number(KOVAGetMTUSetting(name.c_str()), 1);
    row["configured_mtu"] = known_number(mtu_of(configured_mtu(name)), 1);
    return row;
}

constexpr column kColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"MTU", [](const json &row) { return field(row, "mtu"); }, true},
    {"CONFIGURED", [](const json &row) { return field(row, "configured_mtu"); }, true},
};

void show(const std::optional<std::string> &name, bool as_json) {
    json rows = json::array();
    if (name) {
        rows.push_back(describe(require_interface(*name).szIfname));
    } else {
        for (const IFINFO &info : all_interfaces()) {
            rows.push_back(describe(info.szIfname));
        }
    }
    show_table(rows, kColumns, as_json);
}

struct mtu_words {
    std::optional<std::string> shown;
    std::string name;
    std::string mtu;
    bool is_confirmed = false;
};

/** The least that IPv4 needs and the most that an interface can be given. */
std::string checked_mtu(const std::string &text) {
    constexpr int kLeast = 68;
    constexpr int kMost = 65535;
    const int mtu = mtu_of(text);
    if (mtu < kLeast || mtu > kMost) {
        throw failure{kNo, "MTU \"" + text + "\" is not valid: it is a number from 68 to 65535"};
    }
    return std::to_string(mtu);
}

/** The interfaces that get the MTU of one, in the order they get it. */
names given_with(const std::string &name) {
    if (const std::optional<VLANINFO> vlan = find_vlan(name)) {
        return {vlan->szRowDevice, name};
    }
    if (const std::optional<std::string> original = behind_switch_port(name)) {
        return {*original};
    }
    const names members = is_switch_bond(name) ? members_of(find_bond(name).value_or(KOVALINKAGGROPT{})) : names{};
    return members.empty() ? names{name} : members;
}

/** Whether a link is too slow for an MTU, which is then kept for a faster one; a bond of the switch never is. */
bool is_too_slow_for(const std::string &name, const std::string &mtu) {
    constexpr int kGigabit = 1000;
    constexpr int kJumbo = 1500;
    ETHINFO link{};
    return mtu_of(mtu) >= kJumbo && !is_switch_bond(name) && KOVANetGetEthInfo(&link, name.c_str()) == 0 &&
           link.nSpeed < kGigabit;
}

names effects_of(const std::string &name, const std::string &mtu) {
    const names given = given_with(name);
    const bool is_one = given.size() == 1;
    const std::string changed = joined(given, " and ");
    if (is_too_slow_for(name, mtu)) {
        return {"The MTU " + mtu + " of " + changed +
                    " is stored, but not used now: the link is slower than 1000 Mb/s, "
                    "or its speed is not known.",
                "Addresses stay as they are."};
    }
    return {changed + " get" + (is_one ? "s" : "") + " the MTU " + mtu + " and go" + (is_one ? "es" : "") +
                " down for a moment.",
            "IPv4 addresses and the default gateway stay; IPv6 addresses that were added by hand are lost.",
            "Connections over " + changed + " pause."};
}

/** The MTU of an interface, stored and in use, to be put back. */
class kept_mtu {
public:
    explicit kept_mtu(const std::string &name)
        : name_(name), key_(name + "_mtu"), in_use_(is_switch_bond(name) ? 0 : KOVAGetMTU(name.c_str())) {
        clear_error();
        const int found = KLIBCFileGetKeyValue("/etc/kovainfo.conf", key_.c_str(), stored_, sizeof stored_, 0);
        if (found < 0) {
            call_failed("cannot read the configured MTU of " + name);
        }
        is_stored_ = found > 0;
    }
    void put_back() const {
        if (is_stored_) {
            KLIBCINFOSetKeyValue(key_.c_str(), stored_);
        } else {
            KLIBCINFORemoveKey(key_.c_str());
        }
        if (in_use_ > 0 && KOVAGetMTU(name_.c_str()) != in_use_) {
            KOVANetSetMTUEth(std::to_string(in_use_).c_str(), name_.c_str());
        }
    }

private:
    std::string name_;
    std::string key_;
    int in_use_; // 0 for a bond of the switch, which only its members have one for
    char stored_[64] = "";
    bool is_stored_ = false;
};

/** Keeps what is configured and what the kernel drops when an interface goes down; puts back what was lost. */
class kept_settings {
public:
    explicit kept_settings(const std::string &name) {
        for (const std::string &given : given_with(name)) {
            mtus_.emplace_back(given);
        }
        if (is_switch_bond(name)) {
            mtus_.emplace_back(name);
        }
        char interface[IFNAMSIZ] = "";
        DefaultGatewayGet(gateway_, sizeof gateway_, interface, sizeof interface);
    }
    kept_settings(const kept_settings &) = delete;
    kept_settings &operator=(const kept_settings &) = delete;
    ~kept_settings() {
        char gateway[16] = "";
        char interface[IFNAMSIZ] = "";
        DefaultGatewayGet(gateway, sizeof gateway, interface, sizeof interface);
        if (*gateway_ != '\0' && *gateway == '\0') {
            KOVANetDefaultGatewaySet(gateway_);
        }
    }
    /** A value that the kernel does not take is not kept for the next start, nor where it was taken before. */
    void put_back_mtus() const {
        for (const kept_mtu &mtu : mtus_) {
            mtu.put_back();
        }
    }

private:
    std::vector<kept_mtu> mtus_;
    char gateway_[16] = "";
};

[[noreturn]] void set_failed(const std::string &what, const kept_settings &kept) {
    try {
        call_failed(what); // before another call changes the error register
    } catch (const failure &) {
        kept.put_back_mtus();
        throw;
    }
}

void set(const mtu_words &words) {
    require_root();
    const std::string mtu = checked_mtu(words.mtu);
    if ((require_interface(words.name).nFlags & IFF_LOOPBACK) != 0) {
        throw failure{kNo, words.name + " is the loopback, whose MTU is not changed here"};
    }
    confirm(effects_of(words.name, mtu), words.is_confirmed);

    const change_lock lock;
    const kept_settings kept{words.name};
    const step_note note{"setting the MTU of " + words.name + ", this takes five seconds"};
    clear_error();
    if (KOVANetSetMTUValue(mtu.c_str(), words.name.c_str()) < 0) {
        set_failed("cannot set the MTU of " + words.name + " to " + mtu, kept);
    }
}

} // namespace

void add_mtu(CLI::App &object, const global_options &options) {
    auto &words = words_of<mtu_words>();
    CLI::App &one = *object.add_subcommand("show", "the MTU of all interfaces, or of one");
    one.add_option("IF", words.shown, "interface");
    one.callback([&words, &options] { show(words.shown, options.json); });

    CLI::App &change = *object.add_subcommand("set", "set the MTU of an interface, now and at every start");
    change.add_option("IF", words.name, "interface")->required();
    change.add_option("MTU", words.mtu, "bytes, 68 to 65535; the interface may allow less")->required();
    add_yes(change, words.is_confirmed);
    change.callback([&words] { set(words); });
}

} // namespace kova
