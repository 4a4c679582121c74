/**
 * @file
 * The points at which a call can fail. The replaced calls of the rig pass through a fault_point each; while a sweep
 * runs (current_points), the points are counted in order and one of them, or one and those like it behind it, fails.
 */
#pragma once

#include "support/rig.h"

#include <cerrno>
#include <set>

namespace kova_test {

/** Which points of a run fail. */
struct fault_plan {
    enum class way {
        none,      ///< nothing fails: the points are only listed
        once,      ///< the chosen point
        onwards,   ///< the chosen point and every later one of its operation
        otherwise, ///< the chosen point in its other way: a program that runs and exits with 1
    };
    way how = way::none;
    size_t chosen = 0; ///< number of the point, from 0
};

/** The operation of a point, "open" of "KLIBCFileSetKeys /etc/... > open /etc/...". */
std::string operation_of(const std::string &point);

/** What a run met. */
class fault_points {
public:
    explicit fault_points(const fault_plan &plan) : plan_(plan) {}

    /** Counts a point. @return whether it fails */
    bool meets(const std::string &operation, const std::string &detail);
    void leave() { within_.pop_back(); }
    /** What is met from now on is met within a call that is left already. */
    void stay_in(const std::string &call) { within_.push_back(call); }
    /** Goes on behind what another process met. */
    void adopt(const texts &also_met, const texts &also_failed);
    [[nodiscard]] bool fails_otherwise() const { return plan_.how == fault_plan::way::otherwise; }

    texts met{}; ///< "KLIBCFileSetKeys /etc/... > open /etc/...": the calls of the platform around it, then the point
    texts failed{};                  ///< those that failed
    std::set<const void *> blocks{}; ///< memory that was asked for and not given back

private:
    fault_plan plan_;
    std::string chosen_operation_{};
    texts within_{};
};

/** The sweep's run; null outside of one. */
extern fault_points *current_points;

/** While one lives, calls are the rig's own: neither points nor anybody's memory. */
class rig_at_work {
public:
    rig_at_work() { ++depth; }
    rig_at_work(const rig_at_work &) = delete;
    rig_at_work &operator=(const rig_at_work &) = delete;
    ~rig_at_work() { --depth; }

    static inline int depth = 0;
};

/** Whether an address lies in the library, the platform or (a call at the end of one of theirs) this program. */
bool is_in_code_under_test(const void *caller);
/** Whether an address lies in the library, the platform or the C library, which allocates for them. */
bool allocates_for_code_under_test(const void *caller);
/** Whether a block is pointed to by the library's, the platform's or the C library's own variables: a cache. */
bool is_kept_by_variable(const void *block);
/** What an open descriptor leads to, as the code under test named it. */
std::string path_of(int fd);
/** The stream, or during a sweep one whose reads and writes are points, too. */
FILE *watched(FILE *stream, const char *mode, const std::string &path);
/** The stream behind a watched one. */
FILE *behind(FILE *shown);
/** Its direction and path, "read /proc/net/dev". */
std::string stream_text(FILE *shown);
/** A watched stream is about to be closed. */
void forget(FILE *shown);

/** Names of all operations that can fail. */
std::set<std::string> &fault_operations();
inline bool can_fail(const char *operation) {
    return fault_operations().insert(operation).second;
}

/** One call of an operation, for the time of a scope. */
class fault_point {
public:
    /** The detail is what gives the text behind the operation's name. */
    template<typename Detail>
    fault_point(const char *operation, bool is_counted, const Detail &detail)
        : operation_(operation), is_counted_(is_counted && current_points != nullptr && rig_at_work::depth == 0) {
        if (is_counted_) {
            const int saved = errno;
            const rig_at_work guard;
            fails_ = current_points->meets(operation, detail());
            errno = saved;
        }
    }
    fault_point(const fault_point &) = delete;
    fault_point &operator=(const fault_point &) = delete;
    ~fault_point() {
        if (is_counted_) {
            current_points->leave();
        }
    }

    [[nodiscard]] const char *operation() const { return operation_; }
    [[nodiscard]] bool fails() const { return fails_; }

private:
    const char *operation_;
    bool is_counted_;
    bool fails_ = false;
};

} // namespace kova_test

// NOLINTBEGIN(bugprone-macro-parentheses)
/**
 * A call of the C library that can fail: result type, name, parameters, arguments, a text that says what it is about,
 * the result of a failure and its errno. Under another name in C++, so that no declaration is in its way.
 */
#define FAULT_IN_FRONT(type, name, parameters, arguments, detail, failure, error)                                      \
    extern "C" type failing_##name parameters __asm__(#name);                                                          \
    extern "C" type failing_##name parameters {                                                                        \
        static const auto next = reinterpret_cast<type(*) parameters>(dlsym(RTLD_NEXT, #name));                        \
        const ::kova_test::fault_point point{#name, ::kova_test::is_in_code_under_test(__builtin_return_address(0)),   \
                                             [&] { return detail; }};                                                  \
        if (point.fails()) {                                                                                           \
            errno = (error);                                                                                           \
            return failure;                                                                                            \
        }                                                                                                              \
        return next arguments;                                                                                         \
    }                                                                                                                  \
    static const bool name##_can_fail = ::kova_test::can_fail(#name);

/** The same for a call that gives something back, and does so even when it fails. */
#define FAULT_BEHIND(type, name, parameters, arguments, detail, failure, error)                                        \
    extern "C" type failing_##name parameters __asm__(#name);                                                          \
    extern "C" type failing_##name parameters {                                                                        \
        static const auto next = reinterpret_cast<type(*) parameters>(dlsym(RTLD_NEXT, #name));                        \
        const ::kova_test::fault_point point{#name, ::kova_test::is_in_code_under_test(__builtin_return_address(0)),   \
                                             [&] { return detail; }};                                                  \
        const auto result = next arguments;                                                                            \
        if (point.fails()) {                                                                                           \
            errno = (error);                                                                                           \
            return failure;                                                                                            \
        }                                                                                                              \
        return result;                                                                                                 \
    }                                                                                                                  \
    static const bool name##_can_fail = ::kova_test::can_fail(#name);
// NOLINTEND(bugprone-macro-parentheses)
