// kovanet stats: traffic counters, once or as rates while they change.
#include "errors.h"
#include "interfaces.h"
#include "interrupt.h"
#include "objects.h"
#include "words.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <ctime>
#include <kovanetsdk/stats.h>
#include <unistd.h>

namespace kova {
namespace {

double now(clockid_t clock) {
    timespec time{};
    clock_gettime(clock, &time);
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) / 1e9;
}

const NETSTAT *find(const std::vector<NETSTAT> &stats, const std::string &name) {
    const auto found =
        std::find_if(stats.begin(), stats.end(), [&name](const NETSTAT &s) { return name == s.szIfname; });
    return found == stats.end() ? nullptr : &*found;
}

/** The counters of the named interfaces, of all when none is named. */
std::vector<NETSTAT> counters_of(const std::vector<std::string> &names) {
    std::vector<NETSTAT> stats = all_counters();
    if (!names.empty()) {
        std::erase_if(stats, [&names](const NETSTAT &stat) {
            return std::find(names.begin(), names.end(), stat.szIfname) == names.end();
        });
    }
    return stats;
}

json describe(const NETSTAT &stat) {
    json row;
    row["name"] = stat.szIfname;
    row["rx_bytes"] = stat.nRxBytes;
    row["rx_packets"] = stat.nRxPackets;
    row["tx_bytes"] = stat.nTxBytes;
    row["tx_packets"] = stat.nTxPackets;
    return row;
}

json rows_of(const std::vector<NETSTAT> &stats) {
    json rows = json::array();
    for (const NETSTAT &stat : stats) {
        rows.push_back(describe(stat));
    }
    return rows;
}

/** Growth per second; a counter that went back belongs to an interface that was made anew. */
int64_t rate(int64_t before, int64_t after, double seconds) {
    return after < before ? 0 : llround(static_cast<double>(after - before) / seconds);
}

/** The rows with their rates; an interface that was not there before has none yet. */
json rates_of(const std::vector<NETSTAT> &before, const std::vector<NETSTAT> &after, double seconds) {
    json rows = json::array();
    for (const NETSTAT &stat : after) {
        json row = describe(stat);
        const NETSTAT *old = find(before, stat.szIfname);
        const auto add = [&](const char *key, int64_t NETSTAT::*counter) {
            row[key] = old == nullptr ? json() : json(rate(old->*counter, stat.*counter, seconds));
        };
        add("rx_bytes_per_second", &NETSTAT::nRxBytes);
        add("rx_packets_per_second", &NETSTAT::nRxPackets);
        add("tx_bytes_per_second", &NETSTAT::nTxBytes);
        add("tx_packets_per_second", &NETSTAT::nTxPackets);
        rows.push_back(row);
    }
    return rows;
}

constexpr column kColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"RX BYTES", [](const json &row) { return field(row, "rx_bytes"); }, true},
    {"RX PACKETS", [](const json &row) { return field(row, "rx_packets"); }, true},
    {"TX BYTES", [](const json &row) { return field(row, "tx_bytes"); }, true},
    {"TX PACKETS", [](const json &row) { return field(row, "tx_packets"); }, true},
};

constexpr column kRateColumns[] = {
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"RX BYTES/S", [](const json &row) { return field(row, "rx_bytes_per_second"); }, true},
    {"RX PACKETS/S", [](const json &row) { return field(row, "rx_packets_per_second"); }, true},
    {"TX BYTES/S", [](const json &row) { return field(row, "tx_bytes_per_second"); }, true},
    {"TX PACKETS/S", [](const json &row) { return field(row, "tx_packets_per_second"); }, true},
};

/** Seconds, cut to what a clock is good for. */
double in_ms(double seconds) {
    return std::round(seconds * 1e3) / 1e3;
}

/** Shows one tick; on a terminal in place of the one before. Returns the lines it takes. */
int show_tick(const json &rows, double seconds, int lines_before, bool as_json) {
    int lines = 0;
    if (as_json) {
        print_json({{"time", in_ms(now(CLOCK_REALTIME))}, {"seconds", in_ms(seconds)}, {"interfaces", rows}});
    } else {
        if (lines_before > 0 && isatty(STDOUT_FILENO) == 1) {
            printf("\033[%dA\033[J", lines_before);
        } else if (lines_before > 0) {
            putchar('\n');
        }
        lines = print_table(rows, kRateColumns);
    }
    flush_output();
    return lines;
}

struct stats_words {
    std::vector<std::string> names;
    std::string seconds;              /**< between two ticks, "" for one */
    std::optional<std::string> count; /**< ticks */
};

double seconds_of(const std::string &text) {
    constexpr double kLeast = 0.1;
    constexpr double kMost = 86400;
    if (text.empty()) {
        return 1;
    }
    double seconds = 0;
    const char *const end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, seconds, std::chars_format::fixed);
    if (error != std::errc{} || stop != end || !(seconds >= kLeast && seconds <= kMost)) {
        throw failure{kNo, "--watch \"" + text + "\" is not valid: it is a number of seconds from 0.1 to 86400"};
    }
    return seconds;
}

int64_t count_of(const std::optional<std::string> &text) {
    constexpr int64_t kMost = 1000000000;
    return text ? number_within("--count", *text, 1, kMost) : 0;
}

/** When the tick after one is due: those that were missed meanwhile are left out. */
double tick_after(double due, double time, double interval) {
    return due + interval * (1 + std::max(0.0, std::floor((time - due) / interval)));
}

void watch(const stats_words &words, bool as_json) {
    const double interval = seconds_of(words.seconds);
    const int64_t count = count_of(words.count);
    stop_on_signals();
    std::vector<NETSTAT> before = counters_of(words.names);
    double last = now(CLOCK_MONOTONIC);
    double next = last + interval;
    int lines = 0;
    for (int64_t tick = 0; count == 0 || tick < count; ++tick, next = tick_after(next, last, interval)) {
        if (!sleep_unless_interrupted(next - now(CLOCK_MONOTONIC))) {
            break;
        }
        std::vector<NETSTAT> after = counters_of(words.names);
        const double time = now(CLOCK_MONOTONIC);
        lines = show_tick(rates_of(before, after, time - last), time - last, lines, as_json);
        before = std::move(after);
        last = time;
    }
}

void show(const stats_words &words, bool watched, bool as_json) {
    for (const std::string &name : words.names) {
        require_interface(name);
        if (find(all_counters(), name) == nullptr) {
            throw failure{kNotFound, "the library keeps no counters of " + name};
        }
    }
    if (watched) {
        watch(words, as_json);
    } else if (as_json) {
        print_json(rows_of(counters_of(words.names)));
    } else {
        print_table(rows_of(counters_of(words.names)), kColumns);
    }
}

} // namespace

void add_stats(CLI::App &object, const global_options &options) {
    auto &words = words_of<stats_words>();
    add_words(object, "IF", words.names, "interfaces; all when none is named");
    auto *watched = object.add_option("--watch", words.seconds, "show rates, anew every SECONDS (1)")
                        ->option_text("[SECONDS]")
                        ->expected(0, 1);
    object.add_option("--count", words.count, "end after N times")->option_text("N")->needs(watched);
    object.callback([&words, watched, &options] { show(words, watched->count() > 0, options.json); });
}

} // namespace kova
