// kovanet service: what the services of the appliance are told.
#include "errors.h"
#include "objects.h"
#include "table.h"

#include <algorithm>
#include <iterator>
#include <kovanetsdk/events.h>

namespace kova {
namespace {

constexpr struct {
    const char *name;
    uint32_t bit;
} kChanges[] = {
    {"ip", KLIB_SERVICE_IP_CHANGE}, {"hostname", KLIB_SERVICE_HOSTNAME_CHANGE}, {"mtu", KLIB_SERVICE_MTU_CHANGE}};

struct service_words {
    std::vector<std::string> changes;
    std::string keyword;
    int action = 0;
};

uint32_t bit_of(const std::string &name) {
    const auto *found = std::find_if(std::begin(kChanges), std::end(kChanges),
                                     [&name](const auto &change) { return name == change.name; });
    return found->bit;
}

void notify(const service_words &words) {
    require_root();
    uint32_t flags = 0;
    for (const std::string &name : words.changes) {
        flags |= bit_of(name);
    }
    const step_note note{"telling the services"};
    clear_error();
    if (KLIBServicePlugin(words.action, flags) < 0) {
        call_failed("cannot tell the services");
    }
}

} // namespace

void add_service(CLI::App &object, const global_options &) {
    auto &words = words_of<service_words>();
    CLI::App &tell = *object.add_subcommand("notify", "tell the services of a change, as before it and as after it");
    tell.add_option("CHANGES", words.changes, "ip, hostname, mtu, or several with commas between them")
        ->required()
        ->expected(1)
        ->delimiter(',')
        ->check(CLI::IsMember({"ip", "hostname", "mtu"}));
    auto *action_key = tell.add_option("action", words.keyword, "the word action")->check(CLI::IsMember({"action"}));
    action_key->needs(tell.add_option("NUMBER", words.action, "what they are to do, as their plug-ins understand it"));
    tell.callback([&words] { notify(words); });
}

} // namespace kova
