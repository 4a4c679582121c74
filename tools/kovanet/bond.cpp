// kovanet bond: bonds, several interfaces used as one.
#include "composition.h"
#include "confirm.h"
#include "errors.h"
#include "lists.h"
#include "objects.h"
#include "words.h"

#include <algorithm>
#include <cstdio>
#include <kovanetsdk/bridge.h>
#include <kovanetsdk/dhcp.h>
#include <net/if.h>

namespace kova {
namespace {

constexpr int kFewestMembers = 2;

// ---- what there is

bool holds(const names &all, const std::string &name) {
    return std::find(all.begin(), all.end(), name) != all.end();
}

json describe(const KOVALINKAGGROPT &opt) {
    json row;
    row["name"] = opt.szName;
    row["mode"] = opt.mode == KOVA_LINK_AGGR_UNKNOWN ? json() : json(KOVANetLinkAggrModeToString(opt.mode));
    row["members"] = members_of(opt);
    row["partner"] = opt.mode == KOVA_LINK_AGGR_8023AD ? json(opt.blNoPartner == 0) : json();
    add_state(row, opt.szName);
    return row;
}

std::string partner_text(const json &row) {
    return row["partner"].is_null() ? "-" : row["partner"] == true ? "found" : "none";
}

constexpr column kListColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"MODE", [](const json &row) { return field(row, "mode"); }},
    {"STATE", up_field},
    {"LINK", [](const json &row) { return field(row, "link"); }},
    {"ADDRESS", state_address},
    {"MEMBERS", [](const json &row) { return words_field(row, "members"); }},
};

constexpr column kShowColumns[] = {
    {"name", [](const json &row) { return field(row, "name"); }},
    {"mode", [](const json &row) { return field(row, "mode"); }},
    {"members", [](const json &row) { return words_field(row, "members"); }},
    {"partner", partner_text},
    {"state", up_field},
    {"link", [](const json &row) { return field(row, "link"); }},
    {"address", state_address},
};

void list(bool as_json) {
    json rows = json::array();
    for (const IFINFO &info : all_interfaces()) {
        if (const std::optional<KOVALINKAGGROPT> bond = find_bond(info.szIfname)) {
            rows.push_back(describe(*bond));
        }
    }
    show_table(rows, kListColumns, as_json);
}

KOVALINKAGGROPT require_bond(const std::string &name) {
    require_interface(name);
    const std::optional<KOVALINKAGGROPT> bond = find_bond(name);
    if (!bond) {
        throw failure{kNotFound, name + " is no bond with members; see kovanet bond list"};
    }
    return *bond;
}

void show(const std::string &name, bool as_json) {
    const json record = describe(require_bond(name));
    show_record(record, kShowColumns, as_json);
}

// ---- what is wanted

struct bond_words {
    std::string name;
    std::string mode;
    names members;
    bool is_confirmed = false;
};

/** A mode by its whole name, which the library takes as the beginning of one. */
int mode_of(const std::string &text) {
    names known;
    for (int mode = KOVA_LINK_AGGR_BALANCE_ALB; mode < KOVA_LINK_AGGR_MODES; ++mode) {
        known.emplace_back(KOVANetLinkAggrModeToString(mode));
    }
    const auto found = std::find(known.begin(), known.end(), text);
    if (found == known.end()) {
        known.resize(KOVA_LINK_AGGR_BALANCE_RR);
        const std::string meant = suggestion(text, known);
        throw failure{kUsage, "mode \"" + text + "\" is not known" +
                                  (meant.empty() ? "; the modes are " + joined(known) : meant)};
    }
    const int mode = static_cast<int>(found - known.begin()) + KOVA_LINK_AGGR_BALANCE_ALB;
    if (mode > KOVA_LINK_AGGR_BALANCE_RR) {
        throw failure{kNo, "mode \"" + text + "\" is one of the virtual switch, whose bonds are not made here"};
    }
    return mode;
}

