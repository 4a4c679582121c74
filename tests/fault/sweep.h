/**
 * @file
 * The sweep: a call runs once clean, which lists the points at which it can fail, and then once more for each of them
 * from a freshly laid-out state, with that point failing. Every run is a process of its own.
 */
#pragma once

#include "support/connections.h"
#include "support/fake_kernel.h"
#include "support/fault_points.h"

#include <climits>

#include <kovanetsdk/kovanetsdk.h>

namespace fault {

using kova_test::texts;

/** The appliance that every call starts from, and room for what calls give back. */
struct world {
    world();
    world(const world &) = delete;
    world &operator=(const world &) = delete;
    ~world();
    /** Gives back what the call may have added to. */
    void release();

    kova_test::test_rig rig;
    kova_test::fake_kernel kernel{rig};

    KLIBSZLIST *list; ///< "10.0.0.1", "10.0.0.2"
    uint64_t event = 0;
    char text[256] = "";
    int number = 0;
    unsigned mask = 0;
    char names[32][16];
    IFINFO records[32];
    NETINFO card = {};
    ETHINFO ethernet;
    NETSTAT statistics[32];
    KOVAV6IP addresses[16];
    KOVALINKAGGROPT bond;
    KLIBSZHASH *map; ///< empty
    DHCP_TAG_CONF subnet = {};
    DHCP_PXE_CONF boot = {};
    DHCP_RANGE *ranges = nullptr;
    VLANINFO vlan = {};
    BRIDGEINFO bridge = {};
    PPPOE_CONF dial = {};
    PPPOE_RELAY_CONF relay = {};
    std::optional<kova_test::listener> host; ///< who can be reached
    TUNNEL_CONF tunnel = {};
};

/** How a function's result says that it failed. */
enum class failure {
    below_zero,
    zero,
    below_one,
    not_zero,
    like_zero ///< zero, which is the call's answer also when nothing fails
};

/** A failure that a function gets over by design. */
struct tolerance {
    std::string at;               ///< what the point, or a call around it, begins with; a blank at the end: what it is
    std::string reason;           ///< why, in one line
    std::optional<long> result{}; ///< what the function answers then; without one as when nothing failed
    std::string file{};           ///< file that may be in between, by a part of its path
    std::string holds{};          ///< what it holds then, whatever else; "gone" for one that is no more
};
using tolerances = std::vector<tolerance>;
inline constexpr long kAnyResult = LONG_MIN;
/** What every function gets over, or what the platform gets over for it. */
const tolerances &tolerated_everywhere();

/** Says that a function works on its arguments alone: there is nothing that could fail. */
struct pure_tag {};
inline constexpr pure_tag pure{};

/** A call to sweep. */
struct scenario {
    /**
     * @param what     the function's name, and behind "/" what is special when it has several scenarios
     * @param how      the call
     * @param options  in any order: what to lay out before, how the result says failure, what is tolerated, pure
     */
    template<typename... Option>
    scenario(const char *what, std::function<long(world &)> how, const Option &...options)
        : name(what), call(std::move(how)) {
        (set(options), ...);
    }

    std::string name;
    std::function<long(world &)> call;
    void (*lay_out)(world &) = [](world &) {};
    failure fails_with = failure::below_zero;
    tolerances tolerated{};
    bool is_pure = false;

private:
    void set(void (*before)(world &)) { lay_out = before; }
    void set(failure how) { fails_with = how; }
    void set(const tolerances &more) { tolerated.insert(tolerated.end(), more.begin(), more.end()); }
    void set(pure_tag) { is_pure = true; }
};

/** One line each; an exported function without a line is a failure of the ring. */
const std::vector<scenario> &scenarios();

/** What a run did. */
struct report {
    std::string crash{}; ///< how the process ended early
    long result = 0;
    texts met{}, failed{};                        ///< points
    texts wrong{};                                ///< leaks and the like
    std::map<std::string, std::string> changed{}; ///< files that are not as before: owner, mode and content
};

report run(const scenario &one, const kova_test::fault_plan &plan);

/** Runs a scenario through all its points. @return what is wrong, a line each */
texts sweep(const scenario &one, const report &clean);

} // namespace fault
