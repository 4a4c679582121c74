// kovanet dhcp-server pxe: what clients are told that boot from the network.
#include "dhcp_server.h"
#include "rules.h"

#include <cstdio>
#include <kovanetsdk/dhcp.h>
#include <optional>

namespace kova {
namespace {

struct pxe_words {
    std::string mode;
    std::string file_or_server;
    std::optional<std::string> file;
};

constexpr column kColumns[] = {
    {"state", [](const json &row) { return std::string(row.at("enabled") == true ? "on" : "off"); }},
    {"boot from", [](const json &row) { return field(row, "mode"); }},
    {"local file", [](const json &row) { return field(row, "local_file"); }},
    {"remote server", [](const json &row) { return field(row, "remote_server"); }},
    {"remote file", [](const json &row) { return field(row, "remote_file"); }},
};

void show(bool as_json) {
    const config_lock lock{config_lock::kShared};
    DHCP_PXE_CONF conf{};
    clear_error();
    if (DHCPPXEConfGet(&conf) < 0) {
        call_failed("cannot read the settings of network boot");
    }
    const bool is_set = conf.is_remote_tftp == 1 || conf.local_bootloader[0] != '\0';
    const json record = {{"enabled", conf.enabled == 1},
                         {"mode", is_set ? json(conf.is_remote_tftp == 1 ? "remote" : "local") : json()},
                         {"local_file", known_text(conf.local_bootloader)},
                         {"remote_server", known_text(conf.remote_tftp_server_ip)},
                         {"remote_file", known_text(conf.remote_bootloader)}};
    show_record(record, kColumns, as_json);
}

void store(const DHCP_PXE_CONF &conf) {
    change_server([&conf] {
        clear_error();
        if (DHCPPXEConfSet(&conf) < 0) {
            call_failed("cannot store the settings of network boot");
        }
    });
}

/** @param more  what follows the file in the server's line */
void require_file(const std::string &file, const std::string &more) {
    require("file \"" + file + "\"", refuse_server_text(file));
    require("the name of the file", refuse_server_line("dhcp-boot=tag:pxe," + file + more));
}

void set_local(const std::string &file) {
    require_file(file, "");
    DHCP_PXE_CONF conf{};
    conf.enabled = 1;
    snprintf(conf.local_bootloader, sizeof conf.local_bootloader, "%s", file.c_str());
    store(conf);
}

void set_remote(const std::string &given, const std::string &file) {
    require("server \"" + given + "\"", refuse_address(given));
    const std::string server = plain_address(given);
    require_file(file, ",bootserver," + server);
    DHCP_PXE_CONF conf{};
    conf.enabled = conf.is_remote_tftp = 1;
    snprintf(conf.remote_bootloader, sizeof conf.remote_bootloader, "%s", file.c_str());
    snprintf(conf.remote_tftp_server_ip, sizeof conf.remote_tftp_server_ip, "%s", server.c_str());
    store(conf);
}

void set(const pxe_words &words) {
    const bool is_remote = words.mode == "remote";
    if (words.file.has_value() != is_remote) {
        throw failure{kUsage, std::string(is_remote ? "remote takes SERVER and FILE" : "local takes FILE alone") +
                                  "; see kovanet dhcp-server pxe set --help"};
    }
    if (is_remote) {
        set_remote(words.file_or_server, *words.file);
    } else {
        set_local(words.file_or_server);
    }
}

} // namespace

void add_pxe_verbs(CLI::App &object, const global_options &options) {
    auto &words = words_of<pxe_words>();
    CLI::App &all = *object.add_subcommand("pxe", "clients that boot from the network");
    all.add_subcommand("show", "where they boot from")->callback([&options] { show(options.json); });

    CLI::App &change = add_change(all, "set", "answer them: they boot from here, or from another server");
    change.add_option("local|remote", words.mode, "this machine, or another server")
        ->required()
        ->check(CLI::IsMember({"local", "remote"}));
    change.add_option("FILE|SERVER", words.file_or_server, "boot file on this machine, or address of the server")
        ->required();
    change.add_option("FILE", words.file, "boot file on the server");
    change.callback([&words] { set(words); });

    add_change(all, "off", "answer them no more, and keep the settings").callback([] { store({}); });
}

} // namespace kova
