/**
 * @file
 * The rig of the unit tests. The library under test is the shared object that ships; the test program stands before it
 * in symbol lookup, so that calls into the platform, the kernel and the clock pass through here, are noted, and can be
 * answered or made to fail. What is neither answered nor failed is real: files, locks, lists, kernel requests.
 *
 * A test observes one call and compares the whole outcome:
 *
 *     rig.answer("/sbin/ip", 2);
 *     const outcome got = rig.observe([] { return KOVANetFlushIP("-4", "eth0"); });
 *     EXPECT_OUTCOME(got, {.result = -1,
 *                          .log = {"ERR net_flush_ip:N Failed to flush ipv4 address on [eth0]"},
 *                          .commands = {"/sbin/ip -4 address flush dev eth0"}});
 */
#pragma once

#include <cstdint>
#include <functional>
#include <gtest/gtest.h>
#include <map>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace kova_test {

using texts = std::vector<std::string>;

/** Everything that one call did. Fields left out of an expectation are expected empty. */
struct outcome {
    long result = 0;
    unsigned code = 0;          ///< error register; 0 when the call did not touch it
    std::string unit{};         ///< unit in the register
    texts log{};                ///< "ERR net_set_ip:N flush ip failed": level, then the line with its line numbers as N
    texts commands{};           ///< "/sbin/ip -4 address flush dev eth0"
    texts events{};             ///< "net/ipv4_change 4 IFNAME=eth0 ...": event, phase, arguments in order
    texts locks{};              ///< "+0x105", "-0x100" in order, "file+PATH" and "file-" for locks by file
    std::vector<long> sleeps{}; ///< milliseconds asked for, each

    [[nodiscard]] std::string str() const;
    bool operator==(const outcome &) const = default;
};

/** What a refused argument does: one line, 0xD00, nothing else. */
outcome refusal(const std::string &unit, const std::string &condition, long result = -1);

/** Compares outcomes as texts, so that a difference is shown line by line. */
void expect_outcome(const char *file, int line, const outcome &got, const outcome &expected);
#define EXPECT_OUTCOME(got, ...) ::kova_test::expect_outcome(__FILE__, __LINE__, got, __VA_ARGS__)

/** Stands in for ioctl: nothing to let the kernel answer. */
using ioctl_answer = std::function<std::optional<int>(unsigned long request, void *argument)>;

class test_rig {
public:
    /** Runs one call and gives back what it did. */
    outcome observe(const std::function<long()> &call);

    // ---- tools: programs are noted and not started, except /bin/cp, /bin/mv, /bin/mkdir and /bin/rm, which are real

    /** Exit status of commands that begin with a text, optionally with what they print and do; the longest match wins.
     */
    void answer(const std::string &command, int status, const std::string &output = "",
                const std::function<void()> &effect = {});
    /** Really starts commands that begin with a text. */
    void let_run(const std::string &command);

    // ---- failures

    /**
     * Makes the nth next call of an operation fail: one of the platform, whose code is in the register then, or malloc,
     * calloc, realloc, fopen, open, opendir, access, socket, setsockopt, sendto, ioctl, getaddrinfo, or one of
     * unit/failing_calls.cpp; a signal interrupts nanosleep halfway. A name that the rig does not know fails the test.
     */
    void fail(const std::string &operation, int nth = 1);
    /** The same, and every call after it. */
    void fail_from(const std::string &operation, int nth = 1);

    /** Called before each call of an operation that can fail: a look at what is there in between. */
    void before(const std::string &operation, const std::function<void()> &look);

    // ---- kernel

    /** Answers ioctl requests; nothing lets the kernel answer. */
    void answer_ioctl(ioctl_answer answer);
    /** Stands in for gethostname. */
    void answer_gethostname(std::function<int(char *name, size_t size)> answer);
    /** Opens, accesses and lists another path wherever this one, or something below it, is meant; the longest counts.
     */
    void redirect(const std::string &path, const std::string &other);
    /** The same with a file that holds this content. */
    void replace_file(const std::string &path, const std::string &content);
    /** Makes a path look absent. */
    void hide(const std::string &path);
    /** Called at every sleep with the milliseconds asked for: what happens meanwhile. */
    void on_sleep(const std::function<void(long)> &effect);

    // ---- processes that the call forks: each runs to its end before the call goes on, and belongs to the outcome

    /** Holds the next one where it calls wait_for_release, until it is released or the call has ended. */
    void hold_forked();
    void wait_for_release() const;
    /** Lets it go on to its end. */
    void release_forked();

    // ---- used by the replaced calls

    void note_log(int level, const std::string &line);
    int note_command(const texts &words, std::string *output);
    bool is_failing(const std::string &operation);
    std::string redirected(const char *path) const;
    /** The failures that are still to come, as texts for another process, and back. */
    [[nodiscard]] texts failures_left() const;
    void keep_failures(const texts &left);
    /** The path that was asked for when this one was opened. */
    std::string asked_for(const std::string &path) const;

    outcome now;
    bool is_observing = false;
    ioctl_answer on_ioctl;
    std::function<int(char *, size_t)> on_gethostname;
    std::function<void(long)> during_sleep;
    std::map<std::string, int> held;    ///< containers, handles and streams that are open, by kind
    std::map<std::string, mode_t> made; ///< files that open made, or would have made, with the mode asked for
    bool is_holding = false;
    int held_report = -1; ///< where a process that is held will tell what it did
    long slept_ms = 0;    ///< the clocks are ahead by what was slept

private:
    struct reply {
        int status;
        std::string output;
        std::function<void()> effect;
        bool is_real;
    };
    struct failure {
        int skip;
        bool stays;
    };
    std::map<std::string, reply> replies_;
    std::map<std::string, failure> failures_;
    std::map<std::string, std::function<void()>> looks_;
    std::map<std::string, std::string> redirects_;
    int files_ = 0;
};

/** The rig of the test that runs; null between tests. */
extern test_rig *current_rig;

/** Takes away what a test, or the call before, left where the library writes, and lays out the empty directories. */
void lay_out_clean_appliance();
/** What the open descriptors of this process lead to. */
texts open_descriptors();

/** Base of the unit tests: a clean appliance before each test, and a look for anything left open after it. */
class unit_test : public ::testing::Test {
protected:
    void SetUp() override;
    void TearDown() override;

    test_rig rig;

private:
    texts descriptors_;
};

// ---- files and commands of a test

void write_file(const std::string &path, const std::string &content);
/** Content of a file, "<absent>" when there is none. */
std::string read_file(const std::string &path);
/** Names in a directory, sorted. */
texts list_dir(const std::string &path);
/** Permission bits of a file, 0 when there is none. */
unsigned mode_of(const std::string &path);
/** Path and content of an interface file. */
std::string ifcfg(const std::string &ifname);
/** Really runs a shell command line; it has to succeed. */
void shell(const std::string &line);
/** Bytes of one kind, for over-long arguments. */
std::string long_text(size_t length, char byte = 'a');

/** Another process that holds a named lock while this lives. */
class lock_elsewhere {
public:
    explicit lock_elsewhere(uint32_t word);
    lock_elsewhere(const lock_elsewhere &) = delete;
    lock_elsewhere &operator=(const lock_elsewhere &) = delete;
    ~lock_elsewhere();

private:
    pid_t holder_ = -1;
};

/** Texts that no name or address may be: with blanks, slashes, control characters, newlines, dots, over-long. */
const texts &bad_names();

} // namespace kova_test
