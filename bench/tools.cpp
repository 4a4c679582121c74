// The tool against the tools administrators know.
#include "rows.h"
#include "world.h"

#include <memory>

namespace kova {

namespace {

constexpr int kMany = 1000;

sides list_against_ip() {
    run_program({"kovanet", "card", "set", "eth0", "static", "192.168.50.10/24"}, "");
    return {time_of_run({"kovanet", "card", "list"}), time_of_run({"ip", "-br", "addr"})};
}

sides stats_against_ip() {
    const auto world = std::make_shared<interfaces>(kMany, interfaces::state::down);
    const measure ours = time_of_run({"kovanet", "stats"});
    return {[world, ours] { return ours(); }, time_of_run({"ip", "-s", "link"})};
}

} // namespace

contests tool_contests() {
    return {
        {"card-list", "ip", "kovanet card list", "ip -br addr", 1.5, 200, list_against_ip},
        {"stats-list", "ip", "kovanet stats, 1,000 interfaces", "ip -s link", std::nullopt, 20, stats_against_ip},
    };
}

} // namespace kova
