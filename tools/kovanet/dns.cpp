// kovanet dns: the name servers, and where they come from.
#include "errors.h"
#include "interfaces.h"
#include "lists.h"
#include "objects.h"
#include "records.h"
#include "rules.h"
#include "stored.h"
#include "words.h"

#include <kova/core.h>
#include <kovanetsdk/dns.h>

namespace kova {
namespace {

/** The servers that one of the library's readers finds. */
json servers_of(int (*read)(KLIBSZLIST **), const char *what) {
    const owned_list owned = make_list();
    KLIBSZLIST *list = owned.get();
    clear_error();
    if (read(&list) < 0) {
        call_failed(std::string("cannot read the ") + what);
    }
    return texts_of(list);
}

constexpr column kColumns[] = {
    {"mode", [](const json &row) { return field(row, "mode"); }},
    {"servers", [](const json &row) { return words_field(row, "servers"); }},
    {"configured", [](const json &row) { return words_field(row, "configured_servers"); }},
};

void show(bool as_json) {
    const config_lock lock{config_lock::kShared}; // one view of all files
    const json record = dns_record();
    show_record(record, kColumns, as_json);
}

void set(const std::vector<std::string> &servers) {
    require_root();
    for (const std::string &server : servers) {
        require("name server \"" + server + "\"", refuse_server(server));
    }
    const owned_list list = make_list(servers);
    const step_note note{"setting the name servers"};
    const config_lock lock{config_lock::kExclusive}; // the library's call leaves it to its caller
    clear_error();
    if (KOVANetDNSListSet(list.get()) < 0) {
        call_failed("cannot set the name servers");
    }
}

void set_mode(const std::string &mode) {
    require_root();
    const config_lock lock{config_lock::kExclusive};
    clear_error();
    if (KOVANetDNSModeSet(mode.c_str()) < 0) {
        call_failed("cannot set the mode " + mode);
    }
}

void update() {
    require_root();
    clear_error();
    if (KOVANetDNSUpdate() < 0) {
        call_failed("cannot make /etc/resolv.conf");
    }
}

struct dns_words {
    std::vector<std::string> servers;
    std::string mode;
};

} // namespace

json dns_record() {
    const bool is_static = stored_value("/etc/kovainfo.conf", "dns_mode") == "static";
    json record;
    record["mode"] = is_static ? "static" : "auto";
    record["servers"] = servers_of(KOVANetDNSListGet, "servers in use");
    record["configured_servers"] = servers_of(KOVANetStaticDNSListGet, "configured servers");
    return record;
}

void add_dns(CLI::App &object, const global_options &options) {
    auto &words = words_of<dns_words>();
    object.add_subcommand("show", "the mode, the servers in use and the configured ones")->callback([&options] {
        show(options.json);
    });

    CLI::App &change = *object.add_subcommand("set", "configure servers and use them (mode static)");
    add_words(change, "ADDRESS", words.servers, "IPv4 or IPv6 addresses, asked in this order").required();
    change.callback([&words] { set(words.servers); });

    CLI::App &mode = *object.add_subcommand("mode", "use the configured servers, or those the network tells");
    mode.add_option("static|auto", words.mode, "the configured servers, or those learnt by DHCP and from routers")
        ->required()
        ->check(choice({"static", "auto"}));
    mode.callback([&words] { set_mode(words.mode); });

    object.add_subcommand("update", "make /etc/resolv.conf again from the servers of the mode")->callback(update);
}

} // namespace kova
