// kovanet hostname: the name of the appliance.
#include "errors.h"
#include "interfaces.h"
#include "objects.h"
#include "records.h"
#include "rules.h"
#include "table.h"

#include <kova/core.h>
#include <kovanetsdk/hostname.h>

namespace kova {
namespace {

constexpr column kColumns[] = {
    {"name", [](const json &row) { return field(row, "name"); }},
};

/** The name, without its domain; nothing when there is none. */
std::optional<std::string> current_name() {
    char name[64];
    clear_error();
    const int result = KOVALnxGetHostname(name);
    if (result < 0) {
        call_failed("cannot read the host name");
    }
    return result > 0 ? std::optional<std::string>(name) : std::nullopt;
}

void show(bool as_json) {
    const json record = hostname_record();
    show_record(record, kColumns, as_json);
}

/** Only the reload of the logger fails without a code. */
[[noreturn]] void set_failed() {
    if (KLIBCErrGet() == 0) {
        throw failure{kCallFailed, "the host name is set, but nobody was told: the system logger could not be "
                                   "reloaded; see what /sbin/initctl reload syslog-ng says"};
    }
    call_failed("cannot set the host name everywhere");
}

void set(const std::string &name) {
    require_root();
    require("host name \"" + name + "\"", refuse_new_hostname(name));
    const config_lock lock{config_lock::kExclusive}; // nobody else sets another name before this one is looked at
    {
        const step_note note{"setting the host name"};
        clear_error();
        if (KOVALnxSetHostname(name.c_str()) < 0) {
            set_failed();
        }
    }
    const std::string now = current_name().value_or("");
    if (now != name.substr(0, name.find('.'))) {
        throw failure{kNo, "the host name stays \"" + now + "\": inside a container it is given from outside"};
    }
}

struct hostname_words {
    std::string name;
};

} // namespace

json hostname_record() {
    const std::optional<std::string> name = current_name();
    return {{"name", name ? json(*name) : json()}};
}

void add_hostname(CLI::App &object, const global_options &options) {
    auto &words = words_of<hostname_words>();
    object.add_subcommand("show", "the host name, without its domain")->callback([&options] { show(options.json); });

    CLI::App &change = *object.add_subcommand("set", "set the host name, now and at every start");
    change.add_option("NAME", words.name, "up to 63 letters, digits, \"-\", \"_\" and \".\"")->required();
    change.callback([&words] { set(words.name); });
}

} // namespace kova