refusal refuse_bond_name(const std::string &name) {
    const auto is_part = [](unsigned char c) { return isalnum(c) != 0 || c == '-' || c == '_'; };
    if (refusal refused = refuse_interface_name(name)) {
        return refused;
    }
    if (isalpha(static_cast<unsigned char>(name[0])) == 0 || !std::all_of(name.begin(), name.end(), is_part)) {
        return "a bond's name begins with a letter and holds only letters, digits, \"-\" and \"_\"";
    }
    if (name.starts_with("ovs_")) {
        return "names that begin with ovs_ are the virtual switch's";
    }
    return std::nullopt;
}

/** One interface that is to be a member, and is not one of the bond yet. */
void require_joinable(const std::string &name) {
    if ((require_unused(name).nFlags & IFF_MASTER) != 0 || KLIBNetBridgeIfIsMaster(name.c_str()) == 1) {
        throw failure{kNo, name + " is a bond or bridge itself and cannot be a member"};
    }
    require_file(name);
}

/** The members wanted, sorted as the library wants them. */
names checked_members(const bond_words &words, const names &present) {
    names members = words.members;
    std::sort(members.begin(), members.end());
    for (const std::string &name : members) {
        require("interface name \"" + name + "\"", refuse_interface_name(name));
    }
    const auto twice = std::adjacent_find(members.begin(), members.end());
    if (twice != members.end()) {
        throw failure{kNo, *twice + " is named twice"};
    }
    if (members.size() < kFewestMembers) {
        throw failure{kNo, "a bond has at least two members; name another interface"};
    }
    if (members.size() > KOVA_LINK_AGGR_MAX_SLAVES) {
        throw failure{kNo, "a bond has at most 32 members"};
    }
    for (const std::string &name : members) {
        if (!holds(present, name)) {
            require_joinable(name);
        }
    }
    return members;
}

KOVALINKAGGROPT record_of(const std::string &name, int mode, const names &members) {
    KOVALINKAGGROPT opt{};
    snprintf(opt.szName, sizeof opt.szName, "%s", name.c_str());
    opt.mode = mode;
    for (const std::string &member : members) {
        snprintf(opt.aszSlaves[opt.cSlaves++], sizeof opt.aszSlaves[0], "%s", member.c_str());
    }
    return opt;
}

/** What who takes over a file goes on with: a file that says neither static nor DHCP is one of DHCP then. */
ipv4_settings taken_over(const std::string &file_owner) {
    const ipv4_settings settings = settings_of(file_owner);
    const bool is_dhcp_now = settings.source == ipv4_settings::kNone && KOVANetIfIsStaticIP(file_owner.c_str()) != 1;
    return is_dhcp_now ? ipv4_settings{ipv4_settings::kDhcp, {}} : settings;
}

/** What a member that leaves goes on with: the first has the bond's settings, and nobody else its address. */
std::string text_of_released(const std::string &member, const std::string &first, const std::string &bond) {
    ipv4_settings settings = taken_over(member == first ? bond : member);
    const bool is_doubled = member != first && settings.source == ipv4_settings::kStatic &&
                            settings.fixed.address == settings_of(bond).fixed.address;
    if (is_doubled) {
        settings.source = ipv4_settings::kDhcp;
    }
    return text_of(settings);
}

/** The DHCP server serves the bond in place of its members, or the other way round. */
void move_dhcp_server(bool is_bonded, const std::string &bond, const names &members) {
    const owned_list slaves = make_list(members);
    clear_error();
    if (DHCPDLinkAggrSet(is_bonded ? 1 : 0, bond.c_str(), slaves.get()) < 0) {
        call_failed("the bond is changed, but the DHCP server's switches could not be moved");
    }
}

void set_bond(KOVALINKAGGROPT wanted, const std::string &what) {
    clear_error();
    if (KOVANetLinkAggrSet(&wanted) < 0) {
        call_failed("cannot " + what + "; the interfaces were started again with the files as they are");
    }
}

/** The library does not look at what the network script makes of the files. */
void require_in_kernel(const KOVALINKAGGROPT &wanted) {
    const KOVALINKAGGROPT now = find_bond(wanted.szName).value_or(KOVALINKAGGROPT{});
    if (now.mode != wanted.mode || members_of(now) != members_of(wanted)) {
        throw failure{kCallFailed, std::string("the files of ") + wanted.szName +
                                       " are written, but the kernel has another bond or none; see what "
                                       "/etc/rc.network restart " +
                                       wanted.szName + " and its members says"};
    }
}

