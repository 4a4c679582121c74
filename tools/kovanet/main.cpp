// kovanet: the appliance's network for a person at a terminal and for scripts.
#include "completion.h"
#include "errors.h"
#include "help.h"
#include "objects.h"
#include "table.h"
#include "words.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <exception>
#include <new>
#include <string>
#include <syslog.h>
#include <vector>

namespace kova {
namespace {

constexpr char kExitCodes[] = "Every command takes --json and --verbose.\n"
                              "Exit codes: 0 done or yes, 1 no or an invalid value, 2 usage, 3 not found,\n"
                              "            4 the library call failed, 5 needs root";

/** The second number is that of the JSON shapes: it goes up when a field changes its meaning or goes away. */
constexpr char kVersion[] = "kovanet " KOVA_VERSION ", JSON 1";

struct object {
    const char *name;
    const char *description;
    void (*add)(CLI::App &, const global_options &);
    const char *examples;
};

constexpr object kObjects[] = {
    {"show", "what this machine's network is now, on one screen", add_show,
     "  kovanet show\n"
     "  kovanet show --json"},
    {"verify", "whether the network and its services are what the files say", add_verify,
     "  kovanet verify\n"
     "  kovanet verify --json"},
    {"monitor", "changes as they happen", add_monitor,
     "  kovanet monitor\n"
     "  kovanet monitor --json\n"
     "  kovanet monitor --count 1"},
    {"card", "network cards and their IPv4 configuration", add_card,
     "  kovanet card list\n"
     "  kovanet card show eth0\n"
     "  kovanet card set eth0 static 192.168.1.10/24\n"
     "  kovanet card set eth0 static 192.168.1.10 mask 255.255.255.0\n"
     "  kovanet card set eth0 dhcp"},
    {"link", "state and names of the interfaces", add_link,
     "  kovanet link show\n"
     "  kovanet link down eth1\n"
     "  kovanet link rename eth1 lan0\n"
     "  kovanet link up lan0\n"
     "  kovanet link watch"},
    {"addr", "IPv4 and IPv6 addresses as they are now", add_addr,
     "  kovanet addr list eth0\n"
     "  kovanet addr add eth0 2001:db8::10/64\n"
     "  kovanet addr del eth0 2001:db8::10/64\n"
     "  kovanet addr flush eth0 6"},
    {"gateway", "the IPv4 default gateway", add_gateway,
     "  kovanet gateway show\n"
     "  kovanet gateway set 192.168.1.1\n"
     "  kovanet gateway clear"},
    {"route", "routes to the interfaces' own subnets", add_route,
     "  kovanet route check\n"
     "  kovanet route add eth0\n"
     "  kovanet route del eth0 192.168.1.10/24"},
    {"stats", "traffic counters and rates", add_stats,
     "  kovanet stats\n"
     "  kovanet stats eth0 --watch 2\n"
     "  kovanet stats --watch --count 10 --json"},
    {"block", "reasons that keep an interface from changes", add_block,
     "  kovanet block show eth0\n"
     "  kovanet block set eth0 ha on"},
    {"vlan", "VLANs on the interfaces", add_vlan,
     "  kovanet vlan list\n"
     "  kovanet vlan create eth0 10 static 192.168.10.2/24\n"
     "  kovanet vlan create eth0 10 keep --yes\n"
     "  kovanet vlan show eth0.10\n"
     "  kovanet vlan remove eth0.10"},
    {"bond", "several interfaces used as one", add_bond,
     "  kovanet bond list\n"
     "  kovanet bond create bond0 802.3ad eth0 eth1\n"
     "  kovanet bond change bond0 active-backup\n"
     "  kovanet bond change bond0 active-backup eth0 eth1 eth2 --yes\n"
     "  kovanet bond show bond0\n"
     "  kovanet bond delete bond0"},
    {"bridge", "bridges and their ports", add_bridge,
     "  kovanet bridge list\n"
     "  kovanet bridge show eth0\n"
     "  kovanet bridge set br0 master eth0 dhcp\n"
     "  kovanet bridge set eth0 slave br0\n"
     "  kovanet bridge set lbr0 local-lan wlan0 static 192.168.2.1/24\n"
     "  kovanet bridge set eth0 none dhcp --yes"},
    {"ipv6", "how the interfaces get their IPv6 addresses", add_ipv6,
     "  kovanet ipv6 show\n"
     "  kovanet ipv6 set eth0 auto\n"
     "  kovanet ipv6 set eth0 static 2001:db8::10/64 gateway fe80::1\n"
     "  kovanet ipv6 set eth0 off --yes\n"
     "  kovanet ipv6 init"},
    {"mtu", "largest packets of the interfaces", add_mtu,
     "  kovanet mtu show\n"
     "  kovanet mtu set eth0 9000\n"
     "  kovanet mtu set eth0.10 1500 --yes"},
    {"pppoe", "the PPPoE client", add_pppoe,
     "  kovanet pppoe set eth0 user alice@provider default-route on\n"
     "  kovanet pppoe set eth0 user alice@provider --password-file /root/secret\n"
     "  kovanet pppoe set eth0 mtu 1400 --keep-password\n"
     "  kovanet pppoe show\n"
     "  kovanet pppoe start\n"
     "  kovanet pppoe status\n"
     "  kovanet pppoe stop"},
    {"pppoe-relay", "PPPoE from the local LAN to a server elsewhere", add_pppoe_relay,
     "  kovanet pppoe-relay set lbr0 on eth0\n"
     "  kovanet pppoe-relay apply lbr0\n"
     "  kovanet pppoe-relay show\n"
     "  kovanet pppoe-relay set lbr0 off\n"
     "  kovanet pppoe-relay clear"},
    {"dns", "name servers, and where they come from", add_dns,
     "  kovanet dns show\n"
     "  kovanet dns set 192.168.1.1 2001:db8::53\n"
     "  kovanet dns mode auto\n"
     "  kovanet dns update"},
    {"dhcp-server", "the DHCP and router-advertisement server", add_dhcp_server,
     "  kovanet dhcp-server status\n"
     "  kovanet dhcp-server on\n"
     "  kovanet dhcp-server enable eth0\n"
     "  kovanet dhcp-server subnet set eth0 0 range 192.168.1.100 192.168.1.200 \\\n"
     "      mask 255.255.255.0 router 192.168.1.1\n"
     "  kovanet dhcp-server subnet set eth0 0 domain lan.example lease 86400\n"
     "  kovanet dhcp-server subnet set eth0 0 dns 192.168.1.1 192.168.1.2\n"
     "  kovanet dhcp-server subnet set eth0 0 6 mode ra-stateless dns 2001:db8::53\n"
     "  kovanet dhcp-server subnet list\n"
     "  kovanet dhcp-server subnet show eth0 0\n"
     "  kovanet dhcp-server option set eth0 0 ntp-server 192.168.1.1 192.168.1.2\n"
     "  kovanet dhcp-server option list eth0 0\n"
     "  kovanet dhcp-server option del eth0 0 ntp-server\n"
     "  kovanet dhcp-server vendor set MSFT 2 1i\n"
     "  kovanet dhcp-server vendor list\n"
     "  kovanet dhcp-server vendor show MSFT\n"
     "  kovanet dhcp-server vendor del MSFT 2\n"
     "  kovanet dhcp-server pxe set remote 192.168.1.5 pxelinux.0\n"
     "  kovanet dhcp-server pxe show\n"
     "  kovanet dhcp-server pxe off\n"
     "  kovanet dhcp-server conflict eth1 192.168.1.10 192.168.1.20 255.255.255.0\n"
     "  kovanet dhcp-server test-client eth0\n"
     "  kovanet dhcp-server subnet off eth0 0\n"
     "  kovanet dhcp-server disable eth0 6\n"
     "  kovanet dhcp-server restart\n"
     "  kovanet dhcp-server off"},
    {"conflict", "whether an address is somebody else's already", add_conflict,
     "  kovanet conflict address eth0 192.168.1.20\n"
     "  kovanet conflict bond bond0"},
    {"lookup", "the addresses of a name", add_lookup,
     "  kovanet lookup nas02\n"
     "  kovanet lookup www.example.com --json"},
    {"ports", "ports of this machine that are in use", add_ports,
     "  kovanet ports list\n"
     "  kovanet ports list tcp 1 1023\n"
     "  kovanet ports used udp 53\n"
     "  kovanet ports used tcp 8000 8010"},
    {"wake", "wake a sleeping host", add_wake, "  kovanet wake eth0 52:54:00:12:34:56"},
    {"hostname", "the name of the appliance", add_hostname,
     "  kovanet hostname show\n"
     "  kovanet hostname set nas01"},
    {"service", "what the services are told", add_service,
     "  kovanet service notify ip\n"
     "  kovanet service notify ip,mtu action 1"},
    {"topology", "what the interfaces of the appliance are used for", add_topology,
     "  kovanet topology show\n"
     "  kovanet topology show bridge\n"
     "  kovanet topology set router"},
    {"reach", "whether a host answers on a TCP port", add_reach,
     "  kovanet reach nas01 445\n"
     "  kovanet reach 192.168.1.1 80 timeout 2\n"
     "  kovanet reach 2001:db8::1 22 --json"},
    {"tunnel", "the IPv6 tunnel through a tunnel broker", add_tunnel,
     "  kovanet tunnel set broker.example.net login alice\n"
     "  kovanet tunnel set broker.example.net login alice \\\n"
     "      --password-file /root/password\n"
     "  kovanet tunnel set broker.example.net anonymous\n"
     "  kovanet tunnel start\n"
     "  kovanet tunnel show\n"
     "  kovanet tunnel stop\n"
     "  kovanet tunnel restart"},
    {"check", "whether a value is valid", add_check,
     "  kovanet check address 192.168.1.10 mask 255.255.255.0\n"
     "  kovanet check mask 255.255.255.0\n"
     "  kovanet check prefix 192.168.1.0/24\n"
     "  kovanet check ipv6 2001:db8::1/64\n"
     "  kovanet check hostname nas01\n"
     "  kovanet check domain lan.example"},
};

/** Ends the program unless a word that may have been given is one of the commands below another. */
void require_known(const char *what, const char *word, const CLI::App &parent) {
    std::vector<std::string> known;
    for (const CLI::App *command : parent.get_subcommands([](const CLI::App *) { return true; })) {
        known.push_back(command->get_name());
    }
    if (word == nullptr || known.empty() || std::find(known.begin(), known.end(), word) != known.end()) {
        return;
    }
    const std::string meant = suggestion(word, known);
    throw failure{kUsage, std::string(what) + " \"" + word + "\" is not known" +
                              (meant.empty() ? "; see " + whole_name(parent) + " --help" : meant)};
}

/** The first words that are no options: the object, the verb, and what may be a verb below that. */
struct command_words {
    const char *object = nullptr;
    const char *verb = nullptr;
    const char *detail = nullptr;
};

command_words first_words(int argc, char **argv) {
    command_words words;
    char **const end = argv + argc;
    char **at = argv;
    for (const char **word : {&words.object, &words.verb, &words.detail}) {
        at = std::find_if(std::min(at + 1, end), end, [](const char *argument) { return argument[0] != '-'; });
        *word = at != end ? *at : nullptr;
    }
    return words;
}

/** The verbs below a verb, for the objects that have them. */
void require_known_detail(const command_words &words, const CLI::App &object) {
    for (const CLI::App *verb : object.get_subcommands([](const CLI::App *) { return true; })) {
        if (words.verb != nullptr && verb->get_name() == words.verb) {
            require_known("verb", words.detail, *verb);
        }
    }
}

void name_groups(CLI::App &app) {
    for (CLI::App *command : app.get_subcommands([](const CLI::App *) { return true; })) {
        command->group("Commands");
        name_groups(*command);
    }
}

/** A command that has others below it is not complete without one of them. */
void require_verbs(CLI::App &command) {
    const auto below = command.get_subcommands([](const CLI::App *) { return true; });
    if (!below.empty()) {
        command.require_subcommand(1);
    }
    for (CLI::App *each : below) {
        require_verbs(*each);
    }
}

/** Describes the whole first level, and below it only the object that was asked for. */
void describe(CLI::App &app, global_options &options, const command_words &words) {
    app.require_subcommand(1);
    app.fallthrough(); // the global options may stand anywhere
    app.formatter(std::make_shared<help_format>());
    app.set_help_flag("-h,--help", "show this help");
    app.set_version_flag("--version", kVersion, "show the version, and that of the JSON output");
    app.add_flag("--json", options.json, "output for programs");
    app.add_flag("--verbose", options.verbose, "show the library's log");
    app.footer(std::string("Examples:\n  kovanet card list\n  kovanet card set eth0 static 192.168.1.10/24\n"
                           "  kovanet stats --watch\n  kovanet OBJECT --help\n\n") +
               kExitCodes);
    for (const object &each : kObjects) {
        CLI::App &command = *app.add_subcommand(each.name, each.description);
        if (words.object != nullptr && strcmp(words.object, each.name) == 0) {
            command.footer(std::string("Examples:\n") + each.examples + "\n\n" + kExitCodes);
            each.add(command, options);
            require_verbs(command);
        }
    }
    name_groups(app);
}

/** Ends the program for an object or verb that is not known, with what may have been meant. */
void require_known_words(const CLI::App &app, const command_words &words) {
    require_known("object", words.object, app);
    for (const CLI::App *object : app.get_subcommands([](const CLI::App *) { return true; })) {
        if (words.object != nullptr && object->get_name() == words.object) {
            require_known("verb", words.verb, *object);
            require_known_detail(words, *object);
        }
    }
}

void complain(const std::string &text) {
    if (!text.empty()) {
        fprintf(stderr, "kovanet: %s\n", printable(text).c_str());
    }
}

/** The command whose words were being read when the command line turned out to be wrong. */
const CLI::App &last_command(const CLI::App &app) {
    const CLI::App *command = &app;
    while (!command->get_subcommands().empty()) {
        command = command->get_subcommands().front();
    }
    return *command;
}

/** Whether a word too many may be a password. */
bool takes_password(const CLI::App &command) {
    return command.get_option_no_throw("--password-file") != nullptr;
}

/** What an unknown option may have been meant to be. */
std::string suggested_option(const std::string &word, const CLI::App &command) {
    std::vector<std::string> known;
    for (const CLI::App *at = &command; at != nullptr; at = at->get_parent()) {
        for (const CLI::Option *option :
             at->get_options([](const CLI::Option *each) { return each->nonpositional(); })) {
            known.push_back(option->get_name());
        }
    }
    return suggestion(word, known);
}

/** How the command line is wrong, as the library of the command line tells it or better. */
std::string usage_complaint(const CLI::ParseError &error, const CLI::App &app) {
    const std::string text = error.what();
    for (const std::string &word : app.remaining(true)) {
        if (word.starts_with('-')) {
            return "option \"" + word + "\" is not known" + suggested_option(word, last_command(app));
        }
    }
    if (error.get_exit_code() == static_cast<int>(CLI::ExitCodes::ExtrasError)) {
        return takes_password(last_command(app)) ? "there are too many words"
                                                 : "\"" + app.remaining(true).front() + "\" is one word too many";
    }
    if (error.get_name() == "RequiredError" && text.find("subcommand") != std::string::npos) {
        return "the command is not complete";
    }
    if (const char kLacks[] = " requires "; text.starts_with(kLacks)) { // a keyword, whose name is hidden
        return text.substr(sizeof kLacks - 1) + " is required";
    }
    if (error.get_exit_code() == static_cast<int>(CLI::ExitCodes::ConversionError)) {
        return "\"" + text.substr(text.rfind(' ') + 1) + "\" is no number";
    }
    const size_t name_end = text.find(": \""); // of a word, and what is wrong with it
    return name_end == std::string::npos || text.starts_with("--") ? text : text.substr(name_end + 2);
}

/** The command line is wrong: how, and where to read on. */
void complain_of_usage(const CLI::ParseError &error, const CLI::App &app) {
    const std::string what = usage_complaint(error, app);
    complain(what.ends_with('?') ? what : what + "; see " + whole_name(last_command(app)) + " --help");
}

/** kovanet --complete WORD...: for the shells. What cannot be told is no reason to disturb somebody who types. */
int complete(CLI::App &app, int argc, char **argv) {
    global_options options;
    try {
        describe(app, options, first_words(argc, argv));
        for (const std::string &each : completions(app, {argv + 1, argv + argc})) {
            puts(each.c_str());
        }
    } catch (const failure &) {
    }
    return kDone;
}

/** Does what the command line says. @return the exit code of one that is understood */
exit_code obey(CLI::App &app, int argc, char **argv) {
    global_options options;
    const command_words words = first_words(argc, argv);
    try {
        describe(app, options, words);
        require_known_words(app, words);
        app.parse_complete_callback([&options] {
            if (options.verbose) {
                openlog("kovanet", LOG_PERROR | LOG_PID, LOG_USER);
            }
        });
        app.parse(argc, argv);
    } catch (const CLI::CallForVersion &) {
        puts(kVersion);
    } catch (const CLI::CallForHelp &) {
        fputs(app.help().c_str(), stdout);
    } catch (const CLI::ParseError &error) {
        complain_of_usage(error, app);
        return kUsage;
    }
    flush_output();
    return kDone;
}

/** A failure, the more so when its answer is the output, and that is lost. */
exit_code tell(const failure &failed) {
    try {
        flush_output();
    } catch (const failure &unwritten) {
        complain(failed.text.empty() ? unwritten.text : failed.text);
        return failed.text.empty() ? unwritten.code : failed.code;
    }
    complain(failed.text);
    return failed.code;
}

int run(int argc, char **argv) {
    try {
        CLI::App app{"Shows and changes the network configuration of the appliance.", "kovanet"};
        const bool is_completion = argc > 1 && strcmp(argv[1], "--complete") == 0;
        return is_completion ? complete(app, argc - 1, argv + 1) : obey(app, argc, argv);
    } catch (const failure &failed) {
        return tell(failed);
    } catch (const std::bad_alloc &) {
        return tell({kCallFailed, "not enough memory"});
    } catch (const std::exception &error) {
        return tell({kCallFailed, std::string("cannot go on: ") + error.what()});
    }
}

} // namespace
} // namespace kova

int main(int argc, char **argv) {
    return kova::run(argc, argv);
}
