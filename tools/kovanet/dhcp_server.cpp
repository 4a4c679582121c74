// kovanet dhcp-server: what the DHCP and router-advertisement server hands out.
#include "dhcp_server.h"

#include "dhcp_files.h"
#include "records.h"
#include "rules.h"
#include "stored.h"
#include "words.h"

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <kova/core.h>
#include <kovanetsdk/dhcp.h>

namespace kova {
namespace {

struct server_words {
    std::string ifname;
    std::string family_word = "4";
    std::string start, end, mask;
    bool no_restart = false;
    [[nodiscard]] family type() const { return family_word == "6" ? kIPv6 : kIPv4; }
};

// ---- what is served ---------------------------------------------------------------------------------------------

constexpr column kRows[] = {
    {"INTERFACE", [](const json &row) { return field(row, "interface"); }},
    {"FAMILY", [](const json &row) { return "IPv" + field(row, "family"); }},
    {"STATE", [](const json &row) { return std::string(row.at("enabled") == true ? "on" : "off"); }},
    {"SUBNETS", [](const json &row) { return field(row, "subnets"); }, true},
};

constexpr column kSwitches[] = {
    {"service", [](const json &row) { return std::string(row.at("service") == true ? "on" : "off"); }},
    {"pxe", [](const json &row) { return std::string(row.at("pxe") == true ? "on" : "off"); }},
};

bool is_enabled(const served_family &served) {
    require_readable(switch_file_of(served));
    return DHCPInterfaceIsEnabled(served.ifname.c_str(), served.type) == 1;
}

json served_rows() {
    const std::vector<subnet_id> subnets = subnets_there();
    json rows = json::array();
    for (const served_family &served : families_there()) {
        rows.push_back({{"interface", served.ifname},
                        {"family", number_of(served.type)},
                        {"enabled", is_enabled(served)},
                        {"subnets", std::count_if(subnets.begin(), subnets.end(), [&served](const subnet_id &subnet) {
                             return subnet.ifname == served.ifname && subnet.type == served.type;
                         })}});
    }
    return rows;
}

void status(bool as_json) {
    const config_lock lock{config_lock::kShared}; // one view of all files
    const json record = dhcp_server_record();
    if (as_json) {
        print_json(record);
        return;
    }
    print_record(record, kSwitches);
    if (!record.at("interfaces").empty()) {
        putchar('\n');
        print_table(record.at("interfaces"), kRows);
    }
}

/** Ends the program for an interface that neither the kernel nor the server's files know. */
void require_known_interface(const server_words &words) {
    const std::vector<served_family> known = families_there();
    if (std::find(known.begin(), known.end(), served_family{words.ifname, words.type()}) == known.end()) {
        require_interface(words.ifname);
    }
}

void enable(const server_words &words, bool on) {
    require_servable(words.ifname);
    change_server([&] {
        if (on) {
            require_interface(words.ifname);
        } else {
            require_known_interface(words);
        }
        clear_error();
        const int result = DHCPInterfaceSetEnabled(words.ifname.c_str(), words.type(), on ? 1 : 0);
        // the library's call keeps a failed write to itself
        if (result < 0 || (DHCPInterfaceIsEnabled(words.ifname.c_str(), words.type()) == 1) != on) {
            call_failed(std::string(on ? "cannot enable " : "cannot disable ") + words.ifname);
        }
    });
}

void restart_server() {
    const step_note note{"restarting the DHCP server"};
    if (KLIBNetDHCPServerRestart() < 0) {
        throw failure{kCallFailed, "the DHCP server does not restart; the system log tells why"};
    }
}

/** The switch of the whole service, which the library only reads. */
void switch_service(bool on) {
    constexpr char kFolder[] = "/etc/dhcpd";
    require_root();
    {
        const config_lock lock{config_lock::kExclusive};
        std::error_code failed;
        std::filesystem::create_directory(kFolder, failed); // when it fails, so does the next step
        clear_error();
        if (KLIBCFileSetKeyValue("/etc/dhcpd/dhcpd.info", "enable", on ? "yes" : "no", "%s=\"%s\"\n") < 0) {
            call_failed(std::string("cannot switch the DHCP server ") + (on ? "on" : "off"));
        }
    }
    if (!words_of<server_words>().no_restart) {
        restart_server();
    }
}

// ---- questions --------------------------------------------------------------------------------------------------

void tell_conflict(const server_words &words, bool as_json) {
    require("interface name \"" + words.ifname + "\"", refuse_interface_name(words.ifname));
    require("address \"" + words.start + "\" with mask \"" + words.mask + "\"",
            refuse_address_and_mask(words.start, words.mask));
    require("address \"" + words.end + "\" with mask \"" + words.mask + "\"",
            refuse_address_and_mask(words.end, words.mask));
    const config_lock lock{config_lock::kShared};
    const std::string other = conflicting_interface(words.ifname, words.start, words.end, words.mask);
    if (as_json) {
        print_json({{"interface", words.ifname},
                    {"start", words.start},
                    {"end", words.end},
                    {"mask", words.mask},
                    {"conflict", !other.empty()},
                    {"conflict_interface", known_text(other.c_str())}});
    } else {
        puts(other.empty() ? "no conflict" : ("the subnet overlaps one of " + printable(other)).c_str());
    }
    if (!other.empty()) {
        throw failure{kNo, ""}; // the answer is the output
    }
}

constexpr column kOffer[] = {
    {"address", [](const json &row) { return field(row, "address"); }},
    {"mask", [](const json &row) { return field(row, "mask"); }},
};

void test_client(const std::string &ifname, bool as_json) {
    require_root("asking for an address");
    if (ifname.starts_with('-')) {
        throw failure{kNo, "the DHCP client takes no interface whose name begins with \"-\""};
    }
    require_interface(ifname);
    NETINFO card{};
    snprintf(card.szIfname, sizeof card.szIfname, "%s", ifname.c_str());
    const step_note note{"asking for an address on " + ifname};
    clear_error();
    if (KOVAIGetDHCPTestNetInfo(&card) < 0) {
        call_failed("no DHCP server offers an address on " + ifname);
    }
    const json record = {{"interface", ifname}, {"address", card.szIP}, {"mask", card.szMask}};
    show_record(record, kOffer, as_json);
}

CLI::App &add_switch(CLI::App &object, const char *name, const char *description) {
    auto &words = words_of<server_words>();
    CLI::App &verb = add_change(object, name, description);
    verb.add_option("IF", words.ifname, "interface")->required();
    verb.add_option("4|6", words.family_word, "IPv4, which is meant without it, or IPv6")->check(choice({"4", "6"}));
    return verb;
}

} // namespace

json dhcp_server_record() {
    require_readable("/etc/dhcpd/dhcpd.info");
    require_readable("/etc/dhcpd/dhcpd-pxe-setting");
    DHCP_PXE_CONF pxe{};
    clear_error();
    if (DHCPPXEConfGetEnable(&pxe) < 0) {
        call_failed("cannot ask whether network boot is served");
    }
    return {{"service", DHCPIsEnabled() == 1}, {"pxe", pxe.enabled == 1}, {"interfaces", served_rows()}};
}

std::string conflicting_interface(const std::string &ifname, const std::string &start, const std::string &end,
                                  const std::string &mask) {
    char other[256] = "";
    clear_error();
    const int found = DHCPIsRangeConflict(ifname.c_str(), plain_address(start).c_str(), plain_address(end).c_str(),
                                          plain_address(mask).c_str(), other, sizeof other);
    if (found < 0) {
        call_failed("cannot read the subnets of the other interfaces");
    }
    return found == 1 ? other : "";
}

CLI::App &add_change(CLI::App &parent, const char *name, const char *description) {
    CLI::App &verb = *parent.add_subcommand(name, description);
    verb.add_flag("--no-restart", words_of<server_words>().no_restart, "leave the running server as it is");
    return verb;
}

void follow_change() {
    if (words_of<server_words>().no_restart || DHCPIsEnabled() != 1) {
        return;
    }
    try {
        restart_server();
    } catch (const failure &failed) {
        throw failure{failed.code, "the change is stored, but " + failed.text};
    }
}

void require_servable(const std::string &ifname) {
    require("interface name \"" + ifname + "\"", refuse_interface_name(ifname));
    if (ifname.find(',') != std::string::npos) {
        throw failure{kNo, "the server cannot serve " + ifname + ": \",\" stands between the values in its files"};
    }
    if (ifname == "pxe" || ifname.find("-subnet") != std::string::npos || ifname.ends_with("-static")) {
        throw failure{kNo, "the server cannot serve " + ifname + ": its files would have the names of others"};
    }
}

void add_dhcp_server(CLI::App &object, const global_options &options) {
    auto &words = words_of<server_words>();
    object.add_subcommand("status", "the switches of the service, its interfaces and network boot")
        ->callback([&options] { status(options.json); });
    add_change(object, "on", "switch the service on").callback([] { switch_service(true); });
    add_change(object, "off", "switch the service off").callback([] { switch_service(false); });
    add_switch(object, "enable", "serve an interface").callback([&words] { enable(words, true); });
    add_switch(object, "disable", "serve an interface no more").callback([&words] { enable(words, false); });
    object.add_subcommand("restart", "run the server anew on its files")->callback([] {
        require_root();
        restart_server();
    });
    add_subnet_verbs(object, options);
    add_option_verbs(object, options);
    add_vendor_verbs(object, options);
    add_pxe_verbs(object, options);

    CLI::App &conflict = *object.add_subcommand("conflict", "whether an IPv4 subnet overlaps one of another interface");
    conflict.add_option("IF", words.ifname, "interface that it is meant for")->required();
    conflict.add_option("START", words.start, "first address")->required();
    conflict.add_option("END", words.end, "last address")->required();
    conflict.add_option("MASK", words.mask, "dotted mask")->required();
    conflict.callback([&words, &options] { tell_conflict(words, options.json); });

    CLI::App &test = *object.add_subcommand("test-client", "the address that the network's DHCP server would give");
    test.add_option("IF", words.ifname, "interface")->required();
    test.callback([&words, &options] { test_client(words.ifname, options.json); });
}

} // namespace kova
