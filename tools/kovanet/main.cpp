// kovanet: the appliance's network for a person at a terminal and for scripts.
#include "errors.h"
#include "objects.h"
#include "table.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <numeric>
#include <string>
#include <syslog.h>
#include <vector>

namespace kova {
namespace {

constexpr char kExitCodes[] = "Every command takes --json and --verbose.\n"
                              "Exit codes: 0 done or yes, 1 no or an invalid value, 2 usage, 3 not found,\n"
                              "            4 the library call failed, 5 needs root";

struct object {
    const char *name;
    const char *description;
    void (*add)(CLI::App &, const global_options &);
    const char *examples;
};

constexpr object kObjects[] = {
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
     "  kovanet link up lan0"},
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
    {"dns", "name servers, and where they come from", add_dns,
     "  kovanet dns show\n"
     "  kovanet dns set 192.168.1.1 2001:db8::53\n"
     "  kovanet dns mode auto\n"
     "  kovanet dns update"},
    {"hostname", "the name of the appliance", add_hostname,
     "  kovanet hostname show\n"
     "  kovanet hostname set nas01"},
    {"service", "what the services are told", add_service,
     "  kovanet service notify ip\n"
     "  kovanet service notify ip,mtu action 1"},
    {"check", "whether a value is valid", add_check,
     "  kovanet check address 192.168.1.10 mask 255.255.255.0\n"
     "  kovanet check prefix 192.168.1.0/24\n"
     "  kovanet check ipv6 2001:db8::1/64\n"
     "  kovanet check hostname nas01"},
};

/** Help without the types of the words, which their descriptions tell better. */
class help_format : public CLI::Formatter {
public:
    help_format() {
        label("SUBCOMMAND", "COMMAND");
        label("Positionals", "Words");
    }
    std::string make_option_opts(const CLI::Option *option) const override {
        return option->get_positional() ? "" : Formatter::make_option_opts(option);
    }
};

/** Number of letters to change, add or leave out to get from one word to the other. */
size_t distance(const std::string &from, const std::string &to) {
    std::vector<size_t> row(to.size() + 1);
    std::iota(row.begin(), row.end(), 0U);
    for (size_t i = 1; i <= from.size(); ++i) {
        size_t diagonal = std::exchange(row[0], i);
        for (size_t j = 1; j <= to.size(); ++j) {
            const size_t changed = diagonal + (from[i - 1] == to[j - 1] ? 0 : 1);
            diagonal = std::exchange(row[j], std::min({changed, row[j] + 1, row[j - 1] + 1}));
        }
    }
    return row.back();
}

/** Ends the program unless a word that may have been given is one of the commands below another. */
void require_known(const char *what, const char *word, const CLI::App &parent) {
    constexpr size_t kClose = 2;
    const auto known = parent.get_subcommands([](const CLI::App *) { return true; });
    const auto is_word = [word](const CLI::App *command) { return command->get_name() == word; };
    if (word == nullptr || known.empty() || std::any_of(known.begin(), known.end(), is_word)) {
        return;
    }
    const auto *const nearest =
        *std::min_element(known.begin(), known.end(), [word](const auto *one, const auto *other) {
            return distance(word, one->get_name()) < distance(word, other->get_name());
        });
    const std::string &name = nearest->get_name();
    throw failure{kUsage, std::string(what) + " \"" + word + "\" is not known" +
                              (distance(word, name) <= kClose ? "; did you mean " + name + "?" : "")};
}

/** The first words that are no options: the object and the verb. */
struct command_words {
    const char *object = nullptr;
    const char *verb = nullptr;
};

command_words first_words(int argc, char **argv) {
    const auto is_word = [](const char *argument) { return argument[0] != '-'; };
    char **const end = argv + argc;
    char **const object = std::find_if(argv + 1, end, is_word);
    char **const verb = std::find_if(std::min(object + 1, end), end, is_word);
    return {object != end ? *object : nullptr, verb != end ? *verb : nullptr};
}

void name_groups(CLI::App &app) {
    for (CLI::App *command : app.get_subcommands([](const CLI::App *) { return true; })) {
        command->group("Commands");
        name_groups(*command);
    }
}

/** Describes the whole first level, and below it only the object that was asked for. */
void describe(CLI::App &app, global_options &options, const command_words &words) {
    app.require_subcommand(1);
    app.fallthrough(); // the global options may stand anywhere
    app.formatter(std::make_shared<help_format>());
    app.set_help_flag("--help", "show this help");
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
            if (each.add != add_stats) { // which has no verbs
                command.require_subcommand(1);
                require_known("verb", words.verb, command);
            }
        }
    }
    require_known("object", words.object, app);
    name_groups(app);
}

void complain(const std::string &text) {
    if (!text.empty()) {
        fprintf(stderr, "kovanet: %s\n", printable(text).c_str());
    }
}

/** The command line is wrong: how, and where to read on. */
void complain_of_usage(const CLI::ParseError &error, const CLI::App &app) {
    std::string where = app.get_name();
    for (const CLI::App *command = &app; !command->get_subcommands().empty();) {
        command = command->get_subcommands().front();
        where += " " + command->get_name();
    }
    const bool lacks_command = error.get_name() == "RequiredError" && strstr(error.what(), "subcommand") != nullptr;
    complain((lacks_command ? "the command is not complete" : error.what()) + ("; see " + where) + " --help");
}

int run(int argc, char **argv) {
    CLI::App app{"Shows and changes the network configuration of the appliance.", "kovanet"};
    global_options options;
    try {
        describe(app, options, first_words(argc, argv));
        app.parse_complete_callback([&options] {
            if (options.verbose) {
                openlog("kovanet", LOG_PERROR | LOG_PID, LOG_USER);
            }
        });
        app.parse(argc, argv);
        flush_output();
        return kDone;
    } catch (const CLI::CallForHelp &) {
        fputs(app.help().c_str(), stdout);
        return kDone;
    } catch (const CLI::ParseError &error) {
        complain_of_usage(error, app);
        return kUsage;
    } catch (const failure &failed) {
        fflush(stdout);
        complain(failed.text);
        return failed.code;
    }
}

} // namespace
} // namespace kova

int main(int argc, char **argv) {
    return kova::run(argc, argv);
}
