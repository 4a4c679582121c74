// kova-bench: the library against the bare system calls of the same job, and against what a user would run instead.
#include "report.h"
#include "rows.h"
#include "world.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <ctime>
#include <fstream>
#include <sys/utsname.h>
#include <thread>
#include <unistd.h>

namespace kova {

namespace {

struct bench_options {
    bool quick = false;
    bool list = false;
    std::string json_file;
    std::string disk = ".";
    std::vector<std::string> rows;
};

constexpr int kRepetitions = 7;
// enough to see that everything can be measured
constexpr int kQuickRepetitions = 2;
constexpr int kQuickRounds = 2;

contests all_contests() {
    contests all;
    for (const auto family :
         {interface_contests, key_contests, start_contests, address_contests, load_contests, tool_contests}) {
        for (contest &one : family()) {
            all.push_back(std::move(one));
        }
    }
    return all;
}

double median(std::vector<double> values) {
    std::sort(values.begin(), values.end());
    const size_t middle = values.size() / 2;
    return values.size() % 2 == 1 ? values[middle] : (values[middle - 1] + values[middle]) / 2;
}

double lowest(const std::vector<double> &values) {
    return *std::min_element(values.begin(), values.end());
}

double highest(const std::vector<double> &values) {
    return *std::max_element(values.begin(), values.end());
}

/** Measures the two sides in turn, so that whatever else the machine does falls on both. */
void hold(benchmark::State &state, const contest &held) {
    std::vector<double> ours;
    std::vector<double> theirs;
    const sides both = held.prepare();
    both.ours();
    both.theirs();
    bool ours_first = true;
    for (auto _ : state) {
        if (ours_first) {
            ours.push_back(both.ours());
        }
        theirs.push_back(both.theirs());
        if (!ours_first) {
            ours.push_back(both.ours());
        }
        ours_first = !ours_first;
        state.SetIterationTime(ours.back() / 1e9);
    }
    state.counters[kOurs] = median(ours);
    state.counters[kTheirs] = median(theirs);
    state.counters[kRatio] = median(ours) / median(theirs);
}

void enter(const contest &entered, bool quick, table_reporter &reporter) {
    const auto body = [&entered, &reporter](benchmark::State &state) {
        try {
            hold(state, entered);
        } catch (const std::exception &error) {
            reporter.note_failure(entered, error.what());
            state.SkipWithError(error.what());
        }
    };
    benchmark::RegisterBenchmark(entered.name().c_str(), body)
        ->UseManualTime()
        ->Iterations(quick ? std::min(entered.rounds, kQuickRounds) : entered.rounds)
        ->Repetitions(quick ? kQuickRepetitions : kRepetitions)
        ->ReportAggregatesOnly()
        ->ComputeStatistics(kLowest, lowest)
        ->ComputeStatistics(kHighest, highest);
}

/** Where and when it was measured. */
nlohmann::ordered_json circumstances(const bench_options &options) {
    utsname system;
    require(uname(&system) == 0, "uname");
    const time_t now = time(nullptr);
    char text[32];
    strftime(text, sizeof text, "%Y-%m-%dT%H:%M:%SZ", gmtime(&now));
    double load = 0;
    getloadavg(&load, 1);
    return {{"version", 1},
            {"quick", options.quick},
            {"ended", text},
            {"kernel", system.release},
            {"machine", system.machine},
            {"processors", std::thread::hardware_concurrency()},
            {"load", load}};
}

void write_json(const bench_options &options, const table_reporter &reporter) {
    nlohmann::ordered_json all = circumstances(options);
    all["contests"] = reporter.records();
    std::ofstream file(options.json_file);
    file << all.dump(2) << "\n";
    file.close();
    require_done(!file.fail(), "cannot write the results");
}

int measure_all(const bench_options &options, const contests &all) {
    set_disk(options.disk);
    table_reporter reporter{all};
    for (const contest &one : all) {
        const auto asked = std::find(options.rows.begin(), options.rows.end(), one.row);
        if (options.rows.empty() || asked != options.rows.end()) {
            enter(one, options.quick, reporter);
        }
    }
    benchmark::RunSpecifiedBenchmarks(&reporter);
    reporter.print_sum();
    if (options.quick) {
        puts("Measured in two rounds: everything can be measured, the ratios mean nothing");
    }
    if (!options.json_file.empty()) {
        write_json(options, reporter);
    }
    return reporter.has_failures() ? 1 : 0;
}

int run(int argc, char **argv) {
    const contests all = all_contests();
    std::vector<std::string> rows;
    for (const contest &one : all) {
        if (rows.empty() || rows.back() != one.row) {
            rows.push_back(one.row);
        }
    }
    CLI::App app{"Measures the library; to be run by bench/run, inside a box."};
    bench_options options;
    app.add_flag("--quick", options.quick, "a few rounds only: shows that everything can be measured");
    app.add_flag("--list", options.list, "print the names of the rows");
    app.add_option("--json", options.json_file, "file for the results");
    app.add_option("--disk", options.disk, "directory on a disk, for what is written and synced")
        ->check(CLI::ExistingDirectory);
    app.add_option("ROW", options.rows, "rows to measure, otherwise all")->check(CLI::IsMember(rows));
    CLI11_PARSE(app, argc, argv);
    if (options.list) {
        for (const std::string &row : rows) {
            puts(row.c_str());
        }
        return 0;
    }
    // it makes interfaces and writes to /etc
    require_done(getenv("KOVA_BOX") != nullptr, "only inside a box: see bench/run");
    return measure_all(options, all);
}

} // namespace
} // namespace kova

int main(int argc, char **argv) {
    try {
        return kova::run(argc, argv);
    } catch (const std::exception &error) {
        fprintf(stderr, "kova-bench: %s\n", error.what());
        return 1;
    }
}
