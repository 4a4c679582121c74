// kovanet tunnel: the IPv6 tunnel through a tunnel broker.
#include "errors.h"
#include "interfaces.h"
#include "objects.h"
#include "password.h"
#include "records.h"
#include "rules.h"
#include "table.h"
#include "words.h"

#include <algorithm>
#include <kova/core.h>
#include <kova/service.h>
#include <kovanetsdk/ipv6.h>
#include <kovanetsdk/tunnel.h>
#include <unistd.h>

namespace kova {
namespace {

constexpr char kService[] = "kovatunnel";
constexpr char kInterface[] = "tun";
constexpr char kClient[] = "/usr/bin/gogoc";
/** The client's own directory, where it leaves its files. */
constexpr char kFolder[] = "/etc/gogoc";

struct tunnel_words {
    std::string server;
    std::string login;
    std::string user;
    password_words password;
};

/** Reads the account. @return whether the tunnel is configured to run */
bool read_account(TUNNEL_CONF &conf) {
    clear_error();
    const int result = KOVATunnelConfigGet(&conf);
    if (result < 0) {
        call_failed("cannot read the tunnel account");
    }
    return result == 1;
}

/** The interface's addresses that reach beyond the link. */
json addresses() {
    constexpr unsigned kLinkLocal = 0x20;
    json found = json::array();
    for (const KOVAV6IP &address : ipv6_addresses(kInterface)) {
        if (address.nScope != kLinkLocal) {
            found.push_back(address.szIP + ("/" + std::to_string(address.nPrefixLength)));
        }
    }
    return found;
}

/** "up", "connecting" while the client has no address, or "down". */
const char *state_of(const json &found) {
    if (!found.empty()) {
        return "up";
    }
    return KLIBCIsProcAlive(kClient) == 1 ? "connecting" : "down";
}

constexpr column kColumns[] = {
    {"state", [](const json &row) { return field(row, "state"); }},
    {"enabled", [](const json &row) { return std::string(row["enabled"] == true ? "yes" : "no"); }},
    {"server", [](const json &row) { return field(row, "server"); }},
    {"login", [](const json &row) { return field(row, "login"); }},
    {"user", [](const json &row) { return field(row, "user"); }},
    {"addresses", [](const json &row) { return words_field(row, "addresses"); }},
};

void show(bool as_json) {
    require_root("reading the tunnel account");
    secret_record<TUNNEL_CONF> conf;
    json record;
    const bool is_enabled = read_account(*conf);
    const json found = addresses();
    record["state"] = state_of(found);
    record["enabled"] = is_enabled;
    record["server"] = known_text(conf->szServer);
    record["login"] = conf->blAnonymous != 0 ? "anonymous" : "user";
    record["user"] = known_text(conf->szUserId);
    record["addresses"] = found;
    show_record(record, kColumns, as_json);
}

/** What a text is that becomes a value in the files of the account. */
refusal refuse_account_text(const std::string &text, bool has_blanks) {
    constexpr size_t kLongest = sizeof(TUNNEL_CONF::szServer) - 1;
    const auto is_bad = [=](unsigned char byte) { return byte < ' ' || byte == 0x7f || (byte == ' ' && !has_blanks); };
    if (text.empty() || text.size() > kLongest) {
        return "it has 1 to " + std::to_string(kLongest) + " bytes";
    }
    if (std::any_of(text.begin(), text.end(), is_bad)) {
        return has_blanks ? "it holds no control characters" : "it holds neither blanks nor control characters";
    }
    return std::nullopt;
}

void set(const tunnel_words &words) {
    require_root();
    const bool is_anonymous = words.login == "anonymous";
    require("tunnel broker \"" + words.server + "\"", refuse_account_text(words.server, false));
    if (is_anonymous != words.user.empty()) {
        throw failure{kUsage, is_anonymous ? "an anonymous login has no user" : "a login needs the name of its user"};
    }
    if (is_anonymous && (words.password.file || words.password.fd || words.password.is_kept)) {
        throw failure{kUsage, "an anonymous login has no password"};
    }
    secret_record<TUNNEL_CONF> conf;
    if (!is_anonymous) {
        require("user \"" + words.user + "\"", refuse_account_text(words.user, true));
        if (words.password.is_kept) {
            read_account(*conf);
        }
        read_password(words.password, conf->szPassword);
    }
    conf->blAnonymous = is_anonymous ? 1 : 0;
    snprintf(conf->szServer, sizeof conf->szServer, "%s", words.server.c_str());
    snprintf(conf->szUserId, sizeof conf->szUserId, "%s", words.user.c_str());
    clear_error();
    if (KOVATunnelConfigSet(&*conf) < 0) {
        call_failed("cannot store the tunnel account");
    }
}

void configure_to_run(int wanted) {
    clear_error();
    if (KLIBServicecfgRunKeySet(kService, wanted) < 0) {
        call_failed("cannot store whether the tunnel is to run");
    }
}

void require_server() {
    secret_record<TUNNEL_CONF> conf;
    read_account(*conf);
    if (*conf->szServer == '\0') {
        throw failure{kNo, "no tunnel broker is configured; first: kovanet tunnel set"};
    }
}

/** What the client leaves in its working directory is not left where this was called. */
void execute(int action, const char *what) {
    if (chdir(kFolder) != 0) {
        throw failure{kCallFailed, std::string("there is no tunnel client here: ") + kFolder + " is missing"};
    }
    const step_note note{std::string(what) + " the tunnel, this takes up to 45 seconds"};
    clear_error();
    if (KOVATunnelExecute(action, nullptr) < 0) {
        throw failure{kCallFailed, std::string("the tunnel client hung and was killed, or could not be stopped; ") +
                                       "run again with --verbose to see the library's log"};
    }
}

/** The library leaves it to its caller to see whether there is a tunnel. */
void require_tunnel() {
    const std::string state = tunnel_state();
    if (state == "connecting") {
        throw failure{kCallFailed,
                      "the tunnel is not up yet: the broker does not answer, and the client goes on trying; "
                      "see kovanet tunnel show"};
    }
    if (state != "up") {
        throw failure{kCallFailed, "the tunnel is not up: the broker refused or could not be reached; see the system "
                                   "log for what gogoc says"};
    }
}

void start() {
    require_root();
    require_server();
    configure_to_run(KLIB_SERVICE_RUN);
    execute(KOVA_TUNNEL_START, "starting");
    require_tunnel();
}

void restart() {
    require_root();
    require_server();
    execute(KOVA_TUNNEL_RESTART, "restarting");
    require_tunnel();
}

void stop() {
    require_root();
    configure_to_run(KLIB_SERVICE_DO_NOT_RUN);
    execute(KOVA_TUNNEL_STOP, "stopping");
}

} // namespace

std::string tunnel_state() {
    return state_of(addresses());
}

void add_tunnel(CLI::App &object, const global_options &options) {
    auto &words = words_of<tunnel_words>();
    object.add_subcommand("show", "the account, without its password, and how the tunnel is")->callback([&options] {
        show(options.json);
    });

    CLI::App &change = *object.add_subcommand("set", "store the account; a tunnel that is up stays as it is");
    change.add_option("SERVER", words.server, "tunnel broker, HOST or HOST:PORT")->required();
    change.add_option("LOGIN", words.login, "anonymous, or login and the user")
        ->required()
        ->check(choice({"anonymous", "login"}));
    change.add_option("USER", words.user, "user name at the broker");
    add_password(change, words.password);
    change.callback([&words] { set(words); });

    object.add_subcommand("start", "start the tunnel, and store that it is to run")->callback(start);
    object.add_subcommand("stop", "stop the tunnel, and store that it is not to run")->callback(stop);
    object.add_subcommand("restart", "stop the tunnel and start it with the stored account")->callback(restart);
}

} // namespace kova
