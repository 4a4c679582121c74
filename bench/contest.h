/**
 * @file
 * A contest: the same job done by the library and by something else, measured in turn.
 */
#pragma once

#include <chrono>
#include <functional>
#include <optional>
#include <string>
#include <vector>

namespace kova {

/** Does its job and gives what it took. */
using measure = std::function<double()>;

/** The two sides, which own what they need: it is undone when they go. */
struct sides {
    measure ours;
    measure theirs;
};

struct contest {
    std::string row;   ///< word by which it is asked for
    std::string rival; ///< word for the other side, one per row: "floor", or the program a user would run
    std::string ours;  ///< the job
    std::string theirs;
    std::optional<double> goal; ///< most that ours may take, in parts of theirs
    int rounds;                 ///< each side is measured so often for one median
    std::function<sides()> prepare;
    const char *unit = "ns";

    [[nodiscard]] std::string name() const { return row + "/" + rival; }
};

using contests = std::vector<contest>;

/** Nanoseconds a job takes when done so many times in a row. */
template<class Job> measure timed(int times, Job job) {
    return [times, job = std::move(job)]() mutable {
        const auto begin = std::chrono::steady_clock::now();
        for (int i = 0; i < times; ++i) {
            job();
        }
        const std::chrono::duration<double, std::nano> taken = std::chrono::steady_clock::now() - begin;
        return taken.count() / times;
    };
}

/** Nanoseconds of a job worth a measurement of its own. */
template<class Job> measure timed(Job job) {
    return timed(1, std::move(job));
}

} // namespace kova
