/**
 * @file
 * The processes that a call under test forks. Each tells what it did when it ends, and that becomes part of the outcome
 * of the process that forked it, which waits for it unless the rig holds it.
 */
#include "support/fault_points.h"
#include "support/reports.h"

#include <cerrno>
#include <dlfcn.h>
#include <fcntl.h>
#include <sstream>
#include <sys/stat.h>
#include <unistd.h>

namespace kova_test {

namespace {

constexpr char kReached[] = "/tmp/forked-has-reached";
constexpr char kReleased[] = "/tmp/forked-is-released";

/** Where a forked process tells; -1 in the process of the test. */
int report_fd = -1;
/** What it had inherited when it began. */
outcome inherited;
std::map<std::string, int> inherited_held;
size_t inherited_met = 0;
size_t inherited_failed = 0;
bool inherited_verdict = false;

template<typename Item> std::vector<Item> behind_first(const std::vector<Item> &all, size_t number) {
    return {all.begin() + static_cast<ptrdiff_t>(number), all.end()};
}

template<typename Item> void append(std::vector<Item> &all, const std::vector<Item> &more) {
    all.insert(all.end(), more.begin(), more.end());
}

void begin_report(int fd) {
    constexpr int kOutOfTheWay = 500; // of those that the call under test closes or replaces
    close(report_fd);
    report_fd = fcntl(fd, F_DUPFD_CLOEXEC, kOutOfTheWay);
    close(fd);
    inherited = current_rig->now;
    inherited_held = current_rig->held;
    inherited_verdict = ::testing::Test::HasFailure();
    if (current_points != nullptr) {
        inherited_met = current_points->met.size();
        inherited_failed = current_points->failed.size();
    }
}

/** What this process did since it began. */
std::string report() {
    const outcome &now = current_rig->now;
    std::ostringstream out;
    write_texts(out, behind_first(now.log, inherited.log.size()));
    write_texts(out, behind_first(now.commands, inherited.commands.size()));
    write_texts(out, behind_first(now.events, inherited.events.size()));
    write_texts(out, behind_first(now.locks, inherited.locks.size()));
    write_texts(out, current_points != nullptr ? behind_first(current_points->met, inherited_met) : texts{});
    write_texts(out, current_points != nullptr ? behind_first(current_points->failed, inherited_failed) : texts{});
    texts held;
    for (const auto &[kind, count] : current_rig->held) {
        held.push_back(kind);
        held.push_back(std::to_string(count - inherited_held[kind]));
    }
    write_texts(out, held);
    write_texts(out, current_rig->failures_left());
    out << (::testing::Test::HasFailure() && !inherited_verdict ? "failed" : "fine") << "\n";
    return out.str();
}

/** Takes over what forked processes told, one after the other. */
void adopt(const std::string &reports) {
    std::istringstream in{reports};
    while (in.peek() != std::istream::traits_type::eof()) {
        outcome &now = current_rig->now;
        append(now.log, read_texts(in));
        append(now.commands, read_texts(in));
        append(now.events, read_texts(in));
        append(now.locks, read_texts(in));
        const texts met = read_texts(in);
        const texts failed = read_texts(in);
        if (current_points != nullptr) {
            current_points->adopt(met, failed);
        }
        const texts held = read_texts(in);
        for (size_t i = 0; i + 1 < held.size(); i += 2) {
            current_rig->held[held[i]] += std::stoi(held[i + 1]);
        }
        current_rig->keep_failures(read_texts(in));
        std::string verdict;
        in >> verdict >> std::ws;
        EXPECT_EQ("fine", verdict) << "an expectation does not hold in a forked process";
    }
}

pid_t observed_fork(pid_t (*next)()) {
    const bool is_of_the_test = report_fd < 0;
    int ends[2] = {-1, -1};
    if ((is_of_the_test || !current_rig->is_holding) && pipe(ends) != 0) {
        return -1;
    }
    const pid_t child = next();
    if (child == 0) {
        if (ends[1] >= 0) {
            close(ends[0]);
            begin_report(ends[1]);
        }
        if (is_of_the_test && current_points != nullptr) {
            current_points->stay_in("fork");
        }
        return 0;
    }
    close(ends[1]);
    if (!current_rig->is_holding) {
        adopt(receive(ends[0]));
        close(ends[0]);
    } else if (is_of_the_test) {
        current_rig->held_report = ends[0];
        close(open(kReached, O_RDONLY | O_CLOEXEC));
    }
    return child;
}

template<typename Function> Function *real(const char *name) {
    return reinterpret_cast<Function *>(dlsym(RTLD_NEXT, name));
}

} // namespace

void test_rig::hold_forked() {
    is_holding = true;
    for (const char *path : {kReached, kReleased}) {
        unlink(path);
        ASSERT_EQ(0, mkfifo(path, 0600));
    }
}

void test_rig::wait_for_release() const {
    close(open(kReached, O_WRONLY | O_CLOEXEC));
    close(open(kReleased, O_RDONLY | O_CLOEXEC));
}

void test_rig::release_forked() {
    if (!is_holding || report_fd >= 0) {
        return;
    }
    is_holding = false;
    if (held_report >= 0) {
        close(open(kReleased, O_WRONLY | O_CLOEXEC));
        adopt(receive(held_report));
        close(held_report);
        held_report = -1;
    }
    unlink(kReached);
    unlink(kReleased);
}

} // namespace kova_test

#pragma GCC diagnostic ignored "-Wmissing-declarations"

using kova_test::current_rig;
using kova_test::rig_at_work;

extern "C" pid_t fork() noexcept {
    static const auto next = kova_test::real<pid_t()>("fork");
    if (current_rig == nullptr || !current_rig->is_observing || rig_at_work::depth != 0) {
        return next();
    }
    const kova_test::fault_point point{"fork", true, [] { return std::string(); }};
    const rig_at_work guard;
    if (point.fails() || current_rig->is_failing("fork")) {
        errno = EAGAIN;
        return -1;
    }
    return kova_test::observed_fork(next);
}

extern "C" void _exit(int status) {
    if (kova_test::report_fd >= 0) {
        const rig_at_work guard;
        kova_test::send(kova_test::report_fd, kova_test::report());
        close_range(0, static_cast<unsigned>(kova_test::report_fd) - 1, 0); // its end is seen before that of the report
    }
    kova_test::real<void(int)>("_exit")(status);
    __builtin_unreachable();
}

/** Leaves the way to tell open. */
extern "C" int close_range(unsigned first, unsigned last, int flags) noexcept {
    static const auto next = kova_test::real<int(unsigned, unsigned, int)>("close_range");
    const auto kept = static_cast<unsigned>(kova_test::report_fd);
    if (kova_test::report_fd < 0 || kept < first || kept > last) {
        return next(first, last, flags);
    }
    next(first, kept - 1, flags);
    return next(kept + 1, last, flags);
}

namespace {

const bool fork_can_fail = kova_test::can_fail("fork");

} // namespace
