// kovanet lookup: the addresses that a name stands for.
#include "errors.h"
#include "objects.h"
#include "table.h"

#include <kova/core.h>
#include <kovanetsdk/addr.h>
#include <vector>

namespace kova {
namespace {

constexpr int kIpv6Family = 10;

constexpr column kColumns[] = {
    {"ADDRESS", [](const json &row) { return field(row, "address"); }},
    {"FAMILY", [](const json &row) { return "IPv" + field(row, "family"); }},
};

std::vector<KOVALOOKUPIP> addresses_of(const std::string &name) {
    constexpr size_t kUsually = 32;
    const step_note note{"looking " + name + " up"};
    std::vector<KOVALOOKUPIP> found(kUsually);
    for (;;) {
        clear_error();
        const int count = KOVANetLookupIP(name.c_str(), found.data(), static_cast<int>(found.size()), 1);
        const bool has_all = static_cast<size_t>(count) <= found.size();
        found.resize(static_cast<size_t>(count));
        if (has_all) {
            return found;
        }
    }
}

void look_up(const std::string &name, bool as_json) {
    if (name.empty()) {
        throw failure{kNo, "the name is empty"};
    }
    json rows = json::array();
    for (const KOVALOOKUPIP &address : addresses_of(name)) {
        rows.push_back({{"address", address.szIP}, {"family", address.nFamily == kIpv6Family ? 6 : 4}});
    }
    if (rows.empty() && KLIBCErrGet() != 0) {
        call_failed("cannot look " + name + " up");
    }
    if (rows.empty()) {
        throw failure{kNotFound, "no address of " + name + " is known"};
    }
    show_table(rows, kColumns, as_json);
}

} // namespace

void add_lookup(CLI::App &object, const global_options &options) {
    auto &name = words_of<std::string>();
    object.add_option("NAME", name, "name of a host")->required();
    object.callback([&name, &options] { look_up(name, options.json); });
}

} // namespace kova
