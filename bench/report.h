/**
 * @file
 * What came out: a line per contest as it ends, and all of them as JSON.
 */
#pragma once

#include "contest.h"

#include <benchmark/benchmark.h>
#include <map>
#include <nlohmann/json.hpp>

namespace kova {

/** Names of the numbers that a contest reports. */
inline constexpr char kOurs[] = "ours";
inline constexpr char kTheirs[] = "theirs";
inline constexpr char kRatio[] = "ratio";
/** Names of what is made of those of all repetitions. */
inline constexpr char kMedian[] = "median";
inline constexpr char kLowest[] = "lowest";
inline constexpr char kHighest[] = "highest";

/** Prints the table and collects the records. */
class table_reporter : public benchmark::BenchmarkReporter {
public:
    explicit table_reporter(const contests &all) : all_(all) {}

    bool ReportContext(const Context &context) override;
    void ReportRuns(const std::vector<Run> &runs) override;

    /** Remembers that a contest could not be held to its end. */
    void note_failure(const contest &held, const char *reason) { failures_[held.name()] = reason; }
    /** Says how many goals were met. */
    void print_sum() const;
    /** One record per contest; docs/bench.md names the fields. */
    [[nodiscard]] const nlohmann::ordered_json &records() const { return records_; }
    [[nodiscard]] bool has_failures() const { return !failures_.empty(); }

private:
    const contests &all_;
    std::string last_row_;
    nlohmann::ordered_json records_ = nlohmann::ordered_json::array();
    std::map<std::string, std::string> failures_; ///< reasons by name of the contest
};

} // namespace kova
