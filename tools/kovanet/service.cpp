// kovanet service: what the services of the appliance are told.
#include "errors.h"
#include "objects.h"
#include "table.h"
#include "words.h"

#include <algorithm>
#include <climits>
#include <iterator>
#include <kova/core.h>
#include <kovanetsdk/events.h>

namespace kova {
namespace {

constexpr struct {
    const char *name;
    uint32_t bit;
} kChanges[] = {
    {"ip", KLIB_SERVICE_IP_CHANGE}, {"hostname", KLIB_SERVICE_HOSTNAME_CHANGE}, {"mtu", KLIB_SERVICE_MTU_CHANGE}};

struct service_words {
    std::string changes;
    std::string keyword;
    std::string action = "0";
};

/** The bits of names with commas between them; nothing when one is not known. */
std::optional<uint32_t> flags_of(const std::string &changes) {
    uint32_t flags = 0;
    for (const std::string &name : CLI::detail::split(changes, ',')) {
        const auto *found = std::find_if(std::begin(kChanges), std::end(kChanges),
                                         [&name](const auto &change) { return name == change.name; });
        if (found == std::end(kChanges)) {
            return std::nullopt;
        }
        flags |= found->bit;
    }
    return flags;
}

std::string complaint_about(const std::string &changes) {
    return flags_of(changes) ? "" : "\"" + changes + "\" is not ip, hostname, mtu, or several with commas between them";
}

void notify(const service_words &words) {
    require_root();
    const auto action = static_cast<int>(number_within("action", words.action, INT_MIN, INT_MAX));
    const step_note note{"telling the services"};
    clear_error();
    if (KLIBServicePlugin(action, flags_of(words.changes).value_or(0)) < 0) {
        call_failed("cannot tell the services");
    }
    if (KLIBCErrGet() != 0) { // the call goes on after a plug-in that fails, and so does this one
        call_failed("not every service followed");
    }
}

} // namespace

void add_service(CLI::App &object, const global_options &) {
    auto &words = words_of<service_words>();
    CLI::App &tell = *object.add_subcommand("notify", "tell the services of a change, as before it and as after it");
    tell.add_option("CHANGES", words.changes, "ip, hostname, mtu, or several with commas between them")
        ->required()
        ->check(complaint_about);
    add_keyword(tell, "action", words.keyword, "NUMBER", words.action,
                "what they are to do, as their plug-ins understand it");
    tell.callback([&words] { notify(words); });
}

} // namespace kova