// ---- create

KOVALINKAGGROPT checked_new(const bond_words &words) {
    require("bond name \"" + words.name + "\"", refuse_bond_name(words.name));
    const int mode = mode_of(words.mode);
    const std::optional<IFINFO> there = find_interface(words.name);
    if (there && find_bond(words.name)) {
        throw failure{kNo, "there is a bond " + words.name + " already; to change it: kovanet bond change"};
    }
    if (there && (there->nFlags & IFF_MASTER) == 0) {
        throw failure{kNo, "there is an interface named " + words.name + " already"};
    }
    return record_of(words.name, mode, checked_members(words, {}));
}

void create(const bond_words &words) {
    require_root();
    const KOVALINKAGGROPT shown = checked_new(words);
    const names members = members_of(shown);
    names effects = {words.name + " is made of " + joined(members) + " and gets from " + members.front() + " " +
                     text_of(taken_over(members.front())) + "."};
    for (const std::string &member : members) {
        effects.push_back(loss_of(member) + ".");
    }
    effects.push_back("Connections over these interfaces end.");
    if (has_file(words.name)) {
        effects.push_back("The file that " + words.name + " has from before is replaced.");
    }
    confirm(effects, words.is_confirmed);

    const change_lock lock;
    const KOVALINKAGGROPT wanted = checked_new(words);
    const step_note note{"making " + words.name + ", this takes a while"};
    set_bond(wanted, "make " + words.name);
    move_dhcp_server(true, words.name, members);
    require_in_kernel(wanted);
}

// ---- change

/** A bond that can be taken apart: its files are there, and nothing stands on it. */
KOVALINKAGGROPT require_changeable(const std::string &name) {
    KOVALINKAGGROPT opt = require_bond(name);
    if (opt.mode > KOVA_LINK_AGGR_BALANCE_RR || name.starts_with("ovs_")) {
        throw failure{kNo, name + " is a bond of the virtual switch, which is not changed here"};
    }
    require_no_vlan_on(name);
    if (is_port(name)) {
        throw failure{kNo, name + " is a port of a bridge; first: kovanet bridge set " + name + " none"};
    }
    require_file(name);
    for (const std::string &member : members_of(opt)) {
        require_file(member);
    }
    return opt;
}

KOVALINKAGGROPT checked_change(const bond_words &words, const KOVALINKAGGROPT &current) {
    const int mode = mode_of(words.mode);
    const names present = members_of(current);
    KOVALINKAGGROPT wanted =
        record_of(words.name, mode, words.members.empty() ? present : checked_members(words, present));
    wanted.blNoPartner = mode == current.mode ? current.blNoPartner : 0; // what is equal is left alone
    return wanted;
}

/** Members that a bond has and another has not. */
names missing_in(const names &from, const names &other) {
    names missing;
    std::copy_if(from.begin(), from.end(), std::back_inserter(missing),
                 [&other](const std::string &name) { return !holds(other, name); });
    return missing;
}

names effects_of_change(const KOVALINKAGGROPT &wanted, const KOVALINKAGGROPT &current) {
    const std::string bond = wanted.szName;
    const names now = members_of(current);
    const names then = members_of(wanted);
    names effects = {bond + " becomes a bond of mode " + KOVANetLinkAggrModeToString(wanted.mode) + " of " +
                     joined(then) + "."};
    if (then.front() == now.front()) {
        effects.push_back(bond + " keeps " + text_of(settings_of(bond)) + ".");
    } else {
        effects.push_back(bond + " gives up " + text_of(settings_of(bond)) + " and gets from " + then.front() + " " +
                          text_of(taken_over(then.front())) + ".");
    }
    for (const std::string &name : missing_in(then, now)) {
        effects.push_back(loss_of(name) + ".");
    }
    for (const std::string &name : missing_in(now, then)) {
        effects.push_back(name + " leaves and gets " + text_of_released(name, now.front(), bond) + ".");
    }
    effects.push_back("Connections over " + bond + " end.");
    return effects;
}

