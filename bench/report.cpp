#include "report.h"

#include <algorithm>
#include <cstdio>

namespace kova {

namespace {

using json = nlohmann::ordered_json;

std::string fixed(double number, int digits) {
    char text[64];
    snprintf(text, sizeof text, "%.*f", digits, number);
    return text;
}

/** Three digits or more, with the unit in which they are read best. */
std::string amount(double number, const std::string &unit) {
    if (unit == "bytes") {
        return fixed(number / 1024, 0) + " KiB";
    }
    for (const char *prefix : {"ns", "us"}) {
        if (number < 1000) {
            return fixed(number, number < 100 ? 1 : 0) + " " + prefix;
        }
        number /= 1000;
    }
    return fixed(number, 1) + " ms";
}

const char *verdict(const json &met) {
    return met.is_null() ? "" : met == true ? "met" : "MISSED";
}

void print_line(const json &record) {
    const std::string goal = record["goal"].is_null() ? "" : "<= " + fixed(record["goal"], 2);
    const std::string range = fixed(record["ratio_lowest"], 2) + " - " + fixed(record["ratio_highest"], 2);
    const std::string unit = record["unit"];
    printf("  %-42s %10s %10s %7.2f  %-13s %-8s %s\n", record["theirs"].get<std::string>().c_str(),
           amount(record["ours_median"], unit).c_str(), amount(record["theirs_median"], unit).c_str(),
           record["ratio"].get<double>(), range.c_str(), goal.c_str(), verdict(record["met"]));
}

/** The repetitions of a contest as one record. */
json record_of(const contest &held, const std::vector<benchmark::BenchmarkReporter::Run> &runs) {
    const auto number = [&runs](const char *statistic, const char *counter) {
        const auto is_it = [&](const auto &run) { return run.aggregate_name == statistic; };
        return std::find_if(runs.begin(), runs.end(), is_it)->counters.at(counter).value;
    };
    const double ratio = number(kMedian, kRatio);
    return {{"row", held.row},
            {"rival", held.rival},
            {"ours", held.ours},
            {"theirs", held.theirs},
            {"unit", held.unit},
            {"ours_median", number(kMedian, kOurs)},
            {"theirs_median", number(kMedian, kTheirs)},
            {"ratio", ratio},
            {"ratio_lowest", number(kLowest, kRatio)},
            {"ratio_highest", number(kHighest, kRatio)},
            {"goal", held.goal ? json(*held.goal) : json()},
            {"met", held.goal ? json(ratio <= *held.goal) : json()}};
}

} // namespace

bool table_reporter::ReportContext(const Context &) {
    printf("%-44s %10s %10s %7s  %-13s %s\n", "JOB, AND AGAINST WHAT", "OURS", "THEIRS", "RATIO", "LOW - HIGH", "GOAL");
    return true;
}

void table_reporter::ReportRuns(const std::vector<Run> &runs) {
    const auto held = std::find_if(all_.begin(), all_.end(),
                                   [&](const contest &one) { return one.name() == runs[0].run_name.function_name; });
    if (held->row != last_row_) {
        printf("%s: %s\n", held->row.c_str(), held->ours.c_str());
        last_row_ = held->row;
    }
    const auto failure = failures_.find(held->name());
    if (failure != failures_.end()) {
        printf("  %-42s failed: %s\n", held->theirs.c_str(), failure->second.c_str());
    } else {
        records_.push_back(record_of(*held, runs));
        print_line(records_.back());
    }
    fflush(stdout);
}

void table_reporter::print_sum() const {
    const auto with = [this](bool met) {
        return std::count_if(records_.begin(), records_.end(),
                             [met](const json &record) { return record["met"] == met; });
    };
    printf("%td goals met, %td missed, %zu failed\n", with(true), with(false), failures_.size());
}

} // namespace kova