/** The library starts the members that a bond has, not those that it had. */
void start_former(const names &former) {
    for (const std::string &name : former) {
        if (KLIBCExec("/etc/rc.network", "start", name.c_str(), nullptr, nullptr) != 0) {
            throw failure{kCallFailed, name +
                                           " is no member any more, but could not be started; see what "
                                           "/etc/rc.network start " +
                                           name + " says"};
        }
    }
}

void change(const bond_words &words) {
    require_root();
    const KOVALINKAGGROPT there = require_changeable(words.name);
    const KOVALINKAGGROPT shown = checked_change(words, there);
    if (shown.mode == there.mode && members_of(shown) == members_of(there)) {
        return; // it is like that
    }
    confirm(effects_of_change(shown, there), words.is_confirmed);

    const change_lock lock;
    const KOVALINKAGGROPT current = require_changeable(words.name);
    const KOVALINKAGGROPT wanted = checked_change(words, current);
    const step_note note{"changing " + words.name + ", this takes a while"};
    set_bond(wanted, "change " + words.name);
    const names before = members_of(current);
    const names after = members_of(wanted);
    if (before != after) { // who leaves gets its switches back, the bond keeps its own
        move_dhcp_server(false, words.name, before);
        move_dhcp_server(true, words.name, after);
    }
    start_former(missing_in(before, after));
    require_in_kernel(wanted);
}

// ---- delete

void remove(const bond_words &words) {
    require_root();
    const KOVALINKAGGROPT shown = require_changeable(words.name);
    const names members = members_of(shown);
    names effects = {loss_of(words.name) + " and is deleted."};
    for (const std::string &member : members) {
        effects.push_back(member + " gets " + text_of_released(member, members.front(), words.name) + ".");
    }
    effects.push_back("Connections over " + words.name + " end.");
    confirm(effects, words.is_confirmed);

    const change_lock lock;
    require_changeable(words.name);
    const step_note note{"deleting " + words.name + ", this takes a while"};
    set_bond(record_of(words.name, KOVA_LINK_AGGR_UNKNOWN, {}), "delete " + words.name);
    move_dhcp_server(false, words.name, members);
    if (find_bond(words.name)) {
        throw failure{kCallFailed, "the file of " + words.name +
                                       " is gone, but the kernel still has the bond; see what "
                                       "/etc/rc.network restart " +
                                       joined(members) + " says"};
    }
}

} // namespace

void add_bond(CLI::App &object, const global_options &options) {
    auto &words = words_of<bond_words>();
    object.add_subcommand("list", "all bonds that have members")->callback([&options] { list(options.json); });

    CLI::App &one = *object.add_subcommand("show", "one bond");
    one.add_option("BOND", words.name, "the bond")->required();
    one.callback([&words, &options] { show(words.name, options.json); });

    const char *const modes = "balance-alb, 802.3ad, balance-xor, active-backup or balance-rr";
    CLI::App &make = *object.add_subcommand("create", "make a bond, which takes the place of its first member");
    make.add_option("BOND", words.name, "its name")->required();
    make.add_option("MODE", words.mode, modes)->required();
    add_words(make, "IF", words.members, "2 to 32 interfaces; their order is that of their names").required();
    add_yes(make, words.is_confirmed);
    make.callback([&words] { create(words); });

    CLI::App &other = *object.add_subcommand("change", "change the mode and the members of a bond");
    other.add_option("BOND", words.name, "the bond")->required();
    other.add_option("MODE", words.mode, modes)->required();
    add_words(other, "IF", words.members, "all members that it will have; without any it keeps those it has");
    add_yes(other, words.is_confirmed);
    other.callback([&words] { change(words); });

    CLI::App &end = *object.add_subcommand("delete", "delete a bond, whose settings go back to its first member");
    end.add_option("BOND", words.name, "the bond")->required();
    add_yes(end, words.is_confirmed);
    end.callback([&words] { remove(words); });
}

} // namespace kova
